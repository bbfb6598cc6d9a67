// The cheap platform: lists, hashes, files, services, the last error, addresses. Lists and hashes come from a fixed
// store, so that the allocations that a benchmark counts are none of the platform's.

#include <array>

#include "bench/cheap_platform.h"
#include "platform/core.h"

using cheap::Fill;
using cheap::TheState;

struct VLIBSZHASH {
    bool loaded;
};

namespace {

// The module's operations hold at most two at once.
constexpr std::size_t kStoreSize = 8;

template <typename Handle>
class Store {
public:
    Store() {
        for (std::size_t i = 0; i < kStoreSize; ++i) {
            free_[i] = &handles_[i];
        }
    }
    Handle* Take() {
        Handle* handle = free_[--count_];
        *handle = Handle();
        return handle;
    }
    void Give(Handle* handle) {
        free_[count_++] = handle;
    }

private:
    std::array<Handle, kStoreSize> handles_{};
    std::array<Handle*, kStoreSize> free_{};
    std::size_t count_ = kStoreSize;
};

// A list that shares its entries with the state. What is pushed is counted only.
struct CheapList {
    VLIBSZLIST head;
    const char* const* entries;
};

Store<CheapList> lists;
Store<VLIBSZHASH> hashes;

}  // namespace

namespace cheap {

void ShareEntries(VLIBSZLIST* list, const std::vector<const char*>& entries) {
    list->count = static_cast<int>(entries.size());
    reinterpret_cast<CheapList*>(list)->entries = entries.data();
}

}  // namespace cheap

extern "C" {

VLIBSZLIST* VLIBCSzListAlloc(int /*capacity*/) {
    NOTE_CALL("VLIBCSzListAlloc");
    return &lists.Take()->head;
}

int VLIBCSzListPush(VLIBSZLIST** list, const char* /*text*/) {
    NOTE_CALL("VLIBCSzListPush");
    return ++(*list)->count;
}

const char* VLIBCSzListGet(const VLIBSZLIST* list, int index) {
    NOTE_CALL("VLIBCSzListGet");
    return reinterpret_cast<const CheapList*>(list)->entries[index];
}

void VLIBCSzListFree(VLIBSZLIST* list) {
    NOTE_CALL("VLIBCSzListFree");
    lists.Give(reinterpret_cast<CheapList*>(list));
}

VLIBSZHASH* VLIBCSzHashAlloc(int /*capacity*/) {
    NOTE_CALL("VLIBCSzHashAlloc");
    return hashes.Take();
}

const char* VLIBCSzHashGetValue(const VLIBSZHASH* hash, const char* key) {
    NOTE_CALL("VLIBCSzHashGetValue");
    if (!hash->loaded) {
        return nullptr;
    }
    const auto& section = TheState().section;
    const auto found = section.find(key);
    return found == section.end() ? nullptr : found->second;
}

int VLIBCSzHashSetValue(VLIBSZHASH** /*hash*/, const char* /*key*/, const char* /*value*/) {
    NOTE_CALL("VLIBCSzHashSetValue");
    return 0;
}

int VLIBCSzHashRemoveKey(VLIBSZHASH* /*hash*/, const char* /*key*/) {
    NOTE_CALL("VLIBCSzHashRemoveKey");
    return 0;
}

void VLIBCSzHashFree(VLIBSZHASH* hash) {
    NOTE_CALL("VLIBCSzHashFree");
    hashes.Give(hash);
}

int VLIBCFileGetKeyValue(const char* /*path*/, const char* key, char* value, int /*size*/, int /*flags*/) {
    NOTE_CALL("VLIBCFileGetKeyValue");
    // "security" is the only key read whose value must be one of a few.
    Fill(value, key[0] == 's' ? "ads" : "lab.test");
    return 3;
}

int VLIBCFileGetSection(const char* /*path*/, const char* /*section*/, VLIBSZHASH** hash) {
    NOTE_CALL("VLIBCFileGetSection");
    (*hash)->loaded = true;
    return 0;
}

int VLIBCFileAddSection(const char* /*path*/, const char* /*section*/, VLIBSZHASH* /*hash*/, const char* /*format*/) {
    NOTE_CALL("VLIBCFileAddSection");
    return 1;
}

int VLIBCFileRemoveKey(const char* /*path*/, const char* /*key*/) {
    NOTE_CALL("VLIBCFileRemoveKey");
    return 0;
}

int VLIBCFileITmpName(const char* /*path*/, char* name, int /*size*/) {
    NOTE_CALL("VLIBCFileITmpName");
    Fill(name, "/tmp/name");
    return 0;
}

int VLIBCFileExist(const char* /*path*/) {
    NOTE_CALL("VLIBCFileExist");
    return 0;
}

int VLIBCFileTouch(const char* /*path*/) {
    NOTE_CALL("VLIBCFileTouch");
    return 0;
}

int VLIBCFileLock(int /*word*/, int /*seconds*/) {
    NOTE_CALL("VLIBCFileLock");
    return 0;
}

int VLIBCFileUnlock(int /*word*/) {
    NOTE_CALL("VLIBCFileUnlock");
    return 0;
}

int VLIBCSysRename(const char* /*from*/, const char* /*to*/) {
    NOTE_CALL("VLIBCSysRename");
    return 0;
}

int VLIBCSysRemove(const char* /*path*/) {
    NOTE_CALL("VLIBCSysRemove");
    return 0;
}

int VLIBCReadPidFile(const char* /*path*/) {
    NOTE_CALL("VLIBCReadPidFile");
    return -1;
}

int VLIBServiceReload(const char* /*service*/) {
    NOTE_CALL("VLIBServiceReload");
    return 0;
}

int VLIBServiceRestart(const char* /*service*/) {
    NOTE_CALL("VLIBServiceRestart");
    return 0;
}

int VLIBServiceTypeReload(int /*type*/) {
    NOTE_CALL("VLIBServiceTypeReload");
    return 0;
}

int VLIBServiceIsEnabled(const char* /*service*/) {
    NOTE_CALL("VLIBServiceIsEnabled");
    return 1;
}

int VLIBCSupportGet(const char* /*capability*/) {
    NOTE_CALL("VLIBCSupportGet");
    return 1;
}

int VLIBCErrGet() {
    NOTE_CALL("VLIBCErrGet");
    return 0;
}

const char* VLIBCErrorGetFile() {
    NOTE_CALL("VLIBCErrorGetFile");
    return "platform.c";
}

int VLIBCErrorGetLine() {
    NOTE_CALL("VLIBCErrorGetLine");
    return 0;
}

void VLIBCErrSetEx(int /*code*/, const char* /*file*/, int /*line*/) {
    NOTE_CALL("VLIBCErrSetEx");
}

int BlVLIBIsIpAddr(const char* /*text*/) {
    NOTE_CALL("BlVLIBIsIpAddr");
    return 0;
}

int BlVLIBIsv6IpAddrValid(const char* /*text*/) {
    NOTE_CALL("BlVLIBIsv6IpAddrValid");
    return 0;
}

}  // extern "C"
