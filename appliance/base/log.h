// The appliance's own log lines: to syslog, and to the terminal where a program asks for it.

#ifndef VORN_APPLIANCE_BASE_LOG_H
#define VORN_APPLIANCE_BASE_LOG_H

#include <syslog.h>

#include <string>

namespace appliance {

// Writes one line at a priority of syslog (LOG_ERR, LOG_WARNING, LOG_NOTICE, LOG_INFO, LOG_DEBUG). Control bytes are
// shown as \xNN, so that a line stays one line. Never a secret.
void Log(int priority, const std::string& text);

// From now on lines of Log go to the system's logger under this name as the facility LOG_DAEMON, and to standard error as
// well when `terminal`; a line that the logger has not taken after a second is lost. Servers begin with this; other
// programs call openlog(3). Once, before threads run.
void LogAsServer(const std::string& name, bool terminal);

// While one lives, a line that its thread writes to the log of a server is lost rather than waited for: for threads that
// everyone else waits for.
class WithoutWaitForLog {
public:
    WithoutWaitForLog();
    ~WithoutWaitForLog();
    WithoutWaitForLog(const WithoutWaitForLog&) = delete;
    WithoutWaitForLog& operator=(const WithoutWaitForLog&) = delete;
};

}  // namespace appliance

#endif
