// Lists of strings.

#include <algorithm>
#include <string>
#include <vector>

#include "appliance/platform/contract.h"
#include "appliance/platform/last_error.h"

namespace {

// What stands behind the handle; the contract's part of it comes first.
struct List : VLIBSZLIST {
    std::vector<std::string> entries;
};

constexpr int kMostRoom = 65536;  // beyond it, room is made as it is needed

}  // namespace

extern "C" {

VLIBSZLIST* VLIBCSzListAlloc(int capacity) {
    VORN_GUARD(nullptr, {
        if (capacity < 0) {
            return VORN_FAIL_WITH(BadArgument, nullptr);
        }
        auto list = std::make_unique<List>();
        list->count = 0;
        list->entries.reserve(static_cast<std::size_t>(std::min(capacity, kMostRoom)));
        return list.release();
    })
}

int VLIBCSzListPush(VLIBSZLIST** list, const char* text) {
    VORN_GUARD(-1, {
        if (list == nullptr || *list == nullptr || text == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        auto* own = static_cast<List*>(*list);
        own->entries.emplace_back(text);
        own->count = static_cast<int>(own->entries.size());
        return 0;
    })
}

const char* VLIBCSzListGet(const VLIBSZLIST* list, int index) {
    if (list == nullptr || index < 0) {
        return VORN_FAIL_WITH(BadArgument, nullptr);
    }
    const auto& entries = static_cast<const List*>(list)->entries;
    const auto place = static_cast<std::size_t>(index);
    return place < entries.size() ? entries[place].c_str() : VORN_FAIL_WITH(NotFound, nullptr);
}

void VLIBCSzListFree(VLIBSZLIST* list) {
    delete static_cast<List*>(list);
}

}  // extern "C"
