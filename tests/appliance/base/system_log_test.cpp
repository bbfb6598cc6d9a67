#include "appliance/base/system_log.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <chrono>
#include <cstring>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "appliance/base/file.h"
#include "tests/appliance/base/temporary_folder.h"

namespace {

using appliance::FileDescriptor;
using appliance::SystemLog;

// A logger that reads only when it is told to.
FileDescriptor Logger(const std::string& path) {
    unlink(path.c_str());
    FileDescriptor made(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
    EXPECT_EQ(bind(made.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    return made;
}

std::string NextLine(const FileDescriptor& logger) {
    std::array<char, 1024> line{};
    const ssize_t got = recv(logger.get(), line.data(), line.size(), MSG_DONTWAIT);
    return got < 0 ? "" : std::string(line.data(), static_cast<std::size_t>(got));
}

class SystemLogTest : public testing::Test {
protected:
    const appliance_test::TemporaryFolder folder;
    const std::string path = folder.path() + "/log";
    SystemLog log{"nas", LOG_DAEMON, path};
};

TEST_F(SystemLogTest, ALineHasPriorityTimeNameAndProcess) {
    const FileDescriptor logger = Logger(path);
    EXPECT_TRUE(log.Send(LOG_ERR, "something is wrong"));
    const std::string line = NextLine(logger);
    EXPECT_EQ(line.rfind("<" + std::to_string(LOG_DAEMON | LOG_ERR) + ">", 0), 0U) << line;
    const std::string end = " nas[" + std::to_string(getpid()) + "]: something is wrong";
    ASSERT_GT(line.size(), end.size());
    EXPECT_EQ(line.substr(line.size() - end.size()), end);
}

TEST_F(SystemLogTest, ALoggerThatHangsLosesLinesAndKeepsNobodyWaiting) {
    const FileDescriptor logger = Logger(path);
    const auto begin = std::chrono::steady_clock::now();
    int taken = 0;
    for (int i = 0; i < 5000; ++i) {
        taken += log.Send(LOG_INFO, std::string(200, 'x')) ? 1 : 0;
    }
    EXPECT_GT(taken, 0);
    EXPECT_LT(taken, 5000);
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(10));
    while (!NextLine(logger).empty()) {
    }
    EXPECT_TRUE(log.Send(LOG_INFO, "reads again"));
    const std::string told = "lines lost before this one: " + std::to_string(5000 - taken);
    EXPECT_NE(NextLine(logger).find(told), std::string::npos);
    EXPECT_NE(NextLine(logger).find("reads again"), std::string::npos);
    EXPECT_TRUE(log.Send(LOG_INFO, "goes on"));
    EXPECT_NE(NextLine(logger).find("goes on"), std::string::npos) << "what is lost is told once";
}

TEST_F(SystemLogTest, ALoggerThatIsSlowGetsEveryLineFromThePatient) {
    const FileDescriptor logger = Logger(path);
    constexpr int kLines = 400;
    std::vector<std::string> read;
    std::thread reader([&logger, &read] {
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(30);
        while (read.size() < kLines && std::chrono::steady_clock::now() < end) {
            const std::string line = NextLine(logger);
            if (line.empty()) {
                std::this_thread::sleep_for(std::chrono::milliseconds(1));
            } else {
                read.push_back(line.substr(line.rfind(' ') + 1));
            }
        }
    });
    std::vector<std::string> sent;
    for (int i = 0; i < kLines; ++i) {
        sent.push_back(std::to_string(i));
        EXPECT_TRUE(log.Send(LOG_INFO, sent.back(), std::chrono::seconds(30)));
    }
    reader.join();
    EXPECT_EQ(read, sent);
}

TEST_F(SystemLogTest, ALoggerThatHangsIsWaitedForOnce) {
    const FileDescriptor logger = Logger(path);
    const auto begin = std::chrono::steady_clock::now();
    int taken = 0;
    for (int i = 0; i < 5000; ++i) {
        taken += log.Send(LOG_INFO, "x", std::chrono::milliseconds(500)) ? 1 : 0;
    }
    const auto took = std::chrono::steady_clock::now() - begin;
    EXPECT_LT(taken, 5000);
    EXPECT_GE(took, std::chrono::milliseconds(500));
    EXPECT_LT(took, std::chrono::seconds(5));
}

TEST_F(SystemLogTest, WhoeverWaitsHoldsUpNobodyElse) {
    const FileDescriptor logger = Logger(path);
    while (log.Send(LOG_INFO, "x")) {
    }
    std::atomic<bool> waiting{true};
    std::thread waiter([this, &waiting] {
        EXPECT_TRUE(log.Send(LOG_INFO, "x", std::chrono::seconds(60)));
        waiting = false;
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_FALSE(log.Send(LOG_INFO, "x"));
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(20));
    EXPECT_TRUE(waiting);
    while (!NextLine(logger).empty()) {
    }
    waiter.join();
}

TEST_F(SystemLogTest, ALoggerThatEndsIsNotWaitedFor) {
    std::optional<FileDescriptor> logger(Logger(path));
    while (log.Send(LOG_INFO, "x")) {
    }
    std::thread end([&logger] {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        logger.reset();
    });
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_FALSE(log.Send(LOG_INFO, "x", std::chrono::seconds(60)));
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(30));
    end.join();
}

TEST_F(SystemLogTest, ANewLoggerBehindTheSameNameIsFound) {
    {
        const FileDescriptor first = Logger(path);
        ASSERT_TRUE(log.Send(LOG_INFO, "one"));
    }
    const FileDescriptor second = Logger(path);
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(10);
    while (!log.Send(LOG_INFO, "two") && std::chrono::steady_clock::now() < end) {
        usleep(50000);
    }
    std::string line;
    do {
        line = NextLine(second);
        ASSERT_NE(line, "");
    } while (line.find(" lost ") != std::string::npos);
    EXPECT_NE(line.find("two"), std::string::npos);
}

TEST_F(SystemLogTest, WithoutALoggerALineIsLost) {
    EXPECT_FALSE(log.Send(LOG_INFO, "nobody hears this"));
}

}  // namespace
