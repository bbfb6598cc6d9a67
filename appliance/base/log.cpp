#include "appliance/base/log.h"

#include <unistd.h>

#include <chrono>
#include <cstdio>

#include "appliance/base/file.h"
#include "appliance/base/system_log.h"

namespace appliance {
namespace {

// Lives as long as the process: threads log until its end.
struct OwnLog {
    SystemLog system;
    std::string name;
    bool terminal;
};
OwnLog* ownLog = nullptr;

constexpr std::chrono::milliseconds kPatience{1000};
thread_local bool patient = true;

}  // namespace

void LogAsServer(const std::string& name, bool terminal) {
    if (ownLog != nullptr) {
        ownLog->terminal = terminal;
        return;
    }
    ownLog = new OwnLog{{name, LOG_DAEMON}, name, terminal};
}

WithoutWaitForLog::WithoutWaitForLog() {
    patient = false;
}

WithoutWaitForLog::~WithoutWaitForLog() {
    patient = true;
}

void Log(int priority, const std::string& text) {
    std::string line;
    line.reserve(text.size());
    for (const char letter : text) {
        const auto byte = static_cast<unsigned char>(letter);
        if (byte < 0x20 || byte == 0x7F) {
            char shown[5] = {};
            static_cast<void>(std::snprintf(shown, sizeof(shown), "\\x%02X", byte));
            line += shown;
        } else {
            line += letter;
        }
    }
    if (ownLog == nullptr) {
        syslog(priority, "%s", line.c_str());
        return;
    }
    ownLog->system.Send(priority, line, patient ? kPatience : std::chrono::milliseconds(0));
    if (ownLog->terminal) {
        static_cast<void>(WriteAll(STDERR_FILENO, ownLog->name + "[" + std::to_string(getpid()) + "]: " + line + "\n"));
    }
}

}  // namespace appliance
