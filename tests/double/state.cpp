#include "tests/double/state.h"

#include <strings.h>

#include <algorithm>

namespace fake {
namespace {

bool SameKey(const std::string& left, const std::string& right) {
    return strcasecmp(left.c_str(), right.c_str()) == 0;
}

template <typename Map>
void MoveEntry(Map& map, const std::string& from, const std::string& to) {
    auto node = map.extract(from);
    if (!node.empty()) {
        node.key() = to;
        map.insert(std::move(node));
    }
}

}  // namespace

const std::string* FindKey(const Section& section, const std::string& key) {
    for (const auto& entry : section) {
        if (SameKey(entry.first, key)) {
            return &entry.second;
        }
    }
    return nullptr;
}

void SetKey(Section& section, const std::string& key, const std::string& value) {
    for (auto& entry : section) {
        if (SameKey(entry.first, key)) {
            entry.second = value;
            return;
        }
    }
    section.emplace_back(key, value);
}

void RemoveKey(Section& section, const std::string& key) {
    const auto removed =
        std::remove_if(section.begin(), section.end(), [&](const auto& entry) { return SameKey(entry.first, key); });
    section.erase(removed, section.end());
}

bool State::Exists(const std::string& path) const {
    return files.count(path) != 0 || keyValueFiles.count(path) != 0 || pidFiles.count(path) != 0;
}

bool State::Remove(const std::string& path) {
    const bool existed = Exists(path);
    files.erase(path);
    keyValueFiles.erase(path);
    sectionFormats.erase(path);
    pidFiles.erase(path);
    return existed;
}

bool State::Rename(const std::string& from, const std::string& to) {
    if (!Exists(from)) {
        return false;
    }
    if (from == to) {
        return true;
    }
    Remove(to);
    MoveEntry(keyValueFiles, from, to);
    MoveEntry(sectionFormats, from, to);
    MoveEntry(pidFiles, from, to);
    if (files.erase(from) != 0) {
        files.insert(to);
    }
    return true;
}

}  // namespace fake
