// vornwin: what the scheduler runs for the appliance's domain.

#include <unistd.h>

#include <cstring>
#include <iostream>
#include <string>

#include "appliance/base/log.h"
#include "appliance/domain/directory/admin_group.h"
#include "appliance/domain/directory/home_include.h"
#include "appliance/domain/directory/time_sync.h"
#include "appliance/tools/vornwin/update_domain.h"

namespace {

constexpr char kHelp[] =
    "usage: vornwin -updateDomain | -syncTime | -domainAdmins | --help\n"
    "\n"
    "  -updateDomain  refresh the lists of domain users and groups of all domains in sight\n"
    "                 (of the own one only when trusted domains are disabled)\n"
    "  -syncTime      set the clock by the domain controller's; a difference of more than a day is\n"
    "                 reported and not followed\n"
    "  -domainAdmins  make the domain's administrators administrators here, or not, as the options say;\n"
    "                 tries again for minutes while winbind is busy\n"
    "  --help         this text\n"
    "\n"
    "The file-sharing service also calls \"vornwin -makeHome -- USER\" to make a domain user's home folder.\n"
    "\n"
    "Ends with 0 when done, 1 when it failed or only a part was done, 2 for a wrong command line,\n"
    "3 when another refresh is running. What happened is in the system log under \"vornwin\", and on\n"
    "the terminal when there is one.\n";

int MakeHome(const std::string& user) {
    const std::string reason = appliance::MakeUserHome(user);
    if (reason.empty()) {
        return appliance::kDone;
    }
    appliance::Log(LOG_ERR, "no home folder: " + reason);
    return appliance::kFailed;
}

int Run(int count, char** arguments) {
    const std::string command = count > 1 ? arguments[1] : "";
    if (count == 2 && (command == "--help" || command == "-h")) {
        std::cout << kHelp;
        return appliance::kDone;
    }
    if (count == 2 && command == "-updateDomain") {
        return appliance::UpdateDomain();
    }
    if (count == 2 && command == "-syncTime") {
        return appliance::SynchroniseTime() ? appliance::kDone : appliance::kFailed;
    }
    if (count == 2 && command == "-domainAdmins") {
        return appliance::ApplyDomainAdministratorsLater() ? appliance::kDone : appliance::kFailed;
    }
    if (count == 4 && command == "-makeHome" && strcmp(arguments[2], "--") == 0) {
        return MakeHome(arguments[3]);
    }
    std::cerr << "vornwin: wrong command line; \"vornwin --help\" shows what there is\n";
    return appliance::kWrongUse;
}

}  // namespace

int main(int count, char** arguments) {
    openlog("vornwin", LOG_PID | (isatty(STDERR_FILENO) != 0 ? LOG_PERROR : 0), LOG_DAEMON);
    if (geteuid() != 0) {
        std::cerr << "vornwin: only root may do this\n";
        return appliance::kFailed;
    }
    try {
        return Run(count, arguments);
    } catch (const std::exception& error) {
        appliance::Log(LOG_ERR, std::string("ended: ") + error.what());
        return appliance::kFailed;
    }
}
