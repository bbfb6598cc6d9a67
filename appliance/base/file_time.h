// When files were written, to be compared with the time that it is.

#ifndef VORN_APPLIANCE_BASE_FILE_TIME_H
#define VORN_APPLIANCE_BASE_FILE_TIME_H

#include <sys/stat.h>

#include <chrono>

namespace appliance {

// To the nanosecond. What std::chrono::system_clock::now answers is never behind a file that is already written;
// std::time is: it reads the kernel's clock of the last tick, which files are ahead of where the kernel stamps them finer
// (from Linux 6.13).
using Moment = std::chrono::time_point<std::chrono::system_clock, std::chrono::nanoseconds>;

// When the content of the file last changed.
inline Moment WrittenAt(const struct stat& file) {
    return Moment(std::chrono::seconds(file.st_mtim.tv_sec) + std::chrono::nanoseconds(file.st_mtim.tv_nsec));
}

}  // namespace appliance

#endif
