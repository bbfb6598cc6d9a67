// The bytes of a fuzz input, read from both ends: the request from the front, the appliance's answers from the back, so
// that a change of the one leaves the other as it was. Past the end everything is zero.

#ifndef VORN_FUZZ_INPUT_H
#define VORN_FUZZ_INPUT_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace fuzz {

class Input {
public:
    Input(const std::uint8_t* data, std::size_t size);

    std::uint8_t FrontByte();
    std::uint8_t BackByte();

    // Small numbers most often, any int sometimes.
    int BackInt();
    bool BackBool();
    // A text of the list, or one made of bytes, at most `most` of them.
    std::string BackText(const std::vector<std::string>& known, std::size_t most = 64);
    // Up to seven entries, some of them null.
    std::vector<std::optional<std::string>> BackTexts(const std::vector<std::string>& known);

private:
    const std::uint8_t* front_;
    const std::uint8_t* end_;
};

}  // namespace fuzz

#endif
