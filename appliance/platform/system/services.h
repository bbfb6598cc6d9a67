// The services of the appliance: started, stopped, restarted and reloaded by systemd where it runs, else directly.
//
// Names are the appliance's own: "samba" (smbd), "nmbd" and "winbindd" are the file-sharing service's daemons, which
// read the appliance's smb.conf; any other name is a unit of systemd, or a script of /etc/init.d. nmbd has no place
// on an appliance with "disable netbios = yes", and winbindd none on one that is no member of a domain: they are then
// stopped, and can't be started.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_SERVICES_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_SERVICES_H

#include <chrono>
#include <optional>
#include <string>

#include "appliance/base/error_code.h"

namespace appliance {

inline constexpr std::chrono::milliseconds kServiceDeadline{15000};

// Whether it was done, else why not, in one line for a log or an administrator.
struct ServiceResult {
    std::optional<ErrorCode> failure;
    std::string error;

    explicit operator bool() const {
        return !failure;
    }
};

// True for a name that may be a service's: 1 to 64 bytes of a-z, 0-9 and "-", beginning with a letter or a digit.
bool IsServiceName(const std::string& name);

// Each waits for the end of what it does, `deadline` at most; a daemon that does not end within 3 seconds is killed.
// Safe from several processes and threads at once: one change of a service at a time.
ServiceResult StartService(const std::string& name, std::chrono::milliseconds deadline = kServiceDeadline);
ServiceResult StopService(const std::string& name, std::chrono::milliseconds deadline = kServiceDeadline);
ServiceResult RestartService(const std::string& name, std::chrono::milliseconds deadline = kServiceDeadline);

// Has the service read its configuration again. One that should run and does not is started; one that has no place on
// this appliance is stopped.
ServiceResult ReloadService(const std::string& name, std::chrono::milliseconds deadline = kServiceDeadline);

// Does the service run by itself after a start of the machine? Of the file-sharing service's daemons, where systemd
// does not run: does it have a place on this appliance? Nothing, with `result` saying why, when that can't be found
// out.
std::optional<bool> IsServiceEnabled(const std::string& name, ServiceResult& result);

}  // namespace appliance

#endif
