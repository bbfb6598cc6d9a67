// "set": what the request asks for, and the way back to the workgroup.
//
//   appliance in domain mode | "enable_domain" | what happens
//   no                       | false           | nothing
//   no                       | true            | join
//   yes                      | false           | leave
//   yes                      | true            | join again, without leaving first

#include <cstring>

#include "platform/eventlog.h"
#include "platform/settings.h"
#include "src/domain.h"
#include "src/support/log.h"
#include "src/support/paths.h"

namespace {

constexpr int kSettingsLock = 0x806;
constexpr int kSettingsUnlock = 0x800;
constexpr int kSettingsLockWait = 5;

constexpr int kEventLeft = 0x11800506;
constexpr const char* kWorkgroup = "WORKGROUP";

// Without the lock the key stays, and that is no failure.
void RemoveDomainDns() {
    if (VLIBCFileLock(kSettingsLock, kSettingsLockWait) == 0) {
        VLIBCFileRemoveKey(kSystemSettings, "domain_dns");
        VLIBCFileUnlock(kSettingsUnlock);
    }
}

}  // namespace

bool DomainServiceHandler::ApplyDomainConfig() {
    VornConf conf;
    // With regard to case, unlike everywhere else: a model that says "YES" shows its membership but can't change it.
    if (std::strcmp(conf.Def("supportdomain", ""), "yes") != 0) {
        syslog(LOG_ERR, "%s:%d Not support domain", kDomainUnit, LOG_NUMBER(kMembership));
        SetError(2619);
        return false;
    }
    if (!SaveDomainWorkgroup()) {
        syslog(LOG_ERR, "%s:%d Failed to save domain/workgroup info.", kDomainUnit, LOG_NUMBER(kMembership));
        return false;
    }
    return true;
}

bool DomainServiceHandler::SaveDomainWorkgroup() {
    char name[256] = {};
    int domainMode = 0;
    // The second flag does not count here: a broken membership can be left and joined again.
    if (WINIQuery1(name, sizeof(name), &domainMode, nullptr) < 0) {
        syslog(LOG_ERR, "%s:%d Failed to get domain info.", kDomainUnit, LOG_NUMBER(kMembership));
        SetError(2622);
        return false;
    }
    const bool enable = request->GetParam("enable_domain", Json::Value()).asBool();
    if (enable) {
        if (VORNLDAPIsBinded(0) == 1) {
            syslog(LOG_ERR, "%s:%d LDAP is binded", kDomainUnit, LOG_NUMBER(kMembership));
            SetError(2620);
            return false;
        }
        return SaveDomain();
    }
    return domainMode == 0 || LeaveDomain();
}

bool DomainServiceHandler::LeaveDomain() {
    _tag_VORN_WIN2_ record{};  // with join mode 0: back to a workgroup
    record.domainName = kWorkgroup;
    record.userName = "";
    record.password = "";
    // A positive result counts as done here, and as a failure when joining.
    if (VORNWinJoin1(&record) < 0) {
        syslog(LOG_ERR, "%s:%d Failed to clear domain info.", kDomainUnit, LOG_NUMBER(kMembership));
        SetError(kSystemError);
        return false;
    }
    if (RemoveSmbinfoKeys() < 0) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d remove advance option keys Fail [0x%04X %s:%d]", kDomainUnit, LOG_NUMBER(kMembership),
               last.Code(), last.file, last.line);
        SetError(kSystemError);
        return false;
    }
    RemoveDomainDns();
    VORNLogSet1(2, 1, kEventLeft, kWorkgroup, "", "", "");
    return true;
}
