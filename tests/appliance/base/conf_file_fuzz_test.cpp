// Generated configuration files, read and changed, against a model that is as plain as can be.

#include <gtest/gtest.h>

#include <cctype>
#include <map>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "appliance/base/conf_file.h"

using appliance::ConfFile;

namespace {

using Random = std::mt19937;
using Sections = std::map<std::string, std::map<std::string, std::string>>;

// Letters without blanks, in lower case.
std::string Folded(const std::string& text) {
    std::string folded;
    for (const char letter : text) {
        const auto byte = static_cast<unsigned char>(letter);
        if (byte > 0x7F || std::isspace(byte) == 0) {
            folded += byte > 0x7F ? letter : static_cast<char>(std::tolower(byte));
        }
    }
    return folded;
}

std::string Stripped(const std::string& text) {
    std::size_t begin = 0;
    std::size_t end = text.size();
    const auto isBlank = [&](std::size_t at) {
        const auto byte = static_cast<unsigned char>(text[at]);
        return byte <= 0x7F && std::isspace(byte) != 0;
    };
    while (begin < end && isBlank(begin)) {
        ++begin;
    }
    while (end > begin && isBlank(end - 1)) {
        --end;
    }
    return text.substr(begin, end - begin);
}

// Puts two pieces of a line together: blanks where they meet become one.
void Join(std::string& whole, const std::string& piece) {
    const std::string marked = "|" + whole;
    const bool gap = Stripped(marked) != marked || Stripped(piece + "|") != piece + "|";
    const std::string left = Stripped(marked).substr(1);
    const std::string right = Stripped(piece + "|");
    whole = left + (gap && !left.empty() ? " " : "") + right.substr(0, right.size() - 1);
}

// One line with its continuations, and to what it belongs; `key` is folded and empty for all that is no key.
struct ModelLine {
    std::string raw;
    std::string section;
    std::string key;
    std::string value;
};

std::vector<ModelLine> Model(const std::string& text) {
    std::vector<std::string> physical;
    for (std::size_t begin = 0; begin < text.size();) {
        std::size_t end = text.find('\n', begin);
        end = end == std::string::npos ? text.size() : end + 1;
        physical.push_back(text.substr(begin, end - begin));
        begin = end;
    }
    std::vector<ModelLine> lines;
    std::string section = "global";
    for (std::size_t i = 0; i < physical.size(); ++i) {
        ModelLine line;
        line.raw = physical[i];
        const std::string first = Stripped(physical[i]);
        const char mark = first.empty() ? '\0' : first[0];
        if (!first.empty() && mark != '#' && mark != ';') {
            std::string whole;
            bool continues = true;
            while (continues) {
                std::string piece = physical[i];
                const std::string stripped = Stripped(piece);
                continues = piece.back() == '\n' && !stripped.empty() && stripped.back() == '\\';
                if (continues) {
                    piece.erase(piece.rfind('\\'));
                }
                Join(whole, piece);
                if (continues && i + 1 == physical.size()) {
                    break;
                }
                if (continues) {
                    line.raw += physical[++i];
                }
            }
            whole = Stripped(whole);
            const std::size_t sign = whole.find('=');
            if (mark == '[') {
                const std::size_t close = whole.find(']');
                if (close != std::string::npos) {
                    section = Folded(whole.substr(1, close - 1));
                }
            } else if (sign != std::string::npos) {
                line.key = Folded(whole.substr(0, sign));
                line.value = Stripped(whole.substr(sign + 1));
            }
        }
        line.section = section;
        lines.push_back(line);
    }
    return lines;
}

Sections Content(const std::vector<ModelLine>& lines) {
    Sections sections;
    for (const ModelLine& line : lines) {
        if (!line.key.empty()) {
            sections[line.section][line.key] = line.value;
        }
    }
    return sections;
}

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

// All bytes that do not belong to a key.
std::string Others(const std::string& text, const std::string& section, const std::string& key) {
    std::string others;
    for (const ModelLine& line : Model(text)) {
        if (line.section != section || line.key != key) {
            others += line.raw;
        }
    }
    return others;
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

// Is `text` the other one, or that with `added` put in somewhere?
bool IsWith(const std::string& text, const std::string& other, const std::string& added) {
    if (text == other) {
        return true;
    }
    for (std::size_t at = text.find(added); at != std::string::npos; at = text.find(added, at + 1)) {
        if (text.substr(0, at) + text.substr(at + added.size()) == other) {
            return true;
        }
    }
    return false;
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
    for (int turn = 0; turn < kTurns; ++turn) {
        std::string text;
        const auto length = random() % 60;
        for (unsigned i = 0; i < length; ++i) {
            text += random() % 3 == 0 ? static_cast<char>(random() % 256) : "=\n\\[] #a"[random() % 8];
        }
        ConfFile file(text);
        Read(file);
        file.Set("global", "a", "1");
        file.SetSection("x", {{"a", "1"}}, "%s=%s\n");
        file.Remove("global", "a");
        EXPECT_FALSE(file.Get("global", "a").has_value()) << testing::PrintToString(text);
    }
}

}  // namespace
