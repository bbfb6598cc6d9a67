// The domain's administrators as administrators of the appliance.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_ADMIN_GROUP_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_ADMIN_GROUP_H

#include <chrono>
#include <string>

#include "appliance/base/error_code.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

// Puts the domain's group of administrators into the appliance's own group Administrators, or takes it out with
// "disable domain admins" = "yes" in the options file. The group is known by its number (512), whatever the domain's
// language calls it. What is so already is no failure. Needs winbind. False when it could not be done within `time`:
// `code` and a log line say why; TimedOut means that winbind is busy, as it is when a trusted domain is out of reach.
bool ApplyDomainAdministrators(const Membership& membership, std::chrono::milliseconds time, ErrorCode& code);

// The same, tried again for minutes while winbind is busy. False when it could not be done, with a log line.
bool ApplyDomainAdministratorsLater();

// The security identifier of a domain in what "net getdomainsid" prints; empty when there is none.
std::string ParseDomainSid(const std::string& text, const std::string& domain);

}  // namespace appliance

#endif
