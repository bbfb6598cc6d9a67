// The record of a join's or leave's steps, which others read while it runs and afterwards.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_STEP_LOG_H
#define VORN_APPLIANCE_DOMAIN_JOIN_STEP_LOG_H

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

namespace appliance {

// Writes /run/vorn/join_steps.json anew at every change. A write that fails is logged once and stops nothing. Never
// given a secret.
class StepLog {
public:
    // `action` is "join" or "leave".
    StepLog(const std::string& action, const std::string& domain);

    // A step begins; the one before it, when it is still running, has ended well.
    void Begin(const std::string& name, const std::string& server = {});
    // The running step has ended. Without a running step these do nothing.
    void Ok(const std::string& detail = {});
    void Failed(const std::string& detail);
    void Skipped(const std::string& detail);
    // Tells which server the running step asks.
    void Server(const std::string& server);

    // What could not be put back, or could not be done though the job went on. Logged, too.
    void Leftover(const std::string& text);

    // The job has ended; `message` is the status message of a failure.
    void Finish(bool success, const std::string& message);

    // The name of the first step that failed, or empty.
    const std::string& FailedStep() const {
        return failedStep_;
    }

private:
    struct Step {
        std::string name;
        std::string server;
        std::string outcome;
        std::string detail;
        std::int64_t milliseconds;
    };

    void End(const std::string& outcome, const std::string& detail);
    void Write();

    std::string id_;
    std::string action_;
    std::string domain_;
    std::int64_t started_;
    std::int64_t finished_ = 0;
    bool done_ = false;
    bool success_ = false;
    bool complained_ = false;
    std::string message_;
    std::string failedStep_;
    std::vector<Step> steps_;
    std::vector<std::string> leftovers_;
    std::chrono::steady_clock::time_point stepBegan_;
};

// Ends the record of a job whose process was killed: the step that was running has failed, `completed` tells whether the
// job was done to its end since then, and `notes` what was done about it. Nothing when the record has its end. Only for
// the holder of the join lock, which the job would have.
void EndInterruptedSteps(bool completed, const std::vector<std::string>& notes);

}  // namespace appliance

#endif
