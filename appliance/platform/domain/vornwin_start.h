// vornwin started for what must not hold up a caller.

#ifndef VORN_APPLIANCE_PLATFORM_DOMAIN_VORNWIN_START_H
#define VORN_APPLIANCE_PLATFORM_DOMAIN_VORNWIN_START_H

namespace appliance {

// Starts "vornwin OPTION" in a session of its own and does not wait for it. What becomes of it is in the log.
void StartVornwin(const char* option);

}  // namespace appliance

#endif
