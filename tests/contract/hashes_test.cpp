// Hashes of strings.

#include "contract_test.h"

using contract::Hash;

namespace {

std::string Key(int number) {
    return "key " + std::to_string(number);
}

TEST(Hashes, ANewOneHoldsNothing) {
    for (const int capacity : {0, 1, 1024}) {
        const Hash hash(capacity);
        ASSERT_NE(hash.hash, nullptr) << capacity;
        EXPECT_EQ(FAILING(VLIBCSzHashGetValue(hash.hash, "key")), nullptr) << capacity;
    }
}

TEST(Hashes, AnswerWhatWasSet) {
    Hash hash;
    ASSERT_GE(SUCCEEDING(VLIBCSzHashSetValue(&hash.hash, "first", "1")), 0);
    ASSERT_GE(SUCCEEDING(VLIBCSzHashSetValue(&hash.hash, "second", "2")), 0);
    EXPECT_STREQ(SUCCEEDING(VLIBCSzHashGetValue(hash.hash, "first")), "1");
    EXPECT_EQ(hash.Get("second"), "2");
    EXPECT_EQ(hash.Get("third"), "(null)");
    EXPECT_EQ(hash.Get("firs"), "(null)");
}

TEST(Hashes, ALaterValueReplacesTheEarlier) {
    Hash hash;
    ASSERT_TRUE(hash.Set("key", "short"));
    ASSERT_TRUE(hash.Set("key", std::string(5000, 'l')));
    EXPECT_EQ(hash.Get("key"), std::string(5000, 'l'));
    ASSERT_TRUE(hash.Set("key", "s"));
    EXPECT_EQ(hash.Get("key"), "s");
    ASSERT_GE(VLIBCSzHashRemoveKey(hash.hash, "key"), 0);
    EXPECT_EQ(hash.Get("key"), "(null)") << "one removal is enough";
}

// The file-sharing service reads "Server Signing" and "server signing" as one key, and so must the options' reader.
TEST(Hashes, TellKeysApartWithoutRegardToCase) {
    Hash hash;
    ASSERT_TRUE(hash.Set("Server Signing", "yes"));
    EXPECT_EQ(hash.Get("server signing"), "yes");
    EXPECT_EQ(hash.Get("SERVER SIGNING"), "yes");
    ASSERT_TRUE(hash.Set("server signing", "no"));
    EXPECT_EQ(hash.Get("Server Signing"), "no");
    ASSERT_GE(VLIBCSzHashRemoveKey(hash.hash, "SERVER signing"), 0);
    EXPECT_EQ(hash.Get("Server Signing"), "(null)");
}

TEST(Hashes, ValuesKeepTheirCase) {
    Hash hash;
    ASSERT_TRUE(hash.Set("key", "Yes"));
    EXPECT_EQ(hash.Get("KEY"), "Yes");
}

TEST(Hashes, GrowFarBeyondTheirCapacity) {
    constexpr int kKeys = 5000;
    for (const int capacity : {0, 1}) {
        Hash hash(capacity);
        for (int number = 0; number < kKeys; ++number) {
            ASSERT_TRUE(hash.Set(Key(number), std::to_string(number)));
            ASSERT_NE(hash.hash, nullptr);
        }
        for (int number = 0; number < kKeys; ++number) {
            ASSERT_EQ(hash.Get(Key(number)), std::to_string(number));
        }
    }
}

TEST(Hashes, RemovalsInBetweenLeaveTheOthers) {
    constexpr int kKeys = 1000;
    Hash hash(8);
    for (int number = 0; number < kKeys; ++number) {
        ASSERT_TRUE(hash.Set(Key(number), std::to_string(number)));
    }
    for (int number = 0; number < kKeys; ++number) {
        // Looked at, removed when odd, and looked at again, with the walk still under way.
        ASSERT_EQ(hash.Get(Key(number)), std::to_string(number));
        if (number % 2 == 1) {
            ASSERT_GE(SUCCEEDING(VLIBCSzHashRemoveKey(hash.hash, Key(number).c_str())), 0);
            ASSERT_EQ(hash.Get(Key(number)), "(null)");
        }
    }
    for (int number = 0; number < kKeys; ++number) {
        ASSERT_EQ(hash.Get(Key(number)), number % 2 == 1 ? "(null)" : std::to_string(number));
    }
    for (int number = 1; number < kKeys; number += 2) {
        ASSERT_TRUE(hash.Set(Key(number), "again"));
        ASSERT_EQ(hash.Get(Key(number)), "again");
    }
}

TEST(Hashes, RemovingAMissingKeyIsNoFailure) {
    Hash hash;
    EXPECT_GE(SUCCEEDING(VLIBCSzHashRemoveKey(hash.hash, "missing")), 0);
    ASSERT_TRUE(hash.Set("key", "value"));
    EXPECT_GE(SUCCEEDING(VLIBCSzHashRemoveKey(hash.hash, "missing")), 0);
    EXPECT_EQ(hash.Get("key"), "value");
}

TEST(Hashes, HoldCopies) {
    Hash hash;
    char key[] = "key";
    char value[] = "value";
    ASSERT_GE(VLIBCSzHashSetValue(&hash.hash, key, value), 0);
    key[0] = 'X';
    value[0] = 'X';
    EXPECT_EQ(hash.Get("key"), "value");
    EXPECT_EQ(hash.Get("Xey"), "(null)");
}

TEST(Hashes, AnEmptyValueIsAValue) {
    Hash hash;
    ASSERT_TRUE(hash.Set("key", ""));
    EXPECT_EQ(hash.Get("key"), "");
}

TEST(Hashes, LongKeysAndValuesAreKept) {
    const std::string key(4000, 'k');
    const std::string value(100000, 'v');
    Hash hash(1);
    ASSERT_TRUE(hash.Set(key, value));
    EXPECT_EQ(hash.Get(key), value);
    EXPECT_EQ(hash.Get(key.substr(1)), "(null)");
}

TEST(Hashes, DoNotShareTheirContent) {
    Hash first;
    Hash second;
    ASSERT_TRUE(first.Set("key", "1"));
    EXPECT_EQ(second.Get("key"), "(null)");
}

TEST(Hashes, FreeingNullDoesNothing) {
    const contract::ErrorMark mark;
    VLIBCSzHashFree(nullptr);
    EXPECT_TRUE(mark.Stands());
}

}  // namespace
