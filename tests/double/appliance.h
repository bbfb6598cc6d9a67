// An imitation of the appliance for tests. It defines every operation that the platform's headers declare, answers from
// a state that a test sets, records the calls, and lets chosen ones fail.

#ifndef VORN_TESTS_DOUBLE_APPLIANCE_H
#define VORN_TESTS_DOUBLE_APPLIANCE_H

#include <json/value.h>

#include "platform/webapi.h"
#include "tests/double/failures.h"
#include "tests/double/fault.h"
#include "tests/double/handles.h"
#include "tests/double/recorder.h"
#include "tests/double/state.h"

namespace fake {

class Appliance : public Recorder, public Handles {
public:
    Appliance();
    ~Appliance();
    Appliance(const Appliance&) = delete;
    Appliance& operator=(const Appliance&) = delete;

    // A fresh appliance: default state, nothing recorded, no faults. What is still live is forgotten, not freed, so
    // that a leak checker sees it.
    void Reset();

    State state;
};

// The calling thread's appliance.
Appliance& TheAppliance();

// Whether the calling thread has one already; asking makes none.
bool HasAppliance();

// The request and the response of one call of an entry function. The response records into TheAppliance().Answers().
struct Exchange {
    explicit Exchange(const Json::Value& parameters = Json::Value(Json::objectValue));

    VORN::APIRequest request;
    VORN::APIResponse response;
};

}  // namespace fake

#endif
