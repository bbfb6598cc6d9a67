// What a server says to whoever starts it by hand.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <poll.h>
#include <stdlib.h>
#include <unistd.h>

#include <array>
#include <fstream>
#include <sstream>
#include <stdexcept>

#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

using ::testing::HasSubstr;

constexpr const char* kServes = " APIs of 1 modules on ";
constexpr const char* kLine = "module.cpp:17 something is wrong";

// A terminal, seen from the side of the one who sits in front of it.
class Terminal {
public:
    Terminal() : side_(posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC)) {
        std::array<char, 64> name{};
        if (!side_ || grantpt(side_.get()) != 0 || unlockpt(side_.get()) != 0 ||
            ptsname_r(side_.get(), name.data(), name.size()) != 0) {
            throw std::runtime_error("no terminal");
        }
        file_ = name.data();
    }
    const std::string& file() const {
        return file_;
    }
    // Until `text` is to be read there; false when it does not come.
    bool Shows(const std::string& text, milliseconds wait = milliseconds(10000)) {
        return Eventually(
            [&] {
                pollfd waiting{side_.get(), POLLIN, 0};
                std::array<char, 4096> bytes{};
                if (poll(&waiting, 1, 0) > 0) {
                    const ssize_t got = read(side_.get(), bytes.data(), bytes.size());
                    shown_.append(bytes.data(), got > 0 ? static_cast<std::size_t>(got) : 0);
                }
                return shown_.find(text) != std::string::npos;
            },
            wait);
    }
    const std::string& shown() const {
        return shown_;
    }

private:
    appliance::FileDescriptor side_;
    std::string file_;
    std::string shown_;
};

TEST(TerminalTest, ShowsTheLogOfTheServerAndOfItsModules) {
    Tree tree;
    Terminal terminal;
    Server server(tree, {}, true, {false, terminal.file()});
    EXPECT_TRUE(terminal.Shows(kServes + tree.Socket())) << terminal.shown();
    ASSERT_EQ(server.Call("log", Object({{"line", kLine}})).status, 200);
    EXPECT_TRUE(terminal.Shows("vornd[" + std::to_string(server.pid()) + "]: " + kLine)) << terminal.shown();
}

TEST(TerminalTest, AFileGetsTheLogOnlyWhenAskedTo) {
    for (const bool foreground : {false, true}) {
        Tree tree;
        Server server(tree, {}, true, {foreground, {}});
        ASSERT_EQ(server.Call("log", Object({{"line", kLine}})).status, 200);
        if (foreground) {
            EXPECT_THAT(server.Errors(), HasSubstr(kServes));
            EXPECT_THAT(server.Errors(), HasSubstr(kLine));
        } else {
            EXPECT_EQ(server.Errors(), "");
        }
    }
}

}  // namespace
}  // namespace vornd_test
