// A tool that must not be cut short by the end of the one who started it: the join itself, which changes the machine
// account's password on the controller and then stores it here.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_DETACHED_TOOL_H
#define VORN_APPLIANCE_DOMAIN_JOIN_DETACHED_TOOL_H

#include <chrono>
#include <string>

#include "appliance/base/command.h"

namespace appliance {

// Runs the command in a session of its own, its outputs in files of `folder`, and waits for its end. When the caller is
// killed the tool goes on to its own end or its deadline, which another process watches. While it runs it holds a lock
// on a file of `folder`. `command.input`, `ownGroup` and `endsWithCaller` count for nothing here.
CommandResult RunDetached(const Command& command, const std::string& folder);

// Waits up to `wait` until no tool that was started with this folder runs any more. False when one still does.
bool AwaitDetached(const std::string& folder, std::chrono::milliseconds wait);

}  // namespace appliance

#endif
