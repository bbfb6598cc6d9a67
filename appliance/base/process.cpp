#include "appliance/base/process.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <string_view>

#include "appliance/base/file.h"
#include "appliance/base/file_lock.h"
#include "appliance/base/paths.h"

namespace appliance {

namespace {

constexpr double kNanoseconds = 1e9;

// A process' start is known in ticks, a file's time in ticks of another clock: so much they may differ by.
constexpr double kTolerance = 0.05;

constexpr std::chrono::seconds kWriterWait{5};
constexpr char kPidFileLock[] = "/run/vorn/pidfile.lock";

double Seconds(const timespec& time) {
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / kNanoseconds;
}

// The first `limit` bytes of a file.
std::string ReadSmall(int descriptor, std::size_t limit) {
    std::string text(limit, '\0');
    std::size_t length = 0;
    while (length < limit) {
        const ssize_t got = read(descriptor, &text[length], limit - length);
        if (got < 0 && errno == EINTR) {
            continue;
        }
        if (got <= 0) {
            break;
        }
        length += static_cast<std::size_t>(got);
    }
    text.resize(length);
    return text;
}

// False for an id that is free, and for one of a thread that is not its process' first.
bool IsProcess(pid_t pid) {
    const FileDescriptor process(static_cast<int>(syscall(SYS_pidfd_open, pid, 0)));
    return process || errno == EMFILE || errno == ENFILE || errno == ENOSYS || errno == EPERM;
}

// The number that a pid file holds, or -1.
pid_t ParsePid(std::string_view text) {
    const std::size_t first = text.find_first_not_of(" \t\r\n");
    if (first == std::string_view::npos) {
        return -1;
    }
    text = text.substr(first, text.find_last_not_of(" \t\r\n") - first + 1);
    pid_t pid = -1;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), pid);
    return error == std::errc() && end == text.data() + text.size() && pid > 0 ? pid : -1;
}

bool WriteOwnPid(int descriptor) {
    const std::string text = std::to_string(getpid()) + "\n";
    return write(descriptor, text.data(), text.size()) == static_cast<ssize_t>(text.size()) &&
           fchmod(descriptor, 0644) == 0;
}

}  // namespace

std::optional<std::uint64_t> ProcessStart(pid_t pid) {
    if (pid <= 0 || !IsProcess(pid)) {
        return std::nullopt;
    }
    const std::string path = "/proc/" + std::to_string(pid) + "/stat";
    const FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    if (!file) {
        return std::nullopt;
    }
    const std::string stat = ReadSmall(file.get(), 4096);
    // The second field is the program's name in parentheses and may hold anything, ")" and blanks included.
    const std::size_t name = stat.rfind(')');
    if (name == std::string::npos || name + 2 >= stat.size()) {
        return std::nullopt;
    }
    const char state = stat[name + 2];
    if (state == 'Z' || state == 'X' || state == 'x') {
        return std::nullopt;
    }
    std::size_t field = name + 2;
    for (int number = 3; number < 22; ++number) {
        field = stat.find(' ', field);
        if (field == std::string::npos) {
            return std::nullopt;
        }
        ++field;
    }
    std::uint64_t start = 0;
    const auto [end, error] = std::from_chars(&stat[field], stat.data() + stat.size(), start);
    return error == std::errc() && end != &stat[field] ? std::optional(start) : std::nullopt;
}

std::optional<double> ProcessStartTime(pid_t pid) {
    const std::optional<std::uint64_t> start = ProcessStart(pid);
    if (!start) {
        return std::nullopt;
    }
    timespec now = {};
    timespec sinceBoot = {};
    if (clock_gettime(CLOCK_REALTIME, &now) != 0 || clock_gettime(CLOCK_BOOTTIME, &sinceBoot) != 0) {
        return std::nullopt;
    }
    const double afterBoot = static_cast<double>(*start) / static_cast<double>(sysconf(_SC_CLK_TCK));
    return Seconds(now) - Seconds(sinceBoot) + afterBoot;
}

bool WritePidFile(const std::string& path) {
    // Two writers that find the same stale file take turns, else the second would replace the first one's.
    if (MakeFolder(Path(kRun), 0755)) {
        return false;
    }
    const std::optional<FileLock> lock = FileLock::Take(Path(kPidFileLock), kWriterWait);
    if (!lock || ReadPidFile(path) >= 0) {
        return false;
    }
    std::string temporary;
    FileDescriptor file = MakeTemporary(path, temporary);
    if (!file) {
        return false;
    }
    const auto putInPlace = [&] { return rename(temporary.c_str(), path.c_str()) == 0; };
    // A file of another user's is replaced like any other, a folder is not.
    if (WriteOwnPid(file.get()) && (putInPlace() || (ClearForeign(path) && putInPlace()))) {
        return true;
    }
    unlink(temporary.c_str());
    return false;
}

int ReadPidFile(const std::string& path) {
    const FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY));
    struct stat found = {};
    if (!file || fstat(file.get(), &found) != 0 || !S_ISREG(found.st_mode) || found.st_uid != 0) {
        return -1;
    }
    constexpr std::size_t kLongest = 64;
    const std::string text = ReadSmall(file.get(), kLongest + 1);
    const pid_t pid = text.size() > kLongest ? -1 : ParsePid(text);
    const std::optional<double> start = ProcessStartTime(pid);
    return start && *start <= Seconds(found.st_mtim) + kTolerance ? pid : -1;
}

}  // namespace appliance
