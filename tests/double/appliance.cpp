#include "tests/double/appliance.h"

namespace fake {
namespace {

// Kept apart from the appliance: free() asks for it while a thread ends, when the appliance is gone.
thread_local bool exists = false;

}  // namespace

Appliance::Appliance() {
    exists = true;
}

Appliance::~Appliance() {
    exists = false;
}

void Appliance::Reset() {
    state = State();
    ResetRecorder();
    ResetHandles();
}

Appliance& TheAppliance() {
    static thread_local Appliance appliance;
    return appliance;
}

bool HasAppliance() {
    return exists;
}

}  // namespace fake
