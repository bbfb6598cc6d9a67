#include "appliance/domain/join/winbind.h"

#include <algorithm>
#include <array>
#include <thread>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/domain/join/time_budget.h"
#include "appliance/domain/join/tool_output.h"
#include "appliance/domain/membership/samba.h"
#include "appliance/platform/system/services.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;

constexpr char kService[] = "winbindd";
constexpr milliseconds kPause{20};
constexpr milliseconds kLongPause{100};
constexpr milliseconds kAttempt{3000};
constexpr milliseconds kLeastAttempt{500};  // less time is not worth asking in

constexpr std::array kCaches = {
    "/var/cache/samba/winbindd_cache.tdb",    "/var/lib/samba/winbindd_cache.tdb",
    "/var/cache/samba/netsamlogon_cache.tdb", "/var/lib/samba/netsamlogon_cache.tdb",
    "/var/cache/samba/gencache.tdb",          "/run/samba/gencache.tdb",
};

CommandResult Ping(milliseconds deadline) {
    SambaCall call;
    call.arguments = {"--ping"};
    call.deadline = deadline;
    return RunWbinfo(call);
}

}  // namespace

std::string StopWinbind(milliseconds deadline) {
    const ServiceResult result = StopService(kService, deadline);
    return result ? "" : result.error;
}

std::string StartWinbind(milliseconds deadline) {
    const TimeBudget budget(deadline);
    const ServiceResult result = StartService(kService, deadline);
    if (!result) {
        return result.error;
    }
    for (;;) {
        const CommandResult ping = Ping(budget.Left(kAttempt));
        // One that takes a question and gives no answer runs: it is busy.
        if (ping.Succeeded() || ping.end == CommandResult::End::TimedOut) {
            return "";
        }
        if (budget.Over()) {
            return "winbindd does not answer";
        }
        std::this_thread::sleep_for(kPause);
    }
}

WinbindTrust ConfirmTrust(milliseconds deadline, std::string& words) {
    const TimeBudget budget(deadline);
    SambaCall call;
    call.arguments = {"--check-secret"};
    words = "not asked";
    while (budget.Left(deadline) >= kLeastAttempt) {
        call.deadline = budget.Left(deadline);
        const CommandResult result = RunWbinfo(call);
        if (result.Succeeded()) {
            return WinbindTrust::Confirmed;
        }
        words = LastWords(result);
        if (result.end == CommandResult::End::TimedOut) {
            return WinbindTrust::Busy;
        }
        std::this_thread::sleep_for(std::min(budget.Left(deadline), kLongPause));
    }
    return WinbindTrust::Denied;
}

void RemoveDomainCaches() {
    for (const char* cache : kCaches) {
        if (const std::error_code error = RemoveFile(Path(cache));
            error && error != std::errc::no_such_file_or_directory) {
            Log(LOG_WARNING, Path(cache) + ": " + error.message());
        }
    }
}

}  // namespace appliance
