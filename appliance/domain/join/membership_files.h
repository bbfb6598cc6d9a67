// The files that are a membership: smb.conf, secrets, keytab. Put in place, put back and cleared, each step of it such
// that it can be done again after an interruption.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_MEMBERSHIP_FILES_H
#define VORN_APPLIANCE_DOMAIN_JOIN_MEMBERSHIP_FILES_H

#include <string>
#include <vector>

#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/journal.h"

namespace appliance {

// Makes the journal's folder with copies of what a join replaces, the new configuration, and the staging folder with
// its own configuration, secrets and keytab; then the journal itself. `controller` is what the staged join asks. Throws
// std::system_error, JoinError.
void PrepareJoin(const Journal& journal, const std::string& controller);

// Copies the secrets anew, for the case that they have changed since; winbindd must not run. Throws std::system_error.
void RefreshOldSecrets();

// Puts the staged membership in place: secrets, keytab, configuration. Throws std::system_error.
void PutInPlace(const Journal& journal);

// Puts only the staged secret and keytab in place, under the old configuration. Throws std::system_error.
void AdoptStagedSecret(const Journal& journal);

// Puts everything back as the journal's copies have it; the secret and keytab only when the journal does not keep the
// new ones. Answers what could not be put back, one line each.
std::vector<std::string> PutBack(const Journal& journal);

// Makes the new configuration of a leave and writes the journal. Throws std::system_error, JoinError.
void PrepareLeave(const Journal& journal, const std::string& workgroup);

// Turns the journal of an interrupted join into that of a leave of the old membership, and answers it. Throws
// std::system_error, JoinError.
Journal TurnIntoLeave(const Journal& journal, const std::string& workgroup);

// Removes the traces of the membership `journal.before`: configuration first (throws std::system_error when that fails,
// with nothing changed), then secrets, keytab, caches. Answers what could not be removed. winbindd must not run.
std::vector<std::string> ClearMembership(const Journal& journal);

// Writes the DNS servers in use to "domain_dns" of the settings file, or removes that key. Empty, or why not.
std::string RecordDnsServers();
std::string ForgetDnsServers();

}  // namespace appliance

#endif
