// A module that needs an operation which no platform has.

#include "platform/webapi.h"

extern "C" int VLIBCNobodyHasThis(void);

namespace {

void Nothing(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(VLIBCNobodyHasThis());
}

const VORN::APIEntry table[] = {{"Test.Lacking", 1, "nothing", Nothing}, {nullptr, 0, nullptr, nullptr}};

}  // namespace

__attribute__((visibility("default"))) const VORN::APIEntry* GetAPITable();
const VORN::APIEntry* GetAPITable() {
    return table;
}
