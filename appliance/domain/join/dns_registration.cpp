#include "appliance/domain/join/dns_registration.h"

#include <arpa/inet.h>
#include <ifaddrs.h>
#include <net/if.h>
#include <netinet/in.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <memory>
#include <system_error>

#include "appliance/base/conf_file.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/join/time_budget.h"
#include "appliance/domain/join/tool_output.h"

namespace appliance {

namespace {

constexpr std::size_t kMostAddresses = 32;

std::error_code WantedInterfaces(std::vector<std::string>& names) {
    ConfFile options;
    if (const std::error_code error = ConfFile::Load(Path(kSmbInfo), options)) {
        return error;
    }
    for (const std::string& name : Split(options.Get("global", "register nic").value_or(""), ",")) {
        if (!Trim(name).empty()) {
            names.push_back(Trim(name));
        }
    }
    return {};
}

// The address as text; empty when it is none that other machines could use.
std::string UsableAddress(const sockaddr& address) {
    std::array<char, INET6_ADDRSTRLEN> text{};
    if (address.sa_family == AF_INET) {
        const auto* v4 = reinterpret_cast<const sockaddr_in*>(&address);
        const std::uint32_t number = ntohl(v4->sin_addr.s_addr);
        const bool linkLocal = (number >> 16) == 0xA9FE;
        const bool loopback = (number >> 24) == 127;
        if (linkLocal || loopback || inet_ntop(AF_INET, &v4->sin_addr, text.data(), text.size()) == nullptr) {
            return "";
        }
    } else if (address.sa_family == AF_INET6) {
        const auto* v6 = reinterpret_cast<const sockaddr_in6*>(&address);
        if (IN6_IS_ADDR_LINKLOCAL(&v6->sin6_addr) || IN6_IS_ADDR_LOOPBACK(&v6->sin6_addr) ||
            inet_ntop(AF_INET6, &v6->sin6_addr, text.data(), text.size()) == nullptr) {
            return "";
        }
    }
    return text.data();
}

}  // namespace

std::string AddressesToRegister(std::vector<std::string>& addresses) {
    std::vector<std::string> wanted;
    if (const std::error_code error = WantedInterfaces(wanted)) {
        return Path(kSmbInfo) + ": " + error.message();
    }
    ifaddrs* first = nullptr;
    if (getifaddrs(&first) != 0) {
        return "the interfaces can't be listed: " + std::generic_category().message(errno);
    }
    const std::unique_ptr<ifaddrs, void (*)(ifaddrs*)> owner(first, freeifaddrs);
    for (const ifaddrs* place = first; place != nullptr; place = place->ifa_next) {
        const bool named = wanted.empty() || std::find(wanted.begin(), wanted.end(), place->ifa_name) != wanted.end();
        if (place->ifa_addr == nullptr || (place->ifa_flags & IFF_LOOPBACK) != 0 || (place->ifa_flags & IFF_UP) == 0 ||
            !named) {
            continue;
        }
        const std::string address = UsableAddress(*place->ifa_addr);
        if (!address.empty() && addresses.size() < kMostAddresses &&
            std::find(addresses.begin(), addresses.end(), address) == addresses.end()) {
            addresses.push_back(address);
        }
    }
    return addresses.empty() ? "no interface has an address to register" : "";
}

std::string RegisteredName(const Membership& membership) {
    return Lower(membership.machine) + "." + Lower(membership.realm);
}

namespace {

// As the machine account, which may change what it registered itself; then, as records of a former account are another's,
// with the credentials, when there are some.
std::string ChangeRecords(const char* verb, const Membership& membership, const std::vector<std::string>& addresses,
                          const Credentials& credentials, std::chrono::milliseconds deadline) {
    const TimeBudget budget(deadline);
    SambaCall call;
    call.arguments = {"ads", "dns", verb, "--machine-pass", "--", RegisteredName(membership)};
    call.arguments.insert(call.arguments.end(), addresses.begin(), addresses.end());
    call.deadline = budget.Left(deadline);
    CommandResult result = RunNet(call);
    if (!result.Succeeded() && !credentials.user.empty() && !budget.Over()) {
        call.arguments.erase(call.arguments.begin() + 3);
        call.credentials = &credentials;
        call.deadline = budget.Left(deadline);
        result = RunNet(call);
    }
    return result.Succeeded() ? "" : LastWords(result);
}

}  // namespace

std::string RegisterInDns(const Membership& membership, const std::vector<std::string>& addresses,
                          const Credentials& credentials, std::chrono::milliseconds deadline) {
    return ChangeRecords("register", membership, addresses, credentials, deadline);
}

std::string UnregisterInDns(const Membership& membership, const Credentials& credentials,
                            std::chrono::milliseconds deadline) {
    return ChangeRecords("unregister", membership, {}, credentials, deadline);
}

}  // namespace appliance
