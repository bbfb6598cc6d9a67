// Locks between processes and threads.

#ifndef VORN_APPLIANCE_BASE_FILE_LOCK_H
#define VORN_APPLIANCE_BASE_FILE_LOCK_H

#include <chrono>
#include <optional>
#include <string>
#include <utility>

#include "appliance/base/file.h"

namespace appliance {

// An exclusive lock on a file (open file description lock): it shuts out other processes and other threads alike, and
// ends with its owner, however that dies. The file is made when it is missing and is never removed. A child that is
// exec'ed does not inherit it.
class FileLock {
public:
    // Waits up to `wait` for the lock; nothing when it could not be had (errno tells: EAGAIN, or what open says).
    static std::optional<FileLock> Take(const std::string& path, std::chrono::milliseconds wait);

    // Does somebody hold the lock at this moment? Takes nothing, so that nobody who wants the lock is in its way. A missing
    // file, or one that can't be opened, is held by nobody. The caller's own lock counts as well.
    static bool IsHeld(const std::string& path);

    ~FileLock();
    FileLock(FileLock&&) noexcept = default;
    FileLock& operator=(FileLock&& other) noexcept {
        std::swap(descriptor_, other.descriptor_);
        return *this;
    }
    FileLock(const FileLock&) = delete;
    FileLock& operator=(const FileLock&) = delete;

private:
    explicit FileLock(FileDescriptor descriptor) : descriptor_(std::move(descriptor)) {}

    FileDescriptor descriptor_;
};

}  // namespace appliance

#endif
