// Is this an administrator's password? A process of its own asks PAM, and is given up when it takes too long.

#ifndef VORN_APPLIANCE_VORND_AUTHENTICATOR_H
#define VORN_APPLIANCE_VORND_AUTHENTICATOR_H

#include <chrono>
#include <cstddef>
#include <string>
#include <string_view>

#include "appliance/base/secret.h"

namespace appliance {

inline constexpr std::chrono::seconds kLogInDeadline{20};
inline constexpr std::size_t kLogInsAtATime = 2;
inline constexpr std::size_t kWaitingLogIns = 8;

// An answer of "no" comes this long after the question, or a multiple of it: how long it took to find out is not told.
inline constexpr std::chrono::seconds kRefusalStep{2};

// What can be a user and a password at all; anything else is wrong without being looked at.
bool CanBeUser(std::string_view user);
bool CanBePassword(std::string_view password);

struct Verdict {
    enum class Kind { Accepted, Refused, Failed };
    Kind kind = Kind::Failed;
    std::string reason;  // for the log, of all but Accepted
};

// Runs vornauth and waits for it. `user` and `password` are such as can be.
Verdict Authenticate(const std::string& user, const Secret& password);

}  // namespace appliance

#endif
