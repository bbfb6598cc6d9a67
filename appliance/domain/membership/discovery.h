// Which servers stand for a domain.

#ifndef VORN_APPLIANCE_DOMAIN_MEMBERSHIP_DISCOVERY_H
#define VORN_APPLIANCE_DOMAIN_MEMBERSHIP_DISCOVERY_H

#include <chrono>
#include <string>
#include <vector>

namespace appliance {

struct Controller {
    std::string name;     // DNS or NetBIOS name; empty when only the address is known
    std::string address;  // IPv4 or IPv6 address
};

// The domain controllers of a DNS domain by their SRV records (_ldap._tcp.dc._msdcs.DOMAIN), by priority and weight,
// each with its address; empty when DNS gives none or `deadline` (milliseconds) passes. Names and addresses are
// checked: what is no host name is dropped.
std::vector<Controller> FindControllers(const std::string& dnsDomain, std::chrono::milliseconds deadline);

// The primary domain controller of an NT4-style domain by NetBIOS (name DOMAIN#1B); empty when none answers. Asked with
// `configuration`, an smb.conf; empty: the appliance's own.
std::vector<Controller> FindPrimaryController(const std::string& netbiosDomain, std::chrono::milliseconds deadline,
                                              const std::string& configuration = {});

// The addresses of a host: itself when it is an address, else what DNS says (search domains are tried for a name
// without a dot). Empty when it has none or `deadline` (milliseconds) passes.
std::vector<std::string> AddressesOf(const std::string& host, std::chrono::milliseconds deadline);

// The domains in which the resolver looks for names without a dot.
std::vector<std::string> SearchDomains();

// True for an IPv4 or IPv6 address.
bool IsAddress(const std::string& text);

// Why a TCP connection to each of `ports` can't be opened within `deadline` (all are tried at the same time): for each
// an empty text, or a reason ("timed out", "Connection refused").
std::vector<std::string> ProbePorts(const std::string& address, const std::vector<int>& ports,
                                    std::chrono::milliseconds deadline);

// Can a TCP connection to address and port be opened within `deadline`? `reason` says why not ("timed out",
// "Connection refused").
bool CanConnect(const std::string& address, int port, std::chrono::milliseconds deadline, std::string& reason);

}  // namespace appliance

#endif
