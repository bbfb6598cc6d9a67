#include "tests/appliance/core/conf_rules.h"

#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <fstream>
#include <iterator>
#include <vector>

#include "platform/core.h"
#include "tests/appliance/base/conf_model.h"

namespace conf_rules {

namespace {

using conf_model::Content;
using conf_model::Folded;
using conf_model::Keys;
using conf_model::Line;
using conf_model::Model;
using conf_model::Sections;

constexpr char kFormat[] = "    %s=%s\n";

class Hash {
public:
    Hash() : hash_(VLIBCSzHashAlloc(16)) {}
    ~Hash() {
        VLIBCSzHashFree(hash_);
    }
    Hash(const Hash&) = delete;
    Hash& operator=(const Hash&) = delete;
    VLIBSZHASH** address() {
        return &hash_;
    }
    VLIBSZHASH* get() const {
        return hash_;
    }

private:
    VLIBSZHASH* hash_;
};

void Put(const std::string& path, const std::string& content) {
    std::ofstream(path, std::ios::binary | std::ios::trunc) << content;
}

std::string Got(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(file), {});
}

std::string Stripped(const std::string& text) {
    constexpr const char* kBlanks = " \t\r\n\v\f";
    const std::size_t first = text.find_first_not_of(kBlanks);
    return first == std::string::npos ? "" : text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

bool HasControlByte(const std::string& text) {
    return std::any_of(text.begin(), text.end(), [](char letter) {
        const auto byte = static_cast<unsigned char>(letter);
        return byte < 0x20 || byte == 0x7F;
    });
}

bool EndsInBackslash(const std::string& text) {
    const std::string stripped = Stripped(text);
    return !stripped.empty() && stripped.back() == '\\';
}

// Without blanks and control bytes at odd places: what any line of a file can hold.
bool IsPlain(const std::string& key, const std::string& value) {
    const std::string name = Stripped(key);
    return !name.empty() && !HasControlByte(key) && !HasControlByte(value) && key.find('=') == std::string::npos &&
           std::string("#;[").find(name[0]) == std::string::npos && !EndsInBackslash(value);
}

// The bytes of all that is no key of the section.
std::string Around(const std::vector<Line>& lines, const std::string& section) {
    std::string around;
    for (const Line& line : lines) {
        if (line.section != section || line.key.empty()) {
            around += line.raw;
        }
    }
    return around;
}

std::string BrokenValue(const std::string& path, const Words& words, const Sections& content) {
    const auto global = content.find("global");
    const auto found = global == content.end() ? Keys::const_iterator() : global->second.find(Folded(words.key));
    const bool known = global != content.end() && found != global->second.end();
    // Of just this size, so that a byte behind it is noticed.
    std::vector<char> buffer(static_cast<std::size_t>(words.size), 'x');
    const int length = VLIBCFileGetKeyValue(path.c_str(), words.key.c_str(), buffer.data(), words.size, 0);
    if (!known || found->second.empty()) {
        return length == 0 ? "" : "an absent or empty key has no value";
    }
    const std::string cut = found->second.substr(0, static_cast<std::size_t>(words.size) - 1);
    if (std::memcmp(buffer.data(), cut.c_str(), cut.size() + 1) != 0) {
        return "a value is the last one of its key, cut to the buffer and ended by a NUL";
    }
    return length == static_cast<int>(std::strlen(cut.c_str())) ? "" : "the length is that of the text";
}

std::string BrokenSection(const std::string& path, const Words& words, const Keys& keys, Hash& hash) {
    if (VLIBCFileGetSection(path.c_str(), words.section.c_str(), hash.address()) != 0) {
        return "any section can be loaded";
    }
    for (const auto& [key, value] : keys) {
        const char* loaded = VLIBCSzHashGetValue(hash.get(), key.c_str());
        if (key.find('\0') == std::string::npos && (loaded == nullptr || std::strcmp(loaded, value.c_str()) != 0)) {
            return "every key of the section is loaded";
        }
    }
    if (keys.count(Folded(words.key)) == 0 && VLIBCSzHashGetValue(hash.get(), words.key.c_str()) != nullptr) {
        return "no other key is loaded";
    }
    return "";
}

std::string BrokenWrite(const std::string& path, const Words& words, const Hash& hash, const Sections& expected) {
    const std::vector<Line> before = Model(words.text);
    const std::string section = Folded(words.section);
    const bool written = VLIBCFileAddSection(path.c_str(), words.section.c_str(), hash.get(), kFormat) != 0;
    const std::string text = Got(path);
    if (!written) {
        const Keys& keys = expected.at(section);
        std::string letters = words.text;
        letters.erase(std::remove(letters.begin(), letters.end(), '\n'), letters.end());
        const bool plain = !HasControlByte(letters) &&
                           std::all_of(keys.begin(), keys.end(),
                                       [](const auto& entry) { return IsPlain(entry.first, entry.second); }) &&
                           IsPlain(words.key, words.value) && !section.empty() && !HasControlByte(words.section) &&
                           words.section.find(']') == std::string::npos && !EndsInBackslash(words.section) &&
                           !EndsInBackslash(words.text);
        if (plain) {
            return "what lines can hold is written";
        }
        return text == words.text ? "" : "what is refused changes nothing";
    }
    const std::vector<Line> after = Model(text);
    if (Content(after) != expected) {
        return "a written section holds what was given, and all others what they held";
    }
    const std::string around = Around(before, section);
    const std::string header = "[" + Stripped(words.section) + "]\n";
    for (const std::string& closed : {around, around + "\n"}) {
        if (conf_model::IsWith(Around(after, section), closed, header)) {
            return "";
        }
    }
    return "every other byte stays";
}

std::string BrokenRemoval(const std::string& path, const Words& words) {
    Put(path, words.text);
    if (VLIBCFileRemoveKey(path.c_str(), words.key.c_str()) != 0) {
        return "any key can be removed";
    }
    const std::string key = Folded(words.key);
    const std::string expected = key.empty() ? words.text : conf_model::Others(words.text, "global", key);
    return Got(path) == expected ? "" : "the lines of the key go, and no other byte";
}

std::string BrokenIn(const std::string& path, const Words& words) {
    Put(path, words.text);
    Sections content = Content(Model(words.text));
    std::string broken = BrokenValue(path, words, content);
    Hash hash;
    Keys& keys = content[Folded(words.section)];
    if (broken.empty()) {
        broken = BrokenSection(path, words, keys, hash);
    }
    if (broken.empty() && VLIBCSzHashSetValue(hash.address(), words.key.c_str(), words.value.c_str()) == 0) {
        keys[Folded(words.key)] = Stripped(words.value);
        broken = BrokenWrite(path, words, hash, content);
    }
    return broken.empty() ? BrokenRemoval(path, words) : broken;
}

}  // namespace

std::string Broken(const std::string& folder, const Words& words) {
    const std::string path = folder + "/file";
    const std::string broken = BrokenIn(path, words);
    unlink(path.c_str());
    return broken;
}

}  // namespace conf_rules
