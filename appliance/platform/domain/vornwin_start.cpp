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
    const std::string program = Path(kVornwin);
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
        execl(program.c_str(), program.c_str(), option, static_cast<char*>(nullptr));
        _exit(127);
    }
    while (waitpid(pid, nullptr, 0) < 0 && errno == EINTR) {
    }
}

}  // namespace appliance
