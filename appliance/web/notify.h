// What the service manager wants to hear. Without one, none of this does anything.

#ifndef VORN_APPLIANCE_WEB_NOTIFY_H
#define VORN_APPLIANCE_WEB_NOTIFY_H

#include <chrono>
#include <string>

namespace appliance {

inline constexpr const char kWatchdogBeat[] = "WATCHDOG=1";

// Sends "READY=1", "STOPPING=1", kWatchdogBeat or the like to the socket that NOTIFY_SOCKET names. Waits for half a
// second at most, with a beat not at all.
void Notify(const std::string& state);

// How often the service manager wants to hear "WATCHDOG=1" from this process; 0 for not at all.
std::chrono::microseconds WatchdogInterval();

// Takes NOTIFY_SOCKET and its like out of the environment, so that no child speaks in the server's name. Once, before
// threads run; the functions above remember them.
void AdoptNotifySocket();

}  // namespace appliance

#endif
