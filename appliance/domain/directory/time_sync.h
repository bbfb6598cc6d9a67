// The clock of the appliance, set by the domain controller's.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_TIME_SYNC_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_TIME_SYNC_H

#include <cstdint>
#include <ctime>
#include <functional>
#include <optional>
#include <string>

namespace appliance {

// The scheduled task and its switch in smb.conf ("yes" or not).
inline constexpr char kSyncTimeCommand[] = "/usr/vorn/sbin/vornwin -syncTime";
inline constexpr char kSyncTimeKey[] = "vorn sync dctime";

// Is time synchronisation switched on? False also when smb.conf can't be read.
bool IsTimeSynchronised();

// What to do about a clock that differs from the controller's; all times in seconds since 1970.
enum class ClockStep {
    None,  // less than two seconds: the controller's answer is no more exact
    Set,
    TooFar,      // more than a day, and the own clock is a possible one: somebody has to look
    Impossible,  // the controller's time lies before this system was made
};
ClockStep DecideStep(std::int64_t own, std::int64_t controller);

// The moment that "net time" prints in UTC ("Sat Nov 21 19:22:03 2026"); nothing when it is none.
std::optional<std::int64_t> ParseTime(const std::string& text);

// What a controller said, and when it did.
struct ControllerTime {
    std::string controller;
    std::int64_t seconds = 0;  // since 1970
    std::int64_t at = 0;       // nanoseconds of CLOCK_MONOTONIC, which nobody sets
};

// Sets the machine's clock as clock_settime does.
using ClockSetter = std::function<int(clockid_t, const timespec*)>;

// Sets the clock by what a controller said, where DecideStep asks for that, and logs the outcome. False when the time is
// not taken or the clock may not be set.
bool FollowClock(const ControllerTime& answer, const ClockSetter& set = clock_settime);

// Asks a controller of the own domain for the time and sets the clock by it, with one line in the log about the
// outcome. False when no controller answers, its time is not taken, or the clock may not be set. An appliance that is
// no member has nothing to do.
bool SynchroniseTime();

}  // namespace appliance

#endif
