// A password, put to PAM.

#ifndef VORN_APPLIANCE_TOOLS_VORNAUTH_CHECK_H
#define VORN_APPLIANCE_TOOLS_VORNAUTH_CHECK_H

#include <string>

#include "appliance/base/secret.h"
#include "appliance/tools/vornauth/exit_code.h"

namespace appliance::auth {

// Asks PAM's service "vorn" whether this is the user's password and whether the account may be used now; then whether
// the user is an administrator. Takes as long as PAM's modules take, but none of the pauses that they ask for after a
// failure: the server sees to that.
ExitCode Check(const std::string& user, const Secret& password);

}  // namespace appliance::auth

#endif
