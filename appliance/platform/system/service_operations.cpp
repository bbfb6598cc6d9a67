// The contract's services.

#include "appliance/platform/contract.h"
//
#include <string>

#include "appliance/platform/last_error.h"
#include "appliance/platform/system/services.h"

namespace {

using appliance::ServiceResult;

// Type 8: the services that know who may administer the appliance. They are reloaded after the administrators' group
// has changed.
constexpr int kAdministration = 8;
constexpr const char* kAdministrationServices[] = {"samba", "winbindd"};

// Logs and keeps a failure, with the place that the caller names.
int Answer(const ServiceResult& result, int line) {
    if (result) {
        return 0;
    }
    appliance::Log(LOG_ERR, result.error);
    VLIBCErrSetEx(static_cast<int>(*result.failure), appliance::SourceName(__FILE__), line);
    return -1;
}

}  // namespace

extern "C" {

int VLIBServiceReload(const char* service) {
    VORN_GUARD(-1, {
        if (service == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        return Answer(appliance::ReloadService(service), __LINE__);
    })
}

int VLIBServiceRestart(const char* service) {
    VORN_GUARD(-1, {
        if (service == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        return Answer(appliance::RestartService(service), __LINE__);
    })
}

int VLIBServiceTypeReload(int type) {
    VORN_GUARD(-1, {
        if (type != kAdministration) {
            return VORN_FAIL(BadArgument);
        }
        int answer = 0;
        for (const char* service : kAdministrationServices) {
            if (Answer(appliance::ReloadService(service), __LINE__) < 0) {
                answer = -1;
            }
        }
        return answer;
    })
}

int VLIBServiceIsEnabled(const char* service) {
    VORN_GUARD(-1, {
        if (service == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        ServiceResult result;
        const std::optional<bool> enabled = appliance::IsServiceEnabled(service, result);
        return enabled ? (*enabled ? 1 : 0) : Answer(result, __LINE__);
    })
}

}  // extern "C"
