// The contract's options that change who may use and who may administer the appliance.

#include "appliance/platform/contract.h"
//
#include <string>

#include "appliance/base/paths.h"
#include "appliance/domain/directory/admin_group.h"
#include "appliance/domain/directory/home_include.h"
#include "appliance/platform/domain/vornwin_start.h"
#include "appliance/platform/last_error.h"

namespace {

constexpr std::chrono::milliseconds kAdministratorsTime{4000};  // a client waits, and little is left of a join's time

}  // namespace

extern "C" {

int VORNGroupAddDomainAdminGroup(void) {
    VORN_GUARD(-1, {
        appliance::Membership membership;
        if (appliance::ReadMembership(membership)) {
            return VORN_FAIL(FileRead);
        }
        appliance::ErrorCode code = appliance::ErrorCode::Internal;
        if (!appliance::ApplyDomainAdministrators(membership, kAdministratorsTime, code)) {
            if (code == appliance::ErrorCode::TimedOut) {
                appliance::StartVornwin("-domainAdmins");
            }
            VLIBCErrSetEx(static_cast<int>(code), appliance::SourceName(__FILE__), __LINE__);
            return -1;
        }
        return 0;
    })
}

int VORNDomainUserHomeInclude(int include) {
    VORN_GUARD(-1, {
        if (include != 0 && include != 1) {
            return VORN_FAIL(BadArgument);
        }
        bool changed = false;
        if (const std::error_code error = appliance::IncludeUserHomes(include == 1, changed)) {
            appliance::Log(LOG_ERR, "home folders in " + appliance::Path(appliance::kSmbConf) + ": " + error.message());
            return VORN_FAIL(FileWrite);
        }
        if (changed) {
            VLIBServiceReload("samba");
        }
        return 0;
    })
}

}  // extern "C"
