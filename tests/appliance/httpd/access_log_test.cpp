// Lines of the access log, and where they go.

#include "appliance/httpd/access_log.h"

#include <gmock/gmock.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <cstring>

#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using appliance::AccessLine;
using appliance::AccessLog;
using appliance::FormatAccess;
using ::testing::HasSubstr;

// What a system's logger is to those who write to it.
class Logger {
public:
    explicit Logger(const std::string& path) : socket_(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::memcpy(address.sun_path, path.data(), path.size());
        unlink(path.c_str());
        bound_ =
            bind(socket_.get(), static_cast<const sockaddr*>(static_cast<const void*>(&address)), sizeof address) == 0;
    }
    std::string Next() {
        char text[1024];
        const ssize_t got = recv(socket_.get(), text, sizeof text, MSG_DONTWAIT);
        return got > 0 ? std::string(text, static_cast<std::size_t>(got)) : std::string();
    }
    bool bound_ = false;

private:
    appliance::FileDescriptor socket_;
};

const AccessLine kLine{"10.0.0.5", "GET", "/webapi", 200, 153, milliseconds(12)};

TEST(AccessLogTest, Lines) {
    EXPECT_EQ(FormatAccess(kLine), "10.0.0.5 GET /webapi 200 153 bytes 12 ms");
    EXPECT_EQ(FormatAccess({"::1", "", "", 400, 0, milliseconds(0)}), "::1 - - 400 0 bytes 0 ms");
}

TEST(AccessLogTest, NothingBehindThePath) {
    EXPECT_EQ(FormatAccess({"::1", "GET", "/?token=secret", 200, 1, milliseconds(0)}), "::1 GET / 200 1 bytes 0 ms");
    EXPECT_EQ(FormatAccess({"::1", "GET", "/#/link/secret", 404, 1, milliseconds(0)}), "::1 GET / 404 1 bytes 0 ms");
}

TEST(AccessLogTest, OddBytesAreShown) {
    EXPECT_EQ(FormatAccess({"::1", "GET", "/a b\\\"\x1B[31m\xC3\xA4\n", 404, 1, milliseconds(0)}),
              "::1 GET /a\\x20b\\x5C\\x22\\x1B[31m\\xC3\\xA4\\x0A 404 1 bytes 0 ms");
}

TEST(AccessLogTest, LongPathsAreCut) {
    const std::string line = FormatAccess({"::1", "GET", "/" + std::string(5000, 'x'), 404, 1, milliseconds(0)});
    EXPECT_EQ(line, "::1 GET /" + std::string(199, 'x') + "... 404 1 bytes 0 ms");
    EXPECT_LT(FormatAccess({"::1", std::string(5000, 'X'), "/", 405, 1, milliseconds(0)}).size(), 100u);
}

TEST(AccessLogTest, ToTheSystemsLogger) {
    const Folder folder;
    AccessLog log(false, folder.At("log"));
    log.Write(kLine);
    EXPECT_EQ(log.lost(), 1u) << "there is no logger yet";
    Logger first(folder.At("log"));
    ASSERT_TRUE(first.bound_);
    usleep(1100000);
    log.Write(kLine);
    EXPECT_THAT(first.Next(), ::testing::EndsWith("]: lines lost before this one: 1"));
    EXPECT_THAT(first.Next(), ::testing::MatchesRegex("<30>[A-Z][a-z]{2} [ 0-9]{2} [0-9:]{8} vorn-httpd\\[[0-9]+\\]: "
                                                      "10.0.0.5 GET /webapi 200 153 bytes 12 ms"));
}

TEST(AccessLogTest, ALoggerThatIsStartedAnew) {
    const Folder folder;
    auto logger = std::make_unique<Logger>(folder.At("log"));
    AccessLog log(false, folder.At("log"));
    log.Write(kLine);
    EXPECT_NE(logger->Next(), "");
    logger.reset();
    usleep(1100000);
    logger = std::make_unique<Logger>(folder.At("log"));
    log.Write(kLine);
    EXPECT_NE(logger->Next(), "");
    EXPECT_EQ(log.lost(), 0u);
}

TEST(AccessLogTest, ABusyLoggerHoldsUpNothing) {
    const Folder folder;
    Logger logger(folder.At("log"));
    AccessLog log(false, folder.At("log"));
    const auto begin = std::chrono::steady_clock::now();
    for (int count = 0; count < 5000; ++count) {
        log.Write(kLine);
    }
    EXPECT_LT(std::chrono::steady_clock::now() - begin, milliseconds(30000));
    EXPECT_GT(log.lost(), 0u);
}

}  // namespace
}  // namespace httpd_test
