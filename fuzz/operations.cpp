#include "fuzz/operations.h"

#include <json/value.h>

#include <cstdio>
#include <cstdlib>

#include "fuzz/answers.h"
#include "fuzz/check.h"
#include "fuzz/request.h"
#include "src/api_table.h"

namespace fuzz {

namespace {

void Worker(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainUpdateStartFork(request, response, nullptr);
}

void Monitor(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainMonitorUpdating(request, response, nullptr);
}

// The password is the one text that must show up nowhere, so it is one that nothing else can hold.
void SetPassword(Json::Value& request) {
    if (request.isMember("password") && request["password"].isString()) {
        request["password"] = kPassword;
    }
}

// True when the operation ended without an exception.
bool Call(const Operation& operation, fake::Exchange& exchange) {
    try {
        operation.function(&exchange.request, &exchange.response);
        return true;
    } catch (const Json::Exception&) {
        return false;
    } catch (const fake::InjectedException&) {
        return false;
    }
}

}  // namespace

const std::vector<Operation>& Operations() {
    static const std::vector<Operation> operations = {
        {"DomainGet", DomainGet, 1, 1, false},
        {"DomainSet", DomainSet, 1, 1, false},
        {"DomainTestDC", DomainTestDC, 1, 1, false},
        {"DomainGetDomainList", DomainGetDomainList, 1, 1, false},
        {"DomainGetDomainList_V2", DomainGetDomainList_V2, 1, 1, false},
        // A task list that can't be read is answered, and the start goes on and is answered as well.
        {"DomainUpdateStart", DomainUpdateStart, 1, 2, false},
        {"DomainUpdateStatus", DomainUpdateStatus, 1, 1, false},
        {"DomainUpdateStop", DomainUpdateStop, 1, 1, false},
        {"DomainSetOption", DomainSetOption, 1, 1, false},
        {"DomainGetOption", DomainGetOption, 1, 1, false},
        {"DomainScheduleGet", DomainScheduleGet, 1, 1, false},
        {"DomainScheduleSet", DomainScheduleSet, 1, 1, false},
        {"DomainUpdateStartFork", Worker, 2, 2, true},
        {"DomainMonitorUpdating", Monitor, 2, 2, true},
    };
    return operations;
}

const Operation& FindOperation(const std::string& name) {
    for (const Operation& operation : Operations()) {
        if (operation.name == name) {
            return operation;
        }
    }
    std::fprintf(stderr, "no operation %s\n", name.c_str());
    std::abort();
}

void Run(const Operation& operation, const std::uint8_t* data, std::size_t size) {
    fake::Appliance& appliance = fake::TheAppliance();
    appliance.Reset();
    Input input(data, size);
    Json::Value request = DecodeRequest(input);
    SetPassword(request);
    // What the monitor waits for ends some time.
    appliance.FailNth("VLIBCReadPidFile", 1 + input.BackByte() % 8, fake::Fault::Result(-1), true);
    DecodeAnswers(input, appliance);
    const Before before = Remember(appliance);
    fake::Exchange exchange(request);
    const bool completed = Call(operation, exchange);
    CheckRun(operation, before, completed, appliance);
}

}  // namespace fuzz
