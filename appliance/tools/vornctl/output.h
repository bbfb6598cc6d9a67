// What vornctl prints: tables that fit the terminal, colours only where they are welcome, and no control byte that came
// from an answer.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_OUTPUT_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_OUTPUT_H

#include <json/value.h>

#include <cstddef>
#include <cstdio>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace appliance::ctl {

// The text with everything shown that a terminal would obey or hide: control bytes and bytes that are no UTF-8 as \xNN,
// invisible and direction-changing characters as \u{N}.
std::string Escape(std::string_view text);

// True when the text is UTF-8.
bool IsUtf8(std::string_view text);

// How many columns of a terminal an escaped text takes.
std::size_t Columns(std::string_view text);

// The text in lines of at most `width` columns, broken at blanks where there are any.
std::vector<std::string> Wrap(std::string_view text, std::size_t width);

// A JSON value on one line in ASCII, or over several lines with 4 blanks of indentation.
std::string JsonLine(const Json::Value& value);
std::string JsonPretty(const Json::Value& value);

// Local time, "2026-11-29 03:30:12"; "never" for 0 and what is no time.
std::string TimeText(const Json::Value& seconds);

// Milliseconds as "0.04 s".
std::string DurationText(const Json::Value& milliseconds);

enum class Colour { None, Good, Bad, Warning, Title };

// One of the program's two outputs.
class Output {
public:
    explicit Output(std::FILE* file);

    // Of the terminal, 40 to 200; 80 where there is none.
    std::size_t width() const {
        return width_;
    }
    bool isTerminal() const {
        return isTerminal_;
    }

    // The text in a colour, or as it is where colours are not welcome. Not escaped here.
    std::string Coloured(Colour colour, const std::string& text) const;

    // A line that is printed as it is: the caller has escaped what is not its own.
    void Line(const std::string& text);

    // A paragraph, wrapped; `indent` blanks in front of every line but the first, which `first` begins.
    void Paragraph(const std::string& first, std::size_t indent, std::string_view text);

    // Names and values in two columns. Values are escaped here and wrapped.
    void Facts(const std::vector<std::pair<std::string, std::string>>& facts);

    // Columns with titles. Cells are escaped here; what is too wide is wrapped, so that nothing is lost. A column whose
    // title begins with ">" stands at the right.
    void Table(const std::vector<std::string>& titles, const std::vector<std::vector<std::string>>& rows);

    // A line that the next one replaces; only on a terminal. An empty text takes it away.
    void Transient(const std::string& text);

    // False when something could not be written.
    bool Flush();

private:
    void Write(std::string_view text);

    std::FILE* file_;
    bool isTerminal_;
    bool colours_;
    bool transient_ = false;
    std::size_t width_;
};

}  // namespace appliance::ctl

#endif
