// "update_start": refresh the local database of domain users and groups as a background task, one at a time.
//
// Request  {"domain_name": "LAB"}; without a name, or with an empty one or "@all", all domains are refreshed
// Answer   the id of the task, in the framework's form
//
// The task runs the worker below or, when the appliance is fetching already, the monitor of update_tasks.cpp.

#include <cstdlib>

#include "src/api_table.h"
#include "src/domain.h"
#include "src/domain/internal.h"
#include "src/support/handles.h"
#include "src/support/json_access.h"
#include "src/support/log.h"
#include "src/support/paths.h"

namespace {

constexpr int kUsers = 0;
constexpr int kGroups = 1;

// The worker's fetches, in their order; 2623 stands for the failure of any.
bool RefreshDatabase(const std::string& domainName) {
    const bool allDomains = domainName.empty() || domainName == "@all";
    if (!allDomains) {
        const char* domain = domainName.c_str();
        return QueryDomainUserGroup(kUsers, domain) >= 0 && QueryDomainUserGroup(kGroups, domain) >= 0;
    }
    const int refreshed = VORNWinIsEnableTrustDomain() != 0 ? VORNWinUpdateAllDomains() : VORNWinUpdateOU();
    return refreshed >= 0 && QueryDomainUserGroup(kUsers, nullptr) >= 0 && QueryDomainUserGroup(kGroups, nullptr) >= 0;
}

// With trusted domains disabled only the appliance's own domain may be fetched.
bool IsAllowed(const char* domain) {
    return VORNWinIsEnableTrustDomain() != 0 || VORNWinsIsOwnDomain(domain) != 0;
}

}  // namespace

void DomainServiceHandler::UpdateStart() {
    VORN::APIPolling polling;
    if (VLIBCSupportGet("supporttrustdomain") == 0) {
        syslog(LOG_ERR, "%s:%d Not support trust domain", kDomainUnit, LOG_NUMBER(kUpdate));
        SetError(2625);
        ReportError();
        return;
    }
    // Only its type is of interest here; the worker reads it again from the request that the framework hands on.
    if (!CHECK_PARAM_STRING("domain_name", false)) {
        ReportError();
        return;
    }
    if (CheckUpdating()) {
        syslog(LOG_ERR, "%s:%d Domain is updating", kDomainUnit, LOG_NUMBER(kUpdate));
        SetError(2626);
        ReportError();
        return;
    }
    polling.SetRequest(request);
    polling.SetGroupAttr(kTaskGroup);
    polling.SetRemoveAttr(false);
    polling.SetPrefixAttr(kTaskPrefix);
    if (VLIBCFileTouch(kUpdatingMarker) < 0) {
        ReportError();  // without a code of its own
        return;
    }
    // The framework answers from here on. The marker is the task's to remove, also when none could be started.
    polling.Start(response, CheckDomainDBUpdating() ? DomainMonitorUpdating : DomainUpdateStartFork, nullptr);
}

bool DomainServiceHandler::CheckUpdating() {
    VORN::APIPolling polling(request);
    Json::Value tasks;
    if (!polling.List(kTaskPrefix, TaskGroups(), tasks)) {
        // Past the handler's own error, and the start goes on as if nothing ran.
        response->SetError(kPollingError, Json::Value());
        return false;
    }
    for (const std::string& id : TaskIds(tasks)) {
        // A task that can't be read counts as running, so the status is a fresh one each time.
        Json::Value status;
        polling.Status(id, status);
        if (!IsTrue(MemberOf(status, "finish"))) {
            return true;
        }
    }
    return false;
}

bool DomainServiceHandler::CheckDomainDBUpdating() {
    return VLIBCReadPidFile(kUserFetchPid) >= 0 || VLIBCReadPidFile(kGroupFetchPid) >= 0;
}

void DomainServiceHandler::UpdateStartFork() {
    bool done = false;
    {
        const UpdatingMarker marker;
        response->SetSuccess(Progress("updating"));
        std::string domainName;
        if (request->HasParam("domain_name")) {
            domainName = request->GetParam("domain_name", Json::Value()).asString();
        }
        done = RefreshDatabase(domainName);
        if (done) {
            response->SetSuccess(Progress("finish"));
        } else {
            SetError(2623);
        }
    }
    if (!done) {
        ReportError();
    }
}

int QueryDomainUserGroup(int kind, const char* domain) {
    StringList domains;
    if (!domains) {
        return -1;
    }
    if (kind != kUsers && kind != kGroups) {
        syslog(LOG_ERR, "%s:%d Parameter error", kDomainUnit, LOG_NUMBER(kUpdate));
        return -1;
    }
    if (domain != nullptr) {
        if (!IsAllowed(domain) || VLIBCSzListPush(domains.address(), domain) < 0) {
            return -1;
        }
    } else if (VORNWinsEnumAllDomains(domains.address()) < 0) {
        return -1;
    }
    if (VLIBCReadPidFile(kind == kUsers ? kUserFetchPid : kGroupFetchPid) >= 0) {
        return 0;  // the appliance is fetching these by itself
    }
    if (domain == nullptr) {
        // Whether there was anything to delete does not matter.
        [[maybe_unused]] const int removed =
            system(kind == kUsers ? "/bin/rm /usr/vorn/etc/private/domain_user* > /dev/null 2>&1"
                                  : "/bin/rm /usr/vorn/etc/private/domain_group* > /dev/null 2>&1");
    }
    if (VORNWinGetDomainUGByDomain(kind, domains.get()) != 0) {
        syslog(LOG_ERR, "%s:%d query domain user/group fail using specify domain=%s", kDomainUnit, LOG_NUMBER(kUpdate),
               domain);  // null, as the C library prints it, when it was all domains
        return -1;
    }
    return 0;
}
