#include "appliance/web/json_text.h"

#include <json/reader.h>
#include <json/writer.h>

#include <boost/algorithm/string/replace.hpp>
#include <cmath>
#include <cstddef>
#include <memory>

#include "appliance/web/limits.h"

namespace appliance {
namespace {

// Checks the grammar before the library builds the value, since the library takes more than the grammar allows. Each
// member moves behind what it has checked and answers whether it was right.
class Checker {
public:
    explicit Checker(std::string_view text) : text_(text) {}

    bool Check() {
        Blanks();
        const bool right = Value(0);
        Blanks();
        return right && place_ == text_.size();
    }
    bool TooDeep() const {
        return tooDeep_;
    }

private:
    char Next() const {
        return place_ < text_.size() ? text_[place_] : '\0';
    }
    bool Take(char letter) {
        const bool there = place_ < text_.size() && text_[place_] == letter;
        place_ += there ? 1 : 0;
        return there;
    }
    bool Word(std::string_view word) {
        const bool there = text_.substr(place_, word.size()) == word;
        place_ += there ? word.size() : 0;
        return there;
    }
    void Blanks() {
        while (Next() == ' ' || Next() == '\t' || Next() == '\n' || Next() == '\r') {
            ++place_;
        }
    }

    bool Value(int depth) {
        switch (Next()) {
            case '{':
                return Enter(depth) && Members('}', true, depth + 1);
            case '[':
                return Enter(depth) && Members(']', false, depth + 1);
            case '"':
                return String();
            case 't':
                return Word("true");
            case 'f':
                return Word("false");
            case 'n':
                return Word("null");
            default:
                return Number();
        }
    }

    bool Enter(int depth) {
        ++place_;
        tooDeep_ = tooDeep_ || depth >= kJsonDepth;
        return !tooDeep_;
    }

    bool Members(char close, bool named, int depth) {
        Blanks();
        if (Take(close)) {
            return true;
        }
        do {
            Blanks();
            if (named && !(String() && Colon())) {
                return false;
            }
            Blanks();
            if (!Value(depth)) {
                return false;
            }
            Blanks();
        } while (Take(','));
        return Take(close);
    }

    bool Colon() {
        Blanks();
        return Take(':');
    }

    bool Digits() {
        const std::size_t first = place_;
        while (Next() >= '0' && Next() <= '9') {
            ++place_;
        }
        return place_ > first;
    }

    bool Number() {
        Take('-');
        if (!Take('0') && !Digits()) {
            return false;
        }
        if (Take('.') && !Digits()) {
            return false;
        }
        if (Take('e') || Take('E')) {
            Take('+') || Take('-');
            return Digits();
        }
        return true;
    }

    bool String() {
        if (!Take('"')) {
            return false;
        }
        while (place_ < text_.size()) {
            const auto byte = static_cast<unsigned char>(text_[place_]);
            if (byte == '"') {
                ++place_;
                return true;
            }
            if (byte < 0x20 || !(byte == '\\' ? Escape() : Character(byte))) {
                return false;
            }
        }
        return false;
    }

    bool Escape() {
        ++place_;
        constexpr std::string_view kSimple = "\"\\/bfnrt";
        if (Next() != '\0' && kSimple.find(Next()) != std::string_view::npos) {
            ++place_;
            return true;
        }
        unsigned unit = 0;
        if (!Unit(unit) || (unit >= 0xDC00 && unit < 0xE000)) {
            return false;
        }
        if (unit < 0xD800 || unit >= 0xE000) {
            return true;
        }
        unsigned low = 0;
        return Take('\\') && Unit(low) && low >= 0xDC00 && low < 0xE000;
    }

    bool Unit(unsigned& unit) {
        if (!Take('u')) {
            return false;
        }
        for (int digit = 0; digit < 4; ++digit, ++place_) {
            const char letter = Next();
            if (letter >= '0' && letter <= '9') {
                unit = unit * 16 + static_cast<unsigned>(letter - '0');
            } else if (letter >= 'a' && letter <= 'f') {
                unit = unit * 16 + static_cast<unsigned>(letter - 'a' + 10);
            } else if (letter >= 'A' && letter <= 'F') {
                unit = unit * 16 + static_cast<unsigned>(letter - 'A' + 10);
            } else {
                return false;
            }
        }
        return true;
    }

    // One character in UTF-8: no overlong form, no surrogate, nothing above U+10FFFF.
    bool Character(unsigned char first) {
        ++place_;
        if (first < 0x80) {
            return true;
        }
        if (first < 0xC2 || first > 0xF4) {
            return false;
        }
        unsigned char lowest = 0x80;
        unsigned char highest = 0xBF;
        if (first == 0xE0) {
            lowest = 0xA0;
        } else if (first == 0xF0) {
            lowest = 0x90;
        } else if (first == 0xED) {
            highest = 0x9F;
        } else if (first == 0xF4) {
            highest = 0x8F;
        }
        const int more = first < 0xE0 ? 1 : first < 0xF0 ? 2 : 3;
        for (int index = 0; index < more; ++index, ++place_) {
            const auto byte = static_cast<unsigned char>(Next());
            if (byte < lowest || byte > highest) {
                return false;
            }
            lowest = 0x80;
            highest = 0xBF;
        }
        return true;
    }

    std::string_view text_;
    std::size_t place_ = 0;
    bool tooDeep_ = false;
};

bool AllFinite(const Json::Value& value) {
    if (value.isDouble()) {
        return std::isfinite(value.asDouble());
    }
    for (const Json::Value& member : value) {
        if (!AllFinite(member)) {
            return false;
        }
    }
    return true;
}

bool Parse(std::string_view text, bool refuseDuplicates, Json::Value& value) {
    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    builder["rejectDupKeys"] = refuseDuplicates;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    return reader->parse(text.data(), text.data() + text.size(), &value, nullptr);
}

}  // namespace

std::optional<ServerCode> ReadParameters(std::string_view text, Json::Value& parameters) {
    parameters = Json::Value(Json::objectValue);
    if (text.empty()) {
        return std::nullopt;
    }
    Checker checker(text);
    if (!checker.Check()) {
        return checker.TooDeep() ? ServerCode::JsonTooDeep : ServerCode::BadJson;
    }
    if (text[text.find_first_not_of(" \t\r\n")] != '{') {
        return ServerCode::NoObject;
    }
    if (!Parse(text, true, parameters)) {
        Json::Value ignored;
        return Parse(text, false, ignored) ? ServerCode::DuplicateKey : ServerCode::BadJson;
    }
    return AllFinite(parameters) ? std::nullopt : std::optional(ServerCode::BadJson);
}

std::string WriteJson(const Json::Value& value) {
    // Not one builder for all threads: it is cheap, and writing through a shared one is not promised to be safe.
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    // The library escapes every control byte but DEL, which can stand in a text only.
    return boost::replace_all_copy(Json::writeString(builder, value), "\x7F", "\\u007f");
}

}  // namespace appliance
