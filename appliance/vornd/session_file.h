// The text in which sessions outlive the server.

#ifndef VORN_APPLIANCE_VORND_SESSION_FILE_H
#define VORN_APPLIANCE_VORND_SESSION_FILE_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "appliance/vornd/session_token.h"

namespace appliance {

inline constexpr std::size_t kMostSessions = 64;

// What is kept of a session. Times are seconds of a clock that nobody sets: since the machine was started.
struct StoredSession {
    TokenHash hash{};
    std::string csrf;  // the token that each changing request carries beside the session's own
    std::string user;
    std::int64_t begun = 0;
    std::int64_t used = 0;  // by the last call that counts as use
};

// One JSON object. `boot` names this run of the machine: without it the times mean nothing.
std::string WriteSessions(const std::vector<StoredSession>& sessions, const std::string& boot);

// Reads it back. Nothing when a byte of it is not as WriteSessions might have left it; no sessions when they are of
// another run of the machine.
std::optional<std::vector<StoredSession>> ReadSessions(std::string_view text, const std::string& boot);

}  // namespace appliance

#endif
