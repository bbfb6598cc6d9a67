// The contract's lists: the domains in sight, their DNS names, the organisational units.

#include "appliance/platform/contract.h"
//
#include <optional>
#include <string>
#include <vector>

#include "appliance/base/text.h"
#include "appliance/domain/directory/domain_list.h"
#include "appliance/domain/directory/units.h"
#include "appliance/platform/last_error.h"

namespace {

// A client waits for the list.
constexpr std::chrono::seconds kUnitTime{8};

}  // namespace

extern "C" {

int VORNWinsEnumAllDomains(struct VLIBSZLIST** domains) {
    VORN_GUARD(-1, {
        if (domains == nullptr || *domains == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        appliance::Membership membership;
        if (appliance::ReadMembership(membership)) {
            return VORN_FAIL(FileRead);
        }
        if (!membership.Joined()) {
            return VORN_FAIL(NotMember);
        }
        std::vector<appliance::KnownDomain> found;
        if (appliance::TrustedDomainsEnabled()) {
            found = appliance::ListDomains(membership);
        } else {
            found = {appliance::LoadDomains(membership).front()};
        }
        for (const appliance::KnownDomain& domain : found) {
            if (VLIBCSzListPush(domains, domain.name.c_str()) < 0) {
                return VORN_FAIL(OutOfMemory);
            }
        }
        return 0;
    })
}

int VORNWinsEnumOU(struct VLIBSZLIST** names, struct VLIBSZLIST** values) {
    VORN_GUARD(-1, {
        if (names == nullptr || *names == nullptr || values == nullptr || *values == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        appliance::Membership membership;
        if (appliance::ReadMembership(membership)) {
            return VORN_FAIL(FileRead);
        }
        if (!membership.Joined()) {
            return VORN_FAIL(NotMember);
        }
        std::optional<std::vector<appliance::Unit>> units = appliance::RefreshUnits(membership, kUnitTime);
        if (!units) {
            units = appliance::LoadUnits(membership);
        }
        if (!units) {
            return VORN_FAIL(Unreachable);
        }
        for (const appliance::Unit& unit : *units) {
            if (VLIBCSzListPush(names, unit.name.c_str()) < 0 ||
                VLIBCSzListPush(values, unit.distinguishedName.c_str()) < 0) {
                return VORN_FAIL(OutOfMemory);
            }
        }
        return 0;
    })
}

int VORNWinsGetDomainFQDN(const char* domain, char* fqdn, int size) {
    VORN_GUARD(-1, {
        if (domain == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        appliance::Membership membership;
        if (appliance::ReadMembership(membership)) {
            return VORN_FAIL(FileRead);
        }
        const std::optional<appliance::KnownDomain> known =
            appliance::FindDomain(appliance::LoadDomains(membership), domain);
        if (!membership.DomainMode() || !known || known->dns.empty()) {
            return VORN_FAIL(NotFound);
        }
        return appliance::CopyToBuffer(known->dns, fqdn, size) ? 0 : VORN_FAIL(BadArgument);
    })
}

}  // extern "C"
