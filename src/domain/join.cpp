// "set": the join. What it changes ahead of the join is provisional: a join that fails puts it back.

#include <unistd.h>

#include <cstring>

#include "platform/eventlog.h"
#include "platform/settings.h"
#include "platform/webutils.h"
#include "src/domain.h"
#include "src/domain/internal.h"
#include "src/support/handles.h"
#include "src/support/log.h"
#include "src/support/paths.h"

namespace {

constexpr int kEventJoined = 0x11800404;
constexpr const char* kWebFolderService = "webdav-httpd-pure";

// What the join tool said about an earlier join must not be taken for this one's.
void RemoveJoinStatus() {
    if (access(kJoinStatus, F_OK) == 0) {
        unlink(kJoinStatus);
    }
}

bool IsSameDns(const std::vector<std::string>& wanted, const std::vector<std::string>& current) {
    const std::string wantedText = WebUtils::StringImplode(wanted, ",");
    return wantedText == WebUtils::StringImplode(current, ",");
}

}  // namespace

// What is known of a join while it runs.
struct DomainServiceHandler::JoinAttempt {
    std::string domain;
    HeapText domainCopy;
    HeapText userCopy;
    HeapText passwordCopy;
    _tag_VORN_WIN2_ record{};
    int savedTrust = 0;
    int wantedTrust = 1;
    std::vector<std::string> oldDns;
    std::vector<std::string> newDns;
    bool dnsChanged = false;
    bool joined = false;
};

bool DomainServiceHandler::SaveDomain() {
    JoinAttempt attempt;
    attempt.record.joinMode = 1;
    attempt.domain = request->GetParam("domain_name", Json::Value()).asString();
    attempt.domainCopy = CopyText(attempt.domain.c_str());
    attempt.userCopy = CopyText(request->GetParam("username", Json::Value()).asString().c_str());
    attempt.passwordCopy = CopyText(request->GetParam("password", Json::Value()).asString().c_str());
    attempt.record.domainName = attempt.domainCopy.get();
    attempt.record.userName = attempt.userCopy.get();
    attempt.record.password = attempt.passwordCopy.get();
    attempt.savedTrust = VORNWinIsEnableTrustDomain();
    try {
        attempt.joined = TryJoin(attempt);
        if (attempt.joined) {
            FinishJoin();
        }
    } catch (...) {
        CleanUpJoin(attempt);
        throw;
    }
    CleanUpJoin(attempt);
    return attempt.joined;
}

bool DomainServiceHandler::TryJoin(JoinAttempt& attempt) {
    // A "manage_mode" of the wrong type is recorded but stops nothing: the join goes on with trusted domains enabled.
    if (CHECK_PARAM_INT("manage_mode", false)) {
        attempt.wantedTrust = request->GetParam("manage_mode", Json::Value()).asInt() == 0 ? 1 : 0;
    }
    // Compared as stored: a setting of 2 also means enabled, yet it is changed to 1 and put back as 2.
    if (attempt.wantedTrust != attempt.savedTrust && VORNWinSetTrustDomain(attempt.wantedTrust) < 0) {
        SetError(kSystemError);
        return false;
    }

    if (!GetDNSList(attempt.oldDns)) {
        syslog(LOG_ERR, "%s:%d Cannot get the dns list", kDomainUnit, LOG_NUMBER(kJoin));
        SetError(kSystemError);
        return false;
    }
    if (request->HasParam("dns")) {
        attempt.newDns = WebUtils::StringExplode(request->GetParam("dns", "").asString(), ",");
    }
    // Servers that can't be set are recorded but stop nothing: the join may work with the old ones.
    if (!attempt.newDns.empty() && !IsSameDns(attempt.newDns, attempt.oldDns)) {
        attempt.dnsChanged = SetDNSList(attempt.newDns);
    }

    if (!SaveAdvanceDomain(attempt.record)) {
        return false;
    }
    RemoveJoinStatus();
    if (VORNWinJoin1(&attempt.record) != 0) {
        RecordJoinFailure(attempt.domain.c_str(), !attempt.newDns.empty());
        return false;
    }
    return true;
}

void DomainServiceHandler::FinishJoin() {
    VORNGroupAddDomainAdminGroup();
    VLIBServiceReload("samba");
    VLIBServiceReload("nmbd");
    VLIBServiceReload("winbindd");

    char name[256] = {};
    int domainMode = 0;
    if (WINIQuery1(name, sizeof(name), &domainMode, nullptr) < 0) {
        const std::string domain = request->GetParam("domain_name", "").asString();
        VORNLogSet1(2, 1, kEventJoined, domain.c_str(), "", "", "");
    } else {
        VORNLogSet1(2, 1, kEventJoined, name, "", "", "");
    }

    VornConf conf;
    const bool userHome = std::strcmp(conf.Info("enableduserhome", ""), "yes") == 0;
    if (VORNDomainUserHomeInclude(userHome ? 1 : 0) == -1) {
        syslog(LOG_ERR, "%s:%d VORNDomainUserHomeInclude failed.", kDomainUnit, LOG_NUMBER(kJoin));
    }
    if (VLIBServiceIsEnabled(kWebFolderService) == 1 && VLIBServiceRestart(kWebFolderService) < 0) {
        syslog(LOG_ERR, "%s:%d restart webdav failed.", kDomainUnit, LOG_NUMBER(kJoin));
    }
}

void DomainServiceHandler::CleanUpJoin(const JoinAttempt& attempt) {
    RemoveJoinStatus();
    if (attempt.joined) {
        return;
    }
    if (attempt.dnsChanged) {
        SetDNSList(attempt.oldDns);
    }
    // Also when setting it was what failed: what it is then, nobody knows.
    if (attempt.wantedTrust != attempt.savedTrust) {
        VORNWinSetTrustDomain(attempt.savedTrust);
    }
}
