#include "appliance/base/child_process.h"

#include <poll.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <string>

#include "appliance/base/log.h"

namespace appliance {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kPauseWithoutHandle{10};
constexpr std::chrono::seconds kWaitAfterKill{5};

}  // namespace

ChildProcess::ChildProcess(pid_t pid, Reach reach)
    : pid_(pid), reach_(reach), handle_(static_cast<int>(syscall(SYS_pidfd_open, pid, 0))) {}

ChildProcess::~ChildProcess() {
    if (!end_) {
        Kill();
    }
}

std::optional<ChildEnd> ChildProcess::Look() {
    return Collect(WNOHANG);
}

ChildEnd ChildProcess::Wait() {
    std::optional<ChildEnd> end;
    do {
        end = Collect(0);
    } while (!end);
    return *end;
}

void ChildProcess::Kill() {
    if (end_) {
        return;
    }
    // Not yet collected, so the id is still its own.
    if (reach_ != Reach::Group || kill(-pid_, SIGKILL) != 0) {
        kill(pid_, SIGKILL);
    }
    const auto limit = Clock::now() + kWaitAfterKill;
    while (!Look()) {
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(limit - Clock::now());
        if (left.count() <= 0) {
            end_ = ChildEnd{ChildEnd::How::Lost, ETIMEDOUT};  // as far as that goes
            Log(LOG_ERR, "process " + std::to_string(pid_) + " does not end after SIGKILL");
            return;
        }
        pollfd ended = {handle_.get(), POLLIN, 0};
        poll(&ended, 1, static_cast<int>((handle_ ? left : std::min(left, kPauseWithoutHandle)).count()));
    }
}

std::optional<ChildEnd> ChildProcess::Collect(int options) {
    if (end_) {
        return end_;
    }
    int status = 0;
    const pid_t collected = waitpid(pid_, &status, options);
    if (collected == 0 || (collected < 0 && errno == EINTR)) {
        return std::nullopt;
    }
    if (collected < 0) {
        end_ = ChildEnd{ChildEnd::How::Lost, errno};
    } else if (WIFEXITED(status)) {
        end_ = ChildEnd{ChildEnd::How::Exited, WEXITSTATUS(status)};
    } else {
        end_ = ChildEnd{ChildEnd::How::Signalled, WTERMSIG(status)};
    }
    return end_;
}

}  // namespace appliance
