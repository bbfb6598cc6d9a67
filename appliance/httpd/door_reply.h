// An answer to a client, and how it is written.

#ifndef VORN_APPLIANCE_HTTPD_DOOR_REPLY_H
#define VORN_APPLIANCE_HTTPD_DOOR_REPLY_H

#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "appliance/web/server_codes.h"

namespace appliance {

struct DoorReply {
    int status = 200;
    std::string_view type;  // of the content; empty when there is none. Lasts for ever.
    std::string body;
    std::string_view file;  // instead of the body: content of one of the page's files, which outlives every answer
    std::vector<std::pair<std::string_view, std::string>> fields;  // further ones; their names last for ever
    std::shared_ptr<void> storage;                                 // counts the body as long as it is kept

    std::string_view Content() const {
        return file.empty() ? std::string_view(body) : file;
    }
};

inline constexpr std::string_view kJsonType = "application/json";

// The server's own answer: {"success": false, "error": {"code": N, "errors": TEXT}}.
DoorReply DoorError(ServerCode code);
// As above for a wrong HTTP method; `allow` lists those that are right.
DoorReply WrongVerb(std::string_view allow);

// How the answer travels.
struct ReplyForm {
    bool keepOpen = true;
    bool oldVersion = false;  // the client speaks HTTP/1.0
    bool headOnly = false;    // an answer to HEAD
    bool strictTransport = false;
};

// The header of an answer, with the fields that forbid browsers whatever the page does not need. With `keepOpen` false
// it says that the connection ends.
std::string WriteHeader(const DoorReply& reply, const ReplyForm& form);

}  // namespace appliance

#endif
