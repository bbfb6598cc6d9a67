// The clock, set by what a domain controller says.

#include <gtest/gtest.h>

#include <cerrno>
#include <cstdint>
#include <ctime>
#include <optional>

#include "appliance/domain/directory/time_sync.h"

namespace {

using appliance::ControllerTime;

constexpr std::int64_t kSecond = 1000000000;

std::int64_t Nanoseconds(const timespec& time) {
    return time.tv_sec * kSecond + time.tv_nsec;
}

std::int64_t Now(clockid_t clock) {
    timespec time = {};
    clock_gettime(clock, &time);
    return Nanoseconds(time);
}

// What a controller said whose clock is `seconds` ahead, `ago` nanoseconds ago.
ControllerTime Said(std::int64_t seconds, std::int64_t ago) {
    ControllerTime time;
    time.controller = "dc1.lab.test";
    time.seconds = Now(CLOCK_REALTIME) / kSecond + seconds;
    time.at = Now(CLOCK_MONOTONIC) - ago;
    return time;
}

// A clock that is not this machine's, and what it was set to.
struct Clock {
    std::optional<std::int64_t> set;
    int failure = 0;

    bool Follow(const ControllerTime& time) {
        return appliance::FollowClock(time, [this](clockid_t clock, const timespec* moment) {
            EXPECT_EQ(clock, CLOCK_REALTIME);
            set = Nanoseconds(*moment);
            errno = failure;
            return failure == 0 ? 0 : -1;
        });
    }
};

TEST(ClockSettingTest, ToTheMomentThatItIsNowForTheController) {
    for (const std::int64_t ahead : {600, -600, 4, -4, 86000, -86000}) {
        for (const std::int64_t ago : {std::int64_t{0}, kSecond / 4, 3 * kSecond}) {
            Clock clock;
            const ControllerTime time = Said(ahead, ago);
            // The half of a second that "net time" does not tell, and all that has passed since it was told.
            const std::int64_t told = time.seconds * kSecond + kSecond / 2 - time.at;
            const std::int64_t earliest = told + Now(CLOCK_MONOTONIC);
            EXPECT_TRUE(clock.Follow(time));
            const std::int64_t latest = told + Now(CLOCK_MONOTONIC);
            ASSERT_TRUE(clock.set) << ahead;
            EXPECT_GE(*clock.set, earliest) << ahead << ", " << ago;
            EXPECT_LE(*clock.set, latest) << ahead << ", " << ago;
        }
    }
}

TEST(ClockSettingTest, LeftAloneWhenItAgreesOrCannotBeRight) {
    Clock clock;
    EXPECT_TRUE(clock.Follow(Said(0, 0)));
    EXPECT_FALSE(clock.Follow(Said(2 * 86400, 0)));
    EXPECT_FALSE(clock.Follow(Said(-2 * 86400, 0)));
    ControllerTime never;
    EXPECT_FALSE(clock.Follow(never));
    EXPECT_FALSE(clock.set);
}

TEST(ClockSettingTest, FailsWhenTheClockMayNotBeSet) {
    Clock clock;
    clock.failure = EPERM;
    EXPECT_FALSE(clock.Follow(Said(600, 0)));
    EXPECT_TRUE(clock.set);
}

}  // namespace
