#include "appliance/base/file_lock.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <thread>

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kFirstPause{1};
constexpr std::chrono::milliseconds kLongestPause{20};

// 0, or the errno of the attempt. Locks of open file descriptions have no form that waits for a limited time.
int TryLock(int descriptor, short type) {
    struct flock whole = {};
    whole.l_type = type;
    whole.l_whence = SEEK_SET;
    while (fcntl(descriptor, F_OFD_SETLK, &whole) != 0) {
        if (errno != EINTR) {
            return errno == EACCES ? EAGAIN : errno;
        }
    }
    return 0;
}

}  // namespace

std::optional<FileLock> FileLock::Take(const std::string& path, std::chrono::milliseconds wait) {
    const auto end = std::chrono::steady_clock::now() + wait;
    FileDescriptor file(open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NOCTTY | O_NONBLOCK, 0600));
    if (!file) {
        return std::nullopt;
    }
    std::chrono::milliseconds pause = kFirstPause;
    for (;;) {
        const int failure = TryLock(file.get(), F_WRLCK);
        if (failure == 0) {
            return FileLock(std::move(file));
        }
        const auto now = std::chrono::steady_clock::now();
        if (failure != EAGAIN || now >= end) {
            file.Reset();
            errno = failure;
            return std::nullopt;
        }
        std::this_thread::sleep_for(std::min(pause, std::chrono::ceil<std::chrono::milliseconds>(end - now)));
        pause = std::min(2 * pause, kLongestPause);
    }
}

bool FileLock::IsHeld(const std::string& path) {
    const FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NOCTTY | O_NONBLOCK));
    struct flock whole = {};
    whole.l_type = F_WRLCK;
    whole.l_whence = SEEK_SET;
    return file && fcntl(file.get(), F_OFD_GETLK, &whole) == 0 && whole.l_type != F_UNLCK;
}

FileLock::~FileLock() {
    // Closing alone would leave the lock to a child that was forked a moment ago and has not yet come to its exec.
    if (descriptor_) {
        TryLock(descriptor_.get(), F_UNLCK);
    }
}

}  // namespace appliance
