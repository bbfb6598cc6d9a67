// All methods of all loaded modules.

#ifndef VORN_APPLIANCE_VORND_METHOD_TABLE_H
#define VORN_APPLIANCE_VORND_METHOD_TABLE_H

#include <json/value.h>

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "appliance/vornd/module.h"
#include "appliance/web/server_codes.h"

namespace appliance {

class MethodTable {
public:
    // Takes a module over with its methods. False, and the reason in one line, when one of them is there already; the
    // module is unloaded then.
    bool Add(std::unique_ptr<Module> module, std::string& reason);

    // What a request matches: the method's highest version that is not above the requested one. Null when there is
    // none, and `code` says why.
    const VORN::APIEntry* Find(const std::string& api, std::int32_t version, const std::string& method,
                               ServerCode& code) const;

    std::size_t ModuleCount() const {
        return modules_.size();
    }

    // What is loaded, by API and method, each with its versions in rising order.
    using Versions = std::map<std::int32_t, const VORN::APIEntry*>;
    using Methods = std::map<std::string, Versions>;
    const std::map<std::string, Methods>& apis() const {
        return apis_;
    }

private:
    std::vector<std::unique_ptr<Module>> modules_;
    std::map<std::string, Methods> apis_;
};

}  // namespace appliance

#endif
