// The lock on the settings, between threads and processes.

#include <signal.h>
#include <unistd.h>

#include <algorithm>

#include "machine_test.h"

using contract::kLock;
using contract::kUnlock;
using std::chrono::milliseconds;

namespace {

class Locks : public testing::Test {
protected:
    // What a thread of its own gets; the lock is given back at once.
    static int LockInAThread(int seconds) {
        int result = -2;
        std::thread([&] {
            result = VLIBCFileLock(kLock, seconds);
            if (result == 0) {
                VLIBCFileUnlock(kUnlock);
            }
        }).join();
        return result;
    }
    // Whether a process of its own gets it. Only while this one does not hold it: a child begins as a copy of its parent.
    static bool ProcessGets(int seconds) {
        return contract::Await(contract::Fork([=] { return VLIBCFileLock(kLock, seconds) == 0; })) == 0;
    }
    // A process that has the lock and keeps it for so long.
    pid_t Holder(milliseconds time) {
        const pid_t child = contract::Fork([&] {
            if (VLIBCFileLock(kLock, 5) != 0) {
                return false;
            }
            contract::WriteFile(folder / "held", "");
            std::this_thread::sleep_for(time);
            return VLIBCFileUnlock(kUnlock) >= 0;
        });
        EXPECT_TRUE(contract::Eventually([&] { return contract::ReadFile(folder / "held").empty(); }));
        return child;
    }
    template <typename Call>
    static milliseconds TimeOf(Call call) {
        const auto begin = std::chrono::steady_clock::now();
        call();
        return std::chrono::duration_cast<milliseconds>(std::chrono::steady_clock::now() - begin);
    }

    contract::Folder folder;
};

TEST_F(Locks, AreTakenAndGivenBack) {
    for (int round = 0; round < 3; ++round) {
        ASSERT_EQ(SUCCEEDING(VLIBCFileLock(kLock, 5)), 0);
        ASSERT_GE(SUCCEEDING(VLIBCFileUnlock(kUnlock)), 0);
    }
    EXPECT_TRUE(ProcessGets(0));
}

TEST_F(Locks, ShutOutOtherProcesses) {
    const pid_t holder = Holder(milliseconds(3000));
    EXPECT_NE(FAILING(VLIBCFileLock(kLock, 0)), 0);
    EXPECT_FALSE(ProcessGets(0));
    EXPECT_EQ(contract::Await(holder), 0);
    EXPECT_TRUE(ProcessGets(0));
}

TEST_F(Locks, ShutOutOtherThreads) {
    ASSERT_EQ(VLIBCFileLock(kLock, 5), 0);
    EXPECT_NE(LockInAThread(0), 0);
    ASSERT_GE(VLIBCFileUnlock(kUnlock), 0);
    EXPECT_EQ(LockInAThread(0), 0);
}

TEST_F(Locks, TheLowestByteDoesNotCountWhenGivenBack) {
    ASSERT_EQ(VLIBCFileLock(kLock, 5), 0);
    ASSERT_GE(VLIBCFileUnlock(kLock), 0);
    EXPECT_TRUE(ProcessGets(0));
}

TEST_F(Locks, WaitAsLongAsTheyWereAskedTo) {
    const pid_t holder = Holder(milliseconds(60000));
    int result = 0;
    milliseconds none{60000};
    for (int attempt = 0; attempt < 3; ++attempt) {
        none = std::min(none, TimeOf([&] { result = FAILING(VLIBCFileLock(kLock, 0)); }));
        EXPECT_NE(result, 0);
    }
    EXPECT_LT(none, milliseconds(900));
    const milliseconds second = TimeOf([&] { result = FAILING(VLIBCFileLock(kLock, 1)); });
    EXPECT_NE(result, 0);
    EXPECT_GE(second, milliseconds(900));
    EXPECT_LT(second, milliseconds(4000));
    kill(holder, SIGKILL);
    EXPECT_EQ(contract::Await(holder), 1000 + SIGKILL);
}

TEST_F(Locks, WaitNoLongerThanTheyHaveTo) {
    const pid_t holder = Holder(milliseconds(3000));
    int result = -2;
    EXPECT_LT(TimeOf([&] { result = VLIBCFileLock(kLock, 30); }), milliseconds(10000));
    EXPECT_EQ(result, 0);
    EXPECT_GE(VLIBCFileUnlock(kUnlock), 0);
    EXPECT_EQ(contract::Await(holder), 0);
}

TEST_F(Locks, EndWithTheirHolder) {
    const pid_t holder = Holder(milliseconds(60000));
    EXPECT_FALSE(ProcessGets(0));
    kill(holder, SIGKILL);
    EXPECT_EQ(contract::Await(holder), 1000 + SIGKILL);
    EXPECT_EQ(VLIBCFileLock(kLock, 5), 0);
    EXPECT_GE(VLIBCFileUnlock(kUnlock), 0);
}

TEST_F(Locks, KeepOneWriterAtATime) {
    constexpr int kWriters = 4;
    constexpr int kRounds = 25;
    const std::string path = folder.Put("count", "0");
    std::vector<pid_t> writers;
    for (int writer = 0; writer < kWriters; ++writer) {
        writers.push_back(contract::Fork([&] {
            for (int round = 0; round < kRounds; ++round) {
                if (VLIBCFileLock(kLock, 20) != 0) {
                    return false;
                }
                const int count = std::stoi(contract::ReadFile(path));
                std::this_thread::sleep_for(milliseconds(1));
                contract::WriteFile(path, std::to_string(count + 1));
                VLIBCFileUnlock(kUnlock);
            }
            return true;
        }));
    }
    for (const pid_t writer : writers) {
        EXPECT_EQ(contract::Await(writer, std::chrono::seconds(60)), 0);
    }
    EXPECT_EQ(contract::ReadFile(path), std::to_string(kWriters * kRounds));
}

// The module removes a key of the settings while it holds their lock.
TEST_F(Locks, LetTheirHolderRemoveASetting) {
    const contract::KeptFile kept(contract::kSettings);
    contract::WriteFile(contract::kSettings, contract::ReadFile(contract::kSettings) + "\ndomain_dns=192.0.2.1\n");
    char value[64] = {};
    ASSERT_GT(VLIBCFileGetKeyValue(contract::kSettings, "domain_dns", value, sizeof value, 0), 0);
    ASSERT_EQ(VLIBCFileLock(kLock, 5), 0);
    int result = -2;
    EXPECT_LT(TimeOf([&] { result = VLIBCFileRemoveKey(contract::kSettings, "domain_dns"); }), milliseconds(3000));
    EXPECT_GE(result, 0);
    EXPECT_NE(LockInAThread(0), 0) << "it is still held";
    EXPECT_GE(VLIBCFileUnlock(kUnlock), 0);
    EXPECT_LE(VLIBCFileGetKeyValue(contract::kSettings, "domain_dns", value, sizeof value, 0), 0);
}

}  // namespace
