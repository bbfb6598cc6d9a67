// The ranges of user and group ids that stand for the accounts of each domain.

#ifndef VORN_APPLIANCE_DOMAIN_MEMBERSHIP_IDMAP_H
#define VORN_APPLIANCE_DOMAIN_MEMBERSHIP_IDMAP_H

#include <string>
#include <utility>
#include <vector>

#include "appliance/base/conf_file.h"

namespace appliance {

// Keys and values of [global] that give each of `domains` (NetBIOS names) a range of one million ids with the "rid"
// backend (id = low end + RID), and the default domain its own, where `conf` has none for it yet.
std::vector<std::pair<std::string, std::string>> MissingIdmapKeys(const ConfFile& conf,
                                                                  const std::vector<std::string>& domains);

// Adds what is missing to the appliance's smb.conf under its lock. True when the file has been changed: winbind has to
// reload it. Names that can't be NetBIOS names are passed over. Throws std::system_error.
bool EnsureIdmapRanges(const std::vector<std::string>& domains);

// The first and last id of a domain's range in `conf`; false when it has none.
bool IdmapRange(const ConfFile& conf, const std::string& domain, unsigned& low, unsigned& high);

}  // namespace appliance

#endif
