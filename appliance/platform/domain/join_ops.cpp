// The contract's join and leave.

#include "appliance/platform/contract.h"
//
#include <cstring>
#include <optional>
#include <string>

#include "appliance/base/text.h"
#include "appliance/domain/join/join_status.h"
#include "appliance/domain/join/launcher.h"
#include "appliance/platform/last_error.h"

namespace {

constexpr int kJoin = 1;
constexpr int kLeave = 0;

// Why this thread's last join failed. The status file is one for the whole machine, and another caller's join may have
// written or removed it by the time that this caller asks.
std::optional<appliance::JoinStatus>& LastStatus() {
    thread_local std::optional<appliance::JoinStatus> status;
    return status;
}

template <std::size_t size>
std::string FieldText(const char (&field)[size]) {
    return std::string(field, strnlen(field, size));
}

}  // namespace

extern "C" {

int VORNWinJoin1(struct _tag_VORN_WIN2_* record) {
    VORN_GUARD(-1, {
        LastStatus().reset();
        if (record == nullptr || record->domainName == nullptr || record->userName == nullptr ||
            record->password == nullptr || (record->joinMode != kJoin && record->joinMode != kLeave)) {
            return VORN_FAIL(BadArgument);
        }
        appliance::JoinRequest request;
        request.domain = record->domainName;
        if (record->joinMode == kJoin) {
            request.credentials = {record->userName, appliance::Secret(record->password)};
            request.controller = appliance::Trim(FieldText(record->kdc));
            request.realm = appliance::Trim(FieldText(record->fqdn));
            request.netbiosName = appliance::Trim(FieldText(record->netbiosName));
        } else {
            request.action = appliance::JoinRequest::Action::Leave;
        }
        const appliance::JobResult result = appliance::RunJoinTool(request);
        if (!result.success) {
            LastStatus() = result.status;
            return VORN_FAIL(Refused);
        }
        return 0;
    })
}

int ErrWINIState1Get(char* key, int keySize, char* message, int messageSize) {
    VORN_GUARD(-1, {
        appliance::JoinStatus status;
        if (LastStatus()) {
            status = *LastStatus();
            LastStatus().reset();
        } else if (appliance::ReadJoinStatus(status)) {
            return VORN_FAIL(NotFound);
        }
        if (!appliance::CopyToBuffer(status.key, key, keySize) ||
            !appliance::CopyToBuffer(status.message, message, messageSize)) {
            return VORN_FAIL(BadArgument);
        }
        return 0;
    })
}

}  // extern "C"
