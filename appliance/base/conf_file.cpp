#include "appliance/base/conf_file.h"

#include <algorithm>
#include <unordered_map>
#include <unordered_set>

#include "appliance/base/conf_lines.h"
#include "appliance/base/file.h"
#include "appliance/base/text.h"

namespace appliance {

namespace {

using ConfEntries = std::vector<std::pair<std::string, std::string>>;

constexpr std::string_view kGlobal = "global";
constexpr std::string_view kIndentation = "    ";

bool IsGlobal(std::string_view section) {
    return SameKey(section, kGlobal);
}

bool IsWritableSection(std::string_view section) {
    return !KeyIdentity(section).empty() && !HasControlBytes(section) && !Contains(section, "]") &&
           section.back() != '\\';
}

bool IsEntryOf(const ConfLine& line, std::string_view section) {
    return line.kind == ConfLine::Kind::Entry && SameKey(line.section, section);
}

// What stands around the key and the value of a line that is written.
struct Style {
    std::string indentation;
    std::string separator = "=";
};

Style StyleOf(const std::string& text, const ConfLine& line) {
    Style style;
    const std::string_view raw = std::string_view(text).substr(line.begin, line.end - line.begin);
    style.indentation = raw.substr(0, raw.find_first_not_of(" \t"));
    // A separator that is spread over several lines is not worth imitating.
    const std::size_t sign = raw.find('=');
    const std::string_view before = raw.substr(0, sign);
    if (before.find('\n') == std::string_view::npos) {
        const std::size_t begin = before.find_last_not_of(" \t") + 1;
        const std::size_t end = raw.find_first_not_of(" \t", sign + 1);
        style.separator = raw.substr(begin, end - begin);
    }
    return style;
}

// "\r\n" or "\n"; empty when the line is the last one and has no end.
std::string_view EndOfLine(const std::string& text, const ConfLine& line) {
    const std::string_view raw = std::string_view(text).substr(line.begin, line.end - line.begin);
    if (raw.empty() || raw.back() != '\n') {
        return {};
    }
    return raw.size() > 1 && raw[raw.size() - 2] == '\r' ? std::string_view("\r\n") : std::string_view("\n");
}

std::string LineOf(const Style& style, std::string_view key, std::string_view value) {
    std::string line = style.indentation;
    line += key;
    line += style.separator;
    line += value;
    return line;
}

// The last physical line ends in a backslash, blanks after it or not, and is no comment.
bool EndsInBackslash(const std::string& text, const std::vector<ConfLine>& lines) {
    if (lines.empty() || lines.back().kind == ConfLine::Kind::Comment) {
        return false;
    }
    const std::size_t newline = text.size() < 2 ? std::string::npos : text.rfind('\n', text.size() - 2);
    const std::string_view last = TrimConf(std::string_view(text).substr(newline + 1));
    return !last.empty() && last.back() == '\\';
}

// False for a text that must stay as it ends: without a line feed behind it a last backslash is part of its value, and
// would not be one with more behind it.
bool CanGrow(const std::string& text, const std::vector<ConfLine>& lines) {
    return !EndsInBackslash(text, lines) || text.back() == '\n';
}

// What has to stand behind the text so that the next byte begins a line of its own.
std::string_view Closing(const std::string& text, const std::vector<ConfLine>& lines) {
    const bool isOpen = !text.empty() && text.back() != '\n';
    return isOpen || EndsInBackslash(text, lines) ? "\n" : "";
}

// The format's pieces around the key and the value; nothing when it is not a format of whole lines.
std::optional<std::vector<std::string>> PiecesOf(std::string_view format) {
    std::vector<std::string> pieces(1);
    for (std::size_t at = 0; at < format.size(); ++at) {
        if (format[at] != '%') {
            pieces.back() += format[at];
        } else if (++at < format.size() && format[at] == 's') {
            pieces.emplace_back();
        } else if (at < format.size() && format[at] == '%') {
            pieces.back() += '%';
        } else {
            return std::nullopt;
        }
    }
    if (pieces.size() != 3 || pieces[2].empty() || pieces[2].back() != '\n') {
        return std::nullopt;
    }
    pieces[2].pop_back();
    if (HasControlBytes(pieces[0] + pieces[1] + pieces[2])) {
        return std::nullopt;
    }
    return pieces;
}

// What a section holds when it is read, against what was put into it.
bool HoldsAsGiven(const ConfEntries& read, const ConfEntries& given, const std::vector<std::string>& pieces) {
    const std::size_t sign = pieces[1].find('=');
    if (read.size() != given.size() || sign == std::string::npos) {
        return false;
    }
    const std::string inFront = pieces[1].substr(sign + 1);
    return std::equal(read.begin(), read.end(), given.begin(), [&](const auto& one, const auto& other) {
        return one.first == TrimConf(other.first) && one.second == TrimConf(inFront + other.second + pieces[2]);
    });
}

}  // namespace

bool SameKey(std::string_view first, std::string_view second) {
    std::size_t at = 0;
    std::size_t other = 0;
    for (;;) {
        while (at < first.size() && IsConfBlank(first[at])) {
            ++at;
        }
        while (other < second.size() && IsConfBlank(second[other])) {
            ++other;
        }
        if (at == first.size() || other == second.size()) {
            return at == first.size() && other == second.size();
        }
        if (!EqualIgnoringCase(first.substr(at++, 1), second.substr(other++, 1))) {
            return false;
        }
    }
}

std::string KeyIdentity(std::string_view name) {
    std::string identity = Lower(name);
    identity.erase(std::remove_if(identity.begin(), identity.end(), IsConfBlank), identity.end());
    return identity;
}

bool IsWritableKey(std::string_view key) {
    const std::string trimmed(TrimConf(key));
    return !trimmed.empty() && !HasControlBytes(key) && !Contains(key, "=") && !Contains("#;[", trimmed.substr(0, 1));
}

bool IsWritableValue(std::string_view value) {
    const std::string_view trimmed = TrimConf(value);
    return !HasControlBytes(value) && (trimmed.empty() || trimmed.back() != '\\');
}

std::error_code ConfFile::Load(const std::string& path, ConfFile& file, bool mayBeMissing) {
    std::string text;
    const std::error_code error = ReadFile(path, text);
    if (error && !(mayBeMissing && error == std::errc::no_such_file_or_directory)) {
        return error;
    }
    file.text_ = std::move(text);
    return {};
}

std::error_code ConfFile::Save(const std::string& path, mode_t mode) const {
    return ReplaceFile(path, text_, mode);
}

std::optional<std::string> ConfFile::Get(std::string_view section, std::string_view key) const {
    std::optional<std::string> value;
    for (ConfLine& line : ConfLines(text_)) {
        if (IsEntryOf(line, section) && SameKey(line.key, key)) {
            value = std::move(line.value);
        }
    }
    return value;
}

std::vector<std::pair<std::string, std::string>> ConfFile::Section(std::string_view section) const {
    std::vector<std::pair<std::string, std::string>> entries;
    std::unordered_map<std::string, std::size_t> places;
    for (ConfLine& line : ConfLines(text_)) {
        if (!IsEntryOf(line, section)) {
            continue;
        }
        const auto [place, isNew] = places.emplace(KeyIdentity(line.key), entries.size());
        if (isNew) {
            entries.emplace_back(std::move(line.key), std::move(line.value));
        } else {
            entries[place->second].second = std::move(line.value);
        }
    }
    return entries;
}

std::vector<std::string> ConfFile::Sections() const {
    std::vector<std::string> names;
    std::unordered_set<std::string> known;
    for (ConfLine& line : ConfLines(text_)) {
        const bool counts = line.kind == ConfLine::Kind::Header || line.kind == ConfLine::Kind::Entry;
        if (counts && known.insert(KeyIdentity(line.section)).second) {
            names.push_back(std::move(line.section));
        }
    }
    return names;
}

bool ConfFile::Set(std::string_view section, std::string_view key, std::string_view value) {
    if (!IsWritableSection(section) || !IsWritableKey(key) || !IsWritableValue(value)) {
        return false;
    }
    key = TrimConf(key);
    value = TrimConf(value);
    const std::vector<ConfLine> lines = ConfLines(text_);
    std::vector<const ConfLine*> same;
    for (const ConfLine& line : lines) {
        if (IsEntryOf(line, section) && SameKey(line.key, key)) {
            same.push_back(&line);
        }
    }
    if (same.empty()) {
        return Add(lines, section, key, value);
    }
    const ConfLine& last = *same.back();
    if (last.value != value) {
        const std::string line = LineOf(StyleOf(text_, last), last.key, value) + std::string(EndOfLine(text_, last));
        text_.replace(last.begin, last.end - last.begin, line);
    }
    for (std::size_t i = same.size() - 1; i-- > 0;) {
        text_.erase(same[i]->begin, same[i]->end - same[i]->begin);
    }
    return true;
}

bool ConfFile::Add(const std::vector<ConfLine>& lines, std::string_view section, std::string_view key,
                   std::string_view value) {
    const ConfLine* lastOwn = nullptr;      // the line of the section behind which the new one goes
    const ConfLine* firstHeader = nullptr;  // of any section
    for (const ConfLine& line : lines) {
        const bool isHeader = line.kind == ConfLine::Kind::Header;
        if (isHeader && firstHeader == nullptr) {
            firstHeader = &line;
        }
        if ((isHeader || line.kind == ConfLine::Kind::Entry) && SameKey(line.section, section)) {
            lastOwn = &line;
        }
    }
    Style style;
    if (lastOwn != nullptr && lastOwn->kind == ConfLine::Kind::Entry) {
        style = StyleOf(text_, *lastOwn);
    } else if (firstHeader != nullptr || !IsGlobal(section)) {
        style.indentation = kIndentation;
    }
    std::string line = LineOf(style, key, value) + "\n";
    std::size_t place = text_.size();
    if (lastOwn != nullptr) {
        place = lastOwn->end;
        if (place == text_.size() && !CanGrow(text_, lines) && lastOwn->kind == ConfLine::Kind::Entry) {
            place = lastOwn->begin;
        }
    } else if (!IsGlobal(section)) {
        line = "[" + std::string(TrimConf(section)) + "]\n" + line;
    } else if (firstHeader != nullptr) {
        place = firstHeader->begin;
        line = "[global]\n" + line;
    }
    if (place == text_.size()) {
        if (!CanGrow(text_, lines)) {
            return false;
        }
        line.insert(0, Closing(text_, lines));
    }
    text_.insert(place, line);
    return true;
}

bool ConfFile::SetSection(std::string_view section, const std::vector<std::pair<std::string, std::string>>& entries,
                          std::string_view format) {
    const auto pieces = PiecesOf(format);
    if (!pieces || !IsWritableSection(section)) {
        return false;
    }
    std::string block;
    for (const auto& [key, value] : entries) {
        if (!IsWritableKey(key) || !IsWritableValue(value)) {
            return false;
        }
        block += (*pieces)[0] + key + (*pieces)[1] + value + (*pieces)[2] + "\n";
    }
    const std::vector<ConfLine> lines = ConfLines(text_);
    const ConfLine* place = nullptr;  // the section's first entry, else its last header
    for (const ConfLine& line : lines) {
        if (IsEntryOf(line, section)) {
            place = &line;
            break;
        }
        if (line.kind == ConfLine::Kind::Header && SameKey(line.section, section)) {
            place = &line;
        }
    }
    if (place == nullptr) {
        block.insert(0, "[" + std::string(TrimConf(section)) + "]\n");
    }
    std::string text;
    text.reserve(text_.size() + block.size());
    if (place == nullptr && IsGlobal(section)) {
        text += block;
    }
    for (const ConfLine& line : lines) {
        if (!IsEntryOf(line, section)) {
            text.append(text_, line.begin, line.end - line.begin);
        }
        if (&line == place) {
            text += text.empty() || text.back() == '\n' ? "" : "\n";
            text += block;
        }
    }
    if (place == nullptr && !IsGlobal(section)) {
        if (!CanGrow(text_, lines)) {
            return false;
        }
        text += Closing(text_, lines);
        text += block;
    }
    // Whatever could go wrong with a format, a key or a value shows when the text is read again.
    ConfFile result(std::move(text));
    if (!HoldsAsGiven(result.Section(section), entries, *pieces)) {
        return false;
    }
    text_ = std::move(result.text_);
    return true;
}

bool ConfFile::Remove(std::string_view section, std::string_view key) {
    const std::vector<ConfLine> lines = ConfLines(text_);
    bool removed = false;
    for (std::size_t i = lines.size(); i-- > 0;) {
        if (IsEntryOf(lines[i], section) && SameKey(lines[i].key, key)) {
            text_.erase(lines[i].begin, lines[i].end - lines[i].begin);
            removed = true;
        }
    }
    return removed;
}

}  // namespace appliance
