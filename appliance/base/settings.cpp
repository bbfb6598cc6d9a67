#include "appliance/base/settings.h"

#include <cerrno>

#include "appliance/base/conf_file.h"
#include "appliance/base/file_lock.h"
#include "appliance/base/paths.h"

namespace appliance {

namespace {

constexpr char kLockSuffix[] = ".lock";
constexpr char kSection[] = "global";
constexpr mode_t kMode = 0644;

// What this thread holds. It ends with the thread.
struct Held {
    int depth = 0;
    std::optional<FileLock> lock;
};

Held& OwnHeld() {
    thread_local Held held;
    return held;
}

// Reads, changes and writes under the lock. `change` answers false for a file that may stay as it is.
template <typename Change>
std::error_code ChangeSettings(Change change) {
    const std::optional<SettingsLock> lock = SettingsLock::Take();
    if (!lock) {
        return errno == EAGAIN ? std::make_error_code(std::errc::timed_out)
                               : std::error_code(errno, std::generic_category());
    }
    const std::string path = Path(kSettings);
    ConfFile file;
    if (const std::error_code error = ConfFile::Load(path, file)) {
        return error;
    }
    const std::string before = file.text();
    if (!change(file)) {
        return std::make_error_code(std::errc::invalid_argument);
    }
    return file.text() == before ? std::error_code() : file.Save(path, kMode);
}

}  // namespace

bool SettingsLock::Guards(const std::string& path) {
    return path == Path(kSettings) || path == kSettings;
}

std::optional<SettingsLock> SettingsLock::Take(std::chrono::milliseconds wait) {
    Held& held = OwnHeld();
    if (held.depth == 0) {
        held.lock = FileLock::Take(Path(kSettings) + kLockSuffix, wait);
        if (!held.lock) {
            return std::nullopt;
        }
    }
    ++held.depth;
    return SettingsLock();
}

SettingsLock::~SettingsLock() {
    if (holds_) {
        Release();
    }
}

bool SettingsLock::Release() {
    Held& held = OwnHeld();
    if (held.depth == 0) {
        return false;
    }
    if (--held.depth == 0) {
        held.lock.reset();
    }
    return true;
}

std::optional<std::string> Setting(std::string_view key, std::error_code& error) {
    ConfFile file;
    error = ConfFile::Load(Path(kSettings), file);
    return error ? std::nullopt : file.Get(kSection, key);
}

std::error_code SetSetting(std::string_view key, std::string_view value) {
    return ChangeSettings([&](ConfFile& file) { return file.Set(kSection, key, value); });
}

std::error_code RemoveSetting(std::string_view key) {
    return ChangeSettings([&](ConfFile& file) {
        file.Remove(kSection, key);
        return true;
    });
}

}  // namespace appliance
