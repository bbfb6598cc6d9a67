#include "appliance/base/system_log.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <cstring>
#include <string>

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
    EXPECT_NE(NextLine(second).find("two"), std::string::npos);
}

TEST_F(SystemLogTest, WithoutALoggerALineIsLost) {
    EXPECT_FALSE(log.Send(LOG_INFO, "nobody hears this"));
}

}  // namespace
