// Calls of the appliance's web API.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_CLIENT_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_CLIENT_H

#include <json/value.h>

#include <chrono>
#include <memory>
#include <string>

#include "appliance/base/secret.h"
#include "appliance/tools/vornctl/http_call.h"

namespace appliance::ctl {

// A method, and how long its answer may take. Without an API, `name` is the path of something that the server itself
// serves.
struct Method {
    std::string api;
    int version;
    std::string name;
    std::chrono::seconds deadline;
};

// The methods that the commands use.
namespace methods {

inline constexpr const char kDomainApi[] = "VORN.Core.Directory.Domain";
inline constexpr const char kOptionsApi[] = "VORN.Core.Directory.Domain.Conf";
inline constexpr const char kScheduleApi[] = "VORN.Core.Directory.Domain.Schedule";
inline constexpr const char kDirectoryApi[] = "VORN.Appliance.Directory";
inline constexpr const char kEventLogApi[] = "VORN.Appliance.EventLog";

Method Get();
Method Set();
Method TestDc();
Method DomainList(int version);
Method UpdateStart();
Method UpdateStatus();
Method UpdateStop();
Method OptionsGet();
Method OptionsSet();
Method ScheduleGet();
Method ScheduleSet();
Method Users();
Method Groups();
Method Domains();
Method Overview();
Method RefreshProgress();
Method JoinSteps();
Method Leave();
Method Events();
Method NewLink();

}  // namespace methods

// What the server answered.
struct Answer {
    Json::Value whole;  // {"success": ..., ...}
    bool success = false;
    Json::Value data;    // of a success
    int code = 0;        // of a failure
    Json::Value errors;  // likewise
};

class Client {
public:
    // `socket`: path of the server's socket. `deadline`: for every call, in place of its own; 0: its own.
    Client(std::string socket, std::chrono::seconds deadline);

    // Calls a method and waits. `parameters` is an object; `password`, when given, becomes its member "password"
    // without another copy staying in memory. Throws Failure: kNoAnswer, or kInterrupted after Ctrl-C.
    Answer Call(const Method& method, const Json::Value& parameters = Json::Value(Json::objectValue),
                const Secret* password = nullptr) const;

    // The same with a body that is sent as it is.
    Answer CallWithBody(const Method& method, Secret body) const;

    // Begins a call. It moves while its RunFor is called; Finish then gives the answer.
    std::unique_ptr<HttpCall> Start(const Method& method, const Json::Value& parameters,
                                    const Secret* password = nullptr) const;
    static Answer Finish(HttpCall& call);

    // A call for something that the command can do without: false when there is no successful answer within 3 s.
    bool TryCall(Method method, const Json::Value& parameters, Json::Value& data) const;

private:
    std::unique_ptr<HttpCall> Begin(const Method& method, Secret body) const;

    std::string socket_;
    std::chrono::seconds deadline_;
};

// Reads a JSON text strictly. False when it is none.
bool ParseJson(std::string_view text, Json::Value& value);

// A member of an object as a text; empty when it is missing or no text.
std::string TextOf(const Json::Value& object, const char* key);
// The same for a whole number, and for a list; 0 and an empty list.
Json::Int64 NumberOf(const Json::Value& object, const char* key);
const Json::Value& ListOf(const Json::Value& object, const char* key);
// The same for any value; null.
const Json::Value& MemberOf(const Json::Value& object, const char* key);
bool FlagOf(const Json::Value& object, const char* key);

}  // namespace appliance::ctl

#endif
