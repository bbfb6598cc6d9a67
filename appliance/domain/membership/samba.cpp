#include "appliance/domain/membership/samba.h"

#include "appliance/base/paths.h"
#include "appliance/base/text.h"

namespace appliance {

bool IsToolAccountName(std::string_view user) {
    return !user.empty() && IsAccountName(user) && user.find('%') == std::string_view::npos;
}

Command SambaCommand(const std::string& program, const SambaCall& call) {
    Command command;
    command.arguments = {Path(program),
                         "--configfile=" + (call.configuration.empty() ? Path(kSmbConf) : call.configuration)};
    command.arguments.insert(command.arguments.end(), call.arguments.begin(), call.arguments.end());
    command.deadline = call.deadline;
    command.cancel = call.cancel;
    command.ownGroup = call.ownGroup;
    command.endsWithCaller = call.endsWithCaller;
    if (!call.kerberosConfiguration.empty()) {
        command.environment.emplace_back("KRB5_CONFIG", call.kerberosConfiguration);
    }
    if (call.credentials != nullptr) {
        // The name goes by the environment, too: as an argument it could be split or taken for an option.
        command.environment.emplace_back("USER", call.credentials->user);
        command.environment.emplace_back("LOGNAME", call.credentials->user);
        command.secretEnvironment.emplace_back("PASSWD", Secret(call.credentials->password.view()));
    }
    return command;
}

CommandResult RunNet(const SambaCall& call) {
    return Run(SambaCommand(kNet, call));
}

CommandResult RunWbinfo(const SambaCall& call) {
    // It has no option for the configuration and takes it from the environment.
    Command command = SambaCommand(kWbinfo, call);
    command.arguments.erase(command.arguments.begin() + 1);
    command.environment.emplace_back("SMB_CONF_PATH", call.configuration.empty() ? Path(kSmbConf) : call.configuration);
    return Run(command);
}

CommandResult RunRpcclient(const SambaCall& call) {
    return Run(SambaCommand(kRpcclient, call));
}

CommandResult RunNmblookup(const SambaCall& call) {
    return Run(SambaCommand(kNmblookup, call));
}

}  // namespace appliance
