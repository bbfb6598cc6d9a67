// One HTTP request on the server's unix socket.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_HTTP_CALL_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_HTTP_CALL_H

#include <chrono>
#include <memory>
#include <string>

#include "appliance/base/secret.h"

namespace appliance::ctl {

struct HttpAnswer {
    int status = 0;
    std::string body;
};

// A POST of a JSON text that is on its way from the start on. It only moves while RunFor is called.
class HttpCall {
public:
    // `socket` is the path of the server's socket, `target` the path of the request. After `deadline` (milliseconds)
    // the connection is given up. Throws Failure when the socket's path can't be one.
    HttpCall(const std::string& socket, const std::string& target, Secret body, std::chrono::milliseconds deadline);
    ~HttpCall();
    HttpCall(const HttpCall&) = delete;
    HttpCall& operator=(const HttpCall&) = delete;

    // Goes on for `slice` at most. True when the call is over, well or badly.
    bool RunFor(std::chrono::milliseconds slice);

    // The answer of a call that is over. Throws Failure (kNoAnswer) when there is none: nobody listens, no permission,
    // the deadline passed, or what came is no HTTP.
    HttpAnswer Take();

private:
    class Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace appliance::ctl

#endif
