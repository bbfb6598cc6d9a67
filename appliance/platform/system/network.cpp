// The contract's DNS servers.

#include "appliance/platform/contract.h"
//
#include <string>
#include <vector>

#include "appliance/platform/last_error.h"
#include "appliance/platform/system/dns_servers.h"

namespace {

// The code is known at run time only, so the last error carries the place that the caller names.
int FailWith(appliance::ErrorCode code, int line) {
    VLIBCErrSetEx(static_cast<int>(code), appliance::SourceName(__FILE__), line);
    return -1;
}

}  // namespace

extern "C" {

int VORNNetDNSListGet(struct VLIBSZLIST** servers) {
    VORN_GUARD(-1, {
        if (servers == nullptr || *servers == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        std::vector<std::string> found;
        if (const auto failure = appliance::ReadDnsServers(found)) {
            return FailWith(*failure, __LINE__);
        }
        for (const std::string& server : found) {
            if (VLIBCSzListPush(servers, server.c_str()) < 0) {
                return -1;
            }
        }
        return 0;
    })
}

int VORNNetDNSListSet(struct VLIBSZLIST* servers) {
    VORN_GUARD(-1, {
        if (servers == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        std::vector<std::string> entries;
        for (int index = 0; index < servers->count; ++index) {
            if (const char* entry = VLIBCSzListGet(servers, index)) {
                entries.emplace_back(entry);
            }
        }
        const auto failure = appliance::WriteDnsServers(entries);
        return failure ? FailWith(*failure, __LINE__) : 0;
    })
}

}  // extern "C"
