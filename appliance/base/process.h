// Other processes: which are alive, and since when.

#ifndef VORN_APPLIANCE_BASE_PROCESS_H
#define VORN_APPLIANCE_BASE_PROCESS_H

#include <sys/types.h>

#include <cstdint>
#include <optional>
#include <string>

namespace appliance {

// When a process started, in clock ticks since the machine's start (field 22 of /proc/<pid>/stat); nothing when there is
// no such process or it has ended and only waits to be collected. With the pid it names one process for ever.
std::optional<std::uint64_t> ProcessStart(pid_t pid);

// The same moment in seconds since 1970, with fractions.
std::optional<double> ProcessStartTime(pid_t pid);

// Writes the caller's pid as a pid file: root's own, 0644, no symbolic link followed, in one step, and never over the
// file of a live process (returns false). ReadPidFile answers the pid of the live process that a pid file names, or -1:
// a regular file that root owns, not reached through a symbolic link in its last name, holding one pid above 0 whose
// process started no later than the file was written.
bool WritePidFile(const std::string& path);
int ReadPidFile(const std::string& path);

}  // namespace appliance

#endif
