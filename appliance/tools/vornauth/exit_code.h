// How vornauth ends. It says nothing else: the server reads the number.

#ifndef VORN_APPLIANCE_TOOLS_VORNAUTH_EXIT_CODE_H
#define VORN_APPLIANCE_TOOLS_VORNAUTH_EXIT_CODE_H

namespace appliance::auth {

enum ExitCode : int {
    kAccepted = 0,
    kImpossible = 1,       // PAM could not be asked, or had an error of its own
    kUsage = 2,            // standard input does not hold a user and a password
    kWrongPassword = 10,   // or whatever else PAM's authentication refuses
    kUnknownUser = 11,     // PAM or the system does not know the user
    kAccountRefused = 12,  // locked, expired, or not allowed at this time
    kNoAdministrator = 13,
};

}  // namespace appliance::auth

#endif
