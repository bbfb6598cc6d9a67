// Starting and stopping winbind around a change of membership, and what it keeps in memory of a domain.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_WINBIND_H
#define VORN_APPLIANCE_DOMAIN_JOIN_WINBIND_H

#include <chrono>
#include <string>

namespace appliance {

// Ends winbindd, if it runs. Empty when none runs afterwards, else the reason in one line.
std::string StopWinbind(std::chrono::milliseconds deadline);

// Starts winbindd on the appliance's smb.conf and waits until it answers. Empty on success, also when it runs and is too
// busy to answer; else the reason.
std::string StartWinbind(std::chrono::milliseconds deadline);

// Does winbindd confirm the trust with the domain? Asks again until `deadline`, since it has just been started. Busy: it
// runs and answers nothing, as it does for ten seconds and more while it looks for a trusted domain whose name servers
// are silent. `words` gets the reason when it is not Confirmed.
enum class WinbindTrust { Confirmed, Denied, Busy };
WinbindTrust ConfirmTrust(std::chrono::milliseconds deadline, std::string& words);

// Removes what Samba remembers of a domain's controllers and accounts. Only while winbindd does not run.
void RemoveDomainCaches();

}  // namespace appliance

#endif
