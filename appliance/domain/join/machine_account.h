// The appliance's account on the domain controller.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_MACHINE_ACCOUNT_H
#define VORN_APPLIANCE_DOMAIN_JOIN_MACHINE_ACCOUNT_H

#include <chrono>
#include <string>

#include "appliance/domain/join/account_check.h"
#include "appliance/domain/membership/membership.h"
#include "appliance/domain/membership/samba.h"

namespace appliance {

// Is there an account of this name ("NAS1$") in a domain of either kind? Asked over RPC with the credentials.
AccountState LookUpAccountByRpc(const std::string& account, const std::string& controller,
                                const std::string& configuration, const Credentials& credentials,
                                std::chrono::milliseconds deadline);

// Removes the account. Empty on success and when there is none, else the tool's words.
std::string DeleteMachineAccount(const std::string& account, const std::string& controller,
                                 const std::string& configuration, const Credentials& credentials,
                                 std::chrono::milliseconds deadline);

// Does the domain of `membership` accept the machine account with the stored secret? Asked with `configuration` (empty:
// the appliance's) at `controller`, an address (empty: found). `words`, unless null, gets what the tool said.
enum class SecretState { Works, Refused, Unknown };
SecretState TestSecret(const Membership& membership, const std::string& configuration, const std::string& controller,
                       std::chrono::milliseconds deadline, std::string* words = nullptr);

}  // namespace appliance

#endif
