// The contract's refresh of what is known of the domains, and the fetch of their users and groups.

#include "appliance/platform/contract.h"
//
#include <algorithm>
#include <string>
#include <vector>

#include "appliance/base/text.h"
#include "appliance/domain/directory/domain_list.h"
#include "appliance/domain/directory/fetch.h"
#include "appliance/domain/directory/progress.h"
#include "appliance/domain/directory/units.h"
#include "appliance/domain/membership/idmap.h"
#include "appliance/platform/last_error.h"

namespace {

using appliance::ErrorCode;

constexpr char kWinbind[] = "winbindd";

// The code is known at run time only, so the last error carries the place that the caller names.
int FailWith(ErrorCode code, int line, int result = -1) {
    VLIBCErrSetEx(static_cast<int>(code), appliance::SourceName(__FILE__), line);
    return result;
}

// The entries of a list, each once.
std::vector<std::string> Names(const VLIBSZLIST& list) {
    std::vector<std::string> names;
    for (int index = 0; index < list.count; ++index) {
        const char* name = VLIBCSzListGet(&list, index);
        const auto same = [name](const std::string& other) { return appliance::EqualIgnoringCase(other, name); };
        if (name != nullptr && std::none_of(names.begin(), names.end(), same)) {
            names.emplace_back(name);
        }
    }
    return names;
}

}  // namespace

extern "C" {

int VORNWinUpdateAllDomains(void) {
    VORN_GUARD(-1, {
        appliance::Membership membership;
        if (appliance::ReadMembership(membership)) {
            return VORN_FAIL(FileRead);
        }
        if (!membership.Joined()) {
            return VORN_FAIL(NotMember);
        }
        appliance::RecordRefreshBegin();
        if (!appliance::RefreshDomains(membership)) {
            appliance::RecordRefreshFailure(membership.domain, "no domain controller tells which domains there are");
            return VORN_FAIL(Unreachable);
        }
        // A domain that is new gets its range of ids before its users come; without one they'd have no ids.
        std::vector<std::string> names;
        for (const appliance::KnownDomain& domain : appliance::LoadDomains(membership)) {
            names.push_back(domain.name);
        }
        if (appliance::EnsureIdmapRanges(names)) {
            VLIBServiceReload(kWinbind);
        }
        return 0;
    })
}

int VORNWinUpdateOU(void) {
    VORN_GUARD(-1, {
        appliance::Membership membership;
        if (appliance::ReadMembership(membership)) {
            return VORN_FAIL(FileRead);
        }
        if (!membership.Joined()) {
            return VORN_FAIL(NotMember);
        }
        appliance::RecordRefreshBegin();
        if (!appliance::FetchUnits(membership)) {
            appliance::RecordRefreshFailure(membership.domain, "no domain controller tells the organisational units");
            return VORN_FAIL(Unreachable);
        }
        return 0;
    })
}

int VORNWinGetDomainUGByDomain(int kind, struct VLIBSZLIST* domains) {
    VORN_GUARD(-1, {
        if (domains == nullptr || (kind != 0 && kind != 1)) {
            return VORN_FAIL(BadArgument);
        }
        const std::vector<std::string> names = Names(*domains);
        if (names.empty()) {
            return VORN_FAIL(BadArgument);
        }
        const appliance::FetchResult result = appliance::FetchDirectory(static_cast<appliance::EntryKind>(kind), names);
        if (!result.started) {
            // Who asks while another fetch of the kind runs steps aside for it, as callers that look first do.
            return result.code == ErrorCode::FileLock ? 0 : FailWith(result.code, __LINE__);
        }
        if (result.newRanges) {
            VLIBServiceReload(kWinbind);
        }
        if (result.failures.empty()) {
            return 0;
        }
        return FailWith(result.code, __LINE__, result.stored > 0 ? 1 : -1);
    })
}

}  // extern "C"
