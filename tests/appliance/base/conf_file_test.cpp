// Files of keys and values: what is read, and which bytes change when one key is written.

#include "appliance/base/conf_file.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <chrono>

#include "tests/appliance/base/temporary_folder.h"

using appliance::ConfFile;
using appliance::IsWritableKey;
using appliance::IsWritableValue;
using appliance::SameKey;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

namespace {

using ConfFileTest = appliance_test::FolderTest;
using Entries = std::vector<std::pair<std::string, std::string>>;

constexpr char kFormat[] = "    %s=%s\n";

std::string GetGlobal(const std::string& text, const std::string& key) {
    return ConfFile(text).Get("global", key).value_or("<none>");
}

// The text after one key was set.
std::string AfterSet(const std::string& text, const std::string& section, const std::string& key,
                     const std::string& value) {
    ConfFile file(text);
    return file.Set(section, key, value) ? file.text() : "<refused>";
}

TEST(ConfFileNames, CaseAndBlanksDoNotCount) {
    EXPECT_TRUE(SameKey("Password Server", "passwordserver"));
    EXPECT_TRUE(SameKey(" a\tb ", "A B"));
    EXPECT_TRUE(SameKey("", " "));
    EXPECT_FALSE(SameKey("ab", "abc"));
    EXPECT_FALSE(SameKey("abc", "ab"));
    EXPECT_FALSE(SameKey("\xC4", "\xE4"));
    EXPECT_EQ(appliance::KeyIdentity(" Work\tGroup "), "workgroup");
}

TEST(ConfFileNames, WhatCanBeWritten) {
    EXPECT_TRUE(IsWritableKey("server signing"));
    EXPECT_TRUE(IsWritableKey("vorn:x"));
    EXPECT_TRUE(IsWritableKey("a#b"));
    for (const char* key : {"", "  ", "a=b", "#a", " ;a", "[a", "a\nb", "a\tb", "a\rb", "a\x7F"}) {
        EXPECT_FALSE(IsWritableKey(key)) << key;
    }
    EXPECT_TRUE(IsWritableValue(""));
    EXPECT_TRUE(IsWritableValue("a = [b] # c ; \xC3\xA4\xFF"));
    EXPECT_TRUE(IsWritableValue("DOM\\user"));
    for (const char* value : {"a\nb", "a\rb", "\t", "a\x01", "a\\", "a\\  ", "\x7F"}) {
        EXPECT_FALSE(IsWritableValue(value)) << value;
    }
    EXPECT_FALSE(IsWritableValue(std::string("a\0b", 3)));
}

TEST(ConfFileReading, LinesAndBlanks) {
    EXPECT_EQ(GetGlobal("[global]\n\tWork Group \t=  A B \r\n", "workgroup"), "A B");
    EXPECT_EQ(GetGlobal("a=1=2", "a"), "1=2");
    EXPECT_EQ(GetGlobal("a=\nb = \n", "a"), "");
    EXPECT_EQ(GetGlobal("a=\nb = \n", "b"), "");
    EXPECT_EQ(GetGlobal("a=1\n", "b"), "<none>");
    EXPECT_EQ(GetGlobal("", "b"), "<none>");
    EXPECT_EQ(GetGlobal("a = x # no comment ; here\n", "a"), "x # no comment ; here");
    EXPECT_EQ(GetGlobal("a = \"q\"\n", "a"), "\"q\"");
    EXPECT_EQ(GetGlobal("a = 1  2\n", "a"), "1  2");
}

TEST(ConfFileReading, TheLastDuplicateWins) {
    EXPECT_EQ(GetGlobal("a=1\n[global]\nA =2\n[x]\na=3\n[GLOBAL]\n a = 4\n[y]\na=5\n", "a"), "4");
}

TEST(ConfFileReading, CommentsEndWithTheirLine) {
    EXPECT_EQ(GetGlobal("# a=1 \\\na=2\n; a=3\n  #a=4\n", "a"), "2");
    EXPECT_EQ(GetGlobal("a=1\\\n# b=2\n", "a"), "1# b=2");
}

TEST(ConfFileReading, Continuations) {
    EXPECT_EQ(GetGlobal("a = 1\\\n2\n", "a"), "12");
    EXPECT_EQ(GetGlobal("a = 1 \\\n\t 2\n", "a"), "1 2");
    EXPECT_EQ(GetGlobal("a = 1\\\n  2\\\r\n3\n", "a"), "1 23");
    EXPECT_EQ(GetGlobal("a = 1\\  \n2\n", "a"), "12");
    EXPECT_EQ(GetGlobal("a = 1\\\\\n2\n", "a"), "1\\2");
    EXPECT_EQ(GetGlobal("wo\\\nrk\\\n group = A\n", "workgroup"), "A");
    EXPECT_EQ(GetGlobal("[other]\n[glo\\\nbal]\na = 1\n", "a"), "1");
    EXPECT_EQ(GetGlobal("a = 1\\\n\nb = 2\n", "a"), "1");
    EXPECT_EQ(GetGlobal("a = 1\\\n\nb = 2\n", "b"), "2");
    EXPECT_EQ(GetGlobal("a = 1\\\n", "a"), "1");
    // With nothing behind it, not even a line feed, a backslash is one.
    EXPECT_EQ(GetGlobal("a = 1\\", "a"), "1\\");
}

TEST(ConfFileReading, SectionsAndWhatIsNone) {
    const ConfFile file("a=1\n[ Homes ] junk\nb=2\n[broken\nc=3\nno key\n=no name\n[homes]\nd=4\n[global]\n[]\ne=5\n");
    EXPECT_THAT(file.Sections(), ElementsAre("global", "Homes", ""));
    EXPECT_THAT(file.Section("homes"), ElementsAre(Pair("b", "2"), Pair("c", "3"), Pair("d", "4")));
    EXPECT_THAT(file.Section("global"), ElementsAre(Pair("a", "1")));
    EXPECT_THAT(file.Section("none"), IsEmpty());
    EXPECT_THAT(ConfFile("# only\n").Sections(), IsEmpty());
}

TEST(ConfFileReading, ASectionHasEachKeyOnce) {
    EXPECT_THAT(ConfFile("B=1\na=2\n b = 3\n").Section("GLOBAL"), ElementsAre(Pair("B", "3"), Pair("a", "2")));
}

TEST(ConfFileReading, IncludesAreNotFollowed) {
    EXPECT_THAT(ConfFile("include = /etc/passwd\n").Section("global"), ElementsAre(Pair("include", "/etc/passwd")));
}

TEST(ConfFileSet, RewritesTheLastLineOfAKey) {
    EXPECT_EQ(AfterSet("[global]\n# c\n\tWork Group =  OLD  \r\nx=1\n", "global", "workgroup", "NEW"),
              "[global]\n# c\n\tWork Group =  NEW\r\nx=1\n");
    EXPECT_EQ(AfterSet("a=1\nb=2\nA = 3\n[x]\na=4\n", "global", "a", "5"), "b=2\nA = 5\n[x]\na=4\n");
    EXPECT_EQ(AfterSet("a=1", "global", "a", "2"), "a=2");
    EXPECT_EQ(AfterSet("a=\n", "global", "a", "2"), "a=2\n");
    EXPECT_EQ(AfterSet("  a = 1 \\\n  2\nb=1\n", "global", "a", "3"), "  a = 3\nb=1\n");
    EXPECT_EQ(AfterSet("  a \\\n = 1\nb=1\n", "global", "a", "3"), "  a=3\nb=1\n");
    EXPECT_EQ(AfterSet("a = 1\\", "global", "a", "2"), "a = 2");
}

TEST(ConfFileSet, TheSameValueChangesNothing) {
    const std::string text = "a = 1 \\\n  2   \r\n";
    EXPECT_EQ(AfterSet(text, "global", "a", " 1 2 "), text);
}

TEST(ConfFileSet, NewKeysStandAtTheEndOfTheirSection) {
    EXPECT_EQ(AfterSet("[global]\n  a = 1\n\n# of homes\n[homes]\nb=2\n", "global", "n", "v"),
              "[global]\n  a = 1\n  n = v\n\n# of homes\n[homes]\nb=2\n");
    EXPECT_EQ(AfterSet("[global]\n[homes]\nb=2\n", "global", "n", "v"), "[global]\n    n=v\n[homes]\nb=2\n");
    EXPECT_EQ(AfterSet("[x]\na=1\n[y]\n[X]\nb=1", "x", "n", "v"), "[x]\na=1\n[y]\n[X]\nb=1\nn=v\n");
    EXPECT_EQ(AfterSet("a=1\n[x]\nb=2\n", "global", "n", "v"), "a=1\nn=v\n[x]\nb=2\n");
}

TEST(ConfFileSet, NewSections) {
    EXPECT_EQ(AfterSet("[x]\na=1", "new", "n", "v"), "[x]\na=1\n[new]\n    n=v\n");
    EXPECT_EQ(AfterSet("# c\n[x]\na=1\n", "global", "n", "v"), "# c\n[global]\n    n=v\n[x]\na=1\n");
    EXPECT_EQ(AfterSet("", "new", "n", "v"), "[new]\n    n=v\n");
}

TEST(ConfFileSet, WithoutAnyHeaderAKeyIsAPlainLine) {
    EXPECT_EQ(AfterSet("", "global", "n", "v"), "n=v\n");
    EXPECT_EQ(AfterSet("# c\n", "global", "n", "v"), "# c\nn=v\n");
    EXPECT_EQ(AfterSet("a=1\n", "global", "n", "v"), "a=1\nn=v\n");
}

TEST(ConfFileSet, BackslashesAtTheEndSwallowNothing) {
    EXPECT_EQ(AfterSet("a=1\\\n", "global", "n", "v"), "a=1\\\n\nn=v\n");
    EXPECT_EQ(AfterSet("a=1\\\n", "new", "n", "v"), "a=1\\\n\n[new]\n    n=v\n");
    EXPECT_EQ(AfterSet("a=1\\", "global", "n", "v"), "n=v\na=1\\");
    EXPECT_EQ(AfterSet("a=1\\", "new", "n", "v"), "<refused>");
    EXPECT_EQ(AfterSet("# c \\", "global", "n", "v"), "# c \\\nn=v\n");
    EXPECT_EQ(AfterSet("# c \\\n", "global", "n", "v"), "# c \\\nn=v\n");
}

TEST(ConfFileSet, WhatCannotBeWrittenChangesNothing) {
    EXPECT_EQ(AfterSet("a=1\n", "global", "a", "2\n[evil]"), "<refused>");
    EXPECT_EQ(AfterSet("a=1\n", "global", "#a", "2"), "<refused>");
    EXPECT_EQ(AfterSet("a=1\n", "glo]bal", "a", "2"), "<refused>");
    EXPECT_EQ(AfterSet("a=1\n", "", "a", "2"), "<refused>");
    EXPECT_EQ(AfterSet("a=1\n", "x\n[y", "a", "2"), "<refused>");
    EXPECT_EQ(AfterSet("a=1\n", "x\\", "a", "2"), "<refused>");
    ConfFile file("a=1\n");
    EXPECT_FALSE(file.Set("global", "a", "2\\"));
    EXPECT_EQ(file.text(), "a=1\n");
}

TEST(ConfFileRemove, EveryLineOfTheKeyGoes) {
    ConfFile file("a=1\n# a\nb=2\\\n a=3\n A = 4 \\\n 5\n[x]\na=6\n[global]\na=7");
    EXPECT_TRUE(file.Remove("global", "a"));
    EXPECT_EQ(file.text(), "# a\nb=2\\\n a=3\n[x]\na=6\n[global]\n");
    EXPECT_FALSE(file.Remove("global", "a"));
    EXPECT_FALSE(file.Remove("none", "a"));
    EXPECT_EQ(file.text(), "# a\nb=2\\\n a=3\n[x]\na=6\n[global]\n");
}

TEST(ConfFileSetSection, HoldsTheseEntriesAndNoOthers) {
    ConfFile file;
    ASSERT_TRUE(file.SetSection("global", {{"server signing", "yes"}, {"a", ""}}, kFormat));
    EXPECT_EQ(file.text(), "[global]\n    server signing=yes\n    a=\n");
    file = ConfFile("# top\n[x]\nb=1\n[global]\n# kept\na=1\n\nb=2\n[y]\nc=3");
    ASSERT_TRUE(file.SetSection("global", {{"n", "v"}}, kFormat));
    EXPECT_EQ(file.text(), "# top\n[x]\nb=1\n[global]\n# kept\n    n=v\n\n[y]\nc=3");
    ASSERT_TRUE(file.SetSection("y", {}, kFormat));
    EXPECT_EQ(file.text(), "# top\n[x]\nb=1\n[global]\n# kept\n    n=v\n\n[y]\n");
    ASSERT_TRUE(file.SetSection("new", {{"k", "w"}}, "%s = %s\n"));
    EXPECT_EQ(file.text(), "# top\n[x]\nb=1\n[global]\n# kept\n    n=v\n\n[y]\n[new]\nk = w\n");
    file = ConfFile("# top\n[x]\nb=1\n");
    ASSERT_TRUE(file.SetSection("global", {{"k", "w"}}, kFormat));
    EXPECT_EQ(file.text(), "[global]\n    k=w\n# top\n[x]\nb=1\n");
    file = ConfFile("[global]");
    ASSERT_TRUE(file.SetSection("global", {{"k", "w"}}, kFormat));
    EXPECT_EQ(file.text(), "[global]\n    k=w\n");
}

TEST(ConfFileSetSection, FormatsOfWholeLines) {
    for (const char* format : {"%s=%s\n", "\x20%s = %s\n", "%s=\"%s\"\n", "%s=%%%s\n"}) {
        ConfFile file;
        EXPECT_TRUE(file.SetSection("global", {{"k", "w"}}, format)) << format;
    }
    for (const char* format :
         {"", "%s=%s", "%s%s\n", "%s=%d\n", "%s=%s%s\n", "%s\n", "%s=%s\n%s", "#%s=%s\n", "[%s=%s\n", "%s\n=%s\n",
          "%s=%s\\\n", "%s=%s%\n", "x%s=%s\n", "%s=%n%s\n", "\t%s=%s\n"}) {
        ConfFile file("a=1\n");
        EXPECT_FALSE(file.SetSection("global", {{"k", "w"}, {"l", "v"}}, format)) << format;
        EXPECT_EQ(file.text(), "a=1\n");
    }
}

TEST(ConfFileSetSection, WhatCannotBeWrittenChangesNothing) {
    const std::vector<Entries> refused = {
        {{"a", "1\n2"}},
        {{"a", "\t1"}},
        {{"a", "1\\"}},
        {{"", "1"}},
        {{"a=b", "1"}},
        {{"#a", "1"}},
        {{"a\nb", "1"}},
        {{"[a", "1"}},
        {{"a", "1"}, {"A ", "2"}},
        {{"a", std::string("1\0", 2)}},
    };
    for (const Entries& entries : refused) {
        ConfFile file("a=1\n");
        EXPECT_FALSE(file.SetSection("global", entries, kFormat)) << entries[0].first;
        EXPECT_EQ(file.text(), "a=1\n");
    }
}

TEST_F(ConfFileTest, LoadAndSave) {
    ConfFile file("x=1\n");
    EXPECT_FALSE(ConfFile::Load(folder / "none", file));
    EXPECT_EQ(file.text(), "");
    EXPECT_EQ(ConfFile::Load(folder / "none", file, false), std::errc::no_such_file_or_directory);
    EXPECT_TRUE(ConfFile::Load(folder.path(), file));
    const std::string odd("a=1\r\n\0\xFF\n", 9);
    Put(folder / "file", odd);
    ASSERT_FALSE(ConfFile::Load(folder / "file", file));
    EXPECT_EQ(file.text(), odd);
    ASSERT_FALSE(file.Save(folder / "copy"));
    EXPECT_EQ(Got(folder / "copy"), odd);
    struct stat found = {};
    ASSERT_EQ(stat((folder / "copy").c_str(), &found), 0);
    EXPECT_EQ(found.st_mode & 07777, 0644U);
}

TEST(ConfFileSize, AHundredThousandKeys) {
    std::string text = "[global]\n";
    Entries entries;
    for (int i = 0; i < 100000; ++i) {
        entries.emplace_back("key " + std::to_string(i), "value " + std::to_string(i));
        text += "    key " + std::to_string(i) + "=value " + std::to_string(i) + "\n";
    }
    const auto begin = std::chrono::steady_clock::now();
    ConfFile file;
    ASSERT_TRUE(file.SetSection("global", entries, kFormat));
    EXPECT_EQ(file.text(), text);
    EXPECT_EQ(file.Section("global"), entries);
    EXPECT_EQ(file.Get("global", "KEY 99999"), "value 99999");
    ASSERT_TRUE(file.Set("global", "key 0", "new"));
    ASSERT_TRUE(file.Set("global", "added", "new"));
    ASSERT_TRUE(file.Remove("global", "key 50000"));
    EXPECT_EQ(file.Section("global").size(), 100000U);
    // A second of a quiet machine; far more than that where every key is looked for among all others.
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(20));
}

TEST(ConfFileSize, OneKeyAHundredThousandTimes) {
    std::string text;
    for (int i = 0; i < 100000; ++i) {
        text += "key=" + std::to_string(i) + "\n";
    }
    const auto begin = std::chrono::steady_clock::now();
    ConfFile file(text);
    EXPECT_EQ(file.Section("global"), Entries({{"key", "99999"}}));
    ASSERT_TRUE(file.Set("global", "key", "x"));
    EXPECT_EQ(file.text(), "key=x\n");
    file = ConfFile(text);
    EXPECT_TRUE(file.Remove("global", "key"));
    EXPECT_EQ(file.text(), "");
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(20));
}

}  // namespace
