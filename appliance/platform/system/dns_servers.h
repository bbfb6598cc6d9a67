// The DNS servers of the appliance: the resolver's configuration file, and the copy that brings it back.
//
// The file (it may be a symbolic link, which is followed) is changed with a list and put back with the former list
// after a join that failed, and must then be what it was, byte for byte. So the first change keeps a copy of the file
// beside what it wrote, in the private folder; the former list brings the copy back. As soon as the file is not what
// was written here, somebody else has changed it: the copy no longer counts, and the next change keeps a new one.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_DNS_SERVERS_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_DNS_SERVERS_H

#include <optional>
#include <string>
#include <vector>

#include "appliance/base/error_code.h"

namespace appliance {

// The file of the kept copy.
inline constexpr const char kResolvCopy[] = "/usr/vorn/etc/private/resolv.conf.kept";

// All servers of the file in their order; none when it is missing. The resolver asks the first three only.
std::optional<ErrorCode> ReadDnsServers(std::vector<std::string>& servers);

// Makes the entries the servers. A list with an entry that is no address (blanks in front are cut off) is refused as a
// whole; the list in use changes nothing. More than three are kept, though the resolver asks the first three only.
std::optional<ErrorCode> WriteDnsServers(const std::vector<std::string>& entries);

}  // namespace appliance

#endif
