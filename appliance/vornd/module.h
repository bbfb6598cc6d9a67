// A web-API module: a shared library with an API table.

#ifndef VORN_APPLIANCE_VORND_MODULE_H
#define VORN_APPLIANCE_VORND_MODULE_H

#include <memory>
#include <string>
#include <vector>

#include "appliance/platform/contract.h"

namespace appliance {

// A loaded module. What its table names is valid as long as this lives.
class Module {
public:
    // Loads a module: a file that root owns and nobody else may write, in folders of which the same is true; all of
    // whose symbols the platform has; with an API table that makes sense. Nothing, and the reason in one line that
    // names the file, when it is refused.
    static std::unique_ptr<Module> Load(const std::string& path, std::string& reason);

    // The file's real path.
    const std::string& path() const {
        return path_;
    }

    // The rows of its table, without the last one.
    const std::vector<VORN::APIEntry>& entries() const {
        return entries_;
    }

    // The body of a background task that the module exports under this symbol; null when there is none.
    VORN::APITaskFunction FindTask(const std::string& symbol) const;

private:
    struct Unload {
        void operator()(void* library) const;
    };

    Module() = default;
    bool OpenLibrary(std::string& reason);
    bool ReadTable(std::string& reason);

    std::string path_;
    std::unique_ptr<void, Unload> library_;
    std::vector<VORN::APIEntry> entries_;
};

// The files of a folder that may be modules (names that end in ".so"), sorted by name.
std::vector<std::string> ModuleFiles(const std::string& folder);

}  // namespace appliance

#endif
