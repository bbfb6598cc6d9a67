// What every command is given, and the table of all commands.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_COMMAND_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_COMMAND_H

#include <functional>
#include <vector>

#include "appliance/tools/vornctl/arguments.h"
#include "appliance/tools/vornctl/client.h"
#include "appliance/tools/vornctl/exit_code.h"
#include "appliance/tools/vornctl/output.h"

namespace appliance::ctl {

struct Context {
    const Client& client;
    Output& out;  // results
    Output& err;  // failures
    bool json;    // print answers as they are
};

// Does the command's work and returns the exit code. May throw Failure.
using Runner = std::function<int(Context& context)>;

struct Command {
    const char* name;
    const char* summary;
    // Adds the command's options to its arguments and returns what runs it once they are read.
    Runner (*setUp)(Arguments arguments);
    bool hidden = false;
};

Runner SetUpStatus(Arguments arguments);
Runner SetUpJoin(Arguments arguments);
Runner SetUpLeave(Arguments arguments);
Runner SetUpTest(Arguments arguments);
Runner SetUpList(Arguments arguments);
Runner SetUpRefresh(Arguments arguments);
Runner SetUpOptions(Arguments arguments);
Runner SetUpSchedule(Arguments arguments);
Runner SetUpUsers(Arguments arguments);
Runner SetUpGroups(Arguments arguments);
Runner SetUpEvents(Arguments arguments);
Runner SetUpSteps(Arguments arguments);
Runner SetUpLink(Arguments arguments);
Runner SetUpExplain(Arguments arguments);
Runner SetUpCall(Arguments arguments);
Runner SetUpComplete(Arguments arguments);

// In the order of the help.
const std::vector<Command>& Commands();

// Adds the options that belong to all commands.
struct GlobalOptions {
    std::string socket;
    bool json = false;
    int timeout = 0;  // seconds; 0: each call's own
};
void AddGlobalOptions(Arguments arguments, GlobalOptions& options);

// Calls a method whose answer is all that the command prints. True on success, with the answer in `answer`; otherwise
// the failure has been reported and `exitCode` set. With --json the answer has been printed either way.
bool CallAndReport(Context& context, const Method& method, const Json::Value& parameters, Answer& answer,
                   int& exitCode);

// Prints the answer as one line of JSON.
void PrintJson(Context& context, const Answer& answer);

// Says what a refusal means, why it came and what to do. `details` are further lines, each a name and a text. Returns
// kRefused.
int ReportRefusal(Context& context, const Answer& answer,
                  const std::vector<std::pair<std::string, std::string>>& details = {});

}  // namespace appliance::ctl

#endif
