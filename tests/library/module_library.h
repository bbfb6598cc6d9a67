// The built module, loaded as the appliance's server loads it.

#ifndef VORN_TESTS_LIBRARY_MODULE_LIBRARY_H
#define VORN_TESTS_LIBRARY_MODULE_LIBRARY_H

#include <string>

#include "platform/webapi.h"

class ModuleLibrary {
public:
    // Throws std::runtime_error with the loader's words when the module can't be loaded.
    explicit ModuleLibrary(const std::string& path);
    ~ModuleLibrary();
    ModuleLibrary(const ModuleLibrary&) = delete;
    ModuleLibrary& operator=(const ModuleLibrary&) = delete;

    // The address of an exported symbol. Throws std::runtime_error when there is none.
    void* Symbol(const std::string& name) const;

    // What the exported GetAPITable answers.
    const VORN::APIEntry* Table() const;

    // The function that serves a method. Throws std::runtime_error when the table has no such row.
    VORN::APIFunction Function(const std::string& api, int version, const std::string& method) const;

private:
    void* handle;
};

#endif
