// Lists of strings.

#include <climits>

#include "contract_test.h"

using contract::List;

namespace {

TEST(Lists, ANewOneIsEmptyWhateverItsCapacity) {
    for (const int capacity : {0, 1, 1024}) {
        const List list(capacity);
        ASSERT_NE(list.list, nullptr) << capacity;
        EXPECT_EQ(list.list->count, 0) << capacity;
        EXPECT_EQ(VLIBCSzListGet(list.list, 0), nullptr) << capacity;
    }
}

TEST(Lists, EntriesComeBackInTheirOrder) {
    List list;
    for (const char* text : {"b", "a", "c", "a"}) {
        ASSERT_GE(SUCCEEDING(VLIBCSzListPush(&list.list, text)), 0);
    }
    EXPECT_EQ(list.list->count, 4);
    EXPECT_EQ(list.Texts(), (std::vector<std::string>{"b", "a", "c", "a"}));
}

// The caller goes on with the pointer that is left in its variable, whichever that is.
TEST(Lists, GrowFarBeyondTheirCapacity) {
    constexpr int kEntries = 5000;
    for (const int capacity : {0, 1, 3}) {
        List list(capacity);
        for (int number = 0; number < kEntries; ++number) {
            ASSERT_TRUE(list.Push("entry " + std::to_string(number)));
            ASSERT_NE(list.list, nullptr);
            ASSERT_EQ(list.list->count, number + 1);
        }
        for (int number = 0; number < kEntries; ++number) {
            ASSERT_STREQ(VLIBCSzListGet(list.list, number), ("entry " + std::to_string(number)).c_str());
        }
    }
}

TEST(Lists, HoldCopies) {
    List list;
    char text[] = "before";
    ASSERT_GE(VLIBCSzListPush(&list.list, text), 0);
    text[0] = 'X';
    EXPECT_STREQ(VLIBCSzListGet(list.list, 0), "before");
    EXPECT_NE(VLIBCSzListGet(list.list, 0), text);
}

TEST(Lists, AnEmptyTextIsAnEntry) {
    List list;
    ASSERT_TRUE(list.Push(""));
    EXPECT_EQ(list.list->count, 1);
    EXPECT_STREQ(VLIBCSzListGet(list.list, 0), "");
}

TEST(Lists, LongTextsAndAllBytesAreKept) {
    std::string bytes;
    for (int byte = 1; byte < 256; ++byte) {
        bytes += static_cast<char>(byte);
    }
    const std::string longText(100000, 'x');
    List list(1);
    ASSERT_TRUE(list.Push(bytes));
    ASSERT_TRUE(list.Push(longText));
    EXPECT_EQ(list.Texts(), (std::vector<std::string>{bytes, longText}));
}

TEST(Lists, OutOfRangeIsNullAndNoMore) {
    List list;
    ASSERT_TRUE(list.Push("only"));
    for (const int index : {-1, 1, 2, 1000000, INT_MAX, INT_MIN}) {
        EXPECT_EQ(FAILING(VLIBCSzListGet(list.list, index)), nullptr) << index;
    }
    EXPECT_STREQ(SUCCEEDING(VLIBCSzListGet(list.list, 0)), "only");
}

TEST(Lists, DoNotShareTheirEntries) {
    List first;
    List second;
    ASSERT_TRUE(first.Push("first"));
    ASSERT_TRUE(second.Push("second"));
    ASSERT_TRUE(second.Push("third"));
    EXPECT_EQ(first.Texts(), std::vector<std::string>{"first"});
    EXPECT_EQ(second.Texts(), (std::vector<std::string>{"second", "third"}));
}

TEST(Lists, FreeingNullDoesNothing) {
    const contract::ErrorMark mark;
    VLIBCSzListFree(nullptr);
    EXPECT_TRUE(mark.Stands());
}

}  // namespace
