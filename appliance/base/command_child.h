// The child in which a program is run: made ready by its parent, and set up between fork and exec.

#ifndef VORN_APPLIANCE_BASE_COMMAND_CHILD_H
#define VORN_APPLIANCE_BASE_COMMAND_CHILD_H

#include <sys/types.h>

#include <string>
#include <vector>

#include "appliance/base/command.h"
#include "appliance/base/file.h"
#include "appliance/base/secret.h"

namespace appliance {

// The child takes these numbers for its own descriptors: 0 to 2, and 3 for the way to tell of a start that failed. The
// parent's lie above them.
inline constexpr int kFirstFreeDescriptor = 4;

// Everything that the child needs, made ready before the fork: between fork and exec only calls that are safe after a
// signal are allowed, since another thread may have held any lock.
struct CommandChild {
    std::vector<char*> arguments;
    std::vector<char*> environment;
    std::vector<std::string> plain;  // owns what `environment` points to
    std::vector<Secret> secret;
    FileDescriptor input;
    FileDescriptor output;
    FileDescriptor errors;
    FileDescriptor status;  // takes the errno of a start that failed, and is closed by the exec
    bool ownGroup = true;
    bool ownSession = false;
    bool endsWithCaller = true;
    pid_t caller = 0;
};

// Fills all of it but the descriptors. False for what can't be handed to a program. `command` must outlive the child's
// start.
bool PrepareChild(const Command& command, CommandChild& child);

// Goes on in the new process until its exec. A failure is told as an errno through `status`, and ends the process.
[[noreturn]] void RunChild(const CommandChild& child);

}  // namespace appliance

#endif
