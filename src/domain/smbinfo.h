// The file-sharing service's domain-information file, of which the module reads and rewrites section "global".

#ifndef VORN_SRC_DOMAIN_SMBINFO_H
#define VORN_SRC_DOMAIN_SMBINFO_H

#include <cstring>

#include "platform/core.h"
#include "src/support/handles.h"
#include "src/support/paths.h"

constexpr const char* kSmbLineFormat = "    %s=%s\n";  // of every line that is written: key, value

// Loads the section. A file or section that is missing or can't be read leaves the hash empty, and that is no failure.
inline void LoadSmbInfo(StringHash& hash) {
    VLIBCFileGetSection(kSmbInfoConf, kGlobalSection, hash.address());
}

// A switch is on when its key holds exactly "yes".
inline bool IsYes(const VLIBSZHASH* hash, const char* key) {
    const char* value = VLIBCSzHashGetValue(hash, key);
    return value != nullptr && std::strcmp(value, "yes") == 0;
}

#endif
