#include "appliance/platform/webapi/process_session.h"

#include <dirent.h>
#include <signal.h>
#include <unistd.h>

#include <charconv>
#include <memory>
#include <optional>
#include <thread>

#include "appliance/base/file.h"
#include "appliance/base/process.h"
#include "appliance/base/text.h"

namespace appliance {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kPause{10};
constexpr std::chrono::milliseconds kAfterKill{2000};  // a killed process is gone within this, or waits for a device

std::string ReadProcFile(const std::string& path) {
    std::string content;
    if (ReadFile(path, content)) {
        content.clear();
    }
    return content;
}

const std::string& CurrentBoot() {
    static const std::string boot = Trim(ReadProcFile("/proc/sys/kernel/random/boot_id"));
    return boot;
}

std::optional<pid_t> ParsePid(std::string_view text) {
    pid_t pid = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), pid);
    if (error != std::errc() || end != text.data() + text.size() || pid <= 0) {
        return std::nullopt;
    }
    return pid;
}

// The session of a live process: field 6 of its stat, where field 3 is its state. The name (field 2) may hold anything,
// so the fields are counted from its closing bracket.
std::optional<pid_t> SessionOf(pid_t pid) {
    const std::string stat = ReadProcFile("/proc/" + std::to_string(pid) + "/stat");
    const std::size_t name = stat.rfind(") ");
    if (name == std::string::npos) {
        return std::nullopt;
    }
    const std::vector<std::string> fields = Split(std::string_view(stat).substr(name + 2), " ");
    if (fields.size() < 4 || fields[0] == "Z" || fields[0] == "X") {
        return std::nullopt;
    }
    return ParsePid(fields[3]);
}

struct CloseFolder {
    void operator()(DIR* folder) const {
        closedir(folder);
    }
};

std::vector<pid_t> Remaining(const ProcessIdentity& leader, bool all) {
    std::vector<pid_t> pids;
    if (all) {
        pids = ProcessesOfSession(leader.pid);
    } else if (leader.IsAlive()) {
        pids.push_back(leader.pid);
    }
    return pids;
}

// Signals what is left, again and again since a process may start others meanwhile, until nothing is left or the time
// is over.
bool SignalUntilGone(const ProcessIdentity& leader, bool all, int signal, std::chrono::milliseconds limit) {
    const Clock::time_point end = Clock::now() + limit;
    std::vector<pid_t> signalled;
    for (;;) {
        const std::vector<pid_t> pids = Remaining(leader, all);
        if (pids.empty()) {
            return true;
        }
        if (signal == SIGKILL || pids != signalled) {
            for (const pid_t pid : pids) {
                kill(pid, signal);
            }
            signalled = pids;
        }
        if (Clock::now() >= end) {
            return false;
        }
        std::this_thread::sleep_for(kPause);
    }
}

}  // namespace

ProcessIdentity ProcessIdentity::Of(pid_t pid) {
    ProcessIdentity identity;
    if (const std::optional<std::uint64_t> start = ProcessStart(pid)) {
        identity.pid = pid;
        identity.start = *start;
        identity.boot = CurrentBoot();
    }
    return identity;
}

ProcessIdentity ProcessIdentity::OfCaller() {
    return Of(getpid());
}

bool ProcessIdentity::IsAlive() const {
    if (pid <= 0 || boot != CurrentBoot()) {
        return false;
    }
    const std::optional<std::uint64_t> now = ProcessStart(pid);
    return now && *now == start;
}

std::vector<pid_t> ProcessesOfSession(pid_t session) {
    std::vector<pid_t> pids;
    const std::unique_ptr<DIR, CloseFolder> processes(opendir("/proc"));
    if (!processes || session <= 0) {
        return pids;
    }
    while (const dirent* entry = readdir(processes.get())) {
        const std::optional<pid_t> pid = ParsePid(entry->d_name);
        if (pid && SessionOf(*pid) == session) {
            pids.push_back(*pid);
        }
    }
    return pids;
}

bool EndSession(const ProcessIdentity& leader, bool all, std::chrono::milliseconds patience) {
    // The number of a session can't become another process's while one of the session lives, so a session whose leader
    // is gone is still the task's, unless the number went on to a process that leads a session of its own.
    const ProcessIdentity now = ProcessIdentity::Of(leader.pid);
    if (leader.pid <= 0 || leader.boot != CurrentBoot() || (now.pid != 0 && now.start != leader.start)) {
        return true;
    }
    return SignalUntilGone(leader, all, SIGTERM, patience) || SignalUntilGone(leader, all, SIGKILL, kAfterKill);
}

}  // namespace appliance
