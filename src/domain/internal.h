// What the files of the domain unit share beside the class; not exported.

#ifndef VORN_SRC_DOMAIN_INTERNAL_H
#define VORN_SRC_DOMAIN_INTERNAL_H

#include <json/value.h>

#include <string>
#include <vector>

// Whether this model of the appliance supports domains, "yes" in any case. ("set" alone asks for "yes" as it is
// written here; see membership.cpp.)
bool SupportsDomain();

// Replaces `out` with the appliance's DNS servers. On failure `out` stays as it is, a line is logged and no code
// recorded.
bool GetDNSList(std::vector<std::string>& out);

// Fetches the users (kind 0) or groups (kind 1) of one domain, or of all when `domain` is null, into the local database.
// 0 when done or when the appliance is fetching them anyway; -1 on failure.
int QueryDomainUserGroup(int kind, const char* domain);

// The tasks of this module are found by their prefix and their group.
constexpr const char* kTaskPrefix = "DomainUpdate";
constexpr const char* kTaskGroup = "admin";

// The groups to look for tasks in, as VORN::APIPolling::List takes them.
Json::Value TaskGroups();

// The ids in an answer of VORN::APIPolling::List, in its order. Whatever is not an id in an array is passed over.
std::vector<std::string> TaskIds(const Json::Value& tasks);

// What a running refresh shows to the client: {"status": ...}.
Json::Value Progress(const char* status);

// Removes the marker of a running refresh when it goes out of scope.
class UpdatingMarker {
public:
    UpdatingMarker() = default;
    ~UpdatingMarker();
    UpdatingMarker(const UpdatingMarker&) = delete;
    UpdatingMarker& operator=(const UpdatingMarker&) = delete;
};

#endif
