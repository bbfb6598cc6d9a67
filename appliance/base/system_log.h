// The system's logger, asked in a way that never waits for it.

#ifndef VORN_APPLIANCE_BASE_SYSTEM_LOG_H
#define VORN_APPLIANCE_BASE_SYSTEM_LOG_H

#include <chrono>
#include <mutex>
#include <string>
#include <string_view>

#include "appliance/base/file.h"

namespace appliance {

// Lines of one program. syslog(3) waits for a logger that is stuck or slower than what is written, and with it whoever
// else writes a line in the process; this loses the line instead. Safe from several threads at once.
class SystemLog {
public:
    // `facility` as LOG_DAEMON; `socket` is the logger's.
    SystemLog(std::string name, int facility, std::string socket = "/dev/log");

    // False when the logger has not taken the line.
    bool Send(int priority, std::string_view text);

private:
    bool Connect();

    const std::string name_;
    const int facility_;
    const std::string socket_;
    std::mutex mutex_;
    FileDescriptor logger_;
    std::chrono::steady_clock::time_point nextTry_;
};

}  // namespace appliance

#endif
