// What the server answers.

#ifndef VORN_APPLIANCE_VORND_REPLY_H
#define VORN_APPLIANCE_VORND_REPLY_H

#include <json/value.h>

#include <chrono>
#include <cstdint>
#include <string>

#include "appliance/web/server_codes.h"

namespace appliance {

inline constexpr const char kJsonType[] = "application/json";

struct Reply {
    int status = 200;
    std::string body;
    int code = 0;                  // of an error
    const char* type = kJsonType;  // of the body
    const char* allow = nullptr;   // of WrongVerb: the HTTP method that is right
    std::int64_t retryAfter = 0;   // seconds; 0: nothing is said of it
    bool isSecret = false;         // the body is wiped when it has been sent

    // It is not given before this moment.
    std::chrono::steady_clock::time_point notBefore = {};

    // What was asked for, for the counts; texts that outlive the reply. Empty: nothing that is served.
    const char* api = "";
    const char* method = "";
};

// {"success": true, "data": DATA}
std::string SuccessBody(const Json::Value& data);
Reply SuccessReply(const Json::Value& data);

// {"success": false, "error": {"code": CODE, "errors": ERRORS}}, of a module.
Reply FailureReply(int code, const Json::Value& errors);

// The server's own answer to what it does not serve; "errors" is the code in words.
Reply ErrorReply(ServerCode code, const char* allow = nullptr);

}  // namespace appliance

#endif
