#include "tests/appliance/base/conf_model.h"

#include <cctype>

namespace conf_model {

namespace {

std::string Stripped(const std::string& text) {
    std::size_t begin = 0;
    std::size_t end = text.size();
    const auto isBlank = [&](std::size_t at) {
        const auto byte = static_cast<unsigned char>(text[at]);
        return byte <= 0x7F && std::isspace(byte) != 0;
    };
    while (begin < end && isBlank(begin)) {
        ++begin;
    }
    while (end > begin && isBlank(end - 1)) {
        --end;
    }
    return text.substr(begin, end - begin);
}

// Puts two pieces of a line together: blanks where they meet become one.
void Join(std::string& whole, const std::string& piece) {
    const std::string marked = "|" + whole;
    const bool gap = Stripped(marked) != marked || Stripped(piece + "|") != piece + "|";
    const std::string left = Stripped(marked).substr(1);
    const std::string right = Stripped(piece + "|");
    whole = left + (gap && !left.empty() ? " " : "") + right.substr(0, right.size() - 1);
}

}  // namespace

std::string Folded(const std::string& text) {
    std::string folded;
    for (const char letter : text) {
        const auto byte = static_cast<unsigned char>(letter);
        if (byte > 0x7F || std::isspace(byte) == 0) {
            folded += byte > 0x7F ? letter : static_cast<char>(std::tolower(byte));
        }
    }
    return folded;
}

std::vector<Line> Model(const std::string& text) {
    std::vector<std::string> physical;
    for (std::size_t begin = 0; begin < text.size();) {
        std::size_t end = text.find('\n', begin);
        end = end == std::string::npos ? text.size() : end + 1;
        physical.push_back(text.substr(begin, end - begin));
        begin = end;
    }
    std::vector<Line> lines;
    std::string section = "global";
    for (std::size_t i = 0; i < physical.size(); ++i) {
        Line line;
        line.raw = physical[i];
        const std::string first = Stripped(physical[i]);
        const char mark = first.empty() ? '\0' : first[0];
        if (!first.empty() && mark != '#' && mark != ';') {
            std::string whole;
            bool continues = true;
            while (continues) {
                std::string piece = physical[i];
                const std::string stripped = Stripped(piece);
                continues = piece.back() == '\n' && !stripped.empty() && stripped.back() == '\\';
                if (continues) {
                    piece.erase(piece.rfind('\\'));
                }
                Join(whole, piece);
                if (continues && i + 1 == physical.size()) {
                    break;
                }
                if (continues) {
                    line.raw += physical[++i];
                }
            }
            whole = Stripped(whole);
            const std::size_t sign = whole.find('=');
            if (mark == '[') {
                const std::size_t close = whole.find(']');
                if (close != std::string::npos) {
                    section = Folded(whole.substr(1, close - 1));
                }
            } else if (sign != std::string::npos) {
                line.key = Folded(whole.substr(0, sign));
                line.value = Stripped(whole.substr(sign + 1));
            }
        }
        line.section = section;
        lines.push_back(line);
    }
    return lines;
}

Sections Content(const std::vector<Line>& lines) {
    Sections sections;
    for (const Line& line : lines) {
        if (!line.key.empty()) {
            sections[line.section][line.key] = line.value;
        }
    }
    return sections;
}

std::string Others(const std::string& text, const std::string& section, const std::string& key) {
    std::string others;
    for (const Line& line : Model(text)) {
        if (line.section != section || line.key != key) {
            others += line.raw;
        }
    }
    return others;
}

bool IsWith(const std::string& text, const std::string& other, const std::string& added) {
    if (text == other) {
        return true;
    }
    for (std::size_t at = text.find(added); at != std::string::npos; at = text.find(added, at + 1)) {
        if (text.substr(0, at) + text.substr(at + added.size()) == other) {
            return true;
        }
    }
    return false;
}

}  // namespace conf_model
