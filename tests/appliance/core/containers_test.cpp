// Lists and hashes of strings, and the string helpers.

#include <climits>
#include <map>
#include <random>

#include "appliance/platform/contract.h"
#include "tests/appliance/core/core_test.h"

using appliance_test::CoreTest;
using appliance_test::Hash;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

using ListTest = CoreTest;
using HashTest = CoreTest;

TEST_F(ListTest, EntriesInTheirOrder) {
    VLIBSZLIST* list = VLIBCSzListAlloc(1);
    ASSERT_NE(list, nullptr);
    EXPECT_EQ(list->count, 0);
    for (int i = 0; i < 3000; ++i) {
        EXPECT_SUCCEEDS(VLIBCSzListPush(&list, std::to_string(i).c_str()), 0);
    }
    EXPECT_SUCCEEDS(VLIBCSzListPush(&list, VLIBCSzListGet(list, 7)), 0);  // one of its own
    EXPECT_SUCCEEDS(VLIBCSzListPush(&list, ""), 0);
    EXPECT_EQ(list->count, 3002);
    EXPECT_STREQ(VLIBCSzListGet(list, 0), "0");
    EXPECT_STREQ(VLIBCSzListGet(list, 2999), "2999");
    EXPECT_STREQ(VLIBCSzListGet(list, 3000), "7");
    EXPECT_STREQ(VLIBCSzListGet(list, 3001), "");
    EXPECT_FAILS(VLIBCSzListGet(list, 3002), nullptr, NotFound);
    EXPECT_FAILS(VLIBCSzListGet(list, -1), nullptr, BadArgument);
    VLIBCSzListFree(list);
    VLIBCSzListFree(nullptr);
}

TEST_F(ListTest, WhatIsNoList) {
    EXPECT_FAILS(VLIBCSzListAlloc(-1), nullptr, BadArgument);
    VLIBSZLIST* list = VLIBCSzListAlloc(INT_MAX);
    ASSERT_NE(list, nullptr);
    EXPECT_FAILS(VLIBCSzListPush(&list, nullptr), -1, BadArgument);
    EXPECT_EQ(list->count, 0);
    VLIBCSzListFree(list);
    list = nullptr;
    EXPECT_FAILS(VLIBCSzListPush(&list, "a"), -1, BadArgument);
    EXPECT_FAILS(VLIBCSzListPush(nullptr, "a"), -1, BadArgument);
    EXPECT_FAILS(VLIBCSzListGet(nullptr, 0), nullptr, BadArgument);
}

TEST_F(HashTest, KeysWithoutRegardToCaseAndBlanks) {
    Hash hash{{"Server Signing", "yes"}};
    EXPECT_EQ(hash.Value("server signing"), "yes");
    EXPECT_EQ(hash.Value("SERVERSIGNING"), "yes");
    EXPECT_SUCCEEDS(VLIBCSzHashSetValue(hash.address(), "serverSigning", "no"), 0);
    EXPECT_EQ(hash.Value("Server Signing"), "no");
    EXPECT_FAILS(VLIBCSzHashGetValue(hash.get(), "server"), nullptr, NotFound);
    EXPECT_SUCCEEDS(VLIBCSzHashRemoveKey(hash.get(), "SERVER signing"), 0);
    EXPECT_EQ(hash.Value("server signing"), "<none>");
    EXPECT_SUCCEEDS(VLIBCSzHashRemoveKey(hash.get(), "server signing"), 0);
}

TEST_F(HashTest, AValueMayBeOneOfItsOwnTexts) {
    Hash hash{{"a", std::string(100, 'x')}};
    EXPECT_EQ(VLIBCSzHashSetValue(hash.address(), "a", VLIBCSzHashGetValue(hash.get(), "a") + 98), 0);
    EXPECT_EQ(hash.Value("a"), "xx");
    EXPECT_EQ(VLIBCSzHashSetValue(hash.address(), "b", VLIBCSzHashGetValue(hash.get(), "a")), 0);
    EXPECT_EQ(hash.Value("b"), "xx");
}

TEST_F(HashTest, AsAMap) {
    std::mt19937 random(3);
    std::map<std::string, std::string> map;
    Hash hash;
    for (int turn = 0; turn < 20000; ++turn) {
        const std::string key = "key " + std::to_string(random() % 500);
        if (random() % 3 == 0) {
            map.erase(key);
            ASSERT_EQ(VLIBCSzHashRemoveKey(hash.get(), key.c_str()), 0);
        } else {
            map[key] = std::to_string(turn);
            ASSERT_EQ(VLIBCSzHashSetValue(hash.address(), key.c_str(), map[key].c_str()), 0);
        }
        const std::string asked = "key " + std::to_string(random() % 500);
        ASSERT_EQ(hash.Value(asked), map.count(asked) == 0 ? "<none>" : map[asked]);
    }
}

TEST_F(HashTest, WhatIsNoHashAndNoKey) {
    EXPECT_FAILS(VLIBCSzHashAlloc(-1), nullptr, BadArgument);
    VLIBCSzHashFree(VLIBCSzHashAlloc(INT_MAX));
    VLIBCSzHashFree(nullptr);
    Hash hash;
    EXPECT_FAILS(VLIBCSzHashSetValue(hash.address(), "", "x"), -1, BadArgument);
    EXPECT_FAILS(VLIBCSzHashSetValue(hash.address(), " \t", "x"), -1, BadArgument);
    EXPECT_FAILS(VLIBCSzHashSetValue(hash.address(), nullptr, "x"), -1, BadArgument);
    EXPECT_FAILS(VLIBCSzHashSetValue(hash.address(), "x", nullptr), -1, BadArgument);
    EXPECT_FAILS(VLIBCSzHashSetValue(nullptr, "x", "x"), -1, BadArgument);
    EXPECT_FAILS(VLIBCSzHashGetValue(hash.get(), nullptr), nullptr, BadArgument);
    EXPECT_FAILS(VLIBCSzHashGetValue(nullptr, "x"), nullptr, BadArgument);
    EXPECT_FAILS(VLIBCSzHashRemoveKey(nullptr, "x"), -1, BadArgument);
    EXPECT_FAILS(VLIBCSzHashRemoveKey(hash.get(), nullptr), -1, BadArgument);
}

TEST(WebUtilsTest, ExplodeAndImplode) {
    EXPECT_THAT(WebUtils::StringExplode("", ","), IsEmpty());
    EXPECT_THAT(WebUtils::StringExplode("10.0.0.1, 10.0.0.2,", ","), ElementsAre("10.0.0.1", " 10.0.0.2", ""));
    EXPECT_EQ(WebUtils::StringImplode({}, ","), "");
    EXPECT_EQ(WebUtils::StringImplode({""}, ","), "");
    EXPECT_EQ(WebUtils::StringImplode({"a", "", "b"}, ", "), "a, , b");
}

}  // namespace
