// What stands behind the handle of a hash of strings.

#ifndef VORN_APPLIANCE_PLATFORM_CORE_HASH_H
#define VORN_APPLIANCE_PLATFORM_CORE_HASH_H

#include <list>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "appliance/platform/contract.h"

struct VLIBSZHASH {
    using Entry = std::pair<std::string, std::string>;

    // In the order in which the keys came, with the spelling that came first. The index is by KeyIdentity.
    std::list<Entry> entries;
    std::unordered_map<std::string, std::list<Entry>::iterator> index;

    // A section could not be loaded. What it holds is unknown, so writing this hash in its place would lose it.
    bool lacksSection = false;

    std::vector<Entry> All() const {
        return {entries.begin(), entries.end()};
    }
};

namespace appliance {

// Sets a key, which must not be empty, to a copy of the value.
void SetInHash(VLIBSZHASH& hash, const std::string& key, const std::string& value);

}  // namespace appliance

#endif
