// Samba's and winbind's command-line tools, run on the appliance's own configuration. Every call has a deadline, since
// these tools block for a minute and more when a controller is dead.

#ifndef VORN_APPLIANCE_DOMAIN_MEMBERSHIP_SAMBA_H
#define VORN_APPLIANCE_DOMAIN_MEMBERSHIP_SAMBA_H

#include <chrono>
#include <string>
#include <string_view>
#include <vector>

#include "appliance/base/command.h"

namespace appliance {

// A domain account and its password, handed to Samba's tools through the environment, never as an argument.
struct Credentials {
    std::string user;
    Secret password;
};

// How to run one of the tools.
struct SambaCall {
    std::vector<std::string> arguments;         // without the program and without options for configuration
    std::chrono::milliseconds deadline{10000};  // milliseconds
    const Credentials* credentials = nullptr;   // not owned; null: none
    std::string configuration = {};             // empty: the appliance's smb.conf
    bool ownGroup = true;                       // see Command::ownGroup
    bool endsWithCaller = true;                 // see Command::endsWithCaller
    std::string kerberosConfiguration = {};     // empty: the machine's
    int cancel = -1;                            // see Command::cancel
};

// True when the account's name may be handed to the tools: an account name (IsAccountName) without "%", at which they
// would split it into name and password.
bool IsToolAccountName(std::string_view user);

// The command that RunNet and the others would run, for those who start it in another way.
Command SambaCommand(const std::string& program, const SambaCall& call);

inline constexpr char kNet[] = "/usr/bin/net";
inline constexpr char kWbinfo[] = "/usr/bin/wbinfo";
inline constexpr char kRpcclient[] = "/usr/bin/rpcclient";
inline constexpr char kNmblookup[] = "/usr/bin/nmblookup";

CommandResult RunNet(const SambaCall& call);        // net
CommandResult RunWbinfo(const SambaCall& call);     // wbinfo
CommandResult RunRpcclient(const SambaCall& call);  // rpcclient
CommandResult RunNmblookup(const SambaCall& call);  // nmblookup

}  // namespace appliance

#endif
