// What a join changes ahead of itself and keeps only when it succeeds: the DNS servers and the trusted-domain setting.
// The one who changed them puts them back; when that one was killed, this names what stayed changed.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_PROVISIONAL_H
#define VORN_APPLIANCE_DOMAIN_JOIN_PROVISIONAL_H

#include <string>
#include <system_error>
#include <vector>

#include "appliance/base/file_time.h"

namespace appliance {

// Changes the trusted-domain setting under the settings' lock. The first of a chain of changes keeps the file as it was;
// a change back to that value ends the chain and brings the file back to the byte, unless somebody else has written it
// meanwhile: then only this key goes back. ETIMEDOUT when another holds the lock for more than 5 s.
std::error_code ChangeTrustSetting(bool enabled);

// A join has succeeded: what was changed ahead of it stays.
void KeepProvisionalChanges();

// The changes that were made before `before` and are neither kept nor put back, one line each;
// afterwards they count as kept. Only while no join runs.
std::vector<std::string> TakeProvisionalChanges(Moment before);

}  // namespace appliance

#endif
