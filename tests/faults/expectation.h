// What a run must answer, from the rules of its failed calls.

#ifndef VORN_TESTS_FAULTS_EXPECTATION_H
#define VORN_TESTS_FAULTS_EXPECTATION_H

#include <string>
#include <vector>

#include "tests/faults/run.h"

namespace sweep {

struct Expectation {
    bool thrown = false;
    std::vector<fake::Answer> answers;
    std::string missingRule;  // a failed call for which there is none; empty when all is well
};

Expectation Expect(const Run& run);

std::string AnswersText(bool thrown, const std::vector<fake::Answer>& answers);

}  // namespace sweep

#endif
