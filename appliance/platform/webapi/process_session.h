// A session of processes: what a background task started belongs to the session that its process leads, whatever
// process groups are in it.

#ifndef VORN_APPLIANCE_PLATFORM_WEBAPI_PROCESS_SESSION_H
#define VORN_APPLIANCE_PLATFORM_WEBAPI_PROCESS_SESSION_H

#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

namespace appliance {

// One process for ever, also across restarts of the machine.
struct ProcessIdentity {
    pid_t pid = 0;            // 0: none
    std::uint64_t start = 0;  // clock ticks, see ProcessStart
    std::string boot;         // the run of the machine

    static ProcessIdentity OfCaller();
    static ProcessIdentity Of(pid_t pid);
    bool IsAlive() const;
};

// The live processes of a session, the leader included; zombies don't count.
std::vector<pid_t> ProcessesOfSession(pid_t session);

// Ends the process, and with `all` every process of the session that it leads: SIGTERM, and SIGKILL for what is left
// after `patience` (milliseconds). True when nothing of it is left; a process that is gone already is no failure.
bool EndSession(const ProcessIdentity& leader, bool all, std::chrono::milliseconds patience);

}  // namespace appliance

#endif
