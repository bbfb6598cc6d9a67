// Programs that the appliance runs: no shell, a clean environment, a deadline, and nothing left behind.

#ifndef VORN_APPLIANCE_BASE_COMMAND_H
#define VORN_APPLIANCE_BASE_COMMAND_H

#include <chrono>
#include <cstddef>
#include <string>
#include <utility>
#include <vector>

#include "appliance/base/child_process.h"
#include "appliance/base/secret.h"

namespace appliance {

// What to run, and how long at most.
struct Command {
    // The program by its absolute path, then its arguments. Never a secret: other users can read them. A NUL in one of
    // them, or in the environment, is refused (NotStarted, EINVAL).
    std::vector<std::string> arguments;

    // The whole of its time, in milliseconds. When it passes, the program is ended with all that it started.
    std::chrono::milliseconds deadline{10000};

    // When this descriptor can be read, the program is ended as at its deadline; -1: none. Not owned.
    int cancel = -1;

    // Added to the environment, which otherwise holds PATH, HOME=/ and LC_ALL=C only. Secrets go to `secretEnvironment`.
    std::vector<std::pair<std::string, std::string>> environment = {};
    std::vector<std::pair<std::string, Secret>> secretEnvironment = {};

    // Its standard input; empty: /dev/null.
    Secret input = {};

    // What it prints beyond this many bytes is read and dropped, for each of the two outputs.
    std::size_t outputLimit = 1 << 20;

    // True: a process group of its own, so that the deadline ends its children too. False: it stays in the caller's
    // group, so that what stops the caller's group stops it; the deadline then ends the program alone.
    bool ownGroup = true;

    // True: the program is killed when the thread that started it ends (PR_SET_PDEATHSIG).
    bool endsWithCaller = true;

    // True: a session of its own (which is a process group, too), for what has to outlive the caller's session.
    bool ownSession = false;
};

// How a program ended, and what it printed.
struct CommandResult {
    enum class End {
        Exited,      // `code` is the exit status
        Signalled,   // `code` is the signal
        TimedOut,    // the deadline passed
        NotStarted,  // `code` is the errno
    };
    End end = End::NotStarted;
    int code = 0;
    std::string output;
    std::string errors;
    std::chrono::milliseconds took{0};

    bool Succeeded() const {
        return end == End::Exited && code == 0;
    }
    // In words, for a log line: "exited with 1", "killed by signal 9", "did not end within 10000 ms", "cannot be
    // started: No such file or directory".
    std::string Describe() const;
};

// Takes over how a program's process ended. One whose end is lost counts as not started.
void SetEnd(const ChildEnd& end, CommandResult& result);

// Runs the program and waits for its end. Never throws but for std::bad_alloc; safe from several threads at once. Needs
// the default action of SIGCHLD and waits for this one process only. The program's working folder is the caller's. What a
// child of the program prints after the program's end is not waited for. A program that even SIGKILL does not end within
// 5 s (the kernel holds it) is left behind, and the log says so.
CommandResult Run(const Command& command);

}  // namespace appliance

#endif
