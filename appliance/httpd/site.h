// What is served: the page's files, log-in, calls that are passed on, and how the appliance is.

#ifndef VORN_APPLIANCE_HTTPD_SITE_H
#define VORN_APPLIANCE_HTTPD_SITE_H

#include <chrono>
#include <cstddef>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "appliance/httpd/backend.h"
#include "appliance/httpd/client_request.h"
#include "appliance/httpd/door_limits.h"
#include "appliance/httpd/door_metrics.h"
#include "appliance/httpd/door_reply.h"
#include "appliance/httpd/page.h"

namespace appliance {

class Site {
public:
    using Handler = std::function<void(DoorReply)>;

    // `figures` answers the door's own metrics. All outlive the site, and the site outlives every request.
    Site(const Page& page, Backend& backend, const DoorLimits& limits, std::function<std::string()> figures);
    Site(const Site&) = delete;
    Site& operator=(const Site&) = delete;

    // Answers a whole request, at once or later, once.
    void Handle(ClientRequest request, Handler handler);

private:
    // What becomes of a session's cookie.
    enum class Cookie { AsItIs, Set, Clear };

    void PassOn(std::string_view verb, ClientRequest& request, Cookie cookie, Handler handler);
    BackendRequest ToBackend(std::string_view verb, const ClientRequest& request) const;
    void HandleHealth(Handler handler);
    void OnHealth(bool healthy);
    void HandleMetrics(const ClientRequest& request, Handler handler);
    void AnswerMetrics(Handler handler);

    const Page& page_;
    Backend& backend_;
    const DoorLimits& limits_;
    const std::function<std::string()> figures_;

    // One look at vornd answers all who ask within a second.
    std::vector<Handler> healthWaiters_;
    std::chrono::steady_clock::time_point healthSeen_;
    bool healthKnown_ = false;
    bool healthy_ = false;
};

}  // namespace appliance

#endif
