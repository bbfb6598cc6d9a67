// The settings file of the whole appliance (kSettings): lines "key=value" that several programs write.

#ifndef VORN_APPLIANCE_BASE_SETTINGS_H
#define VORN_APPLIANCE_BASE_SETTINGS_H

#include <chrono>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

namespace appliance {

// The lock that every writer of the settings file holds from before it reads until after it has written: exclusive
// between processes and threads, and gone when its holder dies. It lies on a file beside the settings file. A thread that
// holds it may take it again; it is free when the thread has given back each.
class SettingsLock {
public:
    // Is this the settings file, whose writers need the lock?
    static bool Guards(const std::string& path);

    // Waits up to `wait`; nothing when the lock could not be had (errno tells: EAGAIN, or what open says).
    static std::optional<SettingsLock> Take(std::chrono::milliseconds wait = std::chrono::seconds(5));

    ~SettingsLock();
    SettingsLock(SettingsLock&& other) noexcept : holds_(other.holds_) {
        other.holds_ = false;
    }
    SettingsLock& operator=(SettingsLock&& other) noexcept {
        std::swap(holds_, other.holds_);
        return *this;
    }
    SettingsLock(const SettingsLock&) = delete;
    SettingsLock& operator=(const SettingsLock&) = delete;

    // For callers that can't keep the object: Detach leaves the lock with this thread, and Release gives it back; false
    // when this thread does not hold it.
    void Detach() {
        holds_ = false;
    }
    static bool Release();

private:
    SettingsLock() = default;

    bool holds_ = true;
};

// The value of a setting; nothing when the key is absent. `error` tells of a file that can't be read.
std::optional<std::string> Setting(std::string_view key, std::error_code& error);

// Changes one setting under the lock; every other byte of the file stays. ETIMEDOUT when another holds the lock for more
// than 5 s, EINVAL when the key or the value can't be written.
std::error_code SetSetting(std::string_view key, std::string_view value);
std::error_code RemoveSetting(std::string_view key);

}  // namespace appliance

#endif
