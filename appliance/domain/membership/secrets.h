// The secrets that a join leaves: the machine account's password and what belongs to it, in the file-sharing service's
// database of secrets. Each call opens the file, does one thing and closes it; calls within a process wait for each
// other, whichever library of it makes them, since the database library opens a file only once.

#ifndef VORN_APPLIANCE_DOMAIN_MEMBERSHIP_SECRETS_H
#define VORN_APPLIANCE_DOMAIN_MEMBERSHIP_SECRETS_H

#include <string>
#include <vector>

namespace appliance {

inline constexpr char kSecrets[] = "/var/lib/samba/private/secrets.tdb";

// Is the machine account's password for the domain (NetBIOS name) stored? False when the file can't be read.
bool HasMachineSecret(const std::string& path, const std::string& domain);

// Copies the whole database as it is at one moment into a new file (0600) in place of `to`. A missing source gives an
// empty copy, and so does one that is no database (which stays, and is named in the log). Throws std::system_error.
void CopySecrets(const std::string& from, const std::string& to);

// The keys of one domain: those that end in "/NAME" for its NetBIOS name or its DNS name (may be empty). The SID of the
// machine itself is not among them.
struct SecretsOwner {
    std::string domain;
    std::string realm;
    std::string machine;
};

// Makes the keys of `owners` in the database at `path` what they are in `source`, in one transaction that a crash can't
// tear; every other key stays. With an empty `source` they are removed, and their bytes overwritten first. Programs that
// have the file open see the change. A file that is no database is kept as "PATH.damaged" (named in the log), and a new
// one takes its place when there is something to store. Throws std::system_error.
void ReplaceSecrets(const std::string& path, const std::string& source, const std::vector<SecretsOwner>& owners);

// Keeps a file that is no database as "PATH.damaged", as ReplaceSecrets does; what fails is logged.
void KeepDamagedSecrets(const std::string& path);

// Are the stored machine passwords of a domain the same in both files? A missing one equals a missing one.
bool SameMachineSecret(const std::string& first, const std::string& second, const std::string& domain);

}  // namespace appliance

#endif
