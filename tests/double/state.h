// The state of the imitated appliance: what its operations answer from, and what they change.

#ifndef VORN_TESTS_DOUBLE_STATE_H
#define VORN_TESTS_DOUBLE_STATE_H

#include <json/value.h>

#include <array>
#include <cstddef>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "platform/domain.h"
#include "platform/webapi.h"

namespace fake {

using OptionalText = std::optional<std::string>;
using OptionalTexts = std::vector<OptionalText>;
using Section = std::vector<std::pair<std::string, std::string>>;
using KeyValueFile = std::map<std::string, Section>;

struct LastError {
    int code = 0x1234;
    const char* file = "platform.c";
    int line = 77;
};

// A record given to VORNWinJoin1. The pointers within `bytes` are those of the call; the copies outlive it.
struct JoinRecord {
    _tag_VORN_WIN2_ bytes{};
    OptionalText domainName;
    OptionalText userName;
    OptionalText password;
};

struct JoinStatus {
    std::string key;
    std::string message;
};

struct Event {
    int kind = 0;
    int level = 0;
    int event = 0;
    std::array<std::string, 4> arguments;
};

struct FetchedDomains {
    int kind = 0;
    OptionalTexts domains;
};

struct ScheduledTask {
    int id = -1;
    std::string command;
    bool listable = true;
    Json::Value schedule = Json::Value(Json::objectValue);
};

struct BackgroundTask {
    std::string id;
    std::string group;
    std::string prefix;
    Json::Value record;
    bool removedWhenRead = false;
};

struct State {
    // Capabilities, settings, services.
    std::map<std::string, std::string> capabilities{{"supportdomain", "yes"}};
    std::map<std::string, std::string> settings;
    std::map<std::string, int> supports{{"supporttrustdomain", 1}};
    std::set<std::string> enabledServices;
    std::vector<std::string> reloadedServices;
    std::vector<std::string> restartedServices;
    std::vector<int> reloadedServiceTypes;
    LastError lastError;

    // Membership of a domain.
    std::string domainName = "WORKGROUP";
    std::string workgroup = "WORKGROUP";
    int firstFlag = 0;
    int secondFlag = 0;
    int adsJoined = 0;
    int joinedFlag = 0;
    int testJoinResult = 0;
    int trustSetting = 0;
    int ldapBound = 0;
    std::string ownDomain;
    OptionalTexts domains;
    std::map<std::string, std::string> fqdns;
    OptionalTexts unitNames;
    OptionalTexts unitValues;
    std::optional<JoinStatus> joinStatus;
    int joinResult = 0;
    std::function<void(const _tag_VORN_WIN2_&)> onJoin;
    std::vector<JoinRecord> joins;  // every record given, also to a call that failed
    std::vector<FetchedDomains> fetchedDomains;
    int domainUpdates = 0;
    int unitUpdates = 0;
    int adminGroupUpdates = 0;
    int userHomesIncluded = 0;

    // Files. A file of keys and values and a pid file exist without being listed in `files`.
    std::map<std::string, KeyValueFile> keyValueFiles;
    std::map<std::string, std::string> sectionFormats;  // by path, as given to VLIBCFileAddSection last
    std::set<std::string> files;
    std::map<std::string, int> pidFiles;
    std::set<int> heldLocks;
    std::string sharingConfiguration = "/usr/vorn/etc/smb.conf";  // where VORNWinsSetSectionKey writes

    bool Exists(const std::string& path) const;
    bool Remove(const std::string& path);
    bool Rename(const std::string& from, const std::string& to);

    // Network, event log, libc.
    OptionalTexts dnsServers;
    std::vector<Event> events;
    int systemResult = 0;
    std::vector<std::string> commands;
    unsigned int sleptSeconds = 0;

    // Task scheduler.
    std::vector<ScheduledTask> scheduledTasks;
    bool taskScheduleConvertible = true;

    // Background tasks.
    std::vector<BackgroundTask> tasks;
    std::optional<Json::Value> taskList;  // when set, APIPolling::List answers exactly this
    int pollingError = 1001;
    int startedTasks = 0;
    VORN::APITaskFunction startedBody = nullptr;
    void* startedUserData = nullptr;
    Json::Value startedParameters;
    std::vector<std::pair<std::string, bool>> stoppedTasks;  // id and force

    // What a failing read leaves in its buffer, whose content nobody may look at.
    std::string staleText = "stale-garbage";

    // Whether an operation that may replace a list or hash does so each time, so that a stale pointer is found.
    bool sectionLoaderReplacesHash = true;
    bool listGrowthReplacesList = true;
    bool hashGrowthReplacesHash = true;
};

// The value of a key, compared without regard to case, or null.
const std::string* FindKey(const Section& section, const std::string& key);
void SetKey(Section& section, const std::string& key, const std::string& value);
void RemoveKey(Section& section, const std::string& key);

}  // namespace fake

#endif
