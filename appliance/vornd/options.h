// The command line of vornd.

#ifndef VORN_APPLIANCE_VORND_OPTIONS_H
#define VORN_APPLIANCE_VORND_OPTIONS_H

#include <chrono>
#include <string>
#include <vector>

#include "appliance/vornd/access.h"
#include "appliance/web/limits.h"

namespace appliance {

struct Options {
    enum class Action { Serve, Task, Help, Version };
    Action action = Action::Serve;
    bool foreground = false;
    std::string root;    // in front of all fixed paths; for tests
    std::string socket;  // empty: the appliance's own
    std::string door = kDoorAccount;
    std::chrono::seconds patience = kDrainLimit;  // for calls that run when the server is told to end
    std::vector<std::string> modules;
    std::string task;  // id of a recorded task
};

// Reads the command line. False, and the reason in one line, when it is wrong.
bool ParseOptions(int count, char** arguments, Options& options, std::string& reason);

extern const char* const kHelp;

}  // namespace appliance

#endif
