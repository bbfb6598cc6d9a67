// Hashes of strings.

#include <algorithm>
#include <memory>

#include "appliance/base/conf_file.h"
#include "appliance/platform/contract.h"
#include "appliance/platform/core/hash.h"
#include "appliance/platform/last_error.h"

using appliance::KeyIdentity;

namespace {

constexpr int kMostRoom = 65536;  // beyond it, room is made as it is needed

}  // namespace

void appliance::SetInHash(VLIBSZHASH& hash, const std::string& key, const std::string& value) {
    const std::string identity = KeyIdentity(key);
    const auto found = hash.index.find(identity);
    if (found != hash.index.end()) {
        found->second->second = value;
        return;
    }
    hash.entries.emplace_back(key, value);
    try {
        hash.index.emplace(identity, std::prev(hash.entries.end()));
    } catch (...) {
        hash.entries.pop_back();
        throw;
    }
}

extern "C" {

VLIBSZHASH* VLIBCSzHashAlloc(int capacity) {
    VORN_GUARD(nullptr, {
        if (capacity < 0) {
            return VORN_FAIL_WITH(BadArgument, nullptr);
        }
        auto hash = std::make_unique<VLIBSZHASH>();
        hash->index.reserve(static_cast<std::size_t>(std::min(capacity, kMostRoom)));
        return hash.release();
    })
}

const char* VLIBCSzHashGetValue(const VLIBSZHASH* hash, const char* key) {
    VORN_GUARD(nullptr, {
        if (hash == nullptr || key == nullptr) {
            return VORN_FAIL_WITH(BadArgument, nullptr);
        }
        const auto found = hash->index.find(KeyIdentity(key));
        return found == hash->index.end() ? VORN_FAIL_WITH(NotFound, nullptr) : found->second->second.c_str();
    })
}

int VLIBCSzHashSetValue(VLIBSZHASH** hash, const char* key, const char* value) {
    VORN_GUARD(-1, {
        if (hash == nullptr || *hash == nullptr || key == nullptr || value == nullptr || KeyIdentity(key).empty()) {
            return VORN_FAIL(BadArgument);
        }
        appliance::SetInHash(**hash, std::string(key), std::string(value));
        return 0;
    })
}

int VLIBCSzHashRemoveKey(VLIBSZHASH* hash, const char* key) {
    VORN_GUARD(-1, {
        if (hash == nullptr || key == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        const auto found = hash->index.find(KeyIdentity(key));
        if (found != hash->index.end()) {
            hash->entries.erase(found->second);
            hash->index.erase(found);
        }
        return 0;
    })
}

void VLIBCSzHashFree(VLIBSZHASH* hash) {
    delete hash;
}

}  // extern "C"
