// Joining a domain.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_JOIN_JOB_H
#define VORN_APPLIANCE_DOMAIN_JOIN_JOIN_JOB_H

#include "appliance/domain/join/account_check.h"
#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/join_target.h"
#include "appliance/domain/join/journal.h"
#include "appliance/domain/join/membership_job.h"
#include "appliance/domain/join/step_log.h"
#include "appliance/domain/join/time_budget.h"

namespace appliance {

// Used by one thread, under the join lock. Everything that can fail without a trace comes first; the join itself then
// runs beside the old membership, in a folder of its own; only what has proved to work takes the old one's place.
class JoinJob {
public:
    JoinJob(const JoinRequest& request, const JobHooks& hooks, StepLog& steps, const TimeBudget& budget);

    // Throws JoinError or std::exception when the join failed; everything has been put back by then.
    void Run();

private:
    void CheckAccount(const std::string& probe);
    void LookForComputerAccount(const std::string& probe);
    void Prepare();
    void JoinBesideOldOne();
    void ConfirmStaged();
    void Activate();
    void ConfirmTrustOfNewOne();
    void FinishUp();

    void Undo();
    void UndoStaged();
    void UndoActivated();
    void StartOldWinbind();
    void RemoveCreatedAccount();

    void Advance(Journal::Phase phase);
    [[noreturn]] void Fail(const std::string& message, const std::string& detail = {});

    const JoinRequest& request_;
    const JobHooks& hooks_;
    StepLog& steps_;
    const TimeBudget& budget_;
    JoinTarget target_;
    Journal journal_;
    std::string kerberosConfiguration_;
    bool journalled_ = false;
    std::string undone_;  // what putting back came to, for the list of steps
};

}  // namespace appliance

#endif
