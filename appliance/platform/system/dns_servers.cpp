#include "appliance/platform/system/dns_servers.h"

#include <charconv>
#include <chrono>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/file_lock.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/platform/system/resolv_conf.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kLockWait{10000};
constexpr std::size_t kLargestFile = 1 << 20;
constexpr mode_t kFileMode = 0644;

std::optional<ErrorCode> Fail(ErrorCode code, const std::string& what) {
    Log(LOG_ERR, "DNS servers: " + what);
    return code;
}

bool IsMissing(const std::error_code& error) {
    return error == std::errc::no_such_file_or_directory;
}

// A file that may be missing.
using Content = std::optional<std::string>;

std::string TextOf(const Content& content) {
    return content.value_or("");
}

std::error_code Read(const std::string& path, Content& content) {
    std::string text;
    const std::error_code error = ReadFile(path, text, 4 * kLargestFile);
    if (IsMissing(error)) {
        content.reset();
        return {};
    }
    content = std::move(text);
    return error;
}

// What the file was, and what was made of it here.
struct Copy {
    Content before;
    std::string after;
};

// "kept SIZE\n" or "missing 0\n", the bytes of the one, then the bytes of the other: whatever stands in the file, it
// comes back as it was.
std::string Format(const Copy& copy) {
    const std::string before = TextOf(copy.before);
    return (copy.before ? "kept " : "missing ") + std::to_string(before.size()) + "\n" + before + copy.after;
}

std::optional<Copy> Parse(const std::string& text) {
    const std::size_t end = text.find('\n');
    const std::size_t blank = text.find(' ');
    if (end == std::string::npos || blank > end) {
        return std::nullopt;
    }
    std::size_t size = 0;
    const auto [rest, error] = std::from_chars(text.data() + blank + 1, text.data() + end, size);
    const std::string word = text.substr(0, blank);
    if (error != std::errc() || rest != text.data() + end || size > text.size() - end - 1 ||
        (word != "kept" && word != "missing")) {
        return std::nullopt;
    }
    Copy copy;
    if (word == "kept") {
        copy.before = text.substr(end + 1, size);
    }
    copy.after = text.substr(end + 1 + size);
    return copy;
}

// The kept copy, when the file is still what was made of it.
std::optional<Copy> CopyOf(const Content& current) {
    Content kept;
    if (Read(Path(kResolvCopy), kept) || !kept || !current) {
        return std::nullopt;
    }
    std::optional<Copy> copy = Parse(*kept);
    return copy && copy->after == *current ? copy : std::nullopt;
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
    const std::error_code error = before == current
                                      ? RemoveFile(Path(kResolvCopy))
                                      : ReplaceFile(Path(kResolvCopy), Format({before, TextOf(current)}), 0600);
    if (error) {
        Log(LOG_WARNING, "DNS servers: " + Path(kResolvCopy) + ": " + error.message());
    }
}

// The copy first: a file that was changed must be one that can be brought back. `before` is what that would be, which is
// `current` unless it was changed already.
std::optional<ErrorCode> Change(const Content& before, const Content& current,
                                const std::vector<std::string>& servers) {
    const Copy copy = {before, WithServers(TextOf(before), servers)};
    if (const std::error_code error = MakeFolder(Path(kPrivate), 0700)) {
        return WriteFailure(Path(kPrivate), error);
    }
    if (const std::error_code error = ReplaceFile(Path(kResolvCopy), Format(copy), 0600)) {
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
    if (const std::error_code error = Read(Path(kResolvConf), current)) {
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
    if (const std::error_code error = Read(Path(kResolvConf), current)) {
        return Fail(ErrorCode::FileRead, Path(kResolvConf) + ": " + error.message());
    }
    if (*servers == Servers(TextOf(current))) {
        return std::nullopt;
    }
    const std::optional<Copy> copy = CopyOf(current);
    if (copy && *servers == Servers(TextOf(copy->before))) {
        return BringBack(copy->before);
    }
    return Change(copy ? copy->before : current, current, *servers);
}

}  // namespace appliance
