// The file-sharing service's daemons, run without systemd.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_SAMBA_DAEMON_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_SAMBA_DAEMON_H

#include <chrono>
#include <string>

#include "appliance/platform/system/services.h"

namespace appliance {

// A point in time until which something must be done.
using Deadline = std::chrono::steady_clock::time_point;

struct SambaDaemon {
    const char* service;  // the appliance's name
    const char* program;  // by its fixed path, for Path()
    const char* pidFile;  // by its fixed path, for Path()
    const char* name;     // of the program, for smbcontrol and messages
    const char* unit;     // systemd's name
};

// The daemon of a service's name, or null.
const SambaDaemon* FindSambaDaemon(const std::string& service);

// Why the daemon has no place on this appliance; empty when it has one. `result` fails when smb.conf can't be read.
std::string WhyNotHere(const SambaDaemon& daemon, ServiceResult& result);

// Starts a daemon that does not run and waits until it has settled. One that runs is left alone.
ServiceResult StartDaemon(const SambaDaemon& daemon, Deadline deadline);

// Ends a daemon that runs and waits for its end; kills it with all of its process group when it does not end within 3
// seconds, or by the deadline.
ServiceResult StopDaemon(const SambaDaemon& daemon, Deadline deadline);

// Has a daemon that runs read smb.conf again; starts one that does not.
ServiceResult ReloadDaemon(const SambaDaemon& daemon, Deadline deadline);

}  // namespace appliance

#endif
