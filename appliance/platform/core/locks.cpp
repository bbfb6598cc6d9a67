// The lock that a word names.
//
// The bits above the lowest byte say which: 0x800 is the settings file, the only one there is. The lowest byte says how:
// 0x06 is the lock of one writer, which shuts out all others. Any other word is refused.

#include <cerrno>

#include "appliance/base/settings.h"
#include "appliance/platform/contract.h"
#include "appliance/platform/last_error.h"

namespace {

constexpr int kHow = 0xFF;
constexpr int kExclusive = 0x06;
constexpr int kSettingsLock = 0x800;

constexpr int kHeldByAnother = 1;

}  // namespace

extern "C" {

int VLIBCFileLock(int word, int seconds) {
    VORN_GUARD(-1, {
        if ((word & ~kHow) != kSettingsLock || (word & kHow) != kExclusive || seconds < 0) {
            return VORN_FAIL(BadArgument);
        }
        std::optional<appliance::SettingsLock> lock = appliance::SettingsLock::Take(std::chrono::seconds(seconds));
        if (!lock) {
            return VORN_FAIL_WITH(FileLock, errno == EAGAIN ? kHeldByAnother : -1);
        }
        lock->Detach();
        return 0;
    })
}

int VLIBCFileUnlock(int word) {
    VORN_GUARD(-1, {
        if ((word & ~kHow) != kSettingsLock || !appliance::SettingsLock::Release()) {
            return VORN_FAIL(BadArgument);
        }
        return 0;
    })
}

}  // extern "C"
