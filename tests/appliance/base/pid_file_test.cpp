// Pid files: which are believed.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cmath>
#include <csignal>
#include <ctime>
#include <filesystem>
#include <thread>

#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "tests/appliance/base/temporary_folder.h"

using appliance::ProcessStart;
using appliance::ReadPidFile;
using appliance::WritePidFile;
using appliance_test::Fork;
using appliance_test::WaitFor;

namespace {

class PidFileTest : public appliance_test::FolderTest {
protected:
    std::string path = folder / "file.pid";
    std::string own = std::to_string(getpid());

    int Answer(const std::string& content) {
        Put(path, content);
        return ReadPidFile(path);
    }
};

TEST_F(PidFileTest, Processes) {
    EXPECT_TRUE(ProcessStart(1));
    EXPECT_TRUE(ProcessStart(getpid()));
    EXPECT_FALSE(ProcessStart(0));
    EXPECT_FALSE(ProcessStart(-1));
    EXPECT_FALSE(ProcessStart(4194304));
    const pid_t ended = Fork([] { return true; });
    siginfo_t how = {};
    ASSERT_EQ(waitid(P_PID, static_cast<id_t>(ended), &how, WEXITED | WNOWAIT), 0);
    EXPECT_FALSE(ProcessStart(ended));  // only waits to be collected
    EXPECT_EQ(WaitFor(ended), 0);
    EXPECT_FALSE(ProcessStart(ended));
}

TEST_F(PidFileTest, StartOfAProcess) {
    const auto now = [] {
        timespec time = {};
        clock_gettime(CLOCK_REALTIME, &time);
        return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / 1e9;
    };
    const double before = now();
    const pid_t child = Fork([] {
        pause();
        return true;
    });
    const double after = now();
    const auto start = appliance::ProcessStartTime(child);
    ASSERT_TRUE(start);
    EXPECT_GE(*start, before - 0.05);
    EXPECT_LE(*start, after + 0.05);
    EXPECT_GE(*ProcessStart(child), *ProcessStart(getpid()));
    kill(child, SIGKILL);
    WaitFor(child);
    EXPECT_FALSE(appliance::ProcessStartTime(child));
}

TEST_F(PidFileTest, ProgramsMayBeNamedAnyhow) {
    std::filesystem::copy_file("/bin/sleep", folder / "a) R 1 (");
    const pid_t child = fork();
    if (child == 0) {
        execl((folder / "a) R 1 (").c_str(), "x", "60", static_cast<char*>(nullptr));
        _exit(1);
    }
    EXPECT_TRUE(appliance_test::Eventually([&] {
        return std::filesystem::read_symlink("/proc/" + std::to_string(child) + "/exe").filename() == "a) R 1 (";
    }));
    const auto start = ProcessStart(child);
    ASSERT_TRUE(start);
    EXPECT_GE(*start, *ProcessStart(getpid()));
    kill(child, SIGKILL);
    WaitFor(child);
}

TEST_F(PidFileTest, OfALiveProcess) {
    EXPECT_EQ(Answer(own + "\n"), getpid());
    EXPECT_EQ(Answer(own), getpid());
    EXPECT_EQ(Answer(" " + own + " \r\n"), getpid());
}

TEST_F(PidFileTest, BadContent) {
    EXPECT_EQ(ReadPidFile(path), -1);
    for (const std::string& content :
         {std::string(), std::string("\n"), std::string("garbage"), std::string("0"), std::string("-1"), "-" + own,
          "+" + own, own + "x", own + " 1", own + "\n1\n", "0x" + own, own + ".0", std::string("99999999999999999999"),
          std::string("2147483648"), own + std::string(1, '\0'), own + std::string(100, ' ')}) {
        EXPECT_EQ(Answer(content), -1) << testing::PrintToString(content);
    }
}

TEST_F(PidFileTest, OfAProcessThatEnded) {
    const pid_t ended = Fork([] { return true; });
    WaitFor(ended);
    EXPECT_EQ(Answer(std::to_string(ended)), -1);
}

TEST_F(PidFileTest, OfAProcessThatBeganLater) {
    ASSERT_EQ(Answer(own), getpid());
    const auto start = appliance::ProcessStartTime(getpid());
    ASSERT_TRUE(start);
    const auto dated = [&](double seconds) {
        const double whole = std::floor(seconds);
        const timespec when = {static_cast<time_t>(whole), static_cast<long>((seconds - whole) * 1e9)};
        const timespec times[2] = {when, when};
        EXPECT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
        return ReadPidFile(path);
    };
    EXPECT_EQ(dated(*start + 1), getpid());
    EXPECT_EQ(dated(*start), getpid());
    EXPECT_EQ(dated(*start - 0.2), -1);
    EXPECT_EQ(dated(*start - 3600), -1);
}

TEST_F(PidFileTest, WrittenRightAfterTheStart) {
    for (int turn = 0; turn < 50; ++turn) {
        const pid_t child = Fork([&] {
            Put(path, std::to_string(getpid()));
            return ReadPidFile(path) == getpid();
        });
        ASSERT_EQ(WaitFor(child), 0);
    }
}

TEST_F(PidFileTest, OfAThreadThatIsNoProcess) {
    std::atomic<int> thread{0};
    std::atomic<bool> over{false};
    std::thread other([&] {
        thread = static_cast<int>(syscall(SYS_gettid));
        while (!over) {
            std::this_thread::yield();
        }
    });
    while (thread == 0) {
        std::this_thread::yield();
    }
    EXPECT_EQ(Answer(std::to_string(thread)), -1);
    over = true;
    other.join();
}

TEST_F(PidFileTest, OnlyARegularFileOfRoots) {
    Put(folder / "real", own);
    ASSERT_EQ(symlink("real", path.c_str()), 0);
    EXPECT_EQ(ReadPidFile(path), -1);
    EXPECT_EQ(ReadPidFile(folder / "real"), getpid());
    ASSERT_EQ(chown((folder / "real").c_str(), 1, 0), 0);
    EXPECT_EQ(ReadPidFile(folder / "real"), -1);
    ASSERT_EQ(mkfifo((folder / "fifo").c_str(), 0600), 0);
    EXPECT_EQ(ReadPidFile(folder / "fifo"), -1);
    const int fifo = open((folder / "fifo").c_str(), O_RDWR | O_CLOEXEC);
    EXPECT_EQ(write(fifo, own.data(), own.size()), static_cast<ssize_t>(own.size()));
    EXPECT_EQ(ReadPidFile(folder / "fifo"), -1);
    close(fifo);
    EXPECT_EQ(ReadPidFile(folder.path()), -1);
    EXPECT_EQ(ReadPidFile("/dev/zero"), -1);
}

TEST_F(PidFileTest, AFolderMayBeASymbolicLink) {
    ASSERT_EQ(symlink(folder.path().c_str(), (folder / "link").c_str()), 0);
    Put(path, own);
    EXPECT_EQ(ReadPidFile(folder / "link/file.pid"), getpid());
}

TEST_F(PidFileTest, Written) {
    const mode_t before = umask(077);
    EXPECT_TRUE(WritePidFile(path));
    umask(before);
    EXPECT_EQ(Got(path), own + "\n");
    struct stat found = {};
    ASSERT_EQ(lstat(path.c_str(), &found), 0);
    EXPECT_EQ(found.st_mode & 07777, 0644U);
    EXPECT_EQ(ReadPidFile(path), getpid());
    EXPECT_THAT(folder.Names(), testing::ElementsAre("file.pid", "run"));
}

TEST_F(PidFileTest, NotWrittenOverALiveOne) {
    Put(path, "1");
    EXPECT_FALSE(WritePidFile(path));
    EXPECT_EQ(Got(path), "1");
    EXPECT_THAT(folder.Names(), testing::ElementsAre("file.pid", "run"));
}

TEST_F(PidFileTest, WrittenOverWhatIsNoneAnyMore) {
    Put(folder / "foreign", "text");
    for (const char* content : {"", "0", "garbage", "4194304"}) {
        Put(path, content);
        EXPECT_TRUE(WritePidFile(path)) << content;
        EXPECT_EQ(ReadPidFile(path), getpid());
        ASSERT_EQ(unlink(path.c_str()), 0);
    }
    ASSERT_EQ(symlink("foreign", path.c_str()), 0);
    EXPECT_TRUE(WritePidFile(path));
    EXPECT_EQ(ReadPidFile(path), getpid());
    EXPECT_EQ(Got(folder / "foreign"), "text");
    ASSERT_EQ(unlink(path.c_str()), 0);
    std::filesystem::create_directory(path);
    EXPECT_FALSE(WritePidFile(path));
    EXPECT_THAT(folder.Names(), testing::ElementsAre("file.pid", "foreign", "run"));
    EXPECT_FALSE(WritePidFile(folder / "none/file.pid"));
}

// In /tmp everybody may make a folder of this name.
TEST_F(PidFileTest, WrittenWhereAnotherUserHasMadeAFolder) {
    const auto put = [this] {
        std::filesystem::create_directories(path + "/full");
        ASSERT_EQ(chown(path.c_str(), 1, 1), 0);
    };
    put();
    EXPECT_FALSE(WritePidFile(path));
    ASSERT_EQ(chmod(appliance::FolderOf(path).c_str(), 01777), 0);
    EXPECT_TRUE(WritePidFile(path));
    EXPECT_EQ(ReadPidFile(path), getpid());
    std::size_t aside = 0;
    for (const std::string& name : folder.Names()) {
        aside += name.find("file.pid.foreign-") == 0 ? 1U : 0U;
    }
    EXPECT_EQ(aside, 1U);
}

TEST_F(PidFileTest, OneOfManyWriters) {
    for (int turn = 0; turn < 10; ++turn) {
        Put(path, "4194304");
        std::vector<pid_t> writers;
        for (int number = 0; number < 6; ++number) {
            writers.push_back(Fork([&] {
                if (!WritePidFile(path)) {
                    return false;
                }
                Put(folder / std::to_string(getpid()) + ".won", "");
                pause();
                return true;
            }));
        }
        int lost = 0;
        int winner = 0;
        ASSERT_TRUE(appliance_test::Eventually([&] {
            for (pid_t& writer : writers) {
                if (writer > 0 && waitpid(writer, nullptr, WNOHANG) == writer) {
                    writer = 0;
                    ++lost;
                }
            }
            return lost == 5;
        }));
        winner = ReadPidFile(path);
        EXPECT_TRUE(appliance_test::Eventually([&] { return Got(folder / std::to_string(winner) + ".won").empty(); }));
        for (const pid_t writer : writers) {
            if (writer > 0) {
                EXPECT_EQ(writer, winner);
                kill(writer, SIGKILL);
                WaitFor(writer);
            }
        }
    }
}

}  // namespace
