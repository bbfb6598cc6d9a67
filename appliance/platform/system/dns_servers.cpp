#include "appliance/platform/system/dns_servers.h"

#include <chrono>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/file_lock.h"
#include "appliance/base/kept_copy.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/platform/system/resolv_conf.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kLockWait{10000};
constexpr mode_t kFileMode = 0644;

std::optional<ErrorCode> Fail(ErrorCode code, const std::string& what) {
    Log(LOG_ERR, "DNS servers: " + what);
    return code;
}

std::string TextOf(const Content& content) {
    return content.value_or("");
}

// The kept copy, when the file is still what was made of it.
std::optional<KeptCopy> CopyOf(const Content& current) {
    std::optional<KeptCopy> copy = ReadKeptCopy(Path(kResolvCopy));
    return copy && current && copy->after == *current ? copy : std::nullopt;
}

std::optional<ErrorCode> WriteFailure(const std::string& path, const std::error_code& error) {
    return Fail(ErrorCode::FileWrite, path + ": " + error.message());
}

// The file first: when the copy is all that is left over, it no longer matches and does not count.
std::optional<ErrorCode> BringBack(const Content& before) {
    // Where a link leads to nothing, the file at its end goes and the link stays.
    std::string path;
    std::error_code error = FollowLinks(Path(kResolvConf), path);
    if (!error) {
        error = before ? ReplaceFile(path, *before, kFileMode) : RemoveFile(path);
    }
    if (error) {
        return WriteFailure(Path(kResolvConf), error);
    }
    error = RemoveFile(Path(kResolvCopy));
    if (error) {
        Log(LOG_WARNING, "DNS servers: cannot remove " + Path(kResolvCopy) + ": " + error.message());
    }
    return std::nullopt;
}

// The copy as it was before a change that failed.
void BringBackCopy(const Content& before, const Content& current) {
    const std::error_code error =
        before == current ? RemoveFile(Path(kResolvCopy)) : WriteKeptCopy(Path(kResolvCopy), {before, TextOf(current)});
    if (error) {
        Log(LOG_WARNING, "DNS servers: " + Path(kResolvCopy) + ": " + error.message());
    }
}

// The copy first: a file that was changed must be one that can be brought back. `before` is what that would be, which is
// `current` unless it was changed already.
std::optional<ErrorCode> Change(const Content& before, const Content& current,
                                const std::vector<std::string>& servers) {
    const KeptCopy copy = {before, WithServers(TextOf(before), servers)};
    if (const std::error_code error = WriteKeptCopy(Path(kResolvCopy), copy)) {
        return WriteFailure(Path(kResolvCopy), error);
    }
    if (const std::error_code error = ReplaceFile(Path(kResolvConf), copy.after, kFileMode)) {
        BringBackCopy(before, current);
        return WriteFailure(Path(kResolvConf), error);
    }
    return std::nullopt;
}

std::optional<FileLock> TakeLock() {
    if (MakeFolder(Path(kRun), 0755)) {
        return std::nullopt;
    }
    return FileLock::Take(Path(kRun) + "/resolv.lock", kLockWait);
}

}  // namespace

std::optional<ErrorCode> ReadDnsServers(std::vector<std::string>& servers) {
    Content current;
    if (const std::error_code error = ReadContent(Path(kResolvConf), current)) {
        return Fail(ErrorCode::FileRead, Path(kResolvConf) + ": " + error.message());
    }
    servers = Servers(TextOf(current));
    return std::nullopt;
}

std::optional<ErrorCode> WriteDnsServers(const std::vector<std::string>& entries) {
    const std::optional<std::vector<std::string>> servers = CheckedServers(entries);
    if (!servers) {
        return Fail(ErrorCode::BadArgument, "the list is refused: an entry is no address");
    }
    const std::optional<FileLock> lock = TakeLock();
    if (!lock) {
        return Fail(ErrorCode::FileLock, "cannot lock the list");
    }
    Content current;
    if (const std::error_code error = ReadContent(Path(kResolvConf), current)) {
        return Fail(ErrorCode::FileRead, Path(kResolvConf) + ": " + error.message());
    }
    if (*servers == Servers(TextOf(current))) {
        return std::nullopt;
    }
    const std::optional<KeptCopy> copy = CopyOf(current);
    if (copy && *servers == Servers(TextOf(copy->before))) {
        return BringBack(copy->before);
    }
    return Change(copy ? copy->before : current, current, *servers);
}

}  // namespace appliance
