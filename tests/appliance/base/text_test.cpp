#include "appliance/base/text.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

using appliance::CopyToBuffer;
using appliance::IsAccountName;
using appliance::IsDnsName;
using appliance::IsNetbiosName;
using appliance::Lines;
using appliance::Split;
using appliance::Trim;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

TEST(Text, SplitKeepsEmptyPieces) {
    EXPECT_THAT(Split("", ","), IsEmpty());
    EXPECT_THAT(Split("a", ","), ElementsAre("a"));
    EXPECT_THAT(Split(",a,,b,", ","), ElementsAre("", "a", "", "b", ""));
    EXPECT_THAT(Split("a--b---c", "--"), ElementsAre("a", "b", "-c"));
    EXPECT_THAT(Split("a,b", ""), ElementsAre("a,b"));
}

TEST(Text, LinesComeWithoutTheirEnds) {
    EXPECT_THAT(Lines(""), IsEmpty());
    EXPECT_THAT(Lines("a\nb"), ElementsAre("a", "b"));
    EXPECT_THAT(Lines("a\r\n\n\rb\n"), ElementsAre("a", "", "\rb"));
    EXPECT_THAT(Lines("a\r"), ElementsAre("a\r"));
}

TEST(Text, TrimTakesBlanksOffBothEnds) {
    EXPECT_EQ(Trim(" \t\r\n a b\n "), "a b");
    EXPECT_EQ(Trim(" \n "), "");
    EXPECT_EQ(Trim(""), "");
}

TEST(Text, OnlyAsciiLettersHaveCase) {
    EXPECT_EQ(appliance::Upper("az[\xE4"), "AZ[\xE4");
    EXPECT_EQ(appliance::Lower("AZ@\xC4"), "az@\xC4");
    EXPECT_TRUE(appliance::EqualIgnoringCase("LaB", "lAb"));
    EXPECT_FALSE(appliance::EqualIgnoringCase("lab", "labs"));
    EXPECT_FALSE(appliance::EqualIgnoringCase("\xC4", "\xE4"));
}

TEST(Text, BeginningAndPart) {
    EXPECT_TRUE(appliance::StartsWith("abc", "ab"));
    EXPECT_FALSE(appliance::StartsWith("a", "ab"));
    EXPECT_TRUE(appliance::Contains("abc", "bc"));
    EXPECT_FALSE(appliance::Contains("abc", "cb"));
}

TEST(Text, ControlBytes) {
    for (int byte = 0; byte < 256; ++byte) {
        const std::string text = std::string("a") + static_cast<char>(byte) + "b";
        EXPECT_EQ(appliance::HasControlBytes(text), byte < 32 || byte == 127) << byte;
    }
}

TEST(Text, DnsNames) {
    for (const char* name : {"lab.test", "LAB", "a-b.c_d", "_ldap._tcp.lab.test", "1.2.3.4", "a-"}) {
        EXPECT_TRUE(IsDnsName(name)) << name;
    }
    for (const char* name : {"", ".", "lab.", ".lab", "a..b", "-lab", "lab.-x", "a b", "a;b", "a/b", "\xC3\xA4"}) {
        EXPECT_FALSE(IsDnsName(name)) << name;
    }
    EXPECT_TRUE(IsDnsName(std::string(63, 'a') + ".b"));
    EXPECT_FALSE(IsDnsName(std::string(64, 'a') + ".b"));
    std::string longest = std::string(49, 'a');
    for (int label = 0; label < 4; ++label) {
        longest += "." + std::string(50, 'b');
    }
    EXPECT_EQ(longest.size(), 253U);
    EXPECT_TRUE(IsDnsName(longest));
    EXPECT_FALSE(IsDnsName("a" + longest));
}

TEST(Text, NetbiosNames) {
    for (const char* name : {"LAB", "my lab", "A.B", "FIFTEEN-BYTES-X", "\xC3\x84"}) {
        EXPECT_TRUE(IsNetbiosName(name)) << name;
    }
    for (const char* name : {"", ".LAB", "-LAB", " LAB", "LAB ", "SIXTEEN-BYTES-XY", "a\\b", "a/b", "a:b", "a*b", "a?b",
                             "a\"b", "a<b", "a>b", "a|b", "a\tb"}) {
        EXPECT_FALSE(IsNetbiosName(name)) << name;
    }
}

TEST(Text, AccountNames) {
    EXPECT_TRUE(IsAccountName("LAB\\Some One"));
    EXPECT_TRUE(IsAccountName(std::string(256, 'a')));
    EXPECT_FALSE(IsAccountName(std::string(257, 'a')));
    EXPECT_FALSE(IsAccountName(""));
    EXPECT_FALSE(IsAccountName("-U"));
    EXPECT_FALSE(IsAccountName("a\nb"));
}

TEST(Text, BuffersAreCutAndTerminated) {
    char buffer[4] = {'x', 'x', 'x', 'x'};
    EXPECT_TRUE(CopyToBuffer("abc", buffer, 4));
    EXPECT_STREQ(buffer, "abc");
    EXPECT_TRUE(CopyToBuffer("abcdef", buffer, 3));
    EXPECT_STREQ(buffer, "ab");
    EXPECT_TRUE(CopyToBuffer("abc", buffer, 1));
    EXPECT_STREQ(buffer, "");
    buffer[0] = 'y';
    EXPECT_FALSE(CopyToBuffer("abc", buffer, 0));
    EXPECT_FALSE(CopyToBuffer("abc", buffer, -1));
    EXPECT_FALSE(CopyToBuffer("abc", nullptr, 4));
    EXPECT_EQ(buffer[0], 'y');
}

}  // namespace
