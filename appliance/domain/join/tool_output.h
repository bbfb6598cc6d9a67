// From what the tools print to the status message of a failed join.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_TOOL_OUTPUT_H
#define VORN_APPLIANCE_DOMAIN_JOIN_TOOL_OUTPUT_H

#include <string>

#include "appliance/base/command.h"

namespace appliance {

// The status message for a `net ads join` or `net rpc join` that did not succeed.
std::string JoinFailureMessage(const CommandResult& result);

// The status message for a `net rpc info` with the account's credentials; empty when it succeeded. `server` is named
// when no connection came about.
std::string AccountFailureMessage(const CommandResult& result, const std::string& server);

// Does the output of `net ads testjoin` or `net rpc testjoin` prove the membership? The exit status alone does not.
bool ProvesMembership(const CommandResult& result);

// What `net ads lookup` tells of a controller; all empty when it is none of Active Directory.
struct ControllerInfo {
    std::string realm;   // DNS name of its domain
    std::string domain;  // NetBIOS name of its domain
    std::string name;    // its own DNS name
};
ControllerInfo ParseLookup(const CommandResult& result);

// The line that says most: the last one with text in it, of the errors first when the program failed; else how the
// program ended.
std::string LastWords(const CommandResult& result);

}  // namespace appliance

#endif
