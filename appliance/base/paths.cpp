#include "appliance/base/paths.h"

#include <cstdlib>

namespace appliance {

std::string Path(const std::string& path) {
    const char* root = secure_getenv(kRootVariable);
    return root == nullptr ? path : root + path;
}

void SetRoot(const std::string& folder) {
    if (folder.empty()) {
        unsetenv(kRootVariable);
    } else {
        setenv(kRootVariable, folder.c_str(), 1);
    }
}

}  // namespace appliance
