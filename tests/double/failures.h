// The results by which the operations fail, and those that a caller could take for a failure or overlook as one.

#ifndef VORN_TESTS_DOUBLE_FAILURES_H
#define VORN_TESTS_DOUBLE_FAILURES_H

#include <string>
#include <vector>

#include "tests/double/fault.h"

namespace fake {

struct FailureValue {
    Fault fault;
    bool declared;  // a failure by the declaration; otherwise a neighbour: the call does its work and answers this
};

struct FunctionFailures {
    std::string function;
    std::string origin;  // the header that declares it, or "libc"
    std::vector<FailureValue> values;
};

// Every operation that declares its failures, and the wrapped libc calls.
const std::vector<FunctionFailures>& Failures();

// The row of a function, or null when it has none.
const FunctionFailures* FindFailures(const std::string& function);

// The first declared failure of a function, or null when it has none.
const Fault* DefaultFault(const std::string& function);

}  // namespace fake

#endif
