// What stands behind the door: vornd, or a test's double.

#ifndef VORN_APPLIANCE_HTTPD_BACKEND_H
#define VORN_APPLIANCE_HTTPD_BACKEND_H

#include <chrono>
#include <functional>
#include <memory>
#include <string>

namespace appliance {

// Everything that is sent. Nothing of a client's own header is copied.
struct BackendRequest {
    std::string verb;
    std::string target;
    std::string session;  // tokens: empty for none, else of the form that IsToken allows
    std::string csrf;
    std::string client;       // the client's address
    bool background = false;  // sent by the page on its own, not by somebody in front of it
    std::string body;         // of a POST: JSON
    std::chrono::milliseconds limit{0};
};

struct BackendReply {
    enum class Outcome {
        Answered,
        Unreachable,  // no answer, or none that can be passed on
        Busy,         // too many requests are on their way
    };
    Outcome outcome = Outcome::Unreachable;
    int status = 0;  // 200 to 599
    bool isJson = false;
    std::string body;
    std::string retryAfter;         // "Retry-After", when it is a number
    std::string allow;              // "Allow", when it is a list of words
    std::shared_ptr<void> storage;  // counts the body as long as it is kept
};

class Backend {
public:
    using Handler = std::function<void(BackendReply)>;

    virtual ~Backend() = default;
    // Calls the handler once, on the loop's thread, and never before it has returned.
    virtual void Ask(BackendRequest request, Handler handler) = 0;
};

}  // namespace appliance

#endif
