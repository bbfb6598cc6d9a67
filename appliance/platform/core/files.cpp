// Plain files, temporary names, pid files.

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <optional>
#include <string>

#include "appliance/base/file.h"
#include "appliance/base/process.h"
#include "appliance/base/settings.h"
#include "appliance/base/text.h"
#include "appliance/platform/contract.h"
#include "appliance/platform/last_error.h"

using appliance::FileDescriptor;
using appliance::Log;
using appliance::SettingsLock;

namespace {

constexpr mode_t kNewMode = 0644;
constexpr int kTouchAttempts = 3;

std::error_code Errno() {
    return {errno, std::generic_category()};
}

// Opens the regular file of the appliance's own at `path`, made when it is missing. `code` says why it can't be.
FileDescriptor OpenOwn(const std::string& path, appliance::ErrorCode& code) {
    constexpr int kFlags = O_WRONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY;
    for (int attempt = 0;; ++attempt) {
        FileDescriptor file(open(path.c_str(), kFlags | O_CREAT | O_EXCL, kNewMode));
        // Without O_CREAT, which the kernel may refuse for another user's file before it can be looked at.
        if (!file && errno == EEXIST) {
            file.Reset(open(path.c_str(), kFlags));
        }
        struct stat found = {};
        const bool opened = file && fstat(file.get(), &found) == 0;
        if (opened && S_ISREG(found.st_mode) && found.st_uid == geteuid()) {
            return file;
        }
        const std::string reason =
            opened ? "there is something else than a file of the appliance's own" : Errno().message();
        if (attempt == kTouchAttempts || !appliance::ClearForeign(path)) {
            Log(LOG_ERR, path + ": " + reason);
            code = opened ? appliance::ErrorCode::BadData : appliance::ErrorCode::FileWrite;
            return {};
        }
    }
}

// Gives the new file the attributes of the one that it replaces, writes it to the disk, and puts it in its place.
std::error_code RenameOver(const std::string& from, const std::string& to) {
    const FileDescriptor file(open(from.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY));
    struct stat found = {};
    if (!file || fstat(file.get(), &found) != 0) {
        return Errno();
    }
    if (!S_ISREG(found.st_mode)) {
        return std::make_error_code(std::errc::invalid_argument);
    }
    const std::error_code error = appliance::CopyAttributes(to, file.get());
    if (error && error != std::errc::no_such_file_or_directory) {
        return error;
    }
    if (fsync(file.get()) != 0) {
        return Errno();
    }
    return appliance::RenameFile(from, to);
}

// The target may be a symbolic link to another file system, where no rename leads.
std::error_code MoveContent(const std::string& from, const std::string& to) {
    std::string content;
    std::error_code error = appliance::ReadFile(from, content);
    if (!error) {
        error = appliance::ReplaceFile(to, content, kNewMode);
    }
    return error ? error : appliance::RemoveFile(from);
}

}  // namespace

extern "C" {

int VLIBCFileITmpName(const char* path, char* name, int size) {
    VORN_GUARD(-1, {
        if (path == nullptr || name == nullptr || size <= 0) {
            return VORN_FAIL(BadArgument);
        }
        // The file is made here and now, closed to others: so the name is nobody else's.
        std::string made;
        if (!appliance::MakeTemporary(path, made)) {
            Log(LOG_ERR, "no temporary file beside " + std::string(path) + ": " + Errno().message());
            return VORN_FAIL(FileWrite);
        }
        if (made.size() >= static_cast<std::size_t>(size)) {
            unlink(made.c_str());
            return VORN_FAIL(BadArgument);
        }
        appliance::CopyToBuffer(made, name, size);
        return 0;
    })
}

int VLIBCFileExist(const char* path) {
    struct stat found = {};
    return path != nullptr && stat(path, &found) == 0 ? 1 : 0;
}

int VLIBCFileTouch(const char* path) {
    VORN_GUARD(-1, {
        if (path == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        appliance::ErrorCode code = appliance::ErrorCode::Internal;
        const FileDescriptor file = OpenOwn(path, code);
        if (!file) {
            return code == appliance::ErrorCode::BadData ? VORN_FAIL(BadData) : VORN_FAIL(FileWrite);
        }
        return futimens(file.get(), nullptr) == 0 ? 0 : VORN_FAIL(FileWrite);
    })
}

int VLIBCSysRename(const char* from, const char* to) {
    VORN_GUARD(-1, {
        if (from == nullptr || to == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        std::optional<SettingsLock> lock;
        if (SettingsLock::Guards(to) && !(lock = SettingsLock::Take())) {
            return VORN_FAIL(FileLock);
        }
        std::string target;
        std::error_code error = appliance::FollowLinks(to, target);
        if (!error) {
            error = RenameOver(from, target);
        }
        if (error == std::errc::cross_device_link && target != to) {
            error = MoveContent(from, target);
        }
        if (error == std::errc::no_such_file_or_directory) {
            return VORN_FAIL(NotFound);
        }
        if (error) {
            Log(LOG_ERR, std::string(to) + " is not replaced: " + error.message());
            return VORN_FAIL(FileWrite);
        }
        return 0;
    })
}

int VLIBCSysRemove(const char* path) {
    if (path == nullptr) {
        return VORN_FAIL(BadArgument);
    }
    if (unlink(path) == 0) {
        return 0;
    }
    return errno == ENOENT ? VORN_FAIL(NotFound) : VORN_FAIL(FileWrite);
}

int VLIBCReadPidFile(const char* path) {
    VORN_GUARD(-1, {
        if (path == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        const int pid = appliance::ReadPidFile(path);
        return pid > 0 ? pid : VORN_FAIL(NotFound);
    })
}

}  // extern "C"
