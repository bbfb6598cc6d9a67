// Files of keys and values.

#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <optional>
#include <string_view>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/settings.h"
#include "appliance/base/text.h"
#include "appliance/platform/contract.h"
#include "appliance/platform/core/hash.h"
#include "appliance/platform/last_error.h"

using appliance::ConfFile;
using appliance::Log;
using appliance::SettingsLock;

namespace {

constexpr char kGlobal[] = "global";
constexpr std::string_view kOwnSuffix = ".tmp";  // of a temporary file that a caller named itself
constexpr mode_t kNewMode = 0644;

// The file that a temporary file is made to replace; empty for any other name.
std::string TargetOf(const std::string& path) {
    const std::string target = appliance::TemporaryTarget(path);
    if (!target.empty() || path.size() <= kOwnSuffix.size()) {
        return target;
    }
    const std::size_t end = path.size() - kOwnSuffix.size();
    return path.compare(end, kOwnSuffix.size(), kOwnSuffix) == 0 ? path.substr(0, end) : std::string();
}

// The lock that writers of the settings file take; true when it is held or not needed.
bool TakeLockFor(const char* path, std::optional<SettingsLock>& lock) {
    if (!SettingsLock::Guards(path)) {
        return true;
    }
    lock = SettingsLock::Take();
    return lock.has_value();
}

// A temporary file that can't be written must not be there when its caller goes on to the rename.
class UnlessWritten {
public:
    explicit UnlessWritten(const char* path) : path_(path) {}
    ~UnlessWritten() {
        if (!written_ && !TargetOf(path_).empty()) {
            unlink(path_.c_str());
        }
    }
    UnlessWritten(const UnlessWritten&) = delete;
    UnlessWritten& operator=(const UnlessWritten&) = delete;
    void Written() {
        written_ = true;
    }

private:
    std::string path_;
    bool written_ = false;
};

bool IsLink(const char* path) {
    struct stat found = {};
    return lstat(path, &found) == 0 && S_ISLNK(found.st_mode);
}

void LogError(const char* path, const std::string& what) {
    Log(LOG_ERR, std::string(path) + ": " + what);
}

}  // namespace

extern "C" {

int VLIBCFileGetKeyValue(const char* path, const char* key, char* value, int size, int flags) {
    VORN_GUARD(-1, {
        if (path == nullptr || key == nullptr || value == nullptr || size <= 0 || flags != 0) {
            return VORN_FAIL(BadArgument);
        }
        ConfFile file;
        if (const std::error_code error = ConfFile::Load(path, file, false)) {
            return error == std::errc::no_such_file_or_directory ? VORN_FAIL(NotFound) : VORN_FAIL(FileRead);
        }
        const std::optional<std::string> found = file.Get(kGlobal, key);
        if (!found || found->empty()) {
            return VORN_FAIL_WITH(NotFound, 0);
        }
        appliance::CopyToBuffer(*found, value, size);
        return static_cast<int>(std::strlen(value));
    })
}

int VLIBCFileGetSection(const char* path, const char* section, VLIBSZHASH** hash) {
    VORN_GUARD(-1, {
        if (path == nullptr || section == nullptr || hash == nullptr || *hash == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        (*hash)->lacksSection = true;
        ConfFile file;
        if (const std::error_code error = ConfFile::Load(path, file)) {
            LogError(path, error.message());
            return VORN_FAIL(FileRead);
        }
        for (const auto& [key, value] : file.Section(section)) {
            appliance::SetInHash(**hash, key, value);
        }
        (*hash)->lacksSection = false;
        return 0;
    })
}

int VLIBCFileAddSection(const char* path, const char* section, VLIBSZHASH* hash, const char* format) {
    VORN_GUARD(0, {
        if (path == nullptr) {
            return VORN_FAIL_WITH(BadArgument, 0);
        }
        UnlessWritten guard(path);
        if (section == nullptr || hash == nullptr || format == nullptr) {
            return VORN_FAIL_WITH(BadArgument, 0);
        }
        if (hash->lacksSection) {
            LogError(path, "not written, since what the section held could not be read");
            return VORN_FAIL_WITH(FileRead, 0);
        }
        const std::string target = TargetOf(path);
        if (!target.empty() && IsLink(path) && unlink(path) != 0) {
            return VORN_FAIL_WITH(FileWrite, 0);
        }
        std::optional<SettingsLock> lock;
        if (!TakeLockFor(path, lock)) {
            return VORN_FAIL_WITH(FileLock, 0);
        }
        ConfFile file;
        if (const std::error_code error = ConfFile::Load(path, file)) {
            LogError(path, error.message());
            return VORN_FAIL_WITH(FileRead, 0);
        }
        if (!file.SetSection(section, hash->All(), format)) {
            LogError(path, "not written, since a key, a value or the format has bytes that a line can't hold");
            return VORN_FAIL_WITH(BadData, 0);
        }
        const std::string& model = target.empty() ? path : target;
        if (const std::error_code error = appliance::ReplaceFileLike(path, file.text(), model, kNewMode)) {
            LogError(path, error.message());
            return VORN_FAIL_WITH(FileWrite, 0);
        }
        guard.Written();
        return 1;
    })
}

int VLIBCFileRemoveKey(const char* path, const char* key) {
    VORN_GUARD(-1, {
        if (path == nullptr || key == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        std::optional<SettingsLock> lock;
        if (!TakeLockFor(path, lock)) {
            return VORN_FAIL(FileLock);
        }
        ConfFile file;
        if (const std::error_code error = ConfFile::Load(path, file, false)) {
            return error == std::errc::no_such_file_or_directory ? VORN_FAIL(NotFound) : VORN_FAIL(FileRead);
        }
        if (!file.Remove(kGlobal, key)) {
            return 0;
        }
        if (const std::error_code error = file.Save(path)) {
            LogError(path, error.message());
            return VORN_FAIL(FileWrite);
        }
        return 0;
    })
}

}  // extern "C"
