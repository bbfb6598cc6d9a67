#include "appliance/platform/domain/vornwin_start.h"

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <string>

#include "appliance/base/log.h"
#include "appliance/base/paths.h"

namespace appliance {

// Its parent ends at once, so that nobody has to collect it.
void StartVornwin(const char* option) {
    std::string program = Path(kVornwin);
    std::string word = option;
    // Nothing of the server's own environment, as with a background task.
    std::string path = "PATH=/usr/sbin:/usr/bin:/sbin:/bin";
    std::string home = "HOME=/";
    std::string language = "LC_ALL=C";
    std::string root = Path("");
    char* underRoot = nullptr;
    if (!root.empty()) {
        root.insert(0, std::string(kRootVariable) + "=");
        underRoot = root.data();
    }
    char* const arguments[] = {program.data(), word.data(), nullptr};
    char* const environment[] = {path.data(), home.data(), language.data(), underRoot, nullptr};
    const pid_t pid = fork();
    if (pid < 0) {
        Log(LOG_ERR, program + " " + option + " can't be started: " + strerror(errno));
        return;
    }
    if (pid == 0) {
        // Between fork and exec nothing is called that could wait for another thread.
        if (fork() != 0) {
            _exit(0);
        }
        setsid();
        const int nothing = open("/dev/null", O_RDWR);
        dup2(nothing, 0);
        dup2(nothing, 1);
        dup2(nothing, 2);
        signal(SIGPIPE, SIG_DFL);
        sigset_t none;
        sigemptyset(&none);
        sigprocmask(SIG_SETMASK, &none, nullptr);
        execve(arguments[0], arguments, environment);
        _exit(127);
    }
    while (waitpid(pid, nullptr, 0) < 0 && errno == EINTR) {
    }
}

}  // namespace appliance
