#include "appliance/vornd/one_time_links.h"

#include <algorithm>
#include <utility>

namespace appliance {

OneTimeLinks::OneTimeLinks(SessionClock clock) : clock_(std::move(clock)) {}

void OneTimeLinks::Prune() {
    const std::int64_t now = clock_.running();
    const auto isOver = [now](const Kept& link) { return now - link.made >= kLinkLife; };
    links_.erase(std::remove_if(links_.begin(), links_.end(), isOver), links_.end());
}

OneTimeLinks::Link OneTimeLinks::Make() {
    Prune();
    if (links_.size() >= kMostLinks) {
        links_.erase(links_.begin());
    }
    Link link{NewToken(), clock_.wall() + kLinkLife};
    links_.push_back({HashOf(link.token), clock_.running()});
    return link;
}

bool OneTimeLinks::Use(std::string_view token) {
    if (!IsToken(token)) {
        return false;
    }
    Prune();
    const TokenHash hash = HashOf(token);
    const auto found =
        std::find_if(links_.begin(), links_.end(), [&hash](const Kept& link) { return IsSame(link.hash, hash); });
    if (found == links_.end()) {
        return false;
    }
    links_.erase(found);
    return true;
}

}  // namespace appliance
