// What must hold after every run, whatever the request was and whatever the appliance answered.

#ifndef VORN_FUZZ_CHECK_H
#define VORN_FUZZ_CHECK_H

#include <stdexcept>
#include <string>

#include "fuzz/operations.h"
#include "tests/double/appliance.h"

namespace fuzz {

constexpr const char* kPassword = "Canary-7f3a";

// What a run may have to put back.
struct Before {
    int trustSetting;
};

Before Remember(const fake::Appliance& appliance);

// Thrown by CheckRun: the rule, then what was called and logged.
class RuleBroken : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

// Throws when a rule is broken:
// - as many answers as the operation gives, with codes that clients know;
// - no handle left, nothing used against its declaration;
// - log lines of the module's units, at error priority;
// - the password nowhere but in the request and the join's record;
// - commands that hold nothing a shell would take for more than a name;
// - a join that failed put back what it had changed; its status file is gone;
// - a task removed the marker file.
void CheckRun(const Operation& operation, const Before& before, bool completed, const fake::Appliance& appliance);

}  // namespace fuzz

#endif
