#include "appliance/domain/directory/utf8.h"

#include <gtest/gtest.h>

namespace appliance {

TEST(Utf8Test, TellsWellFormedTextFromOther) {
    for (const char* text :
         {"", "alice", "J\xC3\xBCrgen", "\xE6\x97\xA5\xE6\x9C\xAC", "\xF0\x9F\x90\xA7", "\xF4\x8F\xBF\xBF"}) {
        EXPECT_TRUE(IsUtf8(text)) << text;
    }
    for (const char* text : {"\x80", "\xC3", "\xC3(", "\xC0\xAF", "\xE0\x80\xAF", "\xED\xA0\x80", "\xF4\x90\x80\x80",
                             "\xF5\x80\x80\x80", "a\xFF", "\xE6\x97"}) {
        EXPECT_FALSE(IsUtf8(text)) << text;
    }
}

TEST(Utf8Test, FoldsLettersBeyondAscii) {
    EXPECT_EQ(FoldCase("ALICE \xC3\x84\xC3\x96\xC3\x9C"), "alice \xC3\xA4\xC3\xB6\xC3\xBC");
    EXPECT_EQ(FoldCase("\xD0\x98\xD0\x92\xD0\x90\xD0\x9D"), "\xD0\xB8\xD0\xB2\xD0\xB0\xD0\xBD");  // Cyrillic
    EXPECT_EQ(FoldCase("A\xFFZ"), "a\xFFz");
}

TEST(Utf8Test, CleansWhatIsShown) {
    EXPECT_EQ(CleanText("  Alice\tLiddell\n"), "Alice Liddell");
    EXPECT_EQ(CleanText("a\x1B[31mb"), "a [31mb");
    EXPECT_EQ(CleanText("a\xC2\x85z"), "a z");  // a line end beyond ASCII
    EXPECT_EQ(CleanText("a\xFFz"), "a?z");
    EXPECT_EQ(CleanText(std::string("a\0z", 3)), "a z");
}

TEST(Utf8Test, RefusesNamesThatCannotBeListed) {
    for (const char* name : {"alice", "J\xC3\xBCrgen", "-rf", "a b", "../../etc/passwd", "'; DROP TABLE entries; --"}) {
        EXPECT_TRUE(IsListableName(name)) << name;
    }
    for (const std::string& name : {std::string(), std::string("a\nb"), std::string("a\0b", 3), std::string("\x7F"),
                                    std::string("a\xC2\x9Fz"), std::string("\xFF"), std::string(257, 'a')}) {
        EXPECT_FALSE(IsListableName(name)) << name;
    }
    EXPECT_TRUE(IsListableName(std::string(256, 'a')));
}

}  // namespace appliance
