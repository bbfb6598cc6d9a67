// The lock on the settings file, by its words.

#include <atomic>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <thread>

#include "appliance/base/paths.h"
#include "appliance/base/settings.h"
#include "tests/appliance/core/core_test.h"

using appliance_test::Eventually;
using appliance_test::Fork;
using appliance_test::WaitFor;

namespace {

constexpr int kLock = 0x806;
constexpr int kUnlock = 0x800;

class LocksTest : public appliance_test::CoreTest {
protected:
    LocksTest() {
        std::filesystem::create_directory(folder / "etc");
    }
    std::string path = appliance::Path(appliance::kSettings);

    // What a thread of its own gets.
    static int LockElsewhere(int seconds = 0) {
        int result = -2;
        std::thread([&] {
            result = VLIBCFileLock(kLock, seconds);
            if (result == 0) {
                VLIBCFileUnlock(kUnlock);
            }
        }).join();
        return result;
    }
    // A process that holds the lock until it is killed.
    pid_t Holder() {
        const pid_t child = Fork([&] {
            if (VLIBCFileLock(kLock, 0) == 0) {
                Put(folder / "held", "");
                pause();
            }
            return false;
        });
        EXPECT_TRUE(Eventually([&] { return Got(folder / "held").empty(); }));
        return child;
    }
};

TEST_F(LocksTest, TakenAndGivenBack) {
    EXPECT_SUCCEEDS(VLIBCFileLock(kLock, 5), 0);
    EXPECT_EQ(LockElsewhere(), 1);
    EXPECT_SUCCEEDS(VLIBCFileUnlock(kUnlock), 0);
    EXPECT_EQ(LockElsewhere(), 0);
}

TEST_F(LocksTest, TheLowestByteDoesNotCountWhenGivenBack) {
    ASSERT_EQ(VLIBCFileLock(kLock, 0), 0);
    EXPECT_EQ(VLIBCFileUnlock(kLock), 0);
    EXPECT_EQ(LockElsewhere(), 0);
}

TEST_F(LocksTest, HeldByAnother) {
    const pid_t holder = Holder();
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_FAILS(VLIBCFileLock(kLock, 1), 1, FileLock);
    const auto took = std::chrono::steady_clock::now() - begin;
    EXPECT_GE(took, std::chrono::seconds(1));
    EXPECT_LT(took, std::chrono::seconds(5));
    EXPECT_FAILS(VLIBCFileUnlock(kUnlock), -1, BadArgument);
    kill(holder, SIGKILL);
    EXPECT_EQ(WaitFor(holder), 1000 + SIGKILL);
    EXPECT_EQ(VLIBCFileLock(kLock, 0), 0);
    EXPECT_EQ(VLIBCFileUnlock(kUnlock), 0);
}

TEST_F(LocksTest, AThreadsOwn) {
    ASSERT_EQ(VLIBCFileLock(kLock, 0), 0);
    std::thread([] { EXPECT_FAILS(VLIBCFileUnlock(kUnlock), -1, BadArgument); }).join();
    EXPECT_EQ(LockElsewhere(), 1);
    EXPECT_EQ(VLIBCFileUnlock(kUnlock), 0);
    EXPECT_FAILS(VLIBCFileUnlock(kUnlock), -1, BadArgument);
}

TEST_F(LocksTest, RemovingAKeyUnderItDoesNotDeadlock) {
    Put(path, "a=1\ndomain_dns=10.0.0.1\nb=2\n");
    ASSERT_EQ(VLIBCFileLock(kLock, 5), 0);
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_SUCCEEDS(VLIBCFileRemoveKey(path.c_str(), "domain_dns"), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(3));
    EXPECT_EQ(LockElsewhere(), 1);
    EXPECT_EQ(VLIBCFileUnlock(kUnlock), 0);
    EXPECT_EQ(Got(path), "a=1\nb=2\n");
    EXPECT_EQ(LockElsewhere(), 0);
}

TEST_F(LocksTest, EveryWriterOfTheFileTakesIt) {
    Put(path, "a=1\n");
    const std::string fresh = folder / "etc/fresh";
    Put(fresh, "b=2\n");
    const pid_t holder = Holder();
    std::thread remover([&] { EXPECT_FAILS(VLIBCFileRemoveKey(path.c_str(), "a"), -1, FileLock); });
    std::thread renamer([&] { EXPECT_FAILS(VLIBCSysRename(fresh.c_str(), path.c_str()), -1, FileLock); });
    std::thread setter([&] { EXPECT_EQ(appliance::SetSetting("c", "3"), std::errc::timed_out); });
    appliance_test::Hash hash{{"d", "4"}};
    EXPECT_FAILS(VLIBCFileAddSection(path.c_str(), "global", hash.get(), "%s=%s\n"), 0, FileLock);
    remover.join();
    renamer.join();
    setter.join();
    EXPECT_EQ(Got(path), "a=1\n");
    kill(holder, SIGKILL);
    WaitFor(holder);
    EXPECT_EQ(VLIBCFileRemoveKey(path.c_str(), "a"), 0);
    EXPECT_EQ(Got(path), "");
}

TEST_F(LocksTest, OtherWordsAreRefused) {
    for (const int word : {0, 0x06, 0x800, 0x801, 0x805, 0x807, 0x906, 0x706, 0x10806, -1}) {
        EXPECT_FAILS(VLIBCFileLock(word, 0), -1, BadArgument);
    }
    EXPECT_FAILS(VLIBCFileLock(kLock, -1), -1, BadArgument);
    ASSERT_EQ(VLIBCFileLock(kLock, 0), 0);
    for (const int word : {0, 0x06, 0x900, 0x10800}) {
        EXPECT_FAILS(VLIBCFileUnlock(word), -1, BadArgument);
    }
    EXPECT_EQ(VLIBCFileUnlock(kUnlock), 0);
}

TEST_F(LocksTest, NoPlaceForTheLock) {
    std::filesystem::remove(folder / "etc");
    EXPECT_FAILS(VLIBCFileLock(kLock, 5), -1, FileLock);
}

TEST_F(LocksTest, OneAtATimeAmongProcessesAndThreads) {
    Put(folder / "count", "0");
    std::vector<pid_t> children;
    for (int number = 0; number < 3; ++number) {
        children.push_back(Fork([&] {
            std::atomic<int> failed{0};
            std::vector<std::thread> threads;
            for (int thread = 0; thread < 3; ++thread) {
                threads.emplace_back([&] {
                    for (int turn = 0; turn < 10; ++turn) {
                        if (VLIBCFileLock(kLock, 30) != 0) {
                            ++failed;
                            return;
                        }
                        Put(folder / "count", std::to_string(std::stoi(Got(folder / "count")) + 1));
                        failed += VLIBCFileUnlock(kUnlock) == 0 ? 0 : 1;
                    }
                });
            }
            for (std::thread& thread : threads) {
                thread.join();
            }
            return failed == 0;
        }));
    }
    for (const pid_t child : children) {
        EXPECT_EQ(WaitFor(child), 0);
    }
    EXPECT_EQ(Got(folder / "count"), "90");
}

}  // namespace
