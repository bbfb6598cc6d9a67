// A program whose output is used line by line while it runs, however much it prints.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_LINE_COMMAND_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_LINE_COMMAND_H

#include <functional>
#include <string>

#include "appliance/base/command.h"

namespace appliance {

// Runs the command like Run, but hands out each line of its standard output (without its end) as it comes; `output` of
// the result stays empty. It has a process group of its own and ends with the caller, whatever the command says of that.
// Its deadline counts from the last line on, and ends the whole group. `take` may throw: the group is ended then. Secrets
// and an input are not supported. For a process of one thread.
CommandResult RunLines(const Command& command, const std::function<void(const std::string&)>& take);

}  // namespace appliance

#endif
