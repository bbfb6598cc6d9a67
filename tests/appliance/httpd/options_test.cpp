// The command line, and addresses.

#include "appliance/httpd/options.h"

#include <arpa/inet.h>
#include <gmock/gmock.h>

#include <cstring>

#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using appliance::DoorOptions;
using appliance::ParseListenAddress;
using ::testing::HasSubstr;

struct Parsed {
    bool right = false;
    DoorOptions options;
    std::string reason;
};

Parsed Parse(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), "vorn-httpd");
    std::vector<char*> argv;
    for (std::string& argument : arguments) {
        argv.push_back(argument.data());
    }
    argv.push_back(nullptr);
    Parsed parsed;
    parsed.right =
        appliance::ParseDoorOptions(static_cast<int>(arguments.size()), argv.data(), parsed.options, parsed.reason);
    return parsed;
}

TEST(OptionsTest, WhatGoesWithoutSaying) {
    const Parsed parsed = Parse({});
    ASSERT_TRUE(parsed.right) << parsed.reason;
    ASSERT_EQ(parsed.options.addresses.size(), 2u);
    EXPECT_EQ(parsed.options.addresses[0].text, "127.0.0.1:8443");
    EXPECT_EQ(parsed.options.addresses[1].text, "[::1]:8443");
    EXPECT_FALSE(parsed.options.hasOwnAddresses);
    EXPECT_FALSE(parsed.options.clearText);
    EXPECT_EQ(parsed.options.vornd, "/run/vorn/vornd.sock");
    EXPECT_EQ(parsed.options.page, "/usr/vorn/share/console");
    EXPECT_EQ(parsed.options.state, "/var/lib/vorn-httpd");
}

TEST(OptionsTest, AllOfThem) {
    const Parsed parsed = Parse({"--listen", "0.0.0.0:443", "--listen=[::]:443", "--certificate", "c", "--key", "k",
                                 "--page", "p", "--vornd", "v", "--state", "s", "--foreground"});
    ASSERT_TRUE(parsed.right) << parsed.reason;
    EXPECT_EQ(parsed.options.addresses.size(), 2u);
    EXPECT_TRUE(parsed.options.hasOwnAddresses);
    EXPECT_FALSE(parsed.options.addresses[0].isLoopback);
    EXPECT_EQ(parsed.options.certificate, "c");
    EXPECT_EQ(parsed.options.key, "k");
    EXPECT_EQ(parsed.options.page, "p");
    EXPECT_EQ(parsed.options.vornd, "v");
    EXPECT_EQ(parsed.options.state, "s");
    EXPECT_TRUE(parsed.options.foreground);
}

TEST(OptionsTest, ClearTextStaysOnThisMachine) {
    EXPECT_TRUE(Parse({"--clear-text"}).right);
    EXPECT_TRUE(Parse({"--clear-text", "--listen", "127.1.2.3:80", "--listen", "[::1]:80"}).right);
    for (const char* address : {"0.0.0.0:80", "[::]:80", "10.0.0.1:80", "[::ffff:127.0.0.1]:80"}) {
        const Parsed parsed = Parse({"--clear-text", "--listen", "127.0.0.1:80", "--listen", address});
        EXPECT_FALSE(parsed.right) << address;
        EXPECT_THAT(parsed.reason, HasSubstr(address));
    }
}

TEST(OptionsTest, WrongOnes) {
    for (const std::vector<std::string>& arguments :
         std::vector<std::vector<std::string>>{{"--nonsense"},
                                               {"-x"},
                                               {"word"},
                                               {"--listen"},
                                               {"--listen", ""},
                                               {"--listen", "8443"},
                                               {"--listen", "localhost:8443"},
                                               {"--listen", "127.0.0.1:65536"},
                                               {"--listen", "127.0.0.1:-1"},
                                               {"--listen", "127.0.0.1:"},
                                               {"--listen", "127.0.0.1:80x"},
                                               {"--listen", "::1:80"},
                                               {"--listen", "[::1]80"},
                                               {"--listen", "[127.0.0.1]:80"},
                                               {"--certificate", "c"},
                                               {"--key", "k"},
                                               {"--clear-text", "--certificate", "c", "--key", "k"},
                                               {"--page", ""},
                                               {"--foreground=yes"}}) {
        const Parsed parsed = Parse(arguments);
        EXPECT_FALSE(parsed.right) << arguments.back();
        EXPECT_FALSE(parsed.reason.empty()) << arguments.back();
        EXPECT_EQ(parsed.reason.find('\n'), std::string::npos);
    }
}

TEST(OptionsTest, HelpAndVersion) {
    EXPECT_EQ(Parse({"--help"}).options.action, DoorOptions::Action::Help);
    EXPECT_EQ(Parse({"--version"}).options.action, DoorOptions::Action::Version);
    for (const char* option : {"--listen", "--clear-text", "--certificate", "--key", "--page", "--vornd", "--state",
                               "--foreground", "--help", "--version"}) {
        EXPECT_THAT(appliance::kDoorHelp, HasSubstr(std::string("  ") + option + " "));
    }
}

TEST(OptionsTest, AddressesOfClients) {
    const auto client = [](const char* text) {
        sockaddr_storage storage{};
        if (std::strchr(text, ':') != nullptr) {
            sockaddr_in6 address{};
            address.sin6_family = AF_INET6;
            inet_pton(AF_INET6, text, &address.sin6_addr);
            std::memcpy(&storage, &address, sizeof address);
        } else {
            sockaddr_in address{};
            address.sin_family = AF_INET;
            inet_pton(AF_INET, text, &address.sin_addr);
            std::memcpy(&storage, &address, sizeof address);
        }
        return appliance::AddressOfClient(storage);
    };
    EXPECT_EQ(client("10.1.2.3").text, "10.1.2.3");
    EXPECT_FALSE(client("10.1.2.3").isLoopback);
    EXPECT_TRUE(client("127.0.0.9").isLoopback);
    EXPECT_EQ(client("2001:db8::1").text, "2001:db8::1");
    EXPECT_FALSE(client("2001:db8::1").isLoopback);
    EXPECT_TRUE(client("::1").isLoopback);
    EXPECT_EQ(client("::ffff:10.1.2.3").text, "10.1.2.3");
    EXPECT_FALSE(client("::ffff:10.1.2.3").isLoopback);
    EXPECT_TRUE(client("::ffff:127.0.0.1").isLoopback);
}

}  // namespace
}  // namespace httpd_test
