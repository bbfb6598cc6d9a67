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

const std::vector<ServerTarget>& ServerTargets();

// Throws std::out_of_range when there is no such target.
const ServerTarget& FindServerTarget(const std::string& name);

}  // namespace fuzz

#endif
