// The system's logger, asked in a way that never waits for it longer than the caller allows.

#ifndef VORN_APPLIANCE_BASE_SYSTEM_LOG_H
#define VORN_APPLIANCE_BASE_SYSTEM_LOG_H

#include <chrono>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>

#include "appliance/base/file.h"

namespace appliance {

// Lines of one program. syslog(3) waits without end for a logger that is stuck, and with it whoever else writes a line in
// the process; this loses the line instead, and says how many it lost once the logger takes lines again. Safe from
// several threads at once.
class SystemLog {
public:
    // `facility` as LOG_DAEMON; `socket` is the logger's.
    SystemLog(std::string name, int facility, std::string socket = "/dev/log");

    // False when the logger has not taken the line. The system keeps few lines for a logger (ten, where nobody has set
    // another number), so that a burst of them needs `patience` until it has caught up. Once a wait was in vain nobody
    // waits for ten seconds.
    bool Send(int priority, std::string_view text, std::chrono::milliseconds patience = std::chrono::milliseconds(0));

private:
    enum class Outcome { Taken, Full, Failed };

    std::string Form(int priority, std::string_view text) const;
    Outcome Try(const std::string& line);
    bool Lost();
    void TellLost();
    bool Connect();

    const std::string name_;
    const int facility_;
    const std::string socket_;
    std::mutex mutex_;
    std::shared_ptr<const FileDescriptor> logger_;
    std::chrono::steady_clock::time_point nextTry_;
    std::chrono::steady_clock::time_point nextWait_;
    std::uint64_t lost_ = 0;
};

}  // namespace appliance

#endif
