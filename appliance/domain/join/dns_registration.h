// The appliance's own records in the domain's DNS.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_DNS_REGISTRATION_H
#define VORN_APPLIANCE_DOMAIN_JOIN_DNS_REGISTRATION_H

#include <chrono>
#include <string>
#include <vector>

#include "appliance/domain/membership/membership.h"
#include "appliance/domain/membership/samba.h"

namespace appliance {

// The addresses to register: those of the interfaces that "register nic" of smbinfo.conf names, or of all; without
// loopback and link-local ones. Empty when there are some, else why there are none: also when smbinfo.conf can't be read,
// since nobody knows then which are meant.
std::string AddressesToRegister(std::vector<std::string>& addresses);

// "nas1.example.com", the name to register.
std::string RegisteredName(const Membership& membership);

// Makes `addresses` the name's only records. Empty on success, else the reason. The machine account is asked first; the
// account that joins when that may not touch a record which an earlier account made. Both within `deadline`.
std::string RegisterInDns(const Membership& membership, const std::vector<std::string>& addresses,
                          const Credentials& credentials, std::chrono::milliseconds deadline);

// Removes the name's records in the same way; without credentials (an empty user) as the machine account alone. Empty on
// success, else the reason.
std::string UnregisterInDns(const Membership& membership, const Credentials& credentials,
                            std::chrono::milliseconds deadline);

}  // namespace appliance

#endif
