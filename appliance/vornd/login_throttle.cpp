#include "appliance/vornd/login_throttle.h"

#include <arpa/inet.h>
#include <netinet/in.h>

#include <algorithm>
#include <array>
#include <tuple>
#include <utility>

#include "appliance/base/text.h"

namespace appliance {
namespace {

// While others are under way there is no telling how long.
constexpr std::int64_t kShortWait = 3;

// Case means nothing in the names of a domain's users.
std::string UserKey(std::string_view user) {
    return Lower(user);
}

}  // namespace

LoginThrottle::LoginThrottle(std::function<std::int64_t()> now) : now_(std::move(now)) {}

void LoginThrottle::Forget(Entry& entry) const {
    const std::int64_t now = now_();
    if (entry.wait > 0) {
        if (now - entry.until >= kFailureWindow) {
            entry.wait = 0;
            entry.failures.clear();
        }
        return;
    }
    const auto isOld = [now](std::int64_t time) { return now - time >= kFailureWindow; };
    entry.failures.erase(std::remove_if(entry.failures.begin(), entry.failures.end(), isOld), entry.failures.end());
}

void LoginThrottle::Fail(Entry& entry) const {
    Forget(entry);
    if (entry.wait == 0) {
        entry.failures.push_back(now_());
        if (entry.failures.size() < kFailures) {
            return;
        }
    }
    entry.wait = entry.wait == 0 ? kFirstWait : std::min(2 * entry.wait, kLongestWait);
    entry.until = now_() + entry.wait;
}

std::int64_t LoginThrottle::WaitOf(Table& table, const std::string& key) const {
    const auto found = table.find(key);
    if (found == table.end()) {
        return 0;
    }
    Entry& entry = found->second;
    Forget(entry);
    if (entry.wait > 0) {
        const std::int64_t left = entry.until - now_();
        return left > 0 ? left : entry.underWay > 0 ? kShortWait : 0;
    }
    return entry.failures.size() + entry.underWay < kFailures ? 0 : kShortWait;
}

// When the table is full the entry goes that says least: the fewest failures, and of those the oldest.
LoginThrottle::Entry& LoginThrottle::EntryOf(Table& table, const std::string& key) {
    if (table.size() >= kMostEntries && table.count(key) == 0) {
        const auto weight = [](const Table::value_type& row) {
            const Entry& entry = row.second;
            return std::make_tuple(entry.underWay > 0, entry.wait, entry.failures.size(),
                                   entry.failures.empty() ? 0 : entry.failures.back());
        };
        table.erase(std::min_element(table.begin(), table.end(), [&weight](const auto& first, const auto& second) {
            return weight(first) < weight(second);
        }));
    }
    return table[key];
}

std::int64_t LoginThrottle::Begin(std::string_view address, std::string_view user) {
    const std::string addressKey(address);
    const std::string userKey = UserKey(user);
    const std::int64_t wait = std::max(WaitOf(addresses_, addressKey), WaitOf(users_, userKey));
    if (wait == 0) {
        ++EntryOf(addresses_, addressKey).underWay;
        ++EntryOf(users_, userKey).underWay;
    }
    return wait;
}

void LoginThrottle::Settle(Table& table, const std::string& key, Outcome outcome, bool successForgives) const {
    const auto found = table.find(key);
    if (found == table.end()) {
        return;
    }
    Entry& entry = found->second;
    --entry.underWay;
    if (outcome == Outcome::Failure) {
        Fail(entry);
    } else if (outcome == Outcome::Success && successForgives) {
        entry.wait = 0;
        entry.failures.clear();
    }
    if (entry.underWay == 0 && entry.wait == 0 && entry.failures.empty()) {
        table.erase(found);
    }
}

void LoginThrottle::Ended(std::string_view address, std::string_view user, Outcome outcome) {
    Settle(addresses_, std::string(address), outcome, false);
    Settle(users_, UserKey(user), outcome, true);
}

std::string ThrottledAddress(const std::string& address) {
    std::array<unsigned char, sizeof(in6_addr)> bytes{};
    if (inet_pton(AF_INET6, address.c_str(), bytes.data()) != 1) {
        return address;
    }
    constexpr std::array<unsigned char, 12> kMapped{0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0xFF, 0xFF};
    std::array<char, INET6_ADDRSTRLEN> text{};
    if (std::equal(kMapped.begin(), kMapped.end(), bytes.begin())) {
        return inet_ntop(AF_INET, &bytes[kMapped.size()], text.data(), text.size());
    }
    std::fill(bytes.begin() + bytes.size() / 2, bytes.end(), static_cast<unsigned char>(0));
    return std::string(inet_ntop(AF_INET6, bytes.data(), text.data(), text.size())) + "/64";
}

}  // namespace appliance
