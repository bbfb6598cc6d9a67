#include "appliance/platform/system/services.h"

#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <memory>
#include <string_view>
#include <utility>

#include "appliance/base/command.h"
#include "appliance/base/file.h"
#include "appliance/base/file_lock.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/platform/system/samba_daemon.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr const char kSystemdRuns[] = "/run/systemd/system";
constexpr const char kSystemctl[] = "/usr/bin/systemctl";
constexpr const char kScripts[] = "/etc/init.d/";
constexpr const char kStartLinks[] = "/etc/rc2.d";
constexpr std::size_t kLongestName = 64;

enum class Action { Start, Stop, Restart, Reload };

milliseconds Left(Deadline deadline) {
    return std::max(milliseconds(1), std::chrono::duration_cast<milliseconds>(deadline - steady_clock::now()));
}

bool SystemdRuns() {
    struct stat status = {};
    return stat(Path(kSystemdRuns).c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

// "name exited with 1: what it said first".
ServiceResult ResultOf(const std::string& name, const CommandResult& result) {
    if (result.Succeeded()) {
        return {};
    }
    std::string error = name + ": " + result.Describe();
    for (const std::string& line : Lines(result.errors.empty() ? result.output : result.errors)) {
        if (!Trim(line).empty()) {
            error += ": " + Trim(line);
            break;
        }
    }
    const bool late = result.end == CommandResult::End::TimedOut;
    return {late ? ErrorCode::TimedOut : ErrorCode::CommandFailed, std::move(error)};
}

CommandResult RunUntil(std::vector<std::string> arguments, Deadline deadline) {
    Command command;
    command.arguments = std::move(arguments);
    command.deadline = Left(deadline);
    command.endsWithCaller = false;
    return Run(command);
}

// ---- systemd ----

std::string UnitOf(const std::string& name) {
    const SambaDaemon* daemon = FindSambaDaemon(name);
    return daemon == nullptr ? name + ".service" : daemon->unit;
}

ServiceResult AskSystemd(const std::string& name, Action action, Deadline deadline) {
    const char* verb = action == Action::Start     ? "start"
                       : action == Action::Stop    ? "stop"
                       : action == Action::Restart ? "restart"
                                                   : "reload-or-restart";
    return ResultOf(name, RunUntil({Path(kSystemctl), "--no-ask-password", verb, "--", UnitOf(name)}, deadline));
}

// ---- scripts of /etc/init.d ----

bool HasScript(const std::string& name) {
    return access((Path(kScripts) + name).c_str(), X_OK) == 0;
}

ServiceResult RunScript(const std::string& name, Action action, Deadline deadline) {
    const std::string script = Path(kScripts) + name;
    if (!HasScript(name)) {
        return {ErrorCode::NotFound, "there is no service " + name};
    }
    if (action != Action::Reload) {
        const char* verb = action == Action::Start ? "start" : action == Action::Stop ? "stop" : "restart";
        return ResultOf(name, RunUntil({script, verb}, deadline));
    }
    // Every script has "force-reload", which restarts a service that can't reload; not every one has "reload".
    if (RunUntil({script, "reload"}, deadline).Succeeded()) {
        return {};
    }
    return ResultOf(name, RunUntil({script, "force-reload"}, deadline));
}

// Is there a link "SNNname" that starts the service in the usual run level?
bool HasStartLink(const std::string& name) {
    struct CloseFolder {
        void operator()(DIR* folder) const {
            closedir(folder);
        }
    };
    const std::unique_ptr<DIR, CloseFolder> folder(opendir(Path(kStartLinks).c_str()));
    const auto isDigit = [](char byte) { return byte >= '0' && byte <= '9'; };
    while (const dirent* entry = folder ? readdir(folder.get()) : nullptr) {
        const std::string_view link = entry->d_name;
        if (link.size() > 3 && link[0] == 'S' && isDigit(link[1]) && isDigit(link[2]) && link.substr(3) == name) {
            return true;
        }
    }
    return false;
}

// ---- both ----

// For a daemon that has no place on this appliance: what is asked of it can only be that it does not run.
ServiceResult KeepAway(const SambaDaemon& daemon, Action action, const std::string& why, Deadline deadline) {
    ServiceResult result =
        SystemdRuns() ? AskSystemd(daemon.service, Action::Stop, deadline) : StopDaemon(daemon, deadline);
    if (result && action != Action::Reload) {
        const bool member = std::string_view(daemon.service) == "winbindd";
        result = {member ? ErrorCode::NotMember : ErrorCode::BadArgument, std::string(daemon.name) + " " + why};
    }
    return result;
}

ServiceResult ActOnDaemon(const SambaDaemon& daemon, Action action, Deadline deadline) {
    switch (action) {
        case Action::Start:
            return StartDaemon(daemon, deadline);
        case Action::Stop:
            return StopDaemon(daemon, deadline);
        case Action::Restart: {
            ServiceResult stopped = StopDaemon(daemon, deadline);
            return stopped ? StartDaemon(daemon, deadline) : stopped;
        }
        case Action::Reload:
            break;
    }
    return ReloadDaemon(daemon, deadline);
}

ServiceResult ActOnKnown(const std::string& name, Action action, Deadline deadline) {
    const SambaDaemon* daemon = FindSambaDaemon(name);
    if (daemon != nullptr && action != Action::Stop) {
        ServiceResult result;
        const std::string why = WhyNotHere(*daemon, result);
        if (!result) {
            return result;
        }
        if (!why.empty()) {
            return KeepAway(*daemon, action, why, deadline);
        }
    }
    if (SystemdRuns()) {
        return AskSystemd(name, action, deadline);
    }
    return daemon == nullptr ? RunScript(name, action, deadline) : ActOnDaemon(*daemon, action, deadline);
}

ServiceResult Act(const std::string& name, Action action, milliseconds wait) {
    if (!IsServiceName(name)) {
        return {ErrorCode::BadArgument, "a name that no service can have"};
    }
    const Deadline deadline = steady_clock::now() + wait;
    if (const std::error_code error = MakeFolder(Path(kRun), 0755)) {
        return {ErrorCode::FileWrite, Path(kRun) + ": " + error.message()};
    }
    const std::optional<FileLock> lock = FileLock::Take(Path(kRun) + "/service-" + name + ".lock", wait);
    if (!lock) {
        return {ErrorCode::FileLock, name + ": another change of the service does not end"};
    }
    return ActOnKnown(name, action, deadline);
}

}  // namespace

bool IsServiceName(const std::string& name) {
    return !name.empty() && name.size() <= kLongestName && name.front() != '-' &&
           name.find_first_not_of("abcdefghijklmnopqrstuvwxyz0123456789-") == std::string::npos;
}

ServiceResult StartService(const std::string& name, milliseconds deadline) {
    return Act(name, Action::Start, deadline);
}

ServiceResult StopService(const std::string& name, milliseconds deadline) {
    return Act(name, Action::Stop, deadline);
}

ServiceResult RestartService(const std::string& name, milliseconds deadline) {
    return Act(name, Action::Restart, deadline);
}

ServiceResult ReloadService(const std::string& name, milliseconds deadline) {
    return Act(name, Action::Reload, deadline);
}

std::optional<bool> IsServiceEnabled(const std::string& name, ServiceResult& result) {
    result = {};
    if (!IsServiceName(name)) {
        result = {ErrorCode::BadArgument, "a name that no service can have"};
        return std::nullopt;
    }
    if (SystemdRuns()) {
        const CommandResult answer = RunUntil({Path(kSystemctl), "is-enabled", "--quiet", "--", UnitOf(name)},
                                              steady_clock::now() + kServiceDeadline);
        if (answer.end != CommandResult::End::Exited) {
            result = ResultOf(name, answer);
            return std::nullopt;
        }
        return answer.code == 0;
    }
    const SambaDaemon* daemon = FindSambaDaemon(name);
    if (daemon == nullptr) {
        return HasScript(name) && HasStartLink(name);
    }
    const std::string why = WhyNotHere(*daemon, result);
    return result ? std::optional<bool>(why.empty()) : std::nullopt;
}

}  // namespace appliance
