// Modules whose API tables make no sense, one for each value of ODD.

#include "platform/webapi.h"

#define ODD_NO_TABLE 0
#define ODD_ENDLESS 1
#define ODD_NO_FUNCTION 2
#define ODD_TWICE 3
#define ODD_EMPTY 4
#define ODD_NAME 5
#define ODD_FOREIGN 6

namespace {

[[maybe_unused]] void Nothing(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(Json::Value());
}

#if ODD == ODD_ENDLESS
const VORN::APIEntry row = {"Test.Odd", 1, "nothing", Nothing};
// More rows than any module has, and none of zeros among them.
struct Table {
    VORN::APIEntry rows[1100];
    Table() {
        int version = 0;
        for (VORN::APIEntry& entry : rows) {
            entry = row;
            entry.version = ++version;
        }
    }
};
const Table endless;
const VORN::APIEntry* const table = endless.rows;
#elif ODD == ODD_NO_FUNCTION
const VORN::APIEntry table[] = {{"Test.Odd", 1, "nothing", nullptr}, {nullptr, 0, nullptr, nullptr}};
#elif ODD == ODD_TWICE
const VORN::APIEntry table[] = {
    {"Test.Odd", 1, "nothing", Nothing}, {"Test.Odd", 1, "nothing", Nothing}, {nullptr, 0, nullptr, nullptr}};
#elif ODD == ODD_EMPTY
const VORN::APIEntry table[] = {{nullptr, 0, nullptr, nullptr}};
#elif ODD == ODD_NAME
const VORN::APIEntry table[] = {{"Test/Odd", 1, "nothing", Nothing}, {nullptr, 0, nullptr, nullptr}};
#elif ODD == ODD_FOREIGN
// A function that is not the module's own.
const VORN::APIEntry table[] = {{"Test.Odd", 1, "nothing", reinterpret_cast<VORN::APIFunction>(16)},
                                {nullptr, 0, nullptr, nullptr}};
#endif

}  // namespace

#if ODD != ODD_NO_TABLE
__attribute__((visibility("default"))) const VORN::APIEntry* GetAPITable();
const VORN::APIEntry* GetAPITable() {
    return table;
}
#else
extern "C" __attribute__((visibility("default"))) int GetSomethingElse();
int GetSomethingElse() {
    return 1;
}
#endif
