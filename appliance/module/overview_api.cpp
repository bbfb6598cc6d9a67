#include "appliance/module/overview_api.h"

#include <arpa/inet.h>
#include <ifaddrs.h>
#include <net/if.h>
#include <netinet/in.h>

#include <array>
#include <ctime>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <system_error>
#include <vector>

#include "appliance/base/file_lock.h"
#include "appliance/base/paths.h"
#include "appliance/domain/directory/progress.h"
#include "appliance/domain/membership/last_test.h"
#include "appliance/domain/membership/membership.h"
#include "appliance/module/json_file.h"

namespace appliance {
namespace {

// Empty for what is no address that others could use.
std::string AddressText(const sockaddr& address) {
    std::array<char, INET6_ADDRSTRLEN> text{};
    if (address.sa_family == AF_INET) {
        inet_ntop(AF_INET, &reinterpret_cast<const sockaddr_in*>(&address)->sin_addr, text.data(), text.size());
    } else if (address.sa_family == AF_INET6) {
        const in6_addr& v6 = reinterpret_cast<const sockaddr_in6*>(&address)->sin6_addr;
        if (!IN6_IS_ADDR_LINKLOCAL(&v6)) {
            inet_ntop(AF_INET6, &v6, text.data(), text.size());
        }
    }
    return text.data();
}

// All interfaces but the loopback, also those that are down or have no address.
Json::Value Interfaces() {
    std::map<std::string, std::vector<std::string>> found;
    ifaddrs* first = nullptr;
    if (getifaddrs(&first) != 0) {
        throw CallFailure(AnswerCode::SystemError, "the network interfaces can't be read");
    }
    const std::unique_ptr<ifaddrs, void (*)(ifaddrs*)> owner(first, freeifaddrs);
    for (const ifaddrs* place = first; place != nullptr; place = place->ifa_next) {
        if ((place->ifa_flags & IFF_LOOPBACK) != 0) {
            continue;
        }
        std::vector<std::string>& addresses = found[place->ifa_name];
        const std::string address = place->ifa_addr != nullptr ? AddressText(*place->ifa_addr) : "";
        if (!address.empty()) {
            addresses.push_back(address);
        }
    }
    Json::Value shown(Json::arrayValue);
    for (const auto& [name, addresses] : found) {
        Json::Value interface(Json::objectValue);
        interface["name"] = name;
        interface["addresses"] = Json::Value(Json::arrayValue);
        for (const std::string& address : addresses) {
            interface["addresses"].append(address);
        }
        shown.append(interface);
    }
    return shown;
}

Json::Value LastTest(const Membership& membership) {
    const std::optional<MembershipTest> test = ReadLastTest(membership);
    if (!test) {
        return {};
    }
    Json::Value shown(Json::objectValue);
    shown["time"] = Json::Int64{test->time};
    shown["success"] = test->success;
    shown["milliseconds"] = Json::Int64{test->milliseconds};
    return shown;
}

// "join" or "leave" while one runs. A record without an end whose tool holds no lock is that of a killed one.
Json::Value Busy() {
    if (!FileLock::IsHeld(Path(kJoinLock))) {
        return {};
    }
    const Json::Value steps = ReadJsonFile(kJoinSteps);
    return steps.isObject() && steps["finished"].isNull() && steps["action"].isString() ? steps["action"]
                                                                                        : Json::Value();
}

Json::Value Clock() {
    // Else a zone that was set since the server's start would not count.
    tzset();
    const std::time_t now = std::time(nullptr);
    std::tm fields{};
    localtime_r(&now, &fields);
    Json::Value shown(Json::objectValue);
    shown["time"] = Json::Int64{now};
    shown["utc_offset"] = Json::Int64{fields.tm_gmtoff};
    return shown;
}

}  // namespace

Json::Value Overview(const Parameters& /*parameters*/) {
    Membership membership;
    if (const std::error_code error = ReadMembership(membership)) {
        throw CallFailure(AnswerCode::SystemError, "the membership can't be read: " + error.message());
    }
    Json::Value answer(Json::objectValue);
    answer["host_name"] = membership.machine;
    answer["computer_account"] = membership.DomainMode() ? Json::Value(membership.Account()) : Json::Value();
    answer["last_test"] = LastTest(membership);
    answer["interfaces"] = Interfaces();
    answer["refresh"] = ShownProgress(ReadJsonFile(kRefreshProgress));
    answer["busy"] = Busy();
    answer["clock"] = Clock();
    return answer;
}

Json::Value RefreshProgress(const Parameters& /*parameters*/) {
    return ShownProgress(ReadJsonFile(kRefreshProgress));
}

Json::Value JoinSteps(const Parameters& /*parameters*/) {
    return ReadJsonFile(kJoinSteps);
}

}  // namespace appliance
