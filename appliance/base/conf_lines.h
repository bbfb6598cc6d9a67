// The lines of a configuration file, as the file-sharing service takes them.

#ifndef VORN_APPLIANCE_BASE_CONF_LINES_H
#define VORN_APPLIANCE_BASE_CONF_LINES_H

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace appliance {

// One line together with the lines that continue it.
struct ConfLine {
    enum class Kind {
        Other,  // an empty line, or one that the file-sharing service does not understand
        Comment,
        Header,
        Entry,
    };
    Kind kind = Kind::Other;
    std::size_t begin = 0;  // its bytes in the text, the end of the line included
    std::size_t end = 0;
    std::string section;  // to which it belongs; a header's own name
    std::string key;      // of an entry; neither has blanks at its ends
    std::string value;
};

// All lines of a text: together they are the text.
std::vector<ConfLine> ConfLines(std::string_view text);

// Blanks of these files: space, tab, carriage return, line feed, vertical tab, form feed.
bool IsConfBlank(char letter);
// The text without blanks at its ends.
std::string_view TrimConf(std::string_view text);

}  // namespace appliance

#endif
