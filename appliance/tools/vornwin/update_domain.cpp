#include "appliance/tools/vornwin/update_domain.h"

#include <memory>
#include <string>

#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "platform/core.h"
#include "platform/domain.h"

namespace appliance {

namespace {

constexpr int kUsers = 0;
constexpr int kGroups = 1;
constexpr int kDomainRoom = 64;

struct FreeList {
    void operator()(VLIBSZLIST* list) const {
        VLIBCSzListFree(list);
    }
};
using DomainNames = std::unique_ptr<VLIBSZLIST, FreeList>;

// The platform's own lines in the log say more.
int Fail(const std::string& what) {
    Log(LOG_ERR, what);
    return kFailed;
}

// The process that fetches at present, or -1.
int RunningFetch() {
    const int users = VLIBCReadPidFile(Path(kUserPid).c_str());
    return users >= 0 ? users : VLIBCReadPidFile(Path(kGroupPid).c_str());
}

DomainNames AllDomains() {
    VLIBSZLIST* list = VLIBCSzListAlloc(kDomainRoom);
    if (list != nullptr && VORNWinsEnumAllDomains(&list) < 0) {
        VLIBCSzListFree(list);
        list = nullptr;
    }
    return DomainNames(list);
}

}  // namespace

int UpdateDomain() {
    if (VORNWinsIsJoined() == 0) {
        return Fail("the appliance is no member of a domain: there is nothing to refresh");
    }
    if (const int running = RunningFetch(); running >= 0) {
        Log(LOG_NOTICE, "process " + std::to_string(running) + " refreshes the domain users and groups already");
        return kAlreadyRunning;
    }
    const bool known = (VORNWinIsEnableTrustDomain() != 0 ? VORNWinUpdateAllDomains() : VORNWinUpdateOU()) >= 0;
    if (!known) {
        return Fail("refresh: no controller tells what is new in the domain");
    }
    const DomainNames domains = AllDomains();
    if (!domains) {
        return Fail("refresh: the domains in sight can't be listed");
    }
    // The groups are fetched also when users are missing: a dead trusted domain takes nothing from the others.
    const bool users = VORNWinGetDomainUGByDomain(kUsers, domains.get()) == 0;
    const bool groups = VORNWinGetDomainUGByDomain(kGroups, domains.get()) == 0;
    if (!users || !groups) {
        const char* which = !users && !groups ? "users and groups" : !users ? "users" : "groups";
        return Fail(std::string("refresh: not all lists of domain ") + which + " are new");
    }
    Log(LOG_NOTICE, "the lists of domain users and groups are new");
    return kDone;
}

}  // namespace appliance
