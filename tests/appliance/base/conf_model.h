// What a configuration file says, read in a way that is as plain as can be: the judge of generated files.

#ifndef VORN_TESTS_APPLIANCE_BASE_CONF_MODEL_H
#define VORN_TESTS_APPLIANCE_BASE_CONF_MODEL_H

#include <map>
#include <string>
#include <vector>

namespace conf_model {

using Keys = std::map<std::string, std::string>;
using Sections = std::map<std::string, Keys>;

// A name as it is compared: without blanks, its ASCII letters in lower case.
std::string Folded(const std::string& text);

// One line with its continuations, and to what it belongs; `key` is folded and empty for all that is no key.
struct Line {
    std::string raw;
    std::string section;
    std::string key;
    std::string value;
};
std::vector<Line> Model(const std::string& text);

// The keys of all sections, names folded.
Sections Content(const std::vector<Line>& lines);

// All bytes that do not belong to a key.
std::string Others(const std::string& text, const std::string& section, const std::string& key);

// Is `text` the other one, or that with `added` put in somewhere?
bool IsWith(const std::string& text, const std::string& other, const std::string& added);

}  // namespace conf_model

#endif
