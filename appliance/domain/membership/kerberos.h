// Kerberos configuration of the appliance's own processes, and tickets of the machine account.

#ifndef VORN_APPLIANCE_DOMAIN_MEMBERSHIP_KERBEROS_H
#define VORN_APPLIANCE_DOMAIN_MEMBERSHIP_KERBEROS_H

#include <string>

namespace appliance {

// Writes a krb5.conf for one realm into `folder` and answers its path: no reverse look-ups, no DNS look-ups of realms,
// TCP first; `kdc` (an address or a name; may be empty: found in DNS) is the only controller asked. Throws
// std::system_error.
std::string WriteKerberosConfiguration(const std::string& folder, const std::string& realm, const std::string& kdc);

// Points this process at such a file (KRB5_CONFIG). Only for a process of its own: the environment is one per process.
void UseKerberosConfiguration(const std::string& path);

// Takes a ticket for the machine account (its key is in the keytab) into a MEMORY cache and makes it this process's
// default (KRB5CCNAME). Empty on success, else the reason in words; `keyIsWrong` then says whether the keytab holds no
// key for the account, or not the one that the controller knows. May wait for a controller: only for a process that can
// be killed.
std::string TakeMachineTicket(const std::string& account, const std::string& realm, bool& keyIsWrong);

// Removes the keys of one realm from a keytab, and the file when no key is left. A missing file is no failure. Throws
// std::system_error.
void RemoveRealmFromKeytab(const std::string& path, const std::string& realm);

}  // namespace appliance

#endif
