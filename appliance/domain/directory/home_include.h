// The domain users' home folders in the file-sharing service.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_HOME_INCLUDE_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_HOME_INCLUDE_H

#include <optional>
#include <string>
#include <system_error>

namespace appliance {

// Holds the section [homes], and afterwards turns back to [global], so that smb.conf goes on where it was.
inline constexpr char kUserHomeConf[] = "/usr/vorn/etc/userhome.conf";

// Includes that file in smb.conf by one line at the end of [global], or takes the line away; every other byte of
// smb.conf stays. `changed` says whether smb.conf is another one now. Takes smb.conf's lock. Fails, with everything as
// it was, when a file can't be read or written, or smb.conf has no [global].
std::error_code IncludeUserHomes(bool include, bool& changed);

// The text of smb.conf with the line, or without it; the text itself when it is so already. Nothing when there is no
// place for the line.
std::optional<std::string> WithUserHomes(const std::string& conf, const std::string& path, bool include);

// Makes the home folder of a domain user when it is missing, as the name service names it: closed to all others (0700).
// Folders above it are made as root's own. Empty when it is there, else why not. Accounts that belong to no domain are
// refused.
std::string MakeUserHome(const std::string& user);

}  // namespace appliance

#endif
