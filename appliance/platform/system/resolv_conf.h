// The resolver's configuration as text.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_RESOLV_CONF_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_RESOLV_CONF_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace appliance {

// An address as the resolver takes it: IPv4 in dotted decimal, or IPv6, where a link-local one may name an interface
// ("fe80::1%eth0").
bool IsServerAddress(const std::string& text);

// The entries of a list of DNS servers without the blanks in front; nothing when one of them is no address.
std::optional<std::vector<std::string>> CheckedServers(const std::vector<std::string>& entries);

// The addresses of the lines "nameserver ADDRESS", read as the resolver reads them. It asks the first three only; all
// are listed.
std::vector<std::string> Servers(std::string_view text);

// The text with these servers, in the place of the former ones (at the end when it had none), and with the line
// "options timeout:1 attempts:1" at its end, so that a lookup gives up after 3 seconds when three servers are dead.
// Every other byte stays. Without servers no options are set.
std::string WithServers(std::string_view text, const std::vector<std::string>& servers);

}  // namespace appliance

#endif
