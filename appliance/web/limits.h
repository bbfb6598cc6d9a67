// What the server takes at most.

#ifndef VORN_APPLIANCE_WEB_LIMITS_H
#define VORN_APPLIANCE_WEB_LIMITS_H

#include <chrono>
#include <cstddef>

namespace appliance {

inline constexpr std::size_t kHeaderLimit = std::size_t{8} << 10;  // bytes
inline constexpr std::size_t kBodyLimit = std::size_t{64} << 10;   // bytes
inline constexpr int kJsonDepth = 10;                              // levels of arrays and objects
inline constexpr std::size_t kConnections = 256;
inline constexpr std::size_t kDoorConnections = 192;  // of them, of the server in front
inline constexpr std::size_t kWaitingCalls = 64;
inline constexpr std::size_t kWorkers = 16;  // calls that run at a time

inline constexpr std::chrono::seconds kSendLimit{15};    // from a request's first byte to its last
inline constexpr std::chrono::seconds kAnswerLimit{15};  // for the client to take an answer
inline constexpr std::chrono::seconds kLingerLimit{2};   // for it to stop sending what nobody reads any more

// Running calls have deadlines of their own, the longest of them (a join) far below this. What runs longer is left
// behind when the server ends.
inline constexpr std::chrono::seconds kDrainLimit{300};

}  // namespace appliance

#endif
