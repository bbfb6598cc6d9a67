// What must hold after every run of every operation.

#ifndef VORN_TESTS_FAULTS_ORACLES_H
#define VORN_TESTS_FAULTS_ORACLES_H

#include "tests/faults/run.h"

namespace sweep {

// The password of every request that has one. It may show in the settings record, in the copies that the record points
// at, and where the request is read; nowhere else.
constexpr const char* kPassword = "Canary-7f3a";

// One answer and no more; none when an exception passed.
void CheckAnswerCount(const Run& run, Findings& findings);

// The answers that the rules of the failed calls foretell.
void CheckAnswers(const Run& run, Findings& findings);

// Every handle freed, nothing used against its declaration.
void CheckHandles(const Run& run, Findings& findings);

void CheckPassword(const Run& run, Findings& findings);

// Error priority, and one of the two units.
void CheckLogs(const Run& run, Findings& findings);

// All of the above, and those that the operation has of its own.
void CheckRun(const Run& run, Findings& findings);

// A second run, on a fresh appliance and without faults, must end as the one that is passed in did. Ends `run`'s view.
struct Ending {
    explicit Ending(const Run& run);

    bool thrown;
    std::vector<fake::Answer> answers;
    std::vector<std::string> calls;
};
void CheckFreshRun(const Operation& operation, const Scenario& scenario, const Ending& expected, Findings& findings);

// Asks the leak checker, where the program has one.
void CheckLeaks(Findings& findings);

}  // namespace sweep

#endif
