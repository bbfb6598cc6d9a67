#include "appliance/domain/join/attempts.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <stdexcept>
#include <thread>

namespace {

using appliance::Ask;
using appliance::AttemptLimits;
using std::chrono::milliseconds;
using std::chrono::seconds;
using Clock = std::chrono::steady_clock;

AttemptLimits Limits(milliseconds time, milliseconds pause) {
    AttemptLimits limits;
    limits.time = time;
    limits.pause = pause;
    limits.least = milliseconds(10);
    return limits;
}

// Until its time has passed. True: nobody waits for it any more.
bool Hang(milliseconds time, int cancel) {
    pollfd waiting{cancel, POLLIN, 0};
    return poll(&waiting, 1, static_cast<int>(time.count())) == 1;
}

TEST(AttemptsTest, AnAnswerAtOnceNeedsOneAttempt) {
    std::atomic<int> begun{0};
    EXPECT_TRUE(Ask([&](int, milliseconds, int) { return ++begun == 1; }, Limits(seconds(60), seconds(30))));
    EXPECT_EQ(begun, 1);
}

TEST(AttemptsTest, AFailureIsFollowedByTheNextAttemptAtOnce) {
    std::atomic<int> begun{0};
    const auto begin = Clock::now();
    EXPECT_TRUE(
        Ask([&](int number, milliseconds, int) { return ++begun, number == 2; }, Limits(seconds(60), seconds(30))));
    EXPECT_EQ(begun, 3);
    EXPECT_LT(Clock::now() - begin, seconds(20));
}

TEST(AttemptsTest, WhatHangsIsOvertakenAndCalledOff) {
    std::atomic<int> calledOff{0};
    const auto begin = Clock::now();
    EXPECT_TRUE(Ask(
        [&](int number, milliseconds time, int cancel) {
            if (number < 2) {
                calledOff += Hang(time, cancel) ? 1 : 0;
                return false;
            }
            return true;
        },
        Limits(seconds(60), milliseconds(100))));
    EXPECT_EQ(calledOff, 2);
    EXPECT_GE(Clock::now() - begin, milliseconds(200));
    EXPECT_LT(Clock::now() - begin, seconds(30));
}

TEST(AttemptsTest, TheFirstMayStillAnswerWhileOthersRun) {
    std::atomic<int> begun{0};
    std::atomic<int> calledOff{0};
    EXPECT_TRUE(Ask(
        [&](int number, milliseconds time, int cancel) {
            ++begun;
            if (number == 0) {
                for (const auto end = Clock::now() + time; begun < 3 && Clock::now() < end;) {
                    std::this_thread::sleep_for(milliseconds(5));
                }
                return true;
            }
            calledOff += Hang(time, cancel) ? 1 : 0;
            return false;
        },
        Limits(seconds(60), milliseconds(100))));
    EXPECT_EQ(calledOff, 2);
}

TEST(AttemptsTest, WithoutAnAnswerItEndsWhenTheTimeIsOver) {
    std::atomic<int> begun{0};
    const auto begin = Clock::now();
    EXPECT_FALSE(Ask(
        [&](int, milliseconds time, int cancel) {
            ++begun;
            EXPECT_LE(time, milliseconds(3000));
            return Hang(time, cancel) && false;
        },
        Limits(milliseconds(3000), milliseconds(100))));
    EXPECT_EQ(begun, 3);
    EXPECT_GE(Clock::now() - begin, milliseconds(2990));
    EXPECT_LT(Clock::now() - begin, seconds(10));
}

TEST(AttemptsTest, TooLittleTimeIsNotWorthAnAttempt) {
    std::atomic<int> begun{0};
    AttemptLimits limits = Limits(milliseconds(500), milliseconds(300));
    limits.least = milliseconds(400);
    EXPECT_FALSE(Ask([&](int, milliseconds time, int cancel) { return ++begun, Hang(time, cancel) && false; }, limits));
    EXPECT_EQ(begun, 1);
}

TEST(AttemptsTest, OneAttemptStaysAlone) {
    std::atomic<int> begun{0};
    AttemptLimits limits = Limits(milliseconds(300), milliseconds(50));
    limits.attempts = 1;
    EXPECT_FALSE(Ask([&](int, milliseconds time, int cancel) { return ++begun, Hang(time, cancel) && false; }, limits));
    EXPECT_EQ(begun, 1);
}

TEST(AttemptsTest, WithoutAThreadThereIsNoAnswer) {
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        constexpr rlimit kNone{1, 1};  // root has no such limit
        constexpr uid_t kNobody = 65534;
        if ((geteuid() == 0 && setuid(kNobody) != 0) || setrlimit(RLIMIT_NPROC, &kNone) != 0) {
            _exit(2);
        }
        try {
            _exit(Ask([](int, milliseconds, int) { return true; }, Limits(seconds(3), seconds(1))) ? 1 : 0);
        } catch (...) {
            _exit(3);
        }
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), 0);
}

TEST(AttemptsTest, AnExceptionIsNoAnswer) {
    EXPECT_TRUE(Ask(
        [](int number, milliseconds, int) {
            if (number == 0) {
                throw std::runtime_error("odd");
            }
            return true;
        },
        Limits(seconds(60), seconds(30))));
}

}  // namespace
