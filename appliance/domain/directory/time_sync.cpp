#include "appliance/domain/directory/time_sync.h"

#include <cerrno>
#include <cstring>
#include <ctime>

#include "appliance/base/conf_file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/directory/fetch_source.h"
#include "appliance/domain/directory/worker.h"
#include "appliance/domain/membership/samba.h"

namespace appliance {

namespace {

constexpr std::int64_t kSmallest = 2;
constexpr std::int64_t kLargest = std::int64_t{24} * 60 * 60;
constexpr std::int64_t kEarliest = 1767225600;  // 2026-01-01
constexpr std::chrono::milliseconds kDeadline{7000};
constexpr std::int64_t kNanoseconds = 1000000000;

// Nanoseconds since 1970, or since some moment that no setting of the clock moves.
std::int64_t Now(clockid_t clock) {
    timespec time{};
    clock_gettime(clock, &time);
    return time.tv_sec * kNanoseconds + time.tv_nsec;
}

std::optional<ControllerTime> AskController(const Controller& controller) {
    ControllerTime answer;
    answer.controller = controller.name.empty() ? controller.address : controller.name;
    SambaCall call;
    call.arguments = {"time", "-S", answer.controller};
    call.deadline = kDeadline;
    Command command = SambaCommand(kNet, call);
    command.environment.emplace_back("TZ", "UTC");
    const CommandResult result = Run(command);
    answer.at = Now(CLOCK_MONOTONIC);
    const std::optional<std::int64_t> time = result.Succeeded() ? ParseTime(result.output) : std::nullopt;
    if (!time) {
        Log(LOG_WARNING, answer.controller + " does not tell the time: net time " + result.Describe());
        return std::nullopt;
    }
    answer.seconds = *time;
    return answer;
}

std::string Signed(std::int64_t seconds) {
    return (seconds > 0 ? "+" : "") + std::to_string(seconds) + " s";
}

bool SetClock(const ControllerTime& answer, std::int64_t offset, const ClockSetter& set) {
    // Full seconds are told: on average half a second has passed since.
    const std::int64_t now = answer.seconds * kNanoseconds + kNanoseconds / 2 + (Now(CLOCK_MONOTONIC) - answer.at);
    timespec time{};
    time.tv_sec = now / kNanoseconds;
    time.tv_nsec = now % kNanoseconds;
    if (set(CLOCK_REALTIME, &time) != 0) {
        Log(LOG_ERR, "the clock differs by " + Signed(offset) + " from that of " + answer.controller +
                         " and can't be set: " + strerror(errno));
        return false;
    }
    Log(LOG_NOTICE, "the clock has been set by " + Signed(offset) + " to that of " + answer.controller);
    return true;
}

}  // namespace

bool IsTimeSynchronised() {
    ConfFile conf;
    return !ConfFile::Load(Path(kSmbConf), conf, false) && conf.Get("global", kSyncTimeKey).value_or("") == "yes";
}

ClockStep DecideStep(std::int64_t own, std::int64_t controller) {
    if (controller < kEarliest) {
        return ClockStep::Impossible;
    }
    const std::int64_t difference = controller > own ? controller - own : own - controller;
    if (difference < kSmallest) {
        return ClockStep::None;
    }
    // A clock that shows a time before this system was made was never set: there is nothing to compare with.
    return difference > kLargest && own >= kEarliest ? ClockStep::TooFar : ClockStep::Set;
}

std::optional<std::int64_t> ParseTime(const std::string& text) {
    const std::string line = Trim(text);
    std::tm time{};
    const char* end = strptime(line.c_str(), "%a %b %d %H:%M:%S %Y", &time);
    if (end == nullptr || *end != '\0') {
        return std::nullopt;
    }
    const std::time_t seconds = timegm(&time);
    if (seconds <= 0) {
        return std::nullopt;
    }
    return seconds;
}

bool FollowClock(const ControllerTime& answer, const ClockSetter& set) {
    const std::int64_t own = Now(CLOCK_REALTIME) / kNanoseconds;
    const std::int64_t offset = answer.seconds - own;
    switch (DecideStep(own, answer.seconds)) {
        case ClockStep::None:
            Log(LOG_INFO, "the clock agrees with that of " + answer.controller);
            return true;
        case ClockStep::Set:
            return SetClock(answer, offset, set);
        case ClockStep::TooFar:
            Log(LOG_ERR, "the clock differs by " + Signed(offset) + " from that of " + answer.controller +
                             ", more than a day, and is not set: see to one of them by hand");
            return false;
        case ClockStep::Impossible:
            break;
    }
    Log(LOG_ERR, "the clock of " + answer.controller + " shows a time in the past and is not followed");
    return false;
}

bool SynchroniseTime() {
    Membership membership;
    if (const std::error_code error = ReadMembership(membership)) {
        Log(LOG_ERR, Path(kSmbConf) + ": " + error.message());
        return false;
    }
    if (!membership.Joined()) {
        Log(LOG_INFO, "the appliance is no member of a domain, so its clock follows none");
        return true;
    }
    FetchDomain domain;
    domain.name = membership.domain;
    domain.dns = membership.kind == DomainKind::ActiveDirectory ? Lower(membership.realm) : "";
    domain.own = true;
    try {
        for (const Controller& controller : ControllersOf(domain, membership)) {
            if (const std::optional<ControllerTime> answer = AskController(controller)) {
                return FollowClock(*answer);
            }
        }
        Log(LOG_ERR, "no controller of " + membership.domain + " tells the time");
    } catch (const DirectoryError& error) {
        Log(LOG_ERR, std::string("no time from the domain: ") + error.what());
    }
    return false;
}

}  // namespace appliance
