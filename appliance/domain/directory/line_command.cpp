#include "appliance/domain/directory/line_command.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <optional>

#include "appliance/base/child_process.h"
#include "appliance/base/file.h"

namespace appliance {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t kLongestErrors = 4096;
constexpr std::size_t kLongestLine = 65536;
constexpr std::chrono::milliseconds kPauseWithoutHandle{10};

struct Pipe {
    FileDescriptor reading;
    FileDescriptor writing;

    bool Open() {
        std::array<int, 2> ends{};
        if (pipe2(ends.data(), O_CLOEXEC) != 0) {
            return false;
        }
        reading.Reset(ends[0]);
        writing.Reset(ends[1]);
        return true;
    }
};

// Pointers for exec into texts that outlive them.
std::vector<char*> Pointers(std::vector<std::string>& texts) {
    std::vector<char*> pointers;
    for (std::string& text : texts) {
        pointers.push_back(text.data());
    }
    pointers.push_back(nullptr);
    return pointers;
}

// How the program ended; nothing when it still runs at `end`.
std::optional<ChildEnd> EndOf(ChildProcess& program, Clock::time_point end) {
    for (;;) {
        if (const std::optional<ChildEnd> ended = program.Look()) {
            return ended;
        }
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now());
        if (left.count() <= 0) {
            return std::nullopt;
        }
        pollfd wait{program.handle(), POLLIN, 0};
        const auto most = program.handle() >= 0 ? std::chrono::milliseconds(60000) : kPauseWithoutHandle;
        poll(&wait, 1, static_cast<int>(std::min(left, most).count()));
    }
}

}  // namespace

CommandResult RunLines(const Command& command, const std::function<void(const std::string&)>& take) {
    const Clock::time_point started = Clock::now();
    CommandResult result;
    std::vector<std::string> arguments = command.arguments;
    std::vector<std::string> environment = {"PATH=/usr/sbin:/usr/bin:/sbin:/bin", "HOME=/", "LC_ALL=C"};
    for (const auto& [name, value] : command.environment) {
        environment.push_back(name + "=" + value);
    }
    std::vector<char*> argumentPointers = Pointers(arguments);
    std::vector<char*> environmentPointers = Pointers(environment);
    Pipe output;
    Pipe errors;
    Pipe start;  // says why the program could not be started; closed by a start that works
    const FileDescriptor nothing(open("/dev/null", O_RDONLY | O_CLOEXEC));
    if (!nothing || !output.Open() || !errors.Open() || !start.Open()) {
        result.code = errno;
        return result;
    }
    const pid_t parent = getpid();
    const pid_t pid = fork();
    if (pid < 0) {
        result.code = errno;
        return result;
    }
    if (pid == 0) {
        setpgid(0, 0);
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        std::signal(SIGPIPE, SIG_DFL);
        if (getppid() == parent && dup2(nothing.get(), 0) == 0 && dup2(output.writing.get(), 1) == 1 &&
            dup2(errors.writing.get(), 2) == 2) {
            execve(argumentPointers[0], argumentPointers.data(), environmentPointers.data());
        }
        const int reason = errno;
        if (write(start.writing.get(), &reason, sizeof(reason)) < 0) {
            _exit(126);
        }
        _exit(127);
    }
    setpgid(pid, pid);  // whichever of the two comes first
    ChildProcess program(pid, ChildProcess::Reach::Group);
    output.writing.Reset();
    errors.writing.Reset();
    start.writing.Reset();
    int reason = 0;
    if (read(start.reading.get(), &reason, sizeof(reason)) == sizeof(reason)) {
        program.Wait();
        result.code = reason;
        return result;
    }

    std::string text;
    std::size_t searched = 0;
    std::array<char, 16384> buffer{};
    Clock::time_point end = Clock::now() + command.deadline;
    bool timedOut = false;
    while (output.reading || errors.reading) {
        const Clock::time_point now = Clock::now();
        if (now >= end) {
            timedOut = true;
            break;
        }
        const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(end - now).count() + 1;
        pollfd waits[2] = {{output.reading.get(), POLLIN, 0}, {errors.reading.get(), POLLIN, 0}};
        if (poll(waits, 2, static_cast<int>(std::min<std::int64_t>(left, 60000))) <= 0) {
            continue;
        }
        for (const bool isOutput : {true, false}) {
            FileDescriptor& descriptor = isOutput ? output.reading : errors.reading;
            if (!descriptor || waits[isOutput ? 0 : 1].revents == 0) {
                continue;
            }
            const ssize_t got = read(descriptor.get(), buffer.data(), buffer.size());
            if (got < 0 && errno == EINTR) {
                continue;
            }
            if (got <= 0) {
                descriptor.Reset();
                continue;
            }
            const std::string_view piece(buffer.data(), static_cast<std::size_t>(got));
            if (!isOutput) {
                result.errors.append(piece.substr(0, kLongestErrors - std::min(kLongestErrors, result.errors.size())));
                continue;
            }
            end = Clock::now() + command.deadline;
            text.append(piece);
            std::size_t begin = 0;
            for (std::size_t line = text.find('\n', searched); line != std::string::npos;
                 line = text.find('\n', begin)) {
                take(text.substr(begin, line - begin));
                begin = line + 1;
            }
            text.erase(0, begin);
            text.resize(std::min(text.size(), kLongestLine));
            searched = text.size();
        }
    }
    result.took = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - started);
    if (timedOut) {
        result.end = CommandResult::End::TimedOut;
        return result;  // its owner ends it, and what it started
    }
    if (!text.empty()) {
        take(text);
    }
    // It may have closed its outputs and go on.
    const std::optional<ChildEnd> ended = EndOf(program, end);
    result.took = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - started);
    if (ended) {
        SetEnd(*ended, result);
    } else {
        result.end = CommandResult::End::TimedOut;
    }
    return result;
}

}  // namespace appliance
