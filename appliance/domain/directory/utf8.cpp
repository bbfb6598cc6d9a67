#include "appliance/domain/directory/utf8.h"

#include <locale.h>
#include <wctype.h>

#include <cstdint>
#include <cstdlib>

#include "appliance/base/text.h"

namespace appliance {

namespace {

constexpr std::size_t kLongestName = 256;

// One character at `place`, which moves behind it. Where there is none, `place` moves one byte and `valid` is false.
std::uint32_t NextCharacter(std::string_view text, std::size_t& place, bool& valid) {
    const auto byte = [&text](std::size_t at) { return static_cast<unsigned char>(text[at]); };
    const std::uint32_t first = byte(place);
    std::size_t length = 1;
    std::uint32_t character = first;
    std::uint32_t smallest = 0;
    if (first >= 0xF0 && first <= 0xF4) {
        length = 4;
        character = first & 0x07;
        smallest = 0x10000;
    } else if (first >= 0xE0 && first <= 0xEF) {
        length = 3;
        character = first & 0x0F;
        smallest = 0x800;
    } else if (first >= 0xC2 && first <= 0xDF) {
        length = 2;
        character = first & 0x1F;
        smallest = 0x80;
    }
    valid = first < 0x80 || length > 1;
    if (place + length > text.size()) {
        valid = false;
    }
    for (std::size_t next = 1; valid && next < length; ++next) {
        valid = (byte(place + next) & 0xC0) == 0x80;
        character = (character << 6) | (byte(place + next) & 0x3Fu);
    }
    valid = valid && character >= smallest && character <= 0x10FFFF && (character < 0xD800 || character > 0xDFFF);
    place += valid ? length : 1;
    return valid ? character : first;
}

void Append(std::string& text, std::uint32_t character) {
    const auto add = [&text](std::uint32_t byte) { text += static_cast<char>(static_cast<unsigned char>(byte)); };
    if (character < 0x80) {
        add(character);
    } else if (character < 0x800) {
        add(0xC0 | (character >> 6));
        add(0x80 | (character & 0x3F));
    } else if (character < 0x10000) {
        add(0xE0 | (character >> 12));
        add(0x80 | ((character >> 6) & 0x3F));
        add(0x80 | (character & 0x3F));
    } else {
        add(0xF0 | (character >> 18));
        add(0x80 | ((character >> 12) & 0x3F));
        add(0x80 | ((character >> 6) & 0x3F));
        add(0x80 | (character & 0x3F));
    }
}

bool IsControl(std::uint32_t character) {
    return character < 0x20 || (character >= 0x7F && character <= 0x9F);
}

// The C library's own table of letters, whatever the process's locale. Made once and kept.
std::uint32_t LowerCase(std::uint32_t character) {
    static const locale_t unicode = newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
    if (character < 0x80 || unicode == nullptr) {
        return character >= 'A' && character <= 'Z' ? character + ('a' - 'A') : character;
    }
    return towlower_l(character, unicode);
}

}  // namespace

bool IsUtf8(std::string_view text) {
    bool valid = true;
    for (std::size_t place = 0; valid && place < text.size();) {
        NextCharacter(text, place, valid);
    }
    return valid;
}

std::string FoldCase(std::string_view text) {
    std::string folded;
    folded.reserve(text.size());
    for (std::size_t place = 0; place < text.size();) {
        const std::size_t start = place;
        bool valid = false;
        const std::uint32_t character = NextCharacter(text, place, valid);
        if (valid) {
            Append(folded, LowerCase(character));
        } else {
            folded += text[start];
        }
    }
    return folded;
}

std::string CleanText(std::string_view text) {
    std::string clean;
    clean.reserve(text.size());
    for (std::size_t place = 0; place < text.size();) {
        bool valid = false;
        const std::uint32_t character = NextCharacter(text, place, valid);
        if (!valid) {
            clean += '?';
        } else if (IsControl(character)) {
            clean += ' ';
        } else {
            Append(clean, character);
        }
    }
    return Trim(clean);
}

bool IsListableName(std::string_view text) {
    if (text.empty() || text.size() > kLongestName) {
        return false;
    }
    for (std::size_t place = 0; place < text.size();) {
        bool valid = false;
        const std::uint32_t character = NextCharacter(text, place, valid);
        if (!valid || IsControl(character)) {
            return false;
        }
    }
    return true;
}

}  // namespace appliance
