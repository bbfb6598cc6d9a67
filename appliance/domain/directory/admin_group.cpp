#include "appliance/domain/directory/admin_group.h"

#include <algorithm>
#include <thread>

#include "appliance/base/conf_file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/directory/utf8.h"
#include "appliance/domain/join/time_budget.h"
#include "appliance/domain/membership/samba.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kAttempt{15000};
constexpr std::chrono::seconds kPause{3};
constexpr std::chrono::minutes kPatience{5};
constexpr char kGroup[] = "Administrators";
constexpr char kAdministratorsEnd[] = "-512";

CommandResult Net(const std::vector<std::string>& arguments, const TimeBudget& budget) {
    SambaCall call;
    call.arguments = arguments;
    call.deadline = budget.Left(kAttempt);
    return RunNet(call);
}

bool Fail(const std::string& doing, const CommandResult& result, ErrorCode& code) {
    code = result.end == CommandResult::End::TimedOut ? ErrorCode::TimedOut : ErrorCode::CommandFailed;
    const std::vector<std::string> lines = Lines(Trim(result.errors));
    Log(LOG_ERR, "the domain's administrators: net " + doing + " " + result.Describe() +
                     (lines.empty() ? "" : ": " + CleanText(lines.back())));
    return false;
}

}  // namespace

bool ApplyDomainAdministrators(const Membership& membership, std::chrono::milliseconds time, ErrorCode& code) {
    const TimeBudget budget(time);
    if (!membership.Joined()) {
        code = ErrorCode::NotMember;
        Log(LOG_ERR, "the domain's administrators: the appliance is no member of a domain");
        return false;
    }
    ConfFile options;
    if (const std::error_code error = ConfFile::Load(Path(kSmbInfo), options)) {
        code = ErrorCode::FileRead;
        Log(LOG_ERR, Path(kSmbInfo) + ": " + error.message());
        return false;
    }
    const bool disabled = options.Get("global", "disable domain admins").value_or("") == "yes";

    const CommandResult asked = Net({"getdomainsid"}, budget);
    const std::string sid = asked.Succeeded() ? ParseDomainSid(asked.output, membership.domain) : "";
    if (sid.empty()) {
        return Fail("getdomainsid", asked, code);
    }
    // Makes the group when it is missing; one that is there stays as it is.
    const CommandResult made = Net({"sam", "createbuiltingroup", kGroup}, budget);
    if (!made.Succeeded()) {
        return Fail("sam createbuiltingroup", made, code);
    }
    const std::string verb = disabled ? "delmem" : "addmem";
    const CommandResult changed = Net({"sam", verb, kGroup, sid + kAdministratorsEnd}, budget);
    const char* already = disabled ? "NT_STATUS_MEMBER_NOT_IN_ALIAS" : "NT_STATUS_MEMBER_IN_ALIAS";
    if (changed.Succeeded()) {
        Log(LOG_NOTICE, "the administrators of " + membership.domain +
                            (disabled ? " are no longer administrators here" : " are administrators here"));
        return true;
    }
    const bool was = changed.end == CommandResult::End::Exited &&
                     (Contains(changed.errors, already) || Contains(changed.output, already));
    return was ? true : Fail("sam " + verb, changed, code);
}

bool ApplyDomainAdministratorsLater() {
    const TimeBudget budget(kPatience);
    for (;;) {
        Membership membership;
        if (const std::error_code error = ReadMembership(membership)) {
            Log(LOG_ERR, Path(kSmbConf) + ": " + error.message());
            return false;
        }
        ErrorCode code = ErrorCode::Internal;
        if (ApplyDomainAdministrators(membership, kAttempt, code)) {
            return true;
        }
        if (code != ErrorCode::TimedOut || budget.Over()) {
            return false;
        }
        std::this_thread::sleep_for(kPause);
    }
}

std::string ParseDomainSid(const std::string& text, const std::string& domain) {
    const std::string beginning = "SID for domain " + domain + " is: ";
    for (const std::string& line : Lines(text)) {
        if (line.size() < beginning.size() || !EqualIgnoringCase(line.substr(0, beginning.size()), beginning)) {
            continue;
        }
        const std::string sid = Trim(line.substr(beginning.size()));
        const bool plain = sid.find_first_not_of("S-0123456789") == std::string::npos;
        if (plain && StartsWith(sid, "S-1-5-21-") && std::count(sid.begin(), sid.end(), '-') == 6) {
            return sid;
        }
    }
    return "";
}

}  // namespace appliance
