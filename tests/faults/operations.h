// All operations of the module, in the order of the API table, and the bodies of its background tasks.

#ifndef VORN_TESTS_FAULTS_OPERATIONS_H
#define VORN_TESTS_FAULTS_OPERATIONS_H

#include <string>
#include <vector>

#include "tests/faults/model.h"

namespace sweep {

const std::vector<Operation>& Operations();

// Null when there is none of this name.
const Operation* FindOperation(const std::string& name);

// The platform functions that an operation may call (edges.cpp). Throws std::out_of_range for an unknown one.
const std::vector<std::string>& FunctionsOf(const std::string& operation);

// An operation with its functions, still without rules and scenarios.
Operation MakeOperation(const std::string& name, VORN::APIFunction body);

// The operations, each with its rules and scenarios.
Operation DomainGetOperation();
Operation DomainSetOperation();
Operation DomainTestDCOperation();
Operation DomainGetDomainListOperation();
Operation DomainGetDomainListV2Operation();
Operation DomainUpdateStartOperation();
Operation DomainUpdateStatusOperation();
Operation DomainUpdateStopOperation();
Operation DomainSetOptionOperation();
Operation DomainGetOptionOperation();
Operation DomainScheduleGetOperation();
Operation DomainScheduleSetOperation();
Operation DomainUpdateStartForkOperation();
Operation DomainMonitorUpdatingOperation();

}  // namespace sweep

#endif
