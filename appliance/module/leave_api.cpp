#include "appliance/module/leave_api.h"

#include <string.h>

#include <array>
#include <optional>
#include <string_view>
#include <system_error>
#include <utility>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/join_status.h"
#include "appliance/domain/join/launcher.h"
#include "appliance/domain/membership/membership.h"
#include "platform/core.h"
#include "platform/eventlog.h"

namespace appliance {
namespace {

constexpr const char* kWorkgroup = "WORKGROUP";
constexpr std::size_t kLongestAccount = 256;
constexpr std::size_t kLongestPassword = 1024;
constexpr int kNoCodeOfItsOwn = 2615;

constexpr int kSettingsLock = 0x806;
constexpr int kSettingsUnlock = 0x800;
constexpr int kSettingsLockWait = 5;  // seconds
constexpr int kEventLeft = 0x11800506;

Credentials CredentialsOf(const Parameters& parameters) {
    const std::optional<std::string> user = parameters.Text("username", kLongestAccount);
    std::optional<std::string> password = parameters.Text("password", kLongestPassword);
    if (!user || !IsAccountName(*user) || !password || password->empty()) {
        throw CallFailure(AnswerCode::BadParameter, "parameters username and password are needed, or unusable");
    }
    Credentials credentials{*user, Secret(*password)};
    explicit_bzero(password->data(), password->size());
    return credentials;
}

// As after every leave: the DNS servers of the join are forgotten, and the administrators read of it.
void RecordLeave() {
    if (VLIBCFileLock(kSettingsLock, kSettingsLockWait) == 0) {
        VLIBCFileRemoveKey(Path(kSettings).c_str(), "domain_dns");
        VLIBCFileUnlock(kSettingsUnlock);
    }
    if (VORNLogSet1(2, 1, kEventLeft, kWorkgroup, "", "", "") < 0) {
        Log(LOG_ERR, "the event of the leave could not be kept");
    }
}

}  // namespace

int CodeOfStatus(const std::string& message) {
    constexpr std::array<std::pair<const char*, int>, 13> kCodes{{
        {status::kSystem, 2617},
        {status::kKdc, 2603},
        {status::kWorkgroup, 2604},
        {status::kNoController, 2605},
        {status::kPort445, 2606},
        {status::kWrongPassword, 2607},
        {status::kUnknownAccount, 2607},
        {status::kRevoked, 2608},
        {status::kDisabled, 2609},
        {status::kWrongNameOrPassword, 2610},
        {status::kNoRight, 2611},
        {status::kExpired, 2612},
        {status::kNoConnection, 2614},
    }};
    for (const auto& [text, code] : kCodes) {
        if (StartsWith(message, text)) {
            return code;
        }
    }
    return kNoCodeOfItsOwn;
}

Json::Value Leave(const Parameters& parameters) {
    JoinRequest request;
    request.action = JoinRequest::Action::Leave;
    request.domain = kWorkgroup;
    request.deleteAccount = parameters.RequiredBool("delete_account");
    request.resetOptions = true;
    if (request.deleteAccount) {
        request.credentials = CredentialsOf(parameters);
    }
    Membership membership;
    if (const std::error_code error = ReadMembership(membership)) {
        throw CallFailure(AnswerCode::SystemError, "the membership can't be read: " + error.message());
    }
    if (!membership.DomainMode()) {
        throw CallFailure(AnswerCode::NotMember, "this is no member of a domain");
    }
    const JobResult result = RunJoinTool(request);
    if (!result.success) {
        // The answer says it all; the file is for the module whose call reads it.
        if (const std::error_code error = RemoveFile(Path(kJoinStatus))) {
            Log(LOG_WARNING, Path(kJoinStatus) + ": " + error.message());
        }
        throw CallFailure(CodeOfStatus(result.status.message), "the leave failed: " + result.status.message);
    }
    RecordLeave();
    return {};
}

}  // namespace appliance
