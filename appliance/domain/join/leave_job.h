// Leaving a domain.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_LEAVE_JOB_H
#define VORN_APPLIANCE_DOMAIN_JOIN_LEAVE_JOB_H

#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/step_log.h"
#include "appliance/domain/join/time_budget.h"
#include "appliance/domain/membership/discovery.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

// Used by one thread, under the join lock. Goes back to the workgroup also when the domain is gone; only removing the
// computer account, when that is asked for, needs a controller and can fail, and does so before anything is changed.
class LeaveJob {
public:
    LeaveJob(const JoinRequest& request, StepLog& steps, const TimeBudget& budget);

    // Throws JoinError or std::exception when nothing has been left.
    void Run();

private:
    Controller FindController();
    void CheckCredentials(const Controller& controller);
    void DeleteAccount();
    void RegisterAgain();
    void Unregister();
    void Clear();
    [[noreturn]] void Fail(const std::string& message, const std::string& detail = {});

    const JoinRequest& request_;
    StepLog& steps_;
    const TimeBudget& budget_;
    Membership membership_;
    bool deleted_ = false;      // by this job
    bool accountGone_ = false;  // the controller does not know it any more
};

}  // namespace appliance

#endif
