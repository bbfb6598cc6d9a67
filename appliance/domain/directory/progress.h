// How far a fetch is, for those who watch it: /run/vorn/refresh.json.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_PROGRESS_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_PROGRESS_H

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
// "started": s, "updated": s, "errors": [{"domain", "kind", "reason"}]}, times in seconds since 1970. The file is
// replaced at most every 200 milliseconds. One that can't be written is no failure of the fetch.
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
};

}  // namespace appliance

#endif
