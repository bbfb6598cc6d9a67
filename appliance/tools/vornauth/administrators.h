// Who may administer the appliance.

#ifndef VORN_APPLIANCE_TOOLS_VORNAUTH_ADMINISTRATORS_H
#define VORN_APPLIANCE_TOOLS_VORNAUTH_ADMINISTRATORS_H

#include <string>

namespace appliance::auth {

// The group whose members may log in. It is the machine's own, from /etc/group: a group of a domain that has the same
// name opens nothing.
inline constexpr const char kAdministrators[] = "administrators";

// Does the system know the user?
bool IsUser(const std::string& user);

// Is the user a member of the group, whether it is the user's primary one or another? False when there is no such group.
bool IsAdministrator(const std::string& user);

}  // namespace appliance::auth

#endif
