// Texts on a terminal: what is shown of them, how wide they are, where they are broken.

#include <clocale>
#include <cstdint>
#include <cwchar>

#include "appliance/tools/vornctl/output.h"

namespace appliance::ctl {

namespace {

struct Character {
    std::uint32_t point = 0;
    std::size_t size = 0;  // bytes; 0: not UTF-8 here
};

// The character at the beginning of a text that is not empty.
Character Decode(std::string_view text) {
    const auto byte = [text](std::size_t i) -> std::uint32_t {
        return i < text.size() ? static_cast<unsigned char>(text[i]) : 0;
    };
    const std::uint32_t lead = byte(0);
    if (lead < 0x80) {
        return {lead, 1};
    }
    const std::size_t size = lead >= 0xC2 && lead <= 0xDF   ? 2
                             : lead >= 0xE0 && lead <= 0xEF ? 3
                             : lead >= 0xF0 && lead <= 0xF4 ? 4
                                                            : 0;
    std::uint32_t point = size == 2 ? lead & 0x1F : size == 3 ? lead & 0x0F : lead & 0x07;
    for (std::size_t i = 1; i < size; ++i) {
        if ((byte(i) & 0xC0) != 0x80) {
            return {};
        }
        point = point << 6 | (byte(i) & 0x3F);
    }
    const bool tooLong = (size == 3 && point < 0x800) || (size == 4 && point < 0x10000);
    const bool surrogate = point >= 0xD800 && point <= 0xDFFF;
    if (size == 0 || tooLong || surrogate || point > 0x10FFFF) {
        return {};
    }
    return {point, size};
}

// Characters that show nothing themselves or change how others are shown.
bool IsHidden(std::uint32_t point) {
    return (point >= 0x80 && point <= 0x9F) || point == 0xAD || point == 0x61C ||
           (point >= 0x200B && point <= 0x200F) || (point >= 0x2028 && point <= 0x202E) ||
           (point >= 0x2060 && point <= 0x206F) || point == 0xFEFF || (point >= 0xFFF9 && point <= 0xFFFB) ||
           (point >= 0xE0000 && point <= 0xE007F);
}

std::string Hexadecimal(std::uint32_t value, int digits) {
    char text[16];
    std::snprintf(text, sizeof(text), "%0*X", digits, value);
    return text;
}

// Columns of one character, by the C library's tables whatever the locale of the caller.
std::size_t CharacterColumns(std::uint32_t point) {
    if (point < 0x300) {
        return 1;
    }
    static const locale_t locale = newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
    if (locale == nullptr) {
        return 1;
    }
    const locale_t old = uselocale(locale);
    const int columns = wcwidth(static_cast<wchar_t>(point));
    uselocale(old);
    return columns < 0 ? 1 : static_cast<std::size_t>(columns);
}

}  // namespace

std::string Escape(std::string_view text) {
    std::string shown;
    shown.reserve(text.size());
    while (!text.empty()) {
        const Character character = Decode(text);
        if (character.size == 0 || character.point < 0x20 || character.point == 0x7F) {
            shown += "\\x" + Hexadecimal(static_cast<unsigned char>(text[0]), 2);
            text.remove_prefix(1);
        } else if (IsHidden(character.point)) {
            shown += "\\u{" + Hexadecimal(character.point, 4) + "}";
            text.remove_prefix(character.size);
        } else {
            shown += text.substr(0, character.size);
            text.remove_prefix(character.size);
        }
    }
    return shown;
}

bool IsUtf8(std::string_view text) {
    while (!text.empty()) {
        const Character character = Decode(text);
        if (character.size == 0) {
            return false;
        }
        text.remove_prefix(character.size);
    }
    return true;
}

std::size_t Columns(std::string_view text) {
    std::size_t columns = 0;
    while (!text.empty()) {
        const Character character = Decode(text);
        columns += character.size == 0 ? 1 : CharacterColumns(character.point);
        text.remove_prefix(character.size == 0 ? 1 : character.size);
    }
    return columns;
}

std::vector<std::string> Wrap(std::string_view text, std::size_t width) {
    std::vector<std::string> lines;
    while (!text.empty()) {
        std::size_t end = 0;        // of the line, in bytes
        std::size_t columns = 0;    // up to there
        std::size_t lastBlank = 0;  // where it may be broken
        while (end < text.size()) {
            const Character character = Decode(text.substr(end));
            const std::size_t size = character.size == 0 ? 1 : character.size;
            const std::size_t more = character.size == 0 ? 1 : CharacterColumns(character.point);
            if (columns + more > width && end > 0) {
                break;
            }
            if (text[end] == ' ') {
                lastBlank = end;
            }
            columns += more;
            end += size;
        }
        if (end < text.size() && text[end] != ' ' && lastBlank > 0) {
            end = lastBlank;
        }
        lines.emplace_back(text.substr(0, end));
        text.remove_prefix(end);
        while (!text.empty() && text[0] == ' ') {
            text.remove_prefix(1);
        }
    }
    return lines;
}

}  // namespace appliance::ctl
