// Locks between processes and threads.

#include "appliance/base/file_lock.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <thread>

#include "appliance/base/command.h"
#include "tests/appliance/base/temporary_folder.h"

using appliance::FileLock;
using appliance_test::Eventually;
using appliance_test::Fork;
using appliance_test::WaitFor;
using std::chrono::milliseconds;

namespace {

class FileLockTest : public appliance_test::FolderTest {
protected:
    std::string path = folder / "lock";

    // A child that takes the lock, says so with a file, and holds it until it is killed.
    pid_t Holder() {
        const pid_t child = Fork([&] {
            const auto lock = FileLock::Take(path, milliseconds(0));
            if (lock) {
                Put(folder / "held", "");
                pause();
            }
            return false;
        });
        EXPECT_TRUE(Eventually([&] { return Got(folder / "held").empty(); }));
        return child;
    }
};

TEST_F(FileLockTest, TakenAndGivenBack) {
    {
        const auto lock = FileLock::Take(path, milliseconds(0));
        ASSERT_TRUE(lock);
        EXPECT_FALSE(FileLock::Take(path, milliseconds(0)));
        EXPECT_EQ(errno, EAGAIN);
    }
    EXPECT_TRUE(FileLock::Take(path, milliseconds(0)));
    struct stat found = {};
    ASSERT_EQ(stat(path.c_str(), &found), 0);
    EXPECT_EQ(found.st_mode & 07777, 0600U);
}

TEST_F(FileLockTest, TellsWhetherItIsHeldWithoutTakingIt) {
    EXPECT_FALSE(FileLock::IsHeld(path));
    EXPECT_EQ(Got(path), "<missing>");
    {
        const auto lock = FileLock::Take(path, milliseconds(0));
        EXPECT_TRUE(FileLock::IsHeld(path));
    }
    EXPECT_FALSE(FileLock::IsHeld(path));
    const pid_t holder = Holder();
    EXPECT_TRUE(FileLock::IsHeld(path));
    kill(holder, SIGKILL);
    WaitFor(holder);
    EXPECT_FALSE(FileLock::IsHeld(path));
    EXPECT_TRUE(FileLock::Take(path, milliseconds(0)));
}

TEST_F(FileLockTest, MovesWithItsOwner) {
    auto lock = FileLock::Take(path, milliseconds(0));
    ASSERT_TRUE(lock);
    {
        const FileLock moved = std::move(*lock);
        lock.reset();
        EXPECT_FALSE(FileLock::Take(path, milliseconds(0)));
    }
    EXPECT_TRUE(FileLock::Take(path, milliseconds(0)));
}

TEST_F(FileLockTest, WaitsAsLongAsAsked) {
    const auto lock = FileLock::Take(path, milliseconds(0));
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_FALSE(FileLock::Take(path, milliseconds(300)));
    const auto took = std::chrono::steady_clock::now() - begin;
    EXPECT_GE(took, milliseconds(300));
    EXPECT_LT(took, milliseconds(20000));
}

TEST_F(FileLockTest, ComesWithinTheWait) {
    auto lock = FileLock::Take(path, milliseconds(0));
    std::thread giver([&] {
        std::this_thread::sleep_for(milliseconds(150));
        lock.reset();
    });
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_TRUE(FileLock::Take(path, milliseconds(8000)));
    EXPECT_LT(std::chrono::steady_clock::now() - begin, milliseconds(4000));
    giver.join();
}

TEST_F(FileLockTest, ShutsOutAnotherProcess) {
    const pid_t holder = Holder();
    EXPECT_FALSE(FileLock::Take(path, milliseconds(50)));
    kill(holder, SIGKILL);
    EXPECT_EQ(WaitFor(holder), 1000 + SIGKILL);
    EXPECT_TRUE(FileLock::Take(path, milliseconds(0)));
}

TEST_F(FileLockTest, GoesWhileAnotherWaitsWhenItsHolderIsKilled) {
    const pid_t holder = Holder();
    std::thread killer([&] {
        std::this_thread::sleep_for(milliseconds(100));
        kill(holder, SIGKILL);
    });
    EXPECT_TRUE(FileLock::Take(path, milliseconds(8000)));
    killer.join();
    WaitFor(holder);
}

TEST_F(FileLockTest, IsNotTheProgramsThatItsHolderRuns) {
    auto lock = FileLock::Take(path, milliseconds(0));
    ASSERT_TRUE(lock);
    const int open = ::open("/dev/null", O_RDONLY);  // reaches the program below, unlike the lock
    const pid_t program = fork();
    if (program == 0) {
        execl("/bin/sleep", "sleep", "60", static_cast<char*>(nullptr));
        _exit(1);
    }
    close(open);
    lock.reset();
    EXPECT_TRUE(FileLock::Take(path, milliseconds(0)));
    kill(program, SIGKILL);
    WaitFor(program);
}

TEST_F(FileLockTest, OneAtATimeAmongThreads) {
    std::atomic<int> inside{0};
    std::atomic<int> wrong{0};
    int plain = 0;
    std::vector<std::thread> threads;
    for (int number = 0; number < 6; ++number) {
        threads.emplace_back([&] {
            for (int turn = 0; turn < 20; ++turn) {
                const auto lock = FileLock::Take(path, std::chrono::seconds(30));
                if (!lock || ++inside != 1) {
                    ++wrong;
                }
                ++plain;
                --inside;
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(wrong, 0);
    EXPECT_EQ(plain, 120);
}

TEST_F(FileLockTest, OneAtATimeAmongProcesses) {
    Put(folder / "count", "0");
    std::vector<pid_t> children;
    for (int number = 0; number < 4; ++number) {
        children.push_back(Fork([&] {
            for (int turn = 0; turn < 25; ++turn) {
                const auto lock = FileLock::Take(path, std::chrono::seconds(30));
                if (!lock) {
                    return false;
                }
                Put(folder / "count", std::to_string(std::stoi(Got(folder / "count")) + 1));
            }
            return true;
        }));
    }
    for (const pid_t child : children) {
        EXPECT_EQ(WaitFor(child), 0);
    }
    EXPECT_EQ(Got(folder / "count"), "100");
}

TEST_F(FileLockTest, NoLockWithoutItsFile) {
    EXPECT_FALSE(FileLock::Take(folder / "none" + "/lock", std::chrono::seconds(30)));
    EXPECT_EQ(errno, ENOENT);
    ASSERT_EQ(symlink((folder / "target").c_str(), path.c_str()), 0);
    EXPECT_FALSE(FileLock::Take(path, std::chrono::seconds(30)));
    EXPECT_EQ(errno, ELOOP);
    EXPECT_EQ(Got(folder / "target"), "<missing>");
}

}  // namespace
