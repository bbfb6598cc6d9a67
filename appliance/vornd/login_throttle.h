// Keeps passwords from being guessed. Lives on the server's thread.

#ifndef VORN_APPLIANCE_VORND_LOGIN_THROTTLE_H
#define VORN_APPLIANCE_VORND_LOGIN_THROTTLE_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace appliance {

// Failures are counted for each address and for each user. After kFailures of them within kFailureWindow the next
// attempt has to wait, kFirstWait at first and twice as long after each further failure, up to kLongestWait.
class LoginThrottle {
public:
    static constexpr std::size_t kFailures = 5;
    static constexpr std::int64_t kFailureWindow = std::int64_t{15} * 60;  // seconds, as all of these
    static constexpr std::int64_t kFirstWait = 30;
    static constexpr std::int64_t kLongestWait = std::int64_t{15} * 60;
    static constexpr std::size_t kMostEntries = 1024;  // of addresses, and of users

    enum class Outcome {
        Success,  // the user's failures are forgotten, not the address's
        Failure,
        Unknown,  // nobody has looked at the password
    };

    // `now` answers seconds of a clock that nobody sets.
    explicit LoginThrottle(std::function<std::int64_t()> now);

    // May this attempt be made? 0: yes, and an Ended with the same texts follows. Otherwise the seconds to wait. Attempts
    // under way count as failures, so that many at once are no more than one after the other.
    std::int64_t Begin(std::string_view address, std::string_view user);
    void Ended(std::string_view address, std::string_view user, Outcome outcome);

private:
    struct Entry {
        std::vector<std::int64_t> failures;  // when, the oldest first; at most kFailures
        std::int64_t wait = 0;               // the present one; 0: there have not been enough failures
        std::int64_t until = 0;              // when it is over
        std::size_t underWay = 0;
    };
    using Table = std::unordered_map<std::string, Entry>;

    std::int64_t WaitOf(Table& table, const std::string& key) const;
    void Forget(Entry& entry) const;
    void Fail(Entry& entry) const;
    static Entry& EntryOf(Table& table, const std::string& key);
    void Settle(Table& table, const std::string& key, Outcome outcome, bool successForgives) const;

    const std::function<std::int64_t()> now_;
    Table addresses_;
    Table users_;
};

// What stands for an address in the counts: an IPv4 address whole, of an IPv6 address the network of 64 bits that one
// client has to itself as a rule. Another text stands for itself.
std::string ThrottledAddress(const std::string& address);

}  // namespace appliance

#endif
