#include "appliance/domain/directory/ldap_session.h"

#include <gtest/gtest.h>

#include "appliance/domain/directory/worker.h"
#include "tests/appliance/directory/fake_ldap_server.h"

namespace appliance_test {
namespace {

using appliance::BaseOfDomain;
using appliance::DirectoryError;
using appliance::ErrorCode;
using appliance::LdapEntry;
using appliance::LdapSession;
using appliance::RidOfSid;
using std::chrono::milliseconds;
using Page = FakeLdapServer::Page;

constexpr milliseconds kPatience{20000};

struct Outcome {
    int entries = 0;
    std::string failure;
    ErrorCode code = ErrorCode::Internal;
};

Outcome SearchAt(int port, milliseconds patience = kPatience) {
    Outcome outcome;
    try {
        LdapSession session({"127.0.0.1", port, true}, patience);
        session.Search({"DC=lab,DC=test", true, "(objectClass=*)", {"sAMAccountName"}}, [&](const LdapEntry& entry) {
            ++outcome.entries;
            EXPECT_EQ(entry.First("sAMAccountName"), "user" + std::to_string(outcome.entries));
            EXPECT_EQ(entry.First("displayName"), std::string("a\0b", 3));
            EXPECT_EQ(entry.First("missing"), "");
        });
    } catch (const DirectoryError& error) {
        outcome.failure = error.what();
        outcome.code = error.code();
    }
    return outcome;
}

TEST(LdapSessionTest, GoesOnToTheLastPage) {
    FakeLdapServer server(3, {Page::More, Page::More, Page::Last});
    const Outcome outcome = SearchAt(server.port());
    EXPECT_EQ(outcome.failure, "");
    EXPECT_EQ(outcome.entries, 9);
}

TEST(LdapSessionTest, TakesNoIncompleteAnswerForAWholeOne) {
    for (const Page end : {Page::Unsaid, Page::Refused, Page::Close}) {
        FakeLdapServer server(3, {Page::More, end});
        const Outcome outcome = SearchAt(server.port());
        EXPECT_EQ(outcome.entries, 6);
        EXPECT_NE(outcome.failure, "") << static_cast<int>(end);
    }
}

TEST(LdapSessionTest, SaysWhatTheServerSaidInOneLine) {
    FakeLdapServer server(0, {Page::Refused});
    EXPECT_EQ(SearchAt(server.port()).failure, "127.0.0.1: search: Size limit exceeded: too many for you");
}

TEST(LdapSessionTest, EndsWithAServerThatStalls) {
    for (const Page end : {Page::Stall, Page::Silence}) {
        FakeLdapServer server(3, {Page::More, end});
        const auto started = std::chrono::steady_clock::now();
        const Outcome outcome = SearchAt(server.port(), milliseconds(400));
        EXPECT_EQ(outcome.code, ErrorCode::TimedOut) << outcome.failure;
        EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(15));
    }
}

// A library that hangs in spite of its time-outs is ended with its process.
TEST(LdapSessionTest, IsEndedByTheWorkersPatience) {
    FakeLdapServer server(3, {Page::More, Page::Stall});
    const auto started = std::chrono::steady_clock::now();
    try {
        appliance::RunWorker({milliseconds(300), milliseconds(20000)}, [&server](appliance::ProgressReport&) {
            return Json::Value(SearchAt(server.port(), std::chrono::hours(1)).failure);
        });
        ADD_FAILURE() << "the worker came back";
    } catch (const DirectoryError& error) {
        EXPECT_EQ(error.code(), ErrorCode::TimedOut);
    }
    EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(5));
}

TEST(LdapSessionTest, TellsThatNobodyListens) {
    int port = 0;
    {
        FakeLdapServer server(0, {});
        port = server.port();
    }
    EXPECT_EQ(SearchAt(port).code, ErrorCode::Unreachable);
}

TEST(LdapNamesTest, MakesTheBaseOfADomain) {
    EXPECT_EQ(BaseOfDomain("lab.test"), "DC=lab,DC=test");
    EXPECT_EQ(BaseOfDomain("a.b.c."), "DC=a,DC=b,DC=c");
    EXPECT_EQ(BaseOfDomain(""), "");
}

TEST(LdapNamesTest, TakesTheLastNumberOfADomainsSid) {
    const std::string sid("\x01\x05\0\0\0\0\0\x05\x15\0\0\0\x01\0\0\0\x02\0\0\0\x03\0\0\0\xF4\x01\0\0", 28);
    EXPECT_EQ(RidOfSid(sid), 500u);
    std::string large = sid;
    large[27] = '\xFF';
    EXPECT_EQ(RidOfSid(large), 0xFF0001F4u);
    for (const std::size_t place : {0u, 1u, 7u, 8u}) {
        std::string other = sid;
        other[place] = '\x7E';
        EXPECT_FALSE(RidOfSid(other)) << place;
    }
    EXPECT_FALSE(RidOfSid(sid.substr(0, 27)));
    EXPECT_FALSE(RidOfSid(sid + "\x01"));
    EXPECT_FALSE(RidOfSid(""));
    EXPECT_FALSE(RidOfSid(std::string("\x01\x02\0\0\0\0\0\x05\x20\0\0\0\x20\x02\0\0", 16)));  // BUILTIN\Administrators
}

}  // namespace
}  // namespace appliance_test
