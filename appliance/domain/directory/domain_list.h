// The domains in sight: the appliance's own one and those that it trusts. What is known of them lies in
// /var/lib/vorn/domains.json, [{"name", "dns", "own"}] with the own one first, and is what is answered when winbind or
// the controller can't be asked.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_DOMAIN_LIST_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_DOMAIN_LIST_H

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "appliance/domain/membership/membership.h"

namespace appliance {

inline constexpr char kDomainList[] = "/var/lib/vorn/domains.json";

struct KnownDomain {
    std::string name;  // NetBIOS name
    std::string dns;   // DNS name in small letters; empty for an NT4-style domain, or when it is not known
    bool own = false;

    bool operator==(const KnownDomain& other) const {
        return name == other.name && dns == other.dns && own == other.own;
    }
};

// What is known without asking anyone: the own domain, from the membership, then the trusted ones that were seen last
// while the appliance was a member of that same domain.
std::vector<KnownDomain> LoadDomains(const Membership& membership);

// Stores the list; an equal one is not written again. False, with a line in the log, when it can't be written.
bool SaveDomains(const std::vector<KnownDomain>& domains);

// The domains as winbind sees them now, within a few seconds, else as they are known. A winbind that has lost its
// controller forgets the trusted domains: those that are known then stay in the list. What is new is stored. Starts
// programs, but never one for each domain, and asks no controller.
std::vector<KnownDomain> ListDomains(const Membership& membership);

// Asks winbind and, for Active Directory, the controller, and stores what they say. A domain is forgotten, and its
// lists of users and groups are removed, only when both are sure of it. False, with a line in the log, when neither can
// be asked; what is known stays then. Starts a child process (RunWorker).
bool RefreshDomains(const Membership& membership);

// The domain of that NetBIOS or DNS name, in any case; nothing when it is none of them.
std::optional<KnownDomain> FindDomain(const std::vector<KnownDomain>& domains, const std::string& name);

// The trusted domains in what "wbinfo -m --verbose" prints, without BUILTIN, the appliance's own accounts and `own`.
// Lines that are damaged, and names that can't be names, are left out. Nothing when the text is no such list.
std::optional<std::vector<KnownDomain>> ParseTrustList(const std::string& text, const std::string& own);

// Does "wbinfo --online-status" say that the domain's controller is connected?
bool ParseOnline(const std::string& text, const std::string& domain);

}  // namespace appliance

#endif
