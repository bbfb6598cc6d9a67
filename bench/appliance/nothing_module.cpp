// A module whose one method does nothing: what a call costs beside the method's own work. The benchmark puts it into the
// appliance that it measures; it is part of no other.

#include "platform/webapi.h"

namespace {

void Nothing(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(Json::Value());
}

}  // namespace

extern __attribute__((visibility("default"))) const VORN::APIEntry gTable[];
const VORN::APIEntry gTable[] = {
    {"VORN.Bench", 1, "nothing", Nothing},
    {nullptr, 0, nullptr, nullptr},
};

__attribute__((visibility("default"))) const VORN::APIEntry* GetAPITable();
const VORN::APIEntry* GetAPITable() {
    return gTable;
}
