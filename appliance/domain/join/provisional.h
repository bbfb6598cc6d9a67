// What a join changes ahead of itself and keeps only when it succeeds: the DNS servers and the trusted-domain setting.
// The one who changed them puts them back; when that one was killed, this names what stayed changed.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_PROVISIONAL_H
#define VORN_APPLIANCE_DOMAIN_JOIN_PROVISIONAL_H

#include <ctime>
#include <string>
#include <vector>

namespace appliance {

// The trusted-domain setting changes from one text to another. The first value of a chain of changes is kept; a change
// back to it ends the chain.
void NoteTrustChange(const std::string& from, const std::string& to);

// A join has succeeded: what was changed ahead of it stays.
void KeepProvisionalChanges();

// The changes that were made before `before` (seconds since 1970) and are neither kept nor put back, one line each;
// afterwards they count as kept. Only while no join runs.
std::vector<std::string> TakeProvisionalChanges(std::time_t before);

}  // namespace appliance

#endif
