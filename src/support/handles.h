// Owners of the platform's handles: each frees its handle on every way out, an exception included.

#ifndef VORN_SRC_SUPPORT_HANDLES_H
#define VORN_SRC_SUPPORT_HANDLES_H

#include <cstdlib>
#include <cstring>
#include <memory>

#include "platform/core.h"
#include "platform/scheduler.h"

// Owns a handle that the platform may replace while it works on it, so the address of the pointer is handed out.
template <typename Handle, void (*Free)(Handle*)>
class PlatformHandle {
public:
    // Takes over `handle`, which may be null.
    explicit PlatformHandle(Handle* handle) : handle_(handle) {}
    ~PlatformHandle() {
        if (handle_ != nullptr) {
            Free(handle_);
        }
    }
    PlatformHandle(const PlatformHandle&) = delete;
    PlatformHandle& operator=(const PlatformHandle&) = delete;

    explicit operator bool() const {
        return handle_ != nullptr;
    }
    Handle* get() const {
        return handle_;
    }
    Handle* operator->() const {
        return handle_;
    }
    // For an operation that may replace the handle; the owner then owns the new one.
    Handle** address() {
        return &handle_;
    }

private:
    Handle* handle_;
};

constexpr int kInitialCapacity = 1024;  // of every list and hash

// A string list of the platform; false when it could not be allocated.
class StringList : public PlatformHandle<VLIBSZLIST, VLIBCSzListFree> {
public:
    StringList() : PlatformHandle(VLIBCSzListAlloc(kInitialCapacity)) {}
};

// A string hash of the platform; false when it could not be allocated.
class StringHash : public PlatformHandle<VLIBSZHASH, VLIBCSzHashFree> {
public:
    StringHash() : PlatformHandle(VLIBCSzHashAlloc(kInitialCapacity)) {}
};

// A record for a scheduled task; false when it could not be allocated.
class ScheduledTask : public PlatformHandle<_tag_vorn_sched_task_, VORNSchedTaskFree> {
public:
    ScheduledTask() : PlatformHandle(VORNSchedTaskAlloc()) {}
};

// A list of scheduled tasks, empty at first.
class ScheduledTaskList {
public:
    ScheduledTaskList() = default;
    ~ScheduledTaskList() {
        if (first_ != nullptr) {
            VORNSchedTaskListFree(&first_);
        }
    }
    ScheduledTaskList(const ScheduledTaskList&) = delete;
    ScheduledTaskList& operator=(const ScheduledTaskList&) = delete;

    _tag_vorn_sched_task_** address() {
        return &first_;
    }
    const _tag_vorn_sched_task_* first() const {
        return first_;
    }

private:
    _tag_vorn_sched_task_* first_ = nullptr;
};

// A heap copy of a text; null when it could not be made.
struct FreeText {
    void operator()(char* text) const {
        std::free(text);
    }
};
using HeapText = std::unique_ptr<char, FreeText>;

inline HeapText CopyText(const char* text) {
    return HeapText(strdup(text));
}

#endif
