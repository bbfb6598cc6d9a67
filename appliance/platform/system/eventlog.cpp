// The contract's event log.

#include "appliance/platform/contract.h"
//
#include "appliance/platform/last_error.h"
#include "appliance/platform/system/event_log.h"

extern "C" {

int VORNLogSet1(int kind, int level, int event, const char* arg1, const char* arg2, const char* arg3,
                const char* arg4) {
    VORN_GUARD(-1, {
        if (arg1 == nullptr || arg2 == nullptr || arg3 == nullptr || arg4 == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        appliance::AddEvent(kind, level, event, {arg1, arg2, arg3, arg4});
        return 0;
    })
}

}  // extern "C"
