// What a membership changes in smb.conf, and how that is taken back.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_DOMAIN_KEYS_H
#define VORN_APPLIANCE_DOMAIN_JOIN_DOMAIN_KEYS_H

#include <map>
#include <optional>
#include <string>

#include "appliance/base/conf_file.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

// The values that keys of [global] had before the first join; none: the key was not there. Kept while the appliance is
// a member, so that leaving takes back what joining wrote and nothing else.
using FormerKeys = std::map<std::string, std::optional<std::string>>;

// Writes the keys of a membership into `conf` and adds what they were to `former`; keys that are in `former` already
// keep their entry. Everything else in the text stays as it is. False when a value can't be written.
bool WriteDomainKeys(const Membership& membership, bool trustedDomains, ConfFile& conf, FormerKeys& former);

// Goes back to a workgroup: takes back every key of `former`, the realm, the password server and the id ranges of
// domains that were not there before.
bool WriteWorkgroupKeys(const std::string& workgroup, const FormerKeys& former, ConfFile& conf);

// Makes every key in which `from` and `to` differ in [global] in `conf` what it is in `to`: for a file that somebody
// else has changed meanwhile, too.
void TakeOver(const ConfFile& from, const ConfFile& to, ConfFile& conf);

// The former keys as text, and read back; an unreadable text gives no keys.
std::string FormatFormerKeys(const FormerKeys& former);
FormerKeys ParseFormerKeys(const std::string& text);

}  // namespace appliance

#endif
