// What every command is given, and the table of all commands.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_COMMAND_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_COMMAND_H

#include <functional>
#include <vector>

#include "appliance/tools/vornctl/client.h"
#include "appliance/tools/vornctl/exit_code.h"
#include "appliance/tools/vornctl/output.h"

namespace CLI {
class App;
}

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
    // Adds the command's options to its parser and returns what runs it once they are read.
    Runner (*setUp)(CLI::App& parser);
    bool hidden = false;
};

Runner SetUpStatus(CLI::App& parser);
Runner SetUpJoin(CLI::App& parser);
Runner SetUpLeave(CLI::App& parser);
Runner SetUpTest(CLI::App& parser);
Runner SetUpList(CLI::App& parser);
Runner SetUpRefresh(CLI::App& parser);
Runner SetUpOptions(CLI::App& parser);
Runner SetUpSchedule(CLI::App& parser);
Runner SetUpUsers(CLI::App& parser);
Runner SetUpGroups(CLI::App& parser);
Runner SetUpEvents(CLI::App& parser);
Runner SetUpSteps(CLI::App& parser);
Runner SetUpLink(CLI::App& parser);
Runner SetUpExplain(CLI::App& parser);
Runner SetUpCall(CLI::App& parser);
Runner SetUpComplete(CLI::App& parser);

// In the order of the help.
const std::vector<Command>& Commands();

// Adds the options that belong to all commands.
struct GlobalOptions {
    std::string socket;
    bool json = false;
    int timeout = 0;  // seconds; 0: each call's own
};
void AddGlobalOptions(CLI::App& parser, GlobalOptions& options);

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
