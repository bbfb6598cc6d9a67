// Which names may stand in a shell command.

#include "src/support/shell_name.h"

#include <gtest/gtest.h>

#include <string>

namespace {

// Not the source's own list, but what it must amount to.
bool MeansSomethingToTheShell(int byte) {
    switch (byte) {
        case '"':
        case '\'':
        case ';':
        case '&':
        case '|':
        case '<':
        case '>':
        case '(':
        case ')':
        case '$':
        case '\\':
        case '*':
        case '?':
        case '[':
        case ']':
        case '{':
        case '}':
        case '~':
        case '#':
        case '!':
        case '`':
        case 0x7F:
            return true;
        default:
            return byte >= 0x01 && byte <= 0x20;
    }
}

std::string Text(int byte) {
    return std::string(1, static_cast<char>(byte));
}

TEST(ShellName, TellsEveryByteAtEveryPlace) {
    for (int byte = 1; byte <= 255; ++byte) {
        SCOPED_TRACE(byte);
        const bool harmless = !MeansSomethingToTheShell(byte);
        EXPECT_EQ(IsHarmlessToShell((Text(byte) + "lab.test").c_str()), harmless && byte != '-');
        EXPECT_EQ(IsHarmlessToShell(("lab" + Text(byte) + ".test").c_str()), harmless);
        EXPECT_EQ(IsHarmlessToShell(("lab.test" + Text(byte)).c_str()), harmless);
        EXPECT_EQ(IsHarmlessToShell(Text(byte).c_str()), harmless && byte != '-');
    }
}

TEST(ShellName, TakesAHyphenAnywhereButInFront) {
    EXPECT_TRUE(IsHarmlessToShell("l-ab.test-"));
    EXPECT_TRUE(IsHarmlessToShell("lab--test"));
    EXPECT_FALSE(IsHarmlessToShell("-lab.test"));
    EXPECT_FALSE(IsHarmlessToShell("--"));
}

TEST(ShellName, FindsABadByteBehindGoodOnes) {
    EXPECT_FALSE(IsHarmlessToShell((std::string(5000, 'a') + ";").c_str()));
    EXPECT_TRUE(IsHarmlessToShell(std::string(5000, 'a').c_str()));
}

TEST(ShellName, FindsABadByteBehindOneOf0x80AndAbove) {
    EXPECT_TRUE(
        IsHarmlessToShell("l\xC3\xA4"
                          "b.test"));
    EXPECT_FALSE(
        IsHarmlessToShell("l\xC3\xA4"
                          "b.test;x"));
    EXPECT_FALSE(IsHarmlessToShell("\xFF x"));
}

TEST(ShellName, TakesAnEmptyName) {
    EXPECT_TRUE(IsHarmlessToShell(""));
}

TEST(ShellName, LooksNoFurtherThanTheEndOfTheName) {
    EXPECT_TRUE(IsHarmlessToShell("lab.test\0;"));
    EXPECT_TRUE(IsHarmlessToShell("\0-"));
}

}  // namespace
