// What the contract's operations on a configuration file must do with any file and any words.

#ifndef VORN_TESTS_APPLIANCE_CORE_CONF_RULES_H
#define VORN_TESTS_APPLIANCE_CORE_CONF_RULES_H

#include <string>

namespace conf_rules {

struct Words {
    std::string text;  // the file
    std::string section;
    std::string key;
    std::string value;
    int size = 1;  // of the buffer for a value
};

// Reads, sets and removes the key in a file of `folder`, which is removed again. Answers the rule that was broken; empty
// when all hold.
std::string Broken(const std::string& folder, const Words& words);

}  // namespace conf_rules

#endif
