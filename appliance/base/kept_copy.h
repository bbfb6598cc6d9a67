// What a file was, and what a change made of it: kept in a file of its own, so that the change can be taken back to the
// byte.

#ifndef VORN_APPLIANCE_BASE_KEPT_COPY_H
#define VORN_APPLIANCE_BASE_KEPT_COPY_H

#include <optional>
#include <string>
#include <system_error>

namespace appliance {

// The bytes of a file that may be missing.
using Content = std::optional<std::string>;

// Reads such a file; one of more than 4 MiB is a failure (EFBIG).
std::error_code ReadContent(const std::string& path, Content& content);

struct KeptCopy {
    Content before;
    std::string after;
};

// Writes the copy (0600, its folder is made), durably; the caller changes the file itself afterwards.
std::error_code WriteKeptCopy(const std::string& path, const KeptCopy& copy);

// The copy; nothing when there is none, or when it is damaged.
std::optional<KeptCopy> ReadKeptCopy(const std::string& path);

}  // namespace appliance

#endif
