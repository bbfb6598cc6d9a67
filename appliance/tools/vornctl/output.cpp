#include "appliance/tools/vornctl/output.h"

#include <json/writer.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <boost/algorithm/string/replace.hpp>
#include <cstdlib>
#include <ctime>

namespace appliance::ctl {

namespace {

constexpr std::size_t kDefaultWidth = 80;
constexpr std::size_t kLeastWidth = 40;
constexpr std::size_t kMostWidth = 200;
constexpr std::size_t kGap = 2;          // between two columns
constexpr std::size_t kLeastColumn = 8;  // a column is not made narrower than this

std::size_t WidthOf(std::FILE* file) {
    winsize size{};
    if (ioctl(fileno(file), TIOCGWINSZ, &size) != 0 || size.ws_col == 0) {
        return kDefaultWidth;
    }
    return std::clamp(static_cast<std::size_t>(size.ws_col), kLeastWidth, kMostWidth);
}

bool WantsColours() {
    const char* refusal = std::getenv("NO_COLOR");
    const char* terminal = std::getenv("TERM");
    return (refusal == nullptr || *refusal == '\0') && terminal != nullptr && std::string_view(terminal) != "dumb";
}

std::string Written(const Json::Value& value, const char* indentation) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = indentation;
    builder["emitUTF8"] = false;
    // The library leaves DEL as it is, which is a control byte to a terminal. It can stand in a text only.
    return boost::replace_all_copy(Json::writeString(builder, value), "\x7F", "\\u007f");
}

// Widths of the columns so that a row fits: the widest ones give way first.
std::vector<std::size_t> FitColumns(std::vector<std::size_t> widths, std::size_t room) {
    const auto total = [&widths] {
        std::size_t sum = kGap * (widths.size() - 1);
        for (const std::size_t width : widths) {
            sum += width;
        }
        return sum;
    };
    while (total() > room) {
        const auto widest = std::max_element(widths.begin(), widths.end());
        if (*widest <= kLeastColumn) {
            break;
        }
        --*widest;
    }
    return widths;
}

std::string Padded(const std::string& text, std::size_t width, bool right) {
    const std::size_t columns = Columns(text);
    const std::string blanks(columns < width ? width - columns : 0, ' ');
    return right ? blanks + text : text + blanks;
}

void TrimRight(std::string& line) {
    line.erase(line.find_last_not_of(' ') + 1);
}

}  // namespace

std::string JsonLine(const Json::Value& value) {
    return Written(value, "");
}

std::string JsonPretty(const Json::Value& value) {
    return Written(value, "    ");
}

std::string TimeText(const Json::Value& seconds) {
    if (!seconds.isInt64() || seconds.asInt64() <= 0) {
        return "never";
    }
    const std::time_t time = seconds.asInt64();
    std::tm local{};
    char text[64];
    if (localtime_r(&time, &local) == nullptr || std::strftime(text, sizeof(text), "%Y-%m-%d %H:%M:%S", &local) == 0) {
        return "never";
    }
    return text;
}

std::string DurationText(const Json::Value& milliseconds) {
    if (!milliseconds.isIntegral() || milliseconds.asDouble() < 0) {
        return "";
    }
    char text[64];
    std::snprintf(text, sizeof(text), "%.2f s", milliseconds.asDouble() / 1000);
    return text;
}

Output::Output(std::FILE* file)
    : file_(file),
      isTerminal_(isatty(fileno(file)) == 1),
      colours_(isTerminal_ && WantsColours()),
      width_(WidthOf(file)) {}

std::string Output::Coloured(Colour colour, const std::string& text) const {
    if (!colours_ || colour == Colour::None) {
        return text;
    }
    const char* code = "1";
    switch (colour) {
        case Colour::None:
        case Colour::Title:
            break;
        case Colour::Good:
            code = "32";
            break;
        case Colour::Bad:
            code = "1;31";
            break;
        case Colour::Warning:
            code = "33";
            break;
    }
    return std::string("\x1b[") + code + "m" + text + "\x1b[0m";
}

void Output::Line(const std::string& text) {
    Transient("");
    Write(text);
    Write("\n");
}

void Output::Paragraph(const std::string& first, std::size_t indent, std::string_view text) {
    std::string beginning = Padded(first, indent, false);
    for (const std::string& line : Wrap(text, std::max(width_, indent + kLeastColumn) - indent)) {
        Line(beginning + line);
        beginning.assign(indent, ' ');
    }
}

void Output::Facts(const std::vector<std::pair<std::string, std::string>>& facts) {
    std::size_t indent = 0;
    for (const auto& fact : facts) {
        indent = std::max(indent, Columns(fact.first) + kGap);
    }
    for (const auto& [name, value] : facts) {
        Paragraph(name, indent, value.empty() ? "-" : Escape(value));
    }
}

void Output::Table(const std::vector<std::string>& titles, const std::vector<std::vector<std::string>>& rows) {
    std::vector<bool> right;
    std::vector<std::vector<std::string>> cells(1);
    for (const std::string& title : titles) {
        right.push_back(title[0] == '>');
        cells[0].push_back(title[0] == '>' ? title.substr(1) : title);
    }
    for (const auto& row : rows) {
        cells.emplace_back();
        for (std::size_t i = 0; i < titles.size(); ++i) {
            cells.back().push_back(i < row.size() ? Escape(row[i]) : "");
        }
    }
    std::vector<std::size_t> widths(titles.size(), 0);
    for (const auto& row : cells) {
        for (std::size_t i = 0; i < row.size(); ++i) {
            widths[i] = std::max(widths[i], Columns(row[i]));
        }
    }
    widths = FitColumns(std::move(widths), width_);
    for (std::size_t row = 0; row < cells.size(); ++row) {
        std::vector<std::vector<std::string>> wrapped;
        std::size_t height = 1;
        for (std::size_t i = 0; i < widths.size(); ++i) {
            wrapped.push_back(Wrap(cells[row][i], widths[i]));
            height = std::max(height, wrapped.back().size());
        }
        for (std::size_t y = 0; y < height; ++y) {
            std::string line;
            for (std::size_t i = 0; i < widths.size(); ++i) {
                const std::string piece = y < wrapped[i].size() ? wrapped[i][y] : "";
                line += (i > 0 ? std::string(kGap, ' ') : "") + Padded(piece, widths[i], right[i]);
            }
            TrimRight(line);
            Line(row == 0 ? Coloured(Colour::Title, line) : line);
        }
    }
}

void Output::Transient(const std::string& text) {
    if (!isTerminal_ || (text.empty() && !transient_)) {
        return;
    }
    // Wrapped over two lines it could not be replaced.
    const std::vector<std::string> lines = Wrap(text, width_ - 1);
    Write("\r\x1b[K" + (lines.empty() ? std::string() : lines[0]));
    std::fflush(file_);
    transient_ = !text.empty();
}

bool Output::Flush() {
    Transient("");
    return std::fflush(file_) == 0 && std::ferror(file_) == 0;
}

void Output::Write(std::string_view text) {
    std::fwrite(text.data(), 1, text.size(), file_);
}

}  // namespace appliance::ctl
