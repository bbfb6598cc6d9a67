#include "tests/faults/operations.h"

namespace sweep {

const std::vector<Operation>& Operations() {
    static const std::vector<Operation> operations = {
        DomainGetOperation(),
        DomainSetOperation(),
        DomainTestDCOperation(),
        DomainGetDomainListOperation(),
        DomainGetDomainListV2Operation(),
        DomainUpdateStartOperation(),
        DomainUpdateStatusOperation(),
        DomainUpdateStopOperation(),
        DomainSetOptionOperation(),
        DomainGetOptionOperation(),
        DomainScheduleGetOperation(),
        DomainScheduleSetOperation(),
        DomainUpdateStartForkOperation(),
        DomainMonitorUpdatingOperation(),
    };
    return operations;
}

const Operation* FindOperation(const std::string& name) {
    for (const Operation& operation : Operations()) {
        if (operation.name == name) {
            return &operation;
        }
    }
    return nullptr;
}

Operation MakeOperation(const std::string& name, VORN::APIFunction body) {
    Operation operation;
    operation.name = name;
    operation.body = body;
    operation.functions = FunctionsOf(name);
    return operation;
}

}  // namespace sweep
