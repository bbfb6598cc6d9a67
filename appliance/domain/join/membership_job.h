// The join tool's two jobs, each from the lock to its end.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_MEMBERSHIP_JOB_H
#define VORN_APPLIANCE_DOMAIN_JOIN_MEMBERSHIP_JOB_H

#include <chrono>
#include <functional>
#include <string>

#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/join_status.h"

namespace appliance {

// How a job ended. On failure `status` says why, and everything is as before but for what the list of steps names.
struct JobResult {
    bool success = false;
    JoinStatus status;
};

// What the jobs get from other parts of the appliance.
struct JobHooks {
    // Refreshes what is known of the domains in sight; called after a join. May be empty.
    std::function<void()> refreshDomains;
};

// The whole time of a job, in milliseconds: the way forward, and after it the way back. What waits for a job allows
// more than their sum.
inline constexpr std::chrono::milliseconds kForwardTime{20000};
inline constexpr std::chrono::milliseconds kBackTime{7000};

// Joins or leaves as the request says, one at a time on this machine. Steps are recorded live; a failure also goes to
// the status file. Never throws.
JobResult RunJob(const JoinRequest& request, const JobHooks& hooks);

}  // namespace appliance

#endif
