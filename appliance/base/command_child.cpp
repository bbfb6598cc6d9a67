#include "appliance/base/command_child.h"

#include <fcntl.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <string_view>

#include "appliance/base/paths.h"

namespace appliance {

namespace {

constexpr int kStatus = 3;  // where the child keeps its way to tell of a start that failed

constexpr std::string_view kDefaultEnvironment[] = {"PATH=/usr/sbin:/usr/bin:/sbin:/bin", "HOME=/", "LC_ALL=C"};

char* Writable(const char* text) {
    return const_cast<char*>(text);  // execve changes none of its texts
}

bool IsEnvironmentName(std::string_view name) {
    return !name.empty() && name.find('=') == std::string_view::npos && name.find('\0') == std::string_view::npos;
}

// Sets the child up; comes back only when that failed.
void SetUpAndExec(const CommandChild& child) {
    if (child.ownSession ? setsid() < 0 : child.ownGroup && setpgid(0, 0) != 0) {
        return;
    }
    if (child.endsWithCaller) {
        // The caller may be gone by now, and its death is not told afterwards. 0: it is in another pid namespace.
        const pid_t parent = prctl(PR_SET_PDEATHSIG, SIGKILL) == 0 ? getppid() : -1;
        if (parent != child.caller && parent != 0) {
            errno = ESRCH;
            return;
        }
    }
    struct sigaction byDefault = {};
    byDefault.sa_handler = SIG_DFL;
    for (int signal = 1; signal < NSIG; ++signal) {
        sigaction(signal, &byDefault, nullptr);  // fails for those that can't be changed
    }
    sigset_t none;
    sigemptyset(&none);
    if (sigprocmask(SIG_SETMASK, &none, nullptr) != 0 || dup2(child.input.get(), STDIN_FILENO) < 0 ||
        dup2(child.output.get(), STDOUT_FILENO) < 0 || dup2(child.errors.get(), STDERR_FILENO) < 0 ||
        close_range(kFirstFreeDescriptor, ~0U, 0) != 0) {
        return;
    }
    execve(child.arguments[0], child.arguments.data(), child.environment.data());
}

}  // namespace

bool PrepareChild(const Command& command, CommandChild& child) {
    const auto hasNul = [](std::string_view text) { return text.find('\0') != std::string_view::npos; };
    if (command.arguments.empty() || command.arguments.front().substr(0, 1) != "/") {
        return false;
    }
    for (const std::string& argument : command.arguments) {
        if (hasNul(argument)) {
            return false;
        }
        child.arguments.push_back(Writable(argument.c_str()));
    }
    child.arguments.push_back(nullptr);

    const auto isGiven = [&](std::string_view entry) {
        const std::string_view name = entry.substr(0, entry.find('='));
        const auto isSame = [&](const auto& given) { return given.first == name; };
        return std::any_of(command.environment.begin(), command.environment.end(), isSame) ||
               std::any_of(command.secretEnvironment.begin(), command.secretEnvironment.end(), isSame);
    };
    for (const std::string_view entry : kDefaultEnvironment) {
        if (!isGiven(entry)) {
            child.plain.emplace_back(entry);
        }
    }
    if (const std::string root = Path(""); !root.empty()) {
        child.plain.push_back(std::string(kRootVariable) + "=" + root);
    }
    for (const auto& [name, value] : command.environment) {
        if (!IsEnvironmentName(name) || hasNul(value)) {
            return false;
        }
        child.plain.push_back(name + "=" + value);
    }
    for (const auto& [name, value] : command.secretEnvironment) {
        if (!IsEnvironmentName(name) || hasNul(value.view())) {
            return false;
        }
        child.secret.push_back(Secret::Joined({name, "=", value.view()}));
    }
    for (const std::string& entry : child.plain) {
        child.environment.push_back(Writable(entry.c_str()));
    }
    for (const Secret& entry : child.secret) {
        child.environment.push_back(Writable(entry.c_str()));
    }
    child.environment.push_back(nullptr);
    child.ownGroup = command.ownGroup;
    child.ownSession = command.ownSession;
    child.endsWithCaller = command.endsWithCaller;
    child.caller = getpid();
    return true;
}

void RunChild(const CommandChild& child) {
    if (dup3(child.status.get(), kStatus, O_CLOEXEC) >= 0) {
        SetUpAndExec(child);
        const int failure = errno;
        static_cast<void>(!write(kStatus, &failure, sizeof(failure)));
    }
    _exit(127);
}

}  // namespace appliance
