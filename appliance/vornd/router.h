// From a request to what is to be done, and from there to the answer. Knows nothing of connections.

#ifndef VORN_APPLIANCE_VORND_ROUTER_H
#define VORN_APPLIANCE_VORND_ROUTER_H

#include <json/value.h>

#include <optional>
#include <string>
#include <string_view>
#include <variant>

#include "appliance/platform/webapi/task_process.h"
#include "appliance/vornd/door_marks.h"
#include "appliance/vornd/method_table.h"
#include "appliance/vornd/reply.h"

namespace appliance {

// A request as it was sent, with its body complete.
struct WebRequest {
    std::string verb;
    std::string target;
    bool hasContentType = false;
    std::string contentType;
    bool hasContentEncoding = false;
    DoorMarks marks;
    std::string body;
};

// Reads the body of a POST request that takes parameters. Answers what is wrong with it, or nothing.
std::optional<ServerCode> ReadBody(const WebRequest& request, Json::Value& parameters);

// A method to be called with these parameters.
struct Call {
    const VORN::APIEntry* method = nullptr;
    Json::Value parameters;
};

class Router {
public:
    // `methods` outlives the router. `descriptions` is the array of methods.json, or null when there is none.
    Router(const MethodTable& methods, const Json::Value& descriptions, TaskHost taskHost);

    // Either the answer at once, or a call, which may block.
    std::variant<Reply, Call> Route(const WebRequest& request) const;

    // Makes the call. Never throws but for std::bad_alloc; safe from several threads at once.
    Reply Execute(const Call& call) const;

private:
    std::variant<Reply, Call> RouteCall(std::string_view path, const WebRequest& request) const;

    const MethodTable& methods_;
    const TaskHost taskHost_;
    const std::string list_;     // the answer of GET /webapi
    const std::string openApi_;  // the answer of GET /webapi/openapi.json
};

}  // namespace appliance

#endif
