// A module whose background task throws what is no std::exception.

#include "platform/webapi.h"

#define TEST_EXPORT extern "C" __attribute__((visibility("default")))

TEST_EXPORT void TaskThrowNumber(VORN::APIRequest*, VORN::APIResponse* response, void*);
TEST_EXPORT void TaskThrowNumber(VORN::APIRequest*, VORN::APIResponse* response, void*) {
    response->SetSuccess(Json::Value("never the end"));
    throw 42;
}

namespace {

void Nothing(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(Json::Value());
}

const VORN::APIEntry table[] = {{"Test.Throwing", 1, "nothing", Nothing}, {nullptr, 0, nullptr, nullptr}};

}  // namespace

__attribute__((visibility("default"))) const VORN::APIEntry* GetAPITable();
const VORN::APIEntry* GetAPITable() {
    return table;
}
