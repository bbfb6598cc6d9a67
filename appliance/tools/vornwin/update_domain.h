// "vornwin -updateDomain".

#ifndef VORN_APPLIANCE_TOOLS_VORNWIN_UPDATE_DOMAIN_H
#define VORN_APPLIANCE_TOOLS_VORNWIN_UPDATE_DOMAIN_H

namespace appliance {

// How the program ends.
inline constexpr int kDone = 0;
inline constexpr int kFailed = 1;
inline constexpr int kWrongUse = 2;
inline constexpr int kAlreadyRunning = 3;

// Refreshes the lists of the users and groups of all domains, or of the own one when trusted domains are disabled. The
// list that a domain has stays in use until its new one is complete, and for good when that fails. Answers kDone when
// every list is new, kAlreadyRunning when another refresh runs, else kFailed, with lines in the log.
int UpdateDomain();

}  // namespace appliance

#endif
