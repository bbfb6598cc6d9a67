// What the servers read from files and from each other: targets that need no appliance.

#ifndef VORN_FUZZ_SERVER_TARGETS_H
#define VORN_FUZZ_SERVER_TARGETS_H

#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace fuzz {

struct ServerTarget {
    std::string name;  // also of its folder in the corpus
    // Throws ServerRuleBroken.
    void (*run)(std::string_view input);
};

class ServerRuleBroken : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

// A configuration file and what is done with it, by way of the contract's operations. The input's first byte is the size of
// a buffer; a key, a section, a value and the file follow, with a NUL behind each of the first three.
void RunConfFile(std::string_view input);

const std::vector<ServerTarget>& ServerTargets();

// Throws std::out_of_range when there is no such target.
const ServerTarget& FindServerTarget(const std::string& name);

}  // namespace fuzz

#endif
