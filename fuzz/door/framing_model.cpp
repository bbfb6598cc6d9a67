#include "fuzz/door/framing_model.h"

#include <cstddef>
#include <optional>

namespace fuzz {
namespace {

constexpr std::string_view kLineEnd = "\r\n";

std::string Lower(std::string_view text) {
    std::string lower(text);
    for (char& letter : lower) {
        letter = letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
    }
    return lower;
}

std::string_view Bare(std::string_view text) {
    while (!text.empty() && (text.front() == ' ' || text.front() == '\t')) {
        text.remove_prefix(1);
    }
    while (!text.empty() && (text.back() == ' ' || text.back() == '\t')) {
        text.remove_suffix(1);
    }
    return text;
}

// The line at the front, taken away with its end.
std::optional<std::string_view> TakeLine(std::string_view& bytes) {
    const std::size_t end = bytes.find(kLineEnd);
    if (end == std::string_view::npos) {
        return std::nullopt;
    }
    const std::string_view line = bytes.substr(0, end);
    bytes.remove_prefix(end + kLineEnd.size());
    return line;
}

std::optional<std::size_t> Number(std::string_view digits, unsigned base) {
    std::size_t number = 0;
    for (const char letter : Lower(digits)) {
        const unsigned digit = letter >= '0' && letter <= '9'   ? static_cast<unsigned>(letter - '0')
                               : letter >= 'a' && letter <= 'f' ? static_cast<unsigned>(letter - 'a') + 10
                                                                : base;
        if (digit >= base || number > (std::size_t{1} << 40)) {
            return std::nullopt;
        }
        number = number * base + digit;
    }
    return digits.empty() ? std::nullopt : std::optional(number);
}

std::optional<std::string> TakeChunks(std::string_view& bytes) {
    std::string body;
    for (;;) {
        const std::optional<std::string_view> line = TakeLine(bytes);
        const std::optional<std::size_t> size =
            line ? Number(Bare(line->substr(0, line->find(';'))), 16) : std::nullopt;
        if (!size || bytes.size() < *size) {
            return std::nullopt;
        }
        if (*size == 0) {
            break;
        }
        body += bytes.substr(0, *size);
        bytes.remove_prefix(*size);
        if (bytes.substr(0, 2) != kLineEnd) {
            return std::nullopt;
        }
        bytes.remove_prefix(2);
    }
    for (std::optional<std::string_view> line = TakeLine(bytes); line; line = TakeLine(bytes)) {
        if (line->empty()) {
            return body;
        }
    }
    return std::nullopt;
}

std::optional<std::string> TakeRequest(std::string_view& bytes) {
    if (!TakeLine(bytes)) {
        return std::nullopt;
    }
    std::vector<std::string> lengths;
    std::vector<std::string> encodings;
    for (;;) {
        const std::optional<std::string_view> line = TakeLine(bytes);
        if (!line) {
            return std::nullopt;
        }
        if (line->empty()) {
            break;
        }
        const std::size_t colon = line->find(':');
        if (colon == std::string_view::npos) {
            return std::nullopt;
        }
        const std::string name = Lower(line->substr(0, colon));
        const std::string value = Lower(Bare(line->substr(colon + 1)));
        if (name == "content-length") {
            lengths.push_back(value);
        } else if (name == "transfer-encoding") {
            encodings.push_back(value);
        }
    }
    if (lengths.size() + encodings.size() > 1) {
        return std::nullopt;
    }
    if (!encodings.empty()) {
        return encodings.front() == "chunked" ? TakeChunks(bytes) : std::nullopt;
    }
    const std::optional<std::size_t> size =
        lengths.empty() ? std::optional<std::size_t>(0) : Number(lengths.front(), 10);
    if (!size || bytes.size() < *size) {
        return std::nullopt;
    }
    std::string body(bytes.substr(0, *size));
    bytes.remove_prefix(*size);
    return body;
}

}  // namespace

std::vector<std::string> BodiesOf(std::string_view bytes) {
    std::vector<std::string> bodies;
    while (std::optional<std::string> body = TakeRequest(bytes)) {
        bodies.push_back(std::move(*body));
    }
    return bodies;
}

}  // namespace fuzz
