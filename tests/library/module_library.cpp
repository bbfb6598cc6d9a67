#include "tests/library/module_library.h"

#include <dlfcn.h>

#include <stdexcept>

ModuleLibrary::ModuleLibrary(const std::string& path) : handle(dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL)) {
    if (handle == nullptr) {
        throw std::runtime_error(dlerror());
    }
}

ModuleLibrary::~ModuleLibrary() {
    dlclose(handle);
}

void* ModuleLibrary::Symbol(const std::string& name) const {
    void* address = dlsym(handle, name.c_str());
    if (address == nullptr) {
        throw std::runtime_error(dlerror());
    }
    return address;
}

const VORN::APIEntry* ModuleLibrary::Table() const {
    return reinterpret_cast<const VORN::APIEntry* (*)()>(Symbol("_Z11GetAPITablev"))();
}

VORN::APIFunction ModuleLibrary::Function(const std::string& api, int version, const std::string& method) const {
    for (const VORN::APIEntry* row = Table(); row->api != nullptr; ++row) {
        if (row->api == api && row->version == version && row->method == method) {
            return row->function;
        }
    }
    throw std::runtime_error("the table has no " + api + " version " + std::to_string(version) + " " + method);
}
