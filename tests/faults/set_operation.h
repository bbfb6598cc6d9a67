// "set" in pieces: its rules, its scenarios and its own oracles.

#ifndef VORN_TESTS_FAULTS_SET_OPERATION_H
#define VORN_TESTS_FAULTS_SET_OPERATION_H

#include <vector>

#include "tests/faults/model.h"

namespace sweep {

std::vector<Rule> SetRules();
std::vector<Scenario> SetScenarios();

// What is known of a join from the calls of a run.
struct JoinFacts {
    explicit JoinFacts(const Run& run);

    bool attempted = false;
    bool joined = false;
    int savedTrust = 0;
};

// What was changed ahead of a join is put back unless the join succeeded, with the values saved before.
void CheckTrustSetting(const Run& run, Findings& findings);
void CheckDnsServers(const Run& run, Findings& findings);

// The join tool's status is gone after every attempt.
void CheckJoinStatus(const Run& run, Findings& findings);

// The settings file loses "domain_dns" by leaving with the lock held, and nothing else in any other way; the
// domain-information file is as it was until the rename; no temporary file stays; the lock is given back.
void CheckFilesOfSet(const Run& run, Findings& findings);

// A join that succeeded is followed by the same steps in the same order, whatever becomes of each; one that failed by
// none of them. Leaving writes its event when it is done.
void CheckStepsAfterwards(const Run& run, Findings& findings);

}  // namespace sweep

#endif
