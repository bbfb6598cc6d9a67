#include "appliance/platform/system/samba_daemon.h"

#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <system_error>
#include <thread>
#include <utility>

#include "appliance/base/command.h"
#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "appliance/base/text.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr SambaDaemon kDaemons[] = {
    {"samba", "/usr/sbin/smbd", "/run/samba/smbd.pid", "smbd", "smbd.service"},
    {"nmbd", "/usr/sbin/nmbd", "/run/samba/nmbd.pid", "nmbd", "nmbd.service"},
    {"winbindd", "/usr/sbin/winbindd", "/run/samba/winbindd.pid", "winbindd", "winbind.service"},
};

constexpr const char kPidFolder[] = "/run/samba";
constexpr const char kControl[] = "/usr/bin/smbcontrol";
constexpr milliseconds kStep{10};      // between two looks
constexpr milliseconds kSettled{300};  // a daemon that can't run (no secret, no port) has ended by then
constexpr milliseconds kPidFilePatience{5000};
constexpr milliseconds kGrace{3000};  // to end by itself; winbindd takes a minute when it waits for a dead controller
constexpr milliseconds kAfterKill{2000};
constexpr milliseconds kControlDeadline{3000};

ServiceResult Failed(ErrorCode code, const SambaDaemon& daemon, const std::string& what) {
    return {code, std::string(daemon.name) + " " + what};
}

milliseconds Left(Deadline deadline) {
    return std::max(milliseconds(1), std::chrono::duration_cast<milliseconds>(deadline - steady_clock::now()));
}

// A process for ever, not only its number.
struct Process {
    pid_t pid = -1;
    std::uint64_t start = 0;

    bool Lives() const {
        const std::optional<std::uint64_t> now = ProcessStart(pid);
        return now && *now == start;
    }
};

std::optional<Process> Running(const SambaDaemon& daemon) {
    const int pid = ReadPidFile(Path(daemon.pidFile));
    const std::optional<std::uint64_t> start = pid > 0 ? ProcessStart(pid) : std::nullopt;
    return start ? std::optional<Process>(Process{pid, *start}) : std::nullopt;
}

bool HasEnded(const Process& process, Deadline deadline) {
    while (process.Lives()) {
        if (steady_clock::now() >= deadline) {
            return false;
        }
        std::this_thread::sleep_for(kStep);
    }
    return true;
}

std::string FirstLine(const std::string& text) {
    for (const std::string& line : Lines(text)) {
        if (!Trim(line).empty()) {
            return Trim(line);
        }
    }
    return "";
}

// What the program said, as the end of a message.
std::string Said(const CommandResult& result) {
    const std::string line = FirstLine(result.errors.empty() ? result.output : result.errors);
    return line.empty() ? "" : ": " + line;
}

// Has smbcontrol(1) speak to the daemon.
bool Control(const SambaDaemon& daemon, const char* message, milliseconds deadline) {
    Command command;
    command.arguments = {Path(kControl), "--configfile=" + Path(kSmbConf), daemon.name, message};
    command.deadline = deadline;
    return Run(command).Succeeded();
}

// Tells one writing of a pid file from another.
struct Stamp {
    bool exists = false;
    ino_t inode = 0;
    timespec time = {};
};

Stamp StampOf(const std::string& path) {
    struct stat status = {};
    if (stat(path.c_str(), &status) != 0) {
        return {};
    }
    return {true, status.st_ino, status.st_mtim};
}

bool Differ(const Stamp& first, const Stamp& second) {
    return first.exists != second.exists || first.inode != second.inode || first.time.tv_sec != second.time.tv_sec ||
           first.time.tv_nsec != second.time.tv_nsec;
}

ServiceResult EndedAtOnce(const SambaDaemon& daemon) {
    return Failed(ErrorCode::CommandFailed, daemon, "ended right after its start; its own log says why");
}

// The daemon that writes its pid file after `before`; none, with `result` saying why, when none comes up.
std::optional<Process> AwaitPidFile(const SambaDaemon& daemon, const Stamp& before, Deadline deadline,
                                    ServiceResult& result) {
    // The program has gone into the background already: without a pid file within this time none will come.
    const Deadline patience = std::min(deadline, steady_clock::now() + kPidFilePatience);
    Deadline dead = Deadline::max();
    while (true) {
        if (std::optional<Process> process = Running(daemon)) {
            return process;
        }
        const Deadline now = steady_clock::now();
        const Stamp stamp = StampOf(Path(daemon.pidFile));
        if (stamp.exists && Differ(stamp, before)) {
            // Written, and its process is not there: it has ended, or the pid itself follows in a moment.
            dead = std::min(dead, now + kSettled);
        }
        if (now >= dead) {
            result = EndedAtOnce(daemon);
            return std::nullopt;
        }
        if (now >= patience) {
            result = Failed(ErrorCode::CommandFailed, daemon, "did not come up; its own log says why");
            return std::nullopt;
        }
        std::this_thread::sleep_for(kStep);
    }
}

