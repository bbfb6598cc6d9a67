// Generated configuration files, read and changed, against a model that is as plain as can be.

#include <gtest/gtest.h>

#include <map>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "appliance/base/conf_file.h"
#include "tests/appliance/base/conf_model.h"

using appliance::ConfFile;
using conf_model::Content;
using conf_model::Folded;
using conf_model::IsWith;
using conf_model::Model;
using conf_model::Others;
using conf_model::Sections;

namespace {

using Random = std::mt19937;
// The content as the file's own reader gives it.
Sections Read(const ConfFile& file) {
    Sections sections;
    for (const std::string& name : file.Sections()) {
        for (const auto& [key, value] : file.Section(name)) {
            sections[Folded(name)][Folded(key)] = value;
        }
    }
    return sections;
}

std::string Pick(Random& random, const std::vector<std::string>& from) {
    return from[random() % from.size()];
}

const std::vector<std::string> kKeys = {"a", "A", "work group", "WorkGroup", "b c", "x:y", "\xC3\xA4", "k#;[", "\xFF"};
const std::vector<std::string> kSections = {"global", "Glo Bal", "homes", "x", "\xC3\xA4"};

std::string RandomText(Random& random) {
    static const std::vector<std::string> pieces = {
        "a",    "A",        "work group", "WorkGroup", "b c",       "x:y",    "=",
        "=",    "=",        " = ",        "[global]",  "[ homes ]", "[x]",    "[glo bal]",
        "[",    "]",        "#",          ";",         "\n",        "\n",     "\n",
        "\n",   "\r\n",     "\\\n",       "\\\n",      " \\ \n",    "\\\r\n", "\\",
        " ",    "  ",       "\t",         "\v",        "\f",        "\r",     "1",
        "yes",  "\xC3\xA4", "\xFF",       "\"q q\"",   "\n\n",      "\\\\\n", std::string(1, '\0'),
        "\x7F",
    };
    std::string text;
    const auto count = random() % 12;
    for (unsigned i = 0; i < count; ++i) {
        if (random() % 3 == 0) {
            text +=
                Pick(random, kKeys) + Pick(random, {"=", " = ", "\\\n="}) + Pick(random, {"1", "", "x \\\n y"}) + "\n";
        }
        for (auto more = random() % 6; more > 0; --more) {
            text += Pick(random, pieces);
        }
    }
    return text;
}

constexpr unsigned kSeed = 20240611;
constexpr int kTurns = 6000;

TEST(ConfFileFuzz, ReadsAsTheModel) {
    Random random(kSeed);
    for (int turn = 0; turn < kTurns; ++turn) {
        const std::string text = RandomText(random);
        const Sections expected = Content(Model(text));
        const ConfFile file(text);
        ASSERT_EQ(Read(file), expected) << testing::PrintToString(text);
        for (const std::string& key : kKeys) {
            const auto section = expected.find("global");
            const bool known = section != expected.end() && section->second.count(Folded(key)) != 0;
            ASSERT_EQ(file.Get("global", key).has_value(), known) << testing::PrintToString(text);
        }
    }
}

TEST(ConfFileFuzz, SettingOneKeyChangesNothingElse) {
    Random random(kSeed + 1);
    int refused = 0;
    for (int turn = 0; turn < kTurns; ++turn) {
        const std::string text = RandomText(random);
        const std::string section = Pick(random, kSections);
        const std::string key = Pick(random, kKeys);
        const std::string value = Pick(random, {"", "v", "two  words", "a=b", "# c", "[s]", "\\x", "\xFF"});
        ConfFile file(text);
        const std::string shown = testing::PrintToString(text) + " [" + section + "] " + key + "=" + value;
        if (!file.Set(section, key, value)) {
            ASSERT_EQ(text.find_last_of('\\'), text.find_last_not_of(" \t\r\v\f")) << shown;
            ASSERT_EQ(file.text(), text);
            ++refused;
            continue;
        }
        Sections expected = Content(Model(text));
        expected[Folded(section)][Folded(key)] = value;
        ASSERT_EQ(Content(Model(file.text())), expected) << shown;
        // What else stands there is byte for byte the same, but for a header and a line end that a new key needed.
        const std::string before = Others(text, Folded(section), Folded(key));
        const std::string after = Others(file.text(), Folded(section), Folded(key));
        const std::string header = Folded(section) == "global" ? "[global]\n" : "[" + section + "]\n";
        ASSERT_TRUE(IsWith(after, before, header) || IsWith(after, before + "\n", header)) << shown;
        // And once more changes nothing.
        const std::string once = file.text();
        ASSERT_TRUE(file.Set(section, key, value)) << shown;
        ASSERT_EQ(file.text(), once) << shown;
    }
    EXPECT_LT(refused, kTurns / 10);
}

TEST(ConfFileFuzz, RemovingOneKeyChangesNothingElse) {
    Random random(kSeed + 2);
    int removed = 0;
    for (int turn = 0; turn < kTurns; ++turn) {
        const std::string text = RandomText(random);
        const std::string section = Pick(random, kSections);
        const std::string key = Pick(random, kKeys);
        ConfFile file(text);
        Sections expected = Content(Model(text));
        const bool known = expected[Folded(section)].erase(Folded(key)) != 0;
        ASSERT_EQ(file.Remove(section, key), known) << testing::PrintToString(text);
        ASSERT_EQ(file.text(), Others(text, Folded(section), Folded(key))) << testing::PrintToString(text);
        removed += known ? 1 : 0;
    }
    EXPECT_GT(removed, kTurns / 30);
}

TEST(ConfFileFuzz, SectionsAreHeldAsGiven) {
    Random random(kSeed + 3);
    int written = 0;
    for (int turn = 0; turn < kTurns; ++turn) {
        const std::string text = RandomText(random);
        const std::string section = Pick(random, kSections);
        std::map<std::string, std::string> entries;
        std::vector<std::pair<std::string, std::string>> given;
        const auto count = random() % 5;
        for (unsigned i = 0; i < count; ++i) {
            const std::string key = Pick(random, {"one", "two two", "x:y", "\xC3\xA4"});
            const std::string value = Pick(random, {"", "v", "a=b", "[s]", "#", "\xFF", "a\tb", "a\n", "b\\", "\x01"});
            if (entries.emplace(Folded(key), value).second) {
                given.emplace_back(key, value);
            }
        }
        ConfFile file(text);
        Sections expected = Content(Model(text));
        if (!file.SetSection(section, given, "    %s=%s\n")) {
            ASSERT_EQ(file.text(), text);
            continue;
        }
        ++written;
        expected[Folded(section)] = entries;
        if (entries.empty()) {
            expected.erase(Folded(section));
        }
        ASSERT_EQ(Content(Model(file.text())), expected) << testing::PrintToString(text);
    }
    EXPECT_GT(written, kTurns / 3);
}

TEST(ConfFileFuzz, AnyBytesAtAll) {
    Random random(kSeed + 4);
    int set = 0;
    for (int turn = 0; turn < kTurns; ++turn) {
        std::string text;
        const auto length = random() % 60;
        for (unsigned i = 0; i < length; ++i) {
            text += random() % 3 == 0 ? static_cast<char>(random() % 256) : "=\n\\[] #a"[random() % 8];
        }
        const std::string shown = testing::PrintToString(text);
        const Sections content = Content(Model(text));
        ASSERT_EQ(Read(ConfFile(text)), content) << shown;
        ConfFile file(text);
        file.Remove("global", "a");
        ASSERT_EQ(file.text(), Others(text, "global", "a")) << shown;
        file = ConfFile(text);
        if (file.Set("x", "a", "1")) {
            ++set;
            Sections expected = content;
            expected["x"]["a"] = "1";
            ASSERT_EQ(Content(Model(file.text())), expected) << shown;
        }
        file = ConfFile(text);
        if (file.SetSection("x", {{"a", "1"}}, "%s=%s\n")) {
            ++set;
            Sections expected = content;
            expected["x"] = {{"a", "1"}};
            ASSERT_EQ(Content(Model(file.text())), expected) << shown;
        }
    }
    EXPECT_GT(set, kTurns);
}

}  // namespace
