// How far a refresh is, for those who watch it, and how the last one ended: /run/vorn/refresh.json.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_PROGRESS_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_PROGRESS_H

#include <json/value.h>

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "appliance/domain/directory/directory_store.h"

namespace appliance {

struct FetchFailure {
    std::string domain;
    EntryKind kind = EntryKind::User;
    std::string reason;
};

// {"kind": "user"|"group", "domain": text, "count": entries of this domain so far, "domains_done": int, "domains": int,
// "started": s, "updated": s, "finished": s|null, "errors": [{"domain", "kind", "reason"}], "process": {"pid", "start"}},
// times in seconds since 1970. A refresh fetches users, then groups, in one process: its record begins with the first and
// goes on with the second, errors of both in it. The file is replaced at most every 200 milliseconds. One that can't be
// written is no failure of the fetch.
class FetchProgress {
public:
    FetchProgress(EntryKind kind, int domains);

    void Begin(const std::string& domain);
    void Count(std::int64_t count);
    void Fail(const std::string& reason);
    // The domain is done, well or not.
    void End();

    const std::vector<FetchFailure>& failures() const {
        return failures_;
    }

private:
    void Write(bool always);

    EntryKind kind_;
    int domains_;
    int done_ = 0;
    std::string domain_;
    std::int64_t count_ = 0;
    std::int64_t started_;
    std::chrono::steady_clock::time_point written_{};
    bool complained_ = false;
    std::vector<FetchFailure> failures_;
    Json::Value earlier_;  // the errors of the users, when these are the groups
};

// The part of a refresh before the first fetch, which looks which domains there are: no domain is named yet. The second
// says why there will be no fetch; the refresh of this process is over.
void RecordRefreshBegin();
void RecordRefreshFailure(const std::string& domain, const std::string& reason);

// What a watcher is to see of a record, as it was read: without "process", with "running", and with the end of a refresh
// that was stopped or killed, and its error. `record` is an object, or null when there is none: null, too, but for a
// refresh that is about to begin.
Json::Value ShownProgress(Json::Value record);

}  // namespace appliance

#endif
