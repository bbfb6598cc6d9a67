// Links that log in once, for whoever is root already. Lives on the server's thread, and ends with it.

#ifndef VORN_APPLIANCE_VORND_ONE_TIME_LINKS_H
#define VORN_APPLIANCE_VORND_ONE_TIME_LINKS_H

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "appliance/vornd/session_store.h"
#include "appliance/vornd/session_token.h"

namespace appliance {

inline constexpr std::int64_t kLinkLife = std::int64_t{10} * 60;  // seconds
inline constexpr std::size_t kMostLinks = 16;

class OneTimeLinks {
public:
    struct Link {
        std::string token;
        std::int64_t expires = 0;  // seconds since 1970
    };

    explicit OneTimeLinks(SessionClock clock);

    // A new link. When there are kMostLinks, the oldest goes.
    Link Make();

    // True for a link that is good; it is used up then.
    bool Use(std::string_view token);

private:
    struct Kept {
        TokenHash hash{};
        std::int64_t made = 0;
    };

    void Prune();

    const SessionClock clock_;
    std::vector<Kept> links_;  // the oldest first
};

}  // namespace appliance

#endif
