// Where a domain's users and groups come from: a controller's LDAP or RPC service. These run in a process that can be
// killed (worker.h).

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_FETCH_SOURCE_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_FETCH_SOURCE_H

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "appliance/domain/directory/directory_store.h"
#include "appliance/domain/directory/ldap_session.h"
#include "appliance/domain/membership/discovery.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

class ListWriter;
class ProgressReport;

// A domain to fetch from.
struct FetchDomain {
    std::string name;                                              // NetBIOS name
    std::string dns;                                               // DNS name; empty for an NT4-style domain
    bool own = false;                                              // the appliance's own: "password server" counts
    bool useRpc = false;                                           // by RPC although it has a DNS name
    std::optional<std::pair<std::uint32_t, std::uint32_t>> range;  // first and last id; none: its accounts have no ids
};

// The domain's controllers to try, in their order: those of "password server" first, all by name where a name is
// needed. At most four, so that a domain whose controllers are all dead takes no longer than that. Throws
// DirectoryError when none is known.
std::vector<Controller> ControllersOf(const FetchDomain& domain, const Membership& membership);

// A session with the first controller of the domain that lets the machine account in; its name goes to `controller`.
// Takes the ticket itself; each controller that is tried counts as progress. Throws DirectoryError with the reason of
// each.
std::unique_ptr<LdapSession> OpenSession(const FetchDomain& domain, const Membership& membership,
                                         std::chrono::milliseconds patience, ProgressReport& report,
                                         std::string& controller);

// Writes all users or groups to `writer` and answers the controller that gave them. Throws DirectoryError, and what the
// writer throws.
std::string FetchByLdap(EntryKind kind, const FetchDomain& domain, const Membership& membership, ListWriter& writer,
                        ProgressReport& report);
std::string FetchByRpc(EntryKind kind, const FetchDomain& domain, const Membership& membership, ListWriter& writer,
                       ProgressReport& report);

// The id of an account in the domain's range, as the "rid" backend counts; nothing beyond its end.
std::optional<std::int64_t> IdOf(const FetchDomain& domain, std::uint32_t rid);

}  // namespace appliance

#endif
