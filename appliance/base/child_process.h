// A child process of this one, from its fork to its end.

#ifndef VORN_APPLIANCE_BASE_CHILD_PROCESS_H
#define VORN_APPLIANCE_BASE_CHILD_PROCESS_H

#include <sys/types.h>

#include <optional>

#include "appliance/base/file.h"

namespace appliance {

struct ChildEnd {
    enum class How {
        Exited,     // by itself; `code` is what it ended with
        Signalled,  // `code` is the signal
        Lost,       // somebody collects all children of this process, or ignores SIGCHLD; `code` is the errno
    };
    How how = How::Lost;
    int code = 0;
};

// Owns a child: it is killed and collected when its owner goes before its end was seen.
class ChildProcess {
public:
    enum class Reach { Process, Group };

    // `pid` is what fork returned in the parent. With Reach::Group the child leads a group of processes of its own, and
    // what kills it kills that.
    explicit ChildProcess(pid_t pid, Reach reach = Reach::Process);
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    // Becomes readable when the child ends. -1 when the kernel had none to give: then Look has to be asked now and then.
    int handle() const {
        return handle_.get();
    }

    // How it ended; nothing while it runs. Comes back at once.
    std::optional<ChildEnd> Look();

    // Waits for the end, without a deadline: for a child that is about to end.
    ChildEnd Wait();

    // Ends it with SIGKILL and waits for that, unless the kernel holds on to it beyond 5 seconds; then that is logged.
    void Kill();

private:
    std::optional<ChildEnd> Collect(int options);

    pid_t pid_;
    Reach reach_;
    FileDescriptor handle_;
    std::optional<ChildEnd> end_;
};

}  // namespace appliance

#endif
