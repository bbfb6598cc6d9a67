#include "appliance/platform/webapi/task_process.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/paths.h"

namespace appliance {
namespace {

using Clock = std::chrono::steady_clock;

// What a new process gets: no signal blocked or ignored, its standard descriptors on /dev/null and no others.
class SpawnRules {
public:
    SpawnRules() {
        posix_spawnattr_init(&attributes_);
        posix_spawn_file_actions_init(&actions_);
    }
    ~SpawnRules() {
        posix_spawn_file_actions_destroy(&actions_);
        posix_spawnattr_destroy(&attributes_);
    }
    SpawnRules(const SpawnRules&) = delete;
    SpawnRules& operator=(const SpawnRules&) = delete;

    int Prepare() {
        sigset_t none;
        sigset_t all;
        sigemptyset(&none);
        sigfillset(&all);
        int error = posix_spawnattr_setsigmask(&attributes_, &none);
        error = error != 0 ? error : posix_spawnattr_setsigdefault(&attributes_, &all);
        error =
            error != 0 ? error : posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
        error = error != 0 ? error : posix_spawn_file_actions_addopen(&actions_, 0, "/dev/null", O_RDONLY, 0);
        error = error != 0 ? error : posix_spawn_file_actions_addopen(&actions_, 1, "/dev/null", O_WRONLY, 0);
        error = error != 0 ? error : posix_spawn_file_actions_addopen(&actions_, 2, "/dev/null", O_WRONLY, 0);
        return error != 0 ? error : posix_spawn_file_actions_addclosefrom_np(&actions_, 3);
    }

    int Spawn(std::vector<std::string> arguments, pid_t& pid) const {
        std::vector<char*> argv;
        for (std::string& argument : arguments) {
            argv.push_back(argument.data());
        }
        argv.push_back(nullptr);
        std::string path = "PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin";
        std::string home = "HOME=/";
        std::string language = "LC_ALL=C";
        char* environment[] = {path.data(), home.data(), language.data(), nullptr};
        return posix_spawn(&pid, argv[0], &actions_, &attributes_, argv.data(), environment);
    }

private:
    posix_spawnattr_t attributes_{};
    posix_spawn_file_actions_t actions_{};
};

std::string WithReason(const char* what, int error) {
    return std::string(what) + ": " + std::generic_category().message(error);
}

// Waits for this one process; false when it had to be killed.
bool WaitFor(pid_t pid, std::chrono::milliseconds deadline, int& status) {
    const Clock::time_point end = Clock::now() + deadline;
    const FileDescriptor process(static_cast<int>(syscall(SYS_pidfd_open, pid, 0)));
    bool inTime = false;
    for (;;) {
        const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(end - Clock::now()).count();
        pollfd waited{process.get(), POLLIN, 0};
        const int ready = poll(&waited, 1, left > 0 ? static_cast<int>(left) : 0);
        inTime = ready > 0;
        if (ready >= 0 || errno != EINTR) {
            break;
        }
    }
    if (!inTime) {
        kill(pid, SIGKILL);
    }
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    return inTime;
}

}  // namespace

TaskHost TaskHost::Default() {
    return {Path(kTasks), {Path(kVornd)}};
}

std::string StartTaskProcess(const TaskHost& host, const std::string& id, std::chrono::milliseconds deadline) {
    std::vector<std::string> arguments = host.command;
    if (arguments.empty()) {
        return "no program runs tasks";
    }
    arguments.insert(arguments.end(), {"--task", id});
    SpawnRules rules;
    pid_t starter = 0;
    int error = rules.Prepare();
    error = error != 0 ? error : rules.Spawn(arguments, starter);
    if (error != 0) {
        return WithReason(("cannot start " + arguments[0]).c_str(), error);
    }
    // This one goes as soon as the task's process, which it forks, is at work.
    int status = 0;
    if (!WaitFor(starter, deadline, status)) {
        return "did not begin in time";
    }
    if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) {
        return "its process could not begin, see the line before";
    }
    return {};
}

}  // namespace appliance
