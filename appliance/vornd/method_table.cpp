#include "appliance/vornd/method_table.h"

#include <iterator>

namespace appliance {

bool MethodTable::Add(std::unique_ptr<Module> module, std::string& reason) {
    for (const VORN::APIEntry& entry : module->entries()) {
        const auto api = apis_.find(entry.api);
        if (api == apis_.end()) {
            continue;
        }
        const auto method = api->second.find(entry.method);
        if (method != api->second.end() && method->second.count(entry.version) > 0) {
            reason = "module " + module->path() + " refused: " + entry.api + "/" + std::to_string(entry.version) + "/" +
                     entry.method + " is served by another module";
            return false;
        }
    }
    for (const VORN::APIEntry& entry : module->entries()) {
        apis_[entry.api][entry.method][entry.version] = &entry;
    }
    modules_.push_back(std::move(module));
    return true;
}

const VORN::APIEntry* MethodTable::Find(const std::string& api, std::int32_t version, const std::string& method,
                                        ServerCode& code) const {
    const auto methods = apis_.find(api);
    if (methods == apis_.end()) {
        code = ServerCode::NoSuchApi;
        return nullptr;
    }
    const auto versions = methods->second.find(method);
    if (versions == methods->second.end()) {
        code = ServerCode::NoSuchMethod;
        return nullptr;
    }
    const auto above = versions->second.upper_bound(version);
    if (above == versions->second.begin()) {
        code = ServerCode::NoSuchVersion;
        return nullptr;
    }
    return std::prev(above)->second;
}

}  // namespace appliance