// A daemon has come up when it answers; one that is too busy for that (a dead controller) when it is still there a
// moment later.
ServiceResult AwaitDaemon(const SambaDaemon& daemon, const Stamp& before, Deadline deadline) {
    ServiceResult result;
    const std::optional<Process> process = AwaitPidFile(daemon, before, deadline, result);
    if (!process) {
        return result;
    }
    const Deadline settled = std::min(deadline, steady_clock::now() + kSettled);
    if (Control(daemon, "ping", Left(settled)) && process->Lives()) {
        return {};
    }
    return HasEnded(*process, settled) ? EndedAtOnce(daemon) : ServiceResult{};
}

bool SendReload(const SambaDaemon& daemon, const Process& process, Deadline deadline) {
    // The message reaches the daemon's children, too; the signal only the daemon itself.
    return Control(daemon, "reload-config", std::min(kControlDeadline, Left(deadline))) ||
           (process.Lives() && kill(process.pid, SIGHUP) == 0);
}

}  // namespace

const SambaDaemon* FindSambaDaemon(const std::string& service) {
    const auto* found = std::find_if(std::begin(kDaemons), std::end(kDaemons),
                                     [&service](const SambaDaemon& daemon) { return service == daemon.service; });
    return found == std::end(kDaemons) ? nullptr : found;
}

std::string WhyNotHere(const SambaDaemon& daemon, ServiceResult& result) {
    ConfFile conf;
    if (const std::error_code error = ConfFile::Load(Path(kSmbConf), conf, false)) {
        result = {ErrorCode::FileRead, Path(kSmbConf) + ": " + error.message()};
        return "";
    }
    const std::string service = daemon.service;
    if (service == "nmbd") {
        const std::string disabled = Lower(conf.Get("global", "disable netbios").value_or("no"));
        const bool yes = disabled == "yes" || disabled == "true" || disabled == "on" || disabled == "1";
        return yes ? "does not run with \"disable netbios = yes\"" : "";
    }
    if (service == "winbindd" && !MembershipOf(conf).DomainMode()) {
        return "runs on a member of a domain only";
    }
    return "";
}

ServiceResult StartDaemon(const SambaDaemon& daemon, Deadline deadline) {
    if (Running(daemon)) {
        return {};
    }
    if (const std::error_code error = MakeFolder(Path(kPidFolder), 0755)) {
        return Failed(ErrorCode::FileWrite, daemon, "can't be started: " + Path(kPidFolder) + ": " + error.message());
    }
    Command command;
    command.arguments = {Path(daemon.program), "-D", "--configfile=" + Path(kSmbConf)};
    command.deadline = Left(deadline);
    command.endsWithCaller = false;
    const Stamp before = StampOf(Path(daemon.pidFile));
    const CommandResult result = Run(command);
    if (!result.Succeeded()) {
        const bool late = result.end == CommandResult::End::TimedOut;
        return Failed(late ? ErrorCode::TimedOut : ErrorCode::CommandFailed, daemon, result.Describe() + Said(result));
    }
    return AwaitDaemon(daemon, before, deadline);
}

ServiceResult StopDaemon(const SambaDaemon& daemon, Deadline deadline) {
    // Read before the signal: winbindd removes the file while it is still ending.
    const std::optional<Process> process = Running(daemon);
    if (!process) {
        return {};
    }
    if (kill(process->pid, SIGTERM) != 0 && process->Lives()) {
        return Failed(ErrorCode::CommandFailed, daemon, "can't be stopped");
    }
    if (HasEnded(*process, std::min(deadline, steady_clock::now() + kGrace))) {
        return {};
    }
    Log(LOG_WARNING, std::string(daemon.name) + " does not end and is killed");
    const bool leadsGroup = getpgid(process->pid) == process->pid;
    if (process->Lives()) {
        kill(leadsGroup ? -process->pid : process->pid, SIGKILL);
    }
    return HasEnded(*process, steady_clock::now() + kAfterKill)
               ? ServiceResult{}
               : Failed(ErrorCode::TimedOut, daemon, "does not end, though it was killed");
}

ServiceResult ReloadDaemon(const SambaDaemon& daemon, Deadline deadline) {
    const std::optional<Process> process = Running(daemon);
    if (!process) {
        return StartDaemon(daemon, deadline);
    }
    return SendReload(daemon, *process, deadline) ? ServiceResult{}
                                                  : Failed(ErrorCode::CommandFailed, daemon, "can't be reloaded");
}

}  // namespace appliance
