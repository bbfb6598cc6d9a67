#include "appliance/domain/join/membership_job.h"

#include <cerrno>
#include <exception>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/file_lock.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/domain/join/join_job.h"
#include "appliance/domain/join/leave_job.h"
#include "appliance/domain/join/recovery.h"
#include "appliance/domain/join/step_log.h"
#include "appliance/domain/join/time_budget.h"
#include "appliance/domain/membership/last_test.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;

constexpr milliseconds kLockWait{8000};
constexpr milliseconds kRecoveryWait{4000};

JobResult Failed(const JoinStatus& status) {
    const JoinStatus clean = CleanStatus(status);
    Log(LOG_ERR, "failed: " + clean.message);
    if (const std::error_code error = WriteJoinStatus(clean)) {
        Log(LOG_ERR, Path(kJoinStatus) + ": " + error.message());
    }
    return {false, clean};
}

void Work(const JoinRequest& request, const JobHooks& hooks, StepLog& steps, const TimeBudget& budget) {
    const Recovery recovery = RecoverUnderLock(kRecoveryWait, Wanted::Old);
    if (recovery.result != Recovery::Result::Nothing) {
        steps.Begin("recover");
        for (const std::string& note : recovery.notes) {
            steps.Leftover(note);
        }
        if (recovery.result == Recovery::Result::Running) {
            steps.Failed("the tool of an interrupted join still runs");
            throw JoinError(status::kSystem);
        }
        steps.Ok();
    }
    if (request.action == JoinRequest::Action::Join) {
        JoinJob(request, hooks, steps, budget).Run();
    } else {
        LeaveJob(request, steps, budget).Run();
    }
}

JobResult RunUnderLock(const JoinRequest& request, const JobHooks& hooks, const TimeBudget& budget) {
    const bool join = request.action == JoinRequest::Action::Join;
    StepLog steps(join ? "join" : "leave", request.domain);
    JoinStatus status;
    try {
        Work(request, hooks, steps, budget);
        ForgetLastTest();
        steps.Finish(true, "");
        return {true, {}};
    } catch (const JoinError& error) {
        steps.Failed(error.detail.empty() ? error.what() : error.detail);
        status.message = error.what();
    } catch (const std::exception& error) {
        steps.Failed(error.what());
        Log(LOG_ERR, error.what());
        status.message = status::kSystem;
    }
    status.key = join ? "join" : "leave";
    if (!steps.FailedStep().empty()) {
        status.key = steps.FailedStep();
    }
    const JobResult result = Failed(status);
    steps.Finish(false, result.status.message);
    return result;
}

}  // namespace

JobResult RunJob(const JoinRequest& request, const JobHooks& hooks) {
    const TimeBudget budget(kForwardTime);
    try {
        if (const std::error_code error = MakeFolder(Path(kRun), 0755)) {
            Log(LOG_ERR, Path(kRun) + ": " + error.message());
            return Failed({"lock", status::kSystem});
        }
        const std::optional<FileLock> lock = FileLock::Take(Path(kJoinLock), kLockWait);
        if (!lock) {
            const bool busy = errno == EAGAIN;
            Log(LOG_ERR, Path(kJoinLock) + ": " + std::generic_category().message(errno));
            return Failed({"lock", busy ? "Another join or leave is still running." : status::kSystem});
        }
        return RunUnderLock(request, hooks, budget);
    } catch (const std::exception& error) {
        Log(LOG_ERR, error.what());
        return Failed({"", status::kSystem});
    }
}

}  // namespace appliance
