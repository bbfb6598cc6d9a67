// The last error, addresses, pieces of text, unknown capabilities and settings, and all of it in several threads.

#include <arpa/inet.h>

#include <atomic>
#include <random>

#include "contract_test.h"
#include "platform/settings.h"
#include "platform/webutils.h"

using contract::Hash;
using contract::List;

namespace {

// ---- The last error ----

TEST(LastError, IsWhatWasSet) {
    const char* const file = "file.cpp";
    VLIBCErrSetEx(0x0D00, file, 42);
    EXPECT_EQ(VLIBCErrGet(), 0x0D00);
    EXPECT_STREQ(VLIBCErrorGetFile(), file);
    EXPECT_EQ(VLIBCErrorGetLine(), 42);
    VLIBCErrSetEx(-5, "other.cpp", 1);
    EXPECT_EQ(VLIBCErrGet(), -5);
    EXPECT_STREQ(VLIBCErrorGetFile(), "other.cpp");
    EXPECT_EQ(VLIBCErrorGetLine(), 1);
}

TEST(LastError, IsEachThreadsOwn) {
    VLIBCErrSetEx(1, "main.cpp", 1);
    contract::InThreads(8, [](int number) {
        // Whatever a new thread begins with: its file's name is one, and it is not another thread's.
        EXPECT_NE(VLIBCErrorGetFile(), nullptr);
        EXPECT_STRNE(VLIBCErrorGetFile(), "main.cpp");
        for (int round = 0; round < 1000; ++round) {
            VLIBCErrSetEx(number, "thread.cpp", round);
            ASSERT_EQ(VLIBCErrGet(), number);
            ASSERT_EQ(VLIBCErrorGetLine(), round);
        }
    });
    EXPECT_EQ(VLIBCErrGet(), 1);
    EXPECT_STREQ(VLIBCErrorGetFile(), "main.cpp");
}

TEST(LastError, OfAFailureNamesAPlace) {
    const contract::Folder folder;
    VLIBCErrSetEx(0, "", 0);
    ASSERT_EQ(VLIBCReadPidFile((folder / "none").c_str()), -1);
    EXPECT_NE(VLIBCErrGet(), 0);
    EXPECT_STRNE(VLIBCErrorGetFile(), "");
    EXPECT_GT(VLIBCErrorGetLine(), 0);
}

// ---- Addresses ----

bool IsV4(const std::string& text) {
    in_addr address{};
    return inet_pton(AF_INET, text.c_str(), &address) == 1;
}

bool IsV6(const std::string& text) {
    in6_addr address{};
    return inet_pton(AF_INET6, text.c_str(), &address) == 1;
}

void ExpectAsTheSystem(const std::string& text) {
    EXPECT_EQ(BlVLIBIsIpAddr(text.c_str()), IsV4(text) ? 1 : 0) << '"' << text << '"';
    EXPECT_EQ(BlVLIBIsv6IpAddrValid(text.c_str()), IsV6(text) ? 1 : 0) << '"' << text << '"';
}

TEST(Addresses, AreThoseOfTheSystem) {
    for (const char* text : {"",
                             " ",
                             "192.0.2.1",
                             "0.0.0.0",
                             "255.255.255.255",
                             "256.0.0.1",
                             "1.2.3",
                             "1.2.3.4.5",
                             "1.2.3.4 ",
                             " 1.2.3.4",
                             "1.2.3.4\n",
                             "1..3.4",
                             ".1.2.3.4",
                             "1.2.3.4.",
                             "1.2.3.-4",
                             "1.2.3.+4",
                             "0x1.2.3.4",
                             "1.2.3.a",
                             "16909060",
                             "1,2,3,4",
                             "::",
                             "::1",
                             "2001:db8::1",
                             "2001:DB8:0:0:0:0:0:1",
                             "1:2:3:4:5:6:7:8",
                             "1:2:3:4:5:6:7",
                             "1:2:3:4:5:6:7:8:9",
                             "1::2::3",
                             ":::",
                             ":1",
                             "1:",
                             "12345::",
                             "g::",
                             "::ffff:192.0.2.1",
                             "::192.0.2.256",
                             "fe80::1%eth0",
                             "[::1]",
                             "::1/64",
                             "2001:db8::1 ",
                             "lab.test",
                             "localhost",
                             "1.2.3.4:53"}) {
        ExpectAsTheSystem(text);
    }
    ExpectAsTheSystem(std::string(10000, '1'));
    ExpectAsTheSystem(std::string(10000, ':'));
}

TEST(Addresses, AreThoseOfTheSystemAlsoWhenTheyAreSpoilt) {
    constexpr int kRounds = 4000;
    const std::string letters = "0123456789abcfF.:% -";
    std::mt19937 random(1);
    const auto pick = [&](std::size_t count) { return std::size_t{random() % count}; };
    for (int round = 0; round < kRounds; ++round) {
        std::string text = round % 2 == 0 ? "192.0.2.129" : "2001:db8:0:7::192.0.2.1";
        for (std::size_t change = pick(3); change > 0; --change) {
            const std::size_t place = pick(text.size());
            const std::string letter(1, letters[pick(letters.size())]);
            text.replace(place, pick(2), pick(3) == 0 ? "" : letter);
        }
        ExpectAsTheSystem(text);
    }
}

// ---- Pieces of text ----

using Pieces = std::vector<std::string>;

TEST(PiecesOfText, AreThoseBetweenTheSeparators) {
    EXPECT_EQ(WebUtils::StringExplode("10.0.0.1,10.0.0.2", ","), (Pieces{"10.0.0.1", "10.0.0.2"}));
    EXPECT_EQ(WebUtils::StringExplode("one", ","), Pieces{"one"});
    EXPECT_EQ(WebUtils::StringExplode(" a , b ", ","), (Pieces{" a ", " b "}));
    EXPECT_EQ(WebUtils::StringExplode(",a,,b,", ","), (Pieces{"", "a", "", "b", ""}));
    EXPECT_EQ(WebUtils::StringExplode(",", ","), (Pieces{"", ""}));
    EXPECT_EQ(WebUtils::StringExplode("a--b-c--", "--"), (Pieces{"a", "b-c", ""}));
}

TEST(PiecesOfText, AnEmptyTextHasNone) {
    EXPECT_EQ(WebUtils::StringExplode("", ","), Pieces{});
}

TEST(PiecesOfText, AreJoinedBetweenEachTwo) {
    EXPECT_EQ(WebUtils::StringImplode({"a", "b", "c"}, ","), "a,b,c");
    EXPECT_EQ(WebUtils::StringImplode({"a"}, ","), "a");
    EXPECT_EQ(WebUtils::StringImplode({}, ","), "");
    EXPECT_EQ(WebUtils::StringImplode({"", "", ""}, ", "), ", , ");
    EXPECT_EQ(WebUtils::StringImplode({"a", "b"}, ""), "ab");
}

TEST(PiecesOfText, ComeTogetherAgain) {
    std::string text;
    for (int number = 0; number < 2000; ++number) {
        text += number % 3 == 0 ? "," : std::to_string(number);
    }
    EXPECT_EQ(WebUtils::StringImplode(WebUtils::StringExplode(text, ","), ","), text);
}

// ---- Unknown capabilities and settings ----

TEST(UnknownKeys, AnswerTheFallback) {
    VornConf conf;
    EXPECT_STREQ(conf.Def("no such capability of any model", "fallback"), "fallback");
    EXPECT_STREQ(conf.Info("no such setting of any appliance", "other"), "other");
    EXPECT_STREQ(conf.Def("no such capability of any model", ""), "");
    EXPECT_STREQ(conf.Info("", "empty"), "empty");
    EXPECT_STREQ(conf.Info(std::string(10000, 'k').c_str(), "long"), "long");
    const std::string longText(10000, 'f');
    EXPECT_STREQ(conf.Def("no such capability of any model", longText.c_str()), longText.c_str());
}

TEST(UnknownKeys, OfSupportAreNotSupported) {
    EXPECT_EQ(VLIBCSupportGet("no such capability of any model"), 0);
    EXPECT_EQ(VLIBCSupportGet(""), 0);
}

// ---- Threads ----

TEST(Threads, WorkOnTheirOwnObjectsAtOnce) {
    const contract::Folder folder;
    std::atomic<int> done{0};
    contract::InThreads(8, [&](int number) {
        const std::string own = std::to_string(number);
        const std::string path = folder / own;
        for (int round = 0; round < 20; ++round) {
            List list(1);
            Hash hash(1);
            for (int entry = 0; entry < 50; ++entry) {
                ASSERT_TRUE(list.Push(own + " " + std::to_string(entry)));
                ASSERT_TRUE(hash.Set("key " + std::to_string(entry), own));
            }
            ASSERT_STREQ(VLIBCSzListGet(list.list, 49), (own + " 49").c_str());
            ASSERT_NE(VLIBCFileAddSection(path.c_str(), "global", hash.hash, "%s=%s\n"), 0);
            char value[16] = {};
            ASSERT_GT(VLIBCFileGetKeyValue(path.c_str(), "key 7", value, sizeof value, 0), 0);
            ASSERT_EQ(value, own);
            ASSERT_EQ(WebUtils::StringImplode(WebUtils::StringExplode("a," + own, ","), ","), "a," + own);
            VornConf conf;
            ASSERT_EQ(conf.Info("no such setting of any appliance", own.c_str()), own);
        }
        ++done;
    });
    EXPECT_EQ(done, 8);
}

}  // namespace
