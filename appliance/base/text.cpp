#include "appliance/base/text.h"

#include <algorithm>
#include <cstring>

namespace appliance {

namespace {

constexpr std::string_view kBlanks = " \t\r\n";
constexpr std::size_t kLongestDnsName = 253;
constexpr std::size_t kLongestDnsLabel = 63;
constexpr std::size_t kLongestNetbiosName = 15;
constexpr std::size_t kLongestAccountName = 256;

char UpperLetter(char letter) {
    return letter >= 'a' && letter <= 'z' ? static_cast<char>(letter - 'a' + 'A') : letter;
}

char LowerLetter(char letter) {
    return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
}

bool IsControlByte(char letter) {
    const auto byte = static_cast<unsigned char>(letter);
    return byte < 0x20 || byte == 0x7F;
}

bool IsDnsLetter(char letter) {
    const char lower = LowerLetter(letter);
    return (lower >= 'a' && lower <= 'z') || (letter >= '0' && letter <= '9') || letter == '-' || letter == '_';
}

}  // namespace

std::vector<std::string> Split(std::string_view text, std::string_view separator) {
    std::vector<std::string> pieces;
    if (text.empty()) {
        return pieces;
    }
    if (separator.empty()) {
        pieces.emplace_back(text);
        return pieces;
    }
    std::size_t begin = 0;
    for (;;) {
        const std::size_t end = text.find(separator, begin);
        pieces.emplace_back(text.substr(begin, end - begin));
        if (end == std::string_view::npos) {
            return pieces;
        }
        begin = end + separator.size();
    }
}

std::vector<std::string> Lines(std::string_view text) {
    std::vector<std::string> lines;
    std::size_t begin = 0;
    while (begin < text.size()) {
        const std::size_t newline = text.find('\n', begin);
        std::string_view line = text.substr(begin, newline - begin);
        if (newline != std::string_view::npos && !line.empty() && line.back() == '\r') {
            line.remove_suffix(1);
        }
        lines.emplace_back(line);
        if (newline == std::string_view::npos) {
            break;
        }
        begin = newline + 1;
    }
    return lines;
}

std::string Trim(std::string_view text) {
    const std::size_t first = text.find_first_not_of(kBlanks);
    if (first == std::string_view::npos) {
        return {};
    }
    return std::string(text.substr(first, text.find_last_not_of(kBlanks) - first + 1));
}

std::string Upper(std::string_view text) {
    std::string upper(text);
    std::transform(upper.begin(), upper.end(), upper.begin(), UpperLetter);
    return upper;
}

std::string Lower(std::string_view text) {
    std::string lower(text);
    std::transform(lower.begin(), lower.end(), lower.begin(), LowerLetter);
    return lower;
}

bool EqualIgnoringCase(std::string_view first, std::string_view second) {
    return first.size() == second.size() &&
           std::equal(first.begin(), first.end(), second.begin(),
                      [](char one, char other) { return LowerLetter(one) == LowerLetter(other); });
}

bool StartsWith(std::string_view text, std::string_view beginning) {
    return text.substr(0, beginning.size()) == beginning;
}

bool Contains(std::string_view text, std::string_view part) {
    return text.find(part) != std::string_view::npos;
}

bool HasControlBytes(std::string_view text) {
    return std::any_of(text.begin(), text.end(), IsControlByte);
}

bool IsDnsName(std::string_view text) {
    if (text.empty() || text.size() > kLongestDnsName) {
        return false;
    }
    std::size_t label = 0;  // bytes of the label so far
    for (const char letter : text) {
        if (letter == '.') {
            if (label == 0) {
                return false;
            }
            label = 0;
        } else if (!IsDnsLetter(letter) || (label == 0 && letter == '-') || ++label > kLongestDnsLabel) {
            return false;
        }
    }
    return label > 0;
}

bool IsNetbiosName(std::string_view text) {
    return !text.empty() && text.size() <= kLongestNetbiosName && text.front() != '.' && text.front() != '-' &&
           text.front() != ' ' && text.back() != ' ' && !HasControlBytes(text) &&
           text.find_first_of("\\/:*?\"<>|") == std::string_view::npos;
}

bool IsAccountName(std::string_view text) {
    return !text.empty() && text.size() <= kLongestAccountName && text.front() != '-' && !HasControlBytes(text);
}

bool CopyToBuffer(std::string_view text, char* buffer, int size) {
    if (buffer == nullptr || size <= 0) {
        return false;
    }
    const std::size_t length = std::min(text.size(), static_cast<std::size_t>(size) - 1);
    if (length > 0) {
        std::memcpy(buffer, text.data(), length);
    }
    buffer[length] = '\0';
    return true;
}

}  // namespace appliance
