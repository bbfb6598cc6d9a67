// The time of day, to be compared with the times of files.

#ifndef VORN_APPLIANCE_BASE_CLOCK_H
#define VORN_APPLIANCE_BASE_CLOCK_H

#include <chrono>
#include <ctime>

namespace appliance {

// Seconds since 1970, never behind the time of a file that is already written: std::time reads the kernel's clock of the
// last tick, which files are up to 10 ms ahead of where the kernel stamps them finer (from Linux 6.13).
inline std::time_t TimeNow() {
    return std::chrono::system_clock::to_time_t(std::chrono::system_clock::now());
}

}  // namespace appliance

#endif
