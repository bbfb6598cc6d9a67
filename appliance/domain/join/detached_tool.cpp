#include "appliance/domain/join/detached_tool.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <optional>
#include <thread>
#include <vector>

#include "appliance/base/child_process.h"
#include "appliance/base/file.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;
using Clock = std::chrono::steady_clock;

constexpr char kWatcher[] = "/usr/bin/timeout";
constexpr char kOutput[] = "/tool.out";
constexpr char kErrors[] = "/tool.err";
constexpr char kLock[] = "/tool.lock";
constexpr milliseconds kPause{5};
constexpr milliseconds kWatcherMargin{1000};
constexpr int kFirstFree = 10;

FileDescriptor OpenHigh(const std::string& path, int flags) {
    const FileDescriptor low(open(path.c_str(), flags | O_CLOEXEC | O_NOFOLLOW, 0600));
    return FileDescriptor(low ? fcntl(low.get(), F_DUPFD_CLOEXEC, kFirstFree) : -1);
}

// What the child needs, ready before the fork.
struct Prepared {
    std::vector<std::string> arguments;
    std::vector<Secret> environment;
    std::vector<char*> argv;
    std::vector<char*> envp;
    FileDescriptor input;
    FileDescriptor output;
    FileDescriptor errors;
    FileDescriptor lock;
};

void AddEnvironment(Prepared& prepared, std::string_view name, std::string_view value) {
    prepared.environment.push_back(Secret::Joined({name, "=", value}));
}

bool Prepare(const Command& command, const std::string& folder, Prepared& prepared) {
    const auto seconds = std::chrono::ceil<std::chrono::seconds>(command.deadline + kWatcherMargin);
    prepared.arguments = {kWatcher, "--signal=KILL", std::to_string(seconds.count())};
    prepared.arguments.insert(prepared.arguments.end(), command.arguments.begin(), command.arguments.end());
    AddEnvironment(prepared, "PATH", "/usr/sbin:/usr/bin:/sbin:/bin");
    AddEnvironment(prepared, "HOME", "/");
    AddEnvironment(prepared, "LC_ALL", "C");
    for (const auto& [name, value] : command.environment) {
        AddEnvironment(prepared, name, value);
    }
    for (const auto& [name, value] : command.secretEnvironment) {
        AddEnvironment(prepared, name, value.view());
    }
    for (std::string& argument : prepared.arguments) {
        prepared.argv.push_back(argument.data());
    }
    for (const Secret& entry : prepared.environment) {
        prepared.envp.push_back(const_cast<char*>(entry.c_str()));
    }
    prepared.argv.push_back(nullptr);
    prepared.envp.push_back(nullptr);
    prepared.input = OpenHigh("/dev/null", O_RDONLY);
    prepared.output = OpenHigh(folder + kOutput, O_WRONLY | O_CREAT | O_TRUNC);
    prepared.errors = OpenHigh(folder + kErrors, O_WRONLY | O_CREAT | O_TRUNC);
    prepared.lock = OpenHigh(folder + kLock, O_RDWR | O_CREAT);
    return prepared.input && prepared.output && prepared.errors && prepared.lock &&
           flock(prepared.lock.get(), LOCK_EX | LOCK_NB) == 0;
}

[[noreturn]] void RunChild(const Prepared& prepared) {
    setsid();
    struct sigaction byDefault = {};
    byDefault.sa_handler = SIG_DFL;
    for (int signal = 1; signal < NSIG; ++signal) {
        sigaction(signal, &byDefault, nullptr);
    }
    sigset_t none;
    sigemptyset(&none);
    sigprocmask(SIG_SETMASK, &none, nullptr);
    // Not closed by the exec: the lock is held as long as anything of the tool runs.
    if (dup2(prepared.input.get(), 0) >= 0 && dup2(prepared.output.get(), 1) >= 0 &&
        dup2(prepared.errors.get(), 2) >= 0 && dup2(prepared.lock.get(), 3) >= 0 && close_range(4, ~0U, 0) == 0) {
        execve(prepared.argv[0], prepared.argv.data(), prepared.envp.data());
    }
    _exit(127);
}

}  // namespace

CommandResult RunDetached(const Command& command, const std::string& folder) {
    CommandResult result;
    Prepared prepared;
    if (!Prepare(command, folder, prepared)) {
        result.code = errno;
        return result;
    }
    const auto began = Clock::now();
    const pid_t pid = fork();
    if (pid == 0) {
        RunChild(prepared);
    }
    if (pid < 0) {
        result.code = errno;
        return result;
    }
    prepared.lock.Reset();
    ChildProcess tool(pid, ChildProcess::Reach::Group);
    const auto end = began + command.deadline;
    std::optional<ChildEnd> ended = tool.Look();
    while (!ended && Clock::now() < end) {
        std::this_thread::sleep_for(kPause);
        ended = tool.Look();
    }
    if (ended) {
        SetEnd(*ended, result);
    } else {
        tool.Kill();
        result.end = CommandResult::End::TimedOut;
    }
    result.took = std::chrono::duration_cast<milliseconds>(Clock::now() - began);
    static_cast<void>(ReadFile(folder + kOutput, result.output, command.outputLimit));
    static_cast<void>(ReadFile(folder + kErrors, result.errors, command.outputLimit));
    return result;
}

bool AwaitDetached(const std::string& folder, milliseconds wait) {
    const FileDescriptor lock(open((folder + kLock).c_str(), O_RDWR | O_CLOEXEC | O_NOFOLLOW));
    const auto end = Clock::now() + wait;
    while (lock && flock(lock.get(), LOCK_EX | LOCK_NB) != 0) {
        if (Clock::now() >= end) {
            return false;
        }
        std::this_thread::sleep_for(kPause);
    }
    return true;
}

}  // namespace appliance
