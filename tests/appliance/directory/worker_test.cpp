#include "appliance/domain/directory/worker.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <new>
#include <thread>
#include <vector>

#include "tests/appliance/base/temporary_folder.h"

namespace appliance {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr Patience kLong{milliseconds(20000), milliseconds(20000)};

// What the work's failure says, and its code.
std::pair<std::string, ErrorCode> FailureOf(const Patience& patience,
                                            const std::function<Json::Value(ProgressReport&)>& work) {
    try {
        RunWorker(patience, work);
    } catch (const DirectoryError& error) {
        return {error.what(), error.code()};
    }
    return {"no failure", ErrorCode::Internal};
}

TEST(WorkerTest, AnswersWhatTheChildReturns) {
    const pid_t parent = getpid();
    const Json::Value value = RunWorker(kLong, [](ProgressReport&) {
        Json::Value result;
        result["pid"] = getpid();
        result["parent"] = getppid();
        result["group"] = getpgrp();
        result["text"] = "two\nlines";
        return result;
    });
    EXPECT_NE(value["pid"].asInt(), parent);
    EXPECT_EQ(value["parent"].asInt(), parent);
    EXPECT_EQ(value["group"].asInt(), getpgrp());
    EXPECT_EQ(value["text"].asString(), "two\nlines");
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);  // no child is left behind
}

TEST(WorkerTest, HandsOnItsFailures) {
    const auto refused = FailureOf(
        kLong, [](ProgressReport&) -> Json::Value { throw DirectoryError(ErrorCode::Refused, "dc1: \"no\"\n"); });
    EXPECT_EQ(refused.first, "dc1: \"no\"\n");
    EXPECT_EQ(refused.second, ErrorCode::Refused);
    const auto other = FailureOf(kLong, [](ProgressReport&) -> Json::Value { throw std::runtime_error("odd"); });
    EXPECT_EQ(other.first, "odd");
    EXPECT_EQ(other.second, ErrorCode::Internal);
    const auto memory = FailureOf(kLong, [](ProgressReport&) -> Json::Value { throw std::bad_alloc(); });
    EXPECT_EQ(memory.second, ErrorCode::OutOfMemory);
}

TEST(WorkerTest, TellsOfAChildThatDied) {
    const auto killed = FailureOf(kLong, [](ProgressReport&) -> Json::Value {
        kill(getpid(), SIGKILL);
        return {};
    });
    EXPECT_EQ(killed.first, "the helper process was ended by signal 9");
    const auto left = FailureOf(kLong, [](ProgressReport&) -> Json::Value { _exit(3); });
    EXPECT_EQ(left.first, "the helper process ended without an answer");
}

TEST(WorkerTest, EndsASilentChild) {
    const Clock::time_point started = Clock::now();
    const auto failure = FailureOf({milliseconds(200), milliseconds(20000)}, [](ProgressReport&) -> Json::Value {
        for (;;) {
            pause();
        }
    });
    EXPECT_EQ(failure.first, "no progress for 1 s");
    EXPECT_EQ(failure.second, ErrorCode::TimedOut);
    EXPECT_LT(Clock::now() - started, std::chrono::seconds(5));
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
}

TEST(WorkerTest, IsPatientWithProgressButNotForEver) {
    const auto slow = [](int steps) {
        return [steps](ProgressReport& report) {
            for (int step = 1; step <= steps; ++step) {
                std::this_thread::sleep_for(milliseconds(150));
                report.Tell(step);
            }
            return Json::Value("done");
        };
    };
    std::vector<std::int64_t> counts;
    const Json::Value value = RunWorker({milliseconds(2000), milliseconds(20000)}, slow(16),
                                        [&counts](std::int64_t count) { counts.push_back(count); });
    EXPECT_EQ(value.asString(), "done");
    EXPECT_EQ(counts.size(), 16u);
    EXPECT_EQ(counts.back(), 16);
    EXPECT_EQ(FailureOf({milliseconds(2000), milliseconds(1000)}, slow(1000)).first, "not done within 1 s");
}

TEST(WorkerTest, TellsOfManySmallStepsOnlyNowAndThen) {
    int told = 0;
    RunWorker(
        kLong,
        [](ProgressReport& report) {
            for (int step = 0; step < 100000; ++step) {
                report.Tell(step);
            }
            return Json::Value();
        },
        [&told](std::int64_t) { ++told; });
    EXPECT_GE(told, 1);
    EXPECT_LT(told, 100);
}

TEST(WorkerTest, TakesLongAnswers) {
    const Json::Value value = RunWorker(kLong, [](ProgressReport&) { return Json::Value(std::string(1000000, 'x')); });
    EXPECT_EQ(value.asString().size(), 1000000u);
    EXPECT_EQ(FailureOf(kLong, [](ProgressReport&) { return Json::Value(std::string(5000000, 'x')); }).first,
              "the helper process said too much");
}

// Whoever waits for the child may be killed; the child goes with it.
TEST(WorkerTest, DoesNotOutliveItsParent) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    const pid_t parent = appliance_test::Fork([&ends] {
        RunWorker(kLong, [&ends](ProgressReport&) -> Json::Value {
            const pid_t self = getpid();
            if (write(ends[1], &self, sizeof(self)) != sizeof(self)) {
                _exit(1);
            }
            for (;;) {
                pause();
            }
        });
        return true;
    });
    pid_t child = 0;
    ASSERT_EQ(read(ends[0], &child, sizeof(child)), static_cast<ssize_t>(sizeof(child)));
    kill(parent, SIGKILL);
    EXPECT_EQ(appliance_test::WaitFor(parent), 1000 + SIGKILL);
    // The pipe's last writer is gone when the child is.
    close(ends[1]);
    char byte = 0;
    EXPECT_EQ(read(ends[0], &byte, 1), 0);
    close(ends[0]);
}

}  // namespace
}  // namespace appliance
