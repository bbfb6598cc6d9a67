#include "tests/appliance/base/traced_child.h"

#include <gtest/gtest.h>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>

namespace appliance_test {

namespace {

// Runs the work until `enters`, which is told each system call that is entered, answers false; then the child is killed,
// and so is the answer.
bool Trace(const std::function<bool()>& work, const std::function<bool(long)>& enters) {
    const pid_t child = fork();
    if (child == 0) {
        setsid();  // no signal of a terminal's
        ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
        raise(SIGSTOP);
        _exit(work() ? 0 : 1);
    }
    int status = 0;
    waitpid(child, &status, 0);
    if (!WIFSTOPPED(status)) {
        ADD_FAILURE() << "the child can't be traced";
        return true;
    }
    // Killed with its tracer, and system calls told from signals.
    ptrace(PTRACE_SETOPTIONS, child, nullptr, PTRACE_O_EXITKILL | PTRACE_O_TRACESYSGOOD);
    while (ptrace(PTRACE_SYSCALL, child, nullptr, nullptr) == 0) {
        waitpid(child, &status, 0);
        if (WIFEXITED(status)) {
            EXPECT_EQ(WEXITSTATUS(status), 0);
            return true;
        }
        if (!WIFSTOPPED(status) || WSTOPSIG(status) != (SIGTRAP | 0x80)) {
            ADD_FAILURE() << "the child stopped for another reason: " << status;
            break;
        }
        __ptrace_syscall_info call = {};
        ptrace(PTRACE_GET_SYSCALL_INFO, child, sizeof(call), &call);
        if (call.op == PTRACE_SYSCALL_INFO_ENTRY && !enters(static_cast<long>(call.entry.nr))) {
            break;
        }
    }
    kill(child, SIGKILL);
    waitpid(child, &status, 0);
    return false;
}

}  // namespace

bool KilledAtCall(int calls, const std::function<bool()>& work) {
    return !Trace(work, [&](long) { return calls-- > 0; });
}

std::vector<long> CallsOf(const std::function<bool()>& work, const std::function<bool()>& rehearsal) {
    EXPECT_TRUE(rehearsal());
    std::vector<long> calls;
    EXPECT_TRUE(Trace(work, [&](long call) {
        calls.push_back(call);
        return true;
    }));
    return calls;
}

}  // namespace appliance_test
