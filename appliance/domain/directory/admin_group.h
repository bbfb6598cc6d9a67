// The domain's administrators as administrators of the appliance.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_ADMIN_GROUP_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_ADMIN_GROUP_H

#include <string>

#include "appliance/base/error_code.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

// Puts the domain's group of administrators into the appliance's own group Administrators, or takes it out with
// "disable domain admins" = "yes" in the options file. The group is known by its number (512), whatever the domain's
// language calls it. What is so already is no failure. Needs winbind. False when it could not be done: `code` and a log
// line say why.
bool ApplyDomainAdministrators(const Membership& membership, ErrorCode& code);

// The security identifier of a domain in what "net getdomainsid" prints; empty when there is none.
std::string ParseDomainSid(const std::string& text, const std::string& domain);

}  // namespace appliance

#endif
