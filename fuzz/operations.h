// What is fuzzed: the entry functions of the API table and the bodies of the background tasks.

#ifndef VORN_FUZZ_OPERATIONS_H
#define VORN_FUZZ_OPERATIONS_H

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "platform/webapi.h"

namespace fuzz {

struct Operation {
    std::string name;  // that of the function; also of its corpus folder
    VORN::APIFunction function;
    std::size_t leastAnswers;  // that a run without an exception gives
    std::size_t mostAnswers;
    bool isTask;  // a task body, which removes the marker file
};

const std::vector<Operation>& Operations();

// The operation of a name; an unknown one ends the program.
const Operation& FindOperation(const std::string& name);

// Runs an input and holds what happened against the rules of check.h. Throws RuleBroken.
void Run(const Operation& operation, const std::uint8_t* data, std::size_t size);

}  // namespace fuzz

#endif
