#include "appliance/platform/system/event_text.h"

#include <cstddef>
#include <cstdio>

namespace appliance {

namespace {

unsigned Byte(std::string_view text, std::size_t place) {
    return static_cast<unsigned char>(text[place]);
}

// The length of the UTF-8 character that begins at `place`; 0 when none does. A character of several bytes that is a
// control character, half of a pair, too long for its number or beyond the last one is none.
std::size_t CharacterLength(std::string_view text, std::size_t place) {
    const unsigned lead = Byte(text, place);
    if (lead < 0x80) {
        return lead < 0x20 || lead == 0x7F ? 0 : 1;
    }
    const std::size_t length = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
    if (lead < 0xC2 || lead > 0xF4 || text.size() - place < length) {
        return 0;
    }
    unsigned number = lead & (0x7FU >> length);
    for (std::size_t offset = 1; offset < length; ++offset) {
        const unsigned byte = Byte(text, place + offset);
        if ((byte & 0xC0U) != 0x80) {
            return 0;
        }
        number = number << 6U | (byte & 0x3FU);
    }
    constexpr unsigned kLeast[] = {0, 0, 0xA0, 0x800, 0x10000};
    const bool half = number >= 0xD800 && number <= 0xDFFF;
    return number < kLeast[length] || half || number > 0x10FFFF ? 0 : length;
}

// `digits` hexadecimal digits in capitals.
std::string Hexadecimal(unsigned number, int digits) {
    char text[16];
    std::snprintf(text, sizeof(text), "%0*X", digits, number);
    return text;
}

}  // namespace

std::string Shown(std::string_view text) {
    std::string shown;
    for (std::size_t place = 0; place < text.size();) {
        const std::size_t length = CharacterLength(text, place);
        if (length == 0) {
            shown += "\\x" + Hexadecimal(Byte(text, place), 2);
            ++place;
        } else {
            shown += text.substr(place, length);
            place += length;
        }
    }
    return shown;
}

std::string EventText(int code, const EventArguments& arguments) {
    switch (code) {
        case kEventJoinedDomain:
            return "The appliance joined the domain " + Shown(arguments[0]) + ".";
        case kEventBackToWorkgroup:
            return "The appliance left its domain and is back in the workgroup " + Shown(arguments[0]) + ".";
        default:
            break;
    }
    std::size_t count = arguments.size();
    while (count > 0 && arguments[count - 1].empty()) {
        --count;
    }
    std::string text = "event 0x" + Hexadecimal(static_cast<unsigned>(code), 8);
    for (std::size_t place = 0; place < count; ++place) {
        text += (place == 0 ? ": \"" : ", \"") + Shown(arguments[place]) + "\"";
    }
    return text;
}

std::string EventKindName(int kind) {
    return kind == kKindDomain ? "domain" : "kind " + std::to_string(kind);
}

std::string EventLevelName(int level) {
    return level == kLevelInformation ? "information" : "level " + std::to_string(level);
}

}  // namespace appliance
