// What the door to the network takes at most. Sizes of requests are those of appliance/web/limits.h.

#ifndef VORN_APPLIANCE_HTTPD_DOOR_LIMITS_H
#define VORN_APPLIANCE_HTTPD_DOOR_LIMITS_H

#include <chrono>
#include <cstddef>

#include "appliance/web/limits.h"

namespace appliance {

inline constexpr std::size_t kAnswerSize = std::size_t{32} << 20;   // of one answer of vornd, bytes
inline constexpr std::size_t kAnswersHeld = std::size_t{96} << 20;  // of all that clients have yet to take, bytes
inline constexpr std::size_t kUpstreamConnections = 128;            // leaves room at vornd for local clients
inline constexpr std::size_t kUpstreamIdle = 16;                    // kept open for the next calls
inline constexpr std::chrono::milliseconds kTick{250};              // how exactly times are kept
inline constexpr std::chrono::hours kCertificateCheck{12};          // how often the own certificate's end is looked at

// Times; a test has shorter ones.
struct DoorLimits {
    using Time = std::chrono::milliseconds;
    Time handshake = std::chrono::seconds(10);
    Time send = kSendLimit;                       // from a request's first byte to its last
    Time stall = kAnswerLimit;                    // without a byte of an answer taken
    Time answer = std::chrono::seconds(60);       // for a whole answer
    Time idle = std::chrono::seconds(60);         // between two requests
    Time linger = kLingerLimit;                   // for a client to stop sending what nobody reads
    Time protectedFor = std::chrono::seconds(1);  // a newcomer is not pushed out before
    Time upstreamConnect = std::chrono::seconds(2);
    Time upstreamCall = std::chrono::seconds(330);  // calls have deadlines of their own at vornd
    Time upstreamProbe = std::chrono::seconds(2);   // for what only asks how vornd is
    Time upstreamIdle = std::chrono::seconds(30);
    Time drain = std::chrono::seconds(310);
};

}  // namespace appliance

#endif
