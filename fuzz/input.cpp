#include "fuzz/input.h"

namespace fuzz {

Input::Input(const std::uint8_t* data, std::size_t size) : front_(data), end_(data + size) {}

std::uint8_t Input::FrontByte() {
    return front_ == end_ ? std::uint8_t{0} : *front_++;
}

std::uint8_t Input::BackByte() {
    return front_ == end_ ? std::uint8_t{0} : *--end_;
}

int Input::BackInt() {
    const std::uint8_t byte = BackByte();
    if (byte < 0xF0) {
        return static_cast<std::int8_t>(byte);
    }
    std::uint32_t number = 0;
    for (int i = 0; i < 4; ++i) {
        number = number << 8U | BackByte();
    }
    return static_cast<int>(number);
}

bool Input::BackBool() {
    return (BackByte() & 1U) != 0;
}

std::string Input::BackText(const std::vector<std::string>& known, std::size_t most) {
    const std::uint8_t choice = BackByte();
    if (choice < known.size()) {
        return known[choice];
    }
    std::string text;
    for (std::size_t length = choice % (most + 1); text.size() < length;) {
        const auto byte = static_cast<char>(BackByte());
        if (byte == '\0') {
            break;  // the platform's texts end there
        }
        text += byte;
    }
    return text;
}

std::vector<std::optional<std::string>> Input::BackTexts(const std::vector<std::string>& known) {
    std::vector<std::optional<std::string>> texts(BackByte() % 8U);
    for (auto& text : texts) {
        if (!BackBool()) {
            text = BackText(known);
        }
    }
    return texts;
}

}  // namespace fuzz
