#include "appliance/base/conf_lines.h"

namespace appliance {

namespace {

constexpr std::string_view kBlanks = " \t\r\n\v\f";

// The end of the physical line that begins at `begin`, its line feed included.
std::size_t EndOfPhysicalLine(std::string_view text, std::size_t begin) {
    const std::size_t newline = text.find('\n', begin);
    return newline == std::string_view::npos ? text.size() : newline + 1;
}

// Reads a line with its continuations from `place` on, which moves behind them. Where two lines meet, the blanks on
// both sides become one.
std::string JoinedLine(std::string_view text, std::size_t& place) {
    std::string joined;
    bool blankAtEnd = false;  // the last piece ended in blanks ahead of its backslash
    for (;;) {
        const std::size_t end = EndOfPhysicalLine(text, place);
        const bool hasEnd = end > place && text[end - 1] == '\n';
        std::string_view piece = text.substr(place, end - place);
        place = end;
        const std::size_t first = piece.find_first_not_of(kBlanks);
        const bool blankInFront = first == std::string_view::npos ? piece.size() > 1 : first > 0;
        piece = TrimConf(piece);
        const bool continues = hasEnd && !piece.empty() && piece.back() == '\\';
        if (continues) {
            piece.remove_suffix(1);
        }
        const std::string_view trimmed = TrimConf(piece);
        if (trimmed.empty()) {
            blankAtEnd = blankAtEnd || blankInFront || !piece.empty();
        } else {
            if (!joined.empty() && (blankAtEnd || blankInFront)) {
                joined += ' ';
            }
            joined += trimmed;
            blankAtEnd = trimmed.size() < piece.size();
        }
        if (!continues) {
            return joined;
        }
    }
}

void FillEntry(std::string_view joined, ConfLine& line) {
    const std::size_t sign = joined.find('=');
    if (sign == std::string_view::npos) {
        return;
    }
    const std::string_view key = TrimConf(joined.substr(0, sign));
    if (!key.empty()) {
        line.kind = ConfLine::Kind::Entry;
        line.key = key;
        line.value = TrimConf(joined.substr(sign + 1));
    }
}

}  // namespace

bool IsConfBlank(char letter) {
    return kBlanks.find(letter) != std::string_view::npos;
}

std::string_view TrimConf(std::string_view text) {
    const std::size_t first = text.find_first_not_of(kBlanks);
    if (first == std::string_view::npos) {
        return {};
    }
    return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

std::vector<ConfLine> ConfLines(std::string_view text) {
    std::vector<ConfLine> lines;
    std::string section = "global";
    std::size_t place = 0;
    while (place < text.size()) {
        ConfLine line;
        line.begin = place;
        const std::size_t end = EndOfPhysicalLine(text, place);
        const std::string_view first = TrimConf(text.substr(place, end - place));
        if (first.empty()) {
            place = end;
        } else if (first.front() == '#' || first.front() == ';') {
            line.kind = ConfLine::Kind::Comment;
            place = end;
        } else {
            const std::string joined = JoinedLine(text, place);
            if (first.front() != '[') {
                FillEntry(joined, line);
            } else if (const std::size_t close = joined.find(']'); close != std::string::npos) {
                line.kind = ConfLine::Kind::Header;
                section = TrimConf(std::string_view(joined).substr(1, close - 1));
            }
        }
        line.section = section;
        line.end = place;
        lines.push_back(std::move(line));
    }
    return lines;
}

}  // namespace appliance
