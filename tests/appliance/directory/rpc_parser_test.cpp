#include "appliance/domain/directory/rpc_parser.h"

#include <gtest/gtest.h>

#include <vector>

#include "appliance/domain/directory/worker.h"

namespace appliance {
namespace {

// As rpcclient prints them; a tab stands between the parts.
constexpr const char* kUsers[] = {
    "index: 0x1 RID: 0x1f4 acb: 0x00000000 Account: Administrator\tName: \tDesc: Built-in account for administering",
    "index: 0x2 RID: 0xb00 acb: 0x00000010 Account: bulk01704\tName: Bulk User 1704\tDesc: ",
    "index: 0x3 RID: 0x44f acb: 0x00000010 Account: J\xC3\xBCrgen\tName: J\xC3\xBCrgen \xC3\x9C\tDesc: a\tb",
};
constexpr const char* kGroups[] = {
    "index: 0x1 RID: 0x206 acb: 0x00000007 Account: Schema Admins\tDesc: Designated administrators of the schema",
    "index: 0x2 RID: 0x201 acb: 0x00000007 Account: Domain Users\tDesc: ",
    "group:[Cert Publishers] rid:[0x205]",
    "group:[odd] rid:[0x1]] rid:[0x44d]",
};

TEST(RpcParserTest, ReadsUsers) {
    RpcParser parser;
    std::vector<RpcAccount> accounts;
    for (const char* line : kUsers) {
        const auto account = parser.Take(line);
        ASSERT_TRUE(account) << line;
        accounts.push_back(*account);
    }
    EXPECT_EQ(accounts[0].name, "Administrator");
    EXPECT_EQ(accounts[0].rid, 500u);
    EXPECT_EQ(accounts[0].display, "");
    EXPECT_EQ(accounts[1].name, "bulk01704");
    EXPECT_EQ(accounts[1].rid, 0xb00u);
    EXPECT_EQ(accounts[1].display, "Bulk User 1704");
    EXPECT_EQ(accounts[2].name, "J\xC3\xBCrgen");
    EXPECT_EQ(accounts[2].display, "J\xC3\xBCrgen \xC3\x9C");
    EXPECT_EQ(parser.damaged(), 0);
}

TEST(RpcParserTest, ReadsGroupsOfBothSorts) {
    RpcParser parser;
    std::vector<RpcAccount> accounts;
    for (const char* line : kGroups) {
        const auto account = parser.Take(line);
        ASSERT_TRUE(account) << line;
        accounts.push_back(*account);
    }
    EXPECT_EQ(accounts[0].name, "Schema Admins");
    EXPECT_EQ(accounts[0].rid, 0x206u);
    EXPECT_EQ(accounts[0].display, "");
    EXPECT_EQ(accounts[2].name, "Cert Publishers");
    EXPECT_EQ(accounts[2].rid, 0x205u);
    EXPECT_EQ(accounts[3].name, "odd] rid:[0x1]");
    EXPECT_EQ(accounts[3].rid, 0x44du);
}

TEST(RpcParserTest, PassesOverOtherLines) {
    RpcParser parser;
    EXPECT_TRUE(parser.Take(kUsers[0]));
    for (const char* line : {"", "the rest of a description", "Got them all", "   index: 0x9 RID: 0x1"}) {
        EXPECT_FALSE(parser.Take(line)) << line;
    }
    EXPECT_TRUE(parser.Take(kUsers[1]));
}

TEST(RpcParserTest, CountsDamagedAccounts) {
    RpcParser parser;
    EXPECT_FALSE(parser.Take("index: 0x1 RID: 0x1f4 acb: 0x00000000 Account: broken in two"));
    EXPECT_FALSE(parser.Take("index: 0x2 RID: zzz acb: 0x00000000 Account: a\tName: \tDesc: "));
    EXPECT_FALSE(parser.Take("index: 0x3 RID: 0x1f4 acb: 0x00000000 Account: a\tSomething"));
    EXPECT_FALSE(parser.Take("index: 0x4"));
    EXPECT_FALSE(parser.Take("index: 0x5 RID: 0x1ffffffff acb: 0x0 Account: a\tName: \tDesc: "));
    EXPECT_FALSE(parser.Take("group:[x rid:[0x205]"));
    EXPECT_FALSE(parser.Take("group:[x] rid:[0x205"));
    EXPECT_FALSE(parser.Take("group:[x] rid:[]"));
    EXPECT_EQ(parser.damaged(), 8);
}

TEST(RpcParserTest, RefusesListsWithGapsAndForgedLines) {
    RpcParser gap;
    EXPECT_TRUE(gap.Take(kUsers[0]));
    EXPECT_THROW(gap.Take(kUsers[2]), DirectoryError);
    // A description with a line feed that goes on like another account.
    RpcParser forged;
    EXPECT_TRUE(forged.Take(kUsers[0]));
    EXPECT_TRUE(forged.Take("index: 0x2 RID: 0x1f4 acb: 0x00000000 Account: forged\tName: \tDesc: "));
    EXPECT_THROW(forged.Take(kUsers[1]), DirectoryError);
    RpcParser late;
    EXPECT_TRUE(late.Take(kGroups[2]));
    EXPECT_THROW(late.Take(kGroups[0]), DirectoryError);
    RpcParser damaged;
    EXPECT_THROW(damaged.Take("index: x"), DirectoryError);
}

TEST(RpcParserTest, ReportsWhatTheProgramReports) {
    for (const char* line :
         {"result was NT_STATUS_ACCESS_DENIED", "Cannot connect to server.  Error was NT_STATUS_HOST_UNREACHABLE"}) {
        RpcParser parser;
        try {
            parser.Take(line);
            ADD_FAILURE() << line;
        } catch (const DirectoryError& error) {
            EXPECT_NE(std::string(error.what()).find("NT_STATUS_"), std::string::npos);
        }
    }
}

}  // namespace
}  // namespace appliance
