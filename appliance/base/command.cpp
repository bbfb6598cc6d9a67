#include "appliance/base/command.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <optional>

#include "appliance/base/child_process.h"
#include "appliance/base/command_child.h"
#include "appliance/base/file.h"

namespace appliance {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kPauseWithoutPidfd{10};
constexpr std::size_t kMostAfterEnd = std::size_t{1} << 20;  // as much as a pipe can hold

struct Pipe {
    FileDescriptor read;
    FileDescriptor write;
};

FileDescriptor Raised(FileDescriptor descriptor) {
    if (!descriptor || descriptor.get() >= kFirstFreeDescriptor) {
        return descriptor;
    }
    return FileDescriptor(fcntl(descriptor.get(), F_DUPFD_CLOEXEC, kFirstFreeDescriptor));
}

bool MakePipe(Pipe& made) {
    std::array<int, 2> ends = {-1, -1};
    if (pipe2(ends.data(), O_CLOEXEC) != 0) {
        return false;
    }
    made.read = Raised(FileDescriptor(ends[0]));
    made.write = Raised(FileDescriptor(ends[1]));
    return made.read && made.write && fcntl(made.read.get(), F_SETFL, O_NONBLOCK) == 0;
}

// The input lies in memory that can be overwritten afterwards, and nobody has to wait for a program that reads slowly.
FileDescriptor MakeInput(const Secret& text) {
    if (text.empty()) {
        return Raised(FileDescriptor(open("/dev/null", O_RDONLY | O_CLOEXEC)));
    }
    FileDescriptor memory = Raised(FileDescriptor(memfd_create("input", MFD_CLOEXEC)));
    if (!memory) {
        return memory;
    }
    if (const std::error_code error = WriteAll(memory.get(), text.view())) {
        errno = error.value();
        return {};
    }
    lseek(memory.get(), 0, SEEK_SET);
    return memory;
}

void WipeInput(const FileDescriptor& memory, std::size_t size) {
    constexpr std::array<char, 4096> zeros = {};
    for (std::size_t place = 0; place < size; place += zeros.size()) {
        const std::size_t length = std::min(zeros.size(), size - place);
        if (pwrite(memory.get(), zeros.data(), length, static_cast<off_t>(place)) < 0) {
            return;
        }
    }
}

// All signals wait while it lives, so that no handler of the caller runs in the child.
class SignalsBlocked {
public:
    SignalsBlocked() {
        sigset_t all;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &before_);
    }
    ~SignalsBlocked() {
        pthread_sigmask(SIG_SETMASK, &before_, nullptr);
    }
    SignalsBlocked(const SignalsBlocked&) = delete;
    SignalsBlocked& operator=(const SignalsBlocked&) = delete;

private:
    sigset_t before_;
};

// One of the child's outputs, as far as it was read.
class Output {
public:
    Output(FileDescriptor end, std::size_t limit) : end_(std::move(end)), limit_(limit) {}

    // -1 when all was read.
    int descriptor() const {
        return end_.get();
    }
    // Reads what is there, at most `most` bytes.
    void Read(std::size_t most) {
        std::array<char, 65536> buffer;
        for (std::size_t total = 0; end_ && total < most;) {
            const ssize_t got = read(end_.get(), buffer.data(), buffer.size());
            if (got < 0 && errno == EINTR) {
                continue;
            }
            if (got < 0 && errno == EAGAIN) {
                return;
            }
            if (got <= 0) {
                end_.Reset();
                return;
            }
            total += static_cast<std::size_t>(got);
            text_.append(buffer.data(), std::min(static_cast<std::size_t>(got), limit_ - text_.size()));
        }
    }
    std::string Take() {
        return std::move(text_);
    }

private:
    FileDescriptor end_;
    std::size_t limit_;
    std::string text_;
};

// Reads both outputs until the child has ended, the deadline has passed or `cancel` can be read.
void Follow(ChildProcess& child, Output& output, Output& errors, Clock::time_point end, int cancel,
            CommandResult& result) {
    constexpr std::size_t kOneTurn = std::size_t{1} << 18;
    bool cancelled = false;
    for (;;) {
        if (const std::optional<ChildEnd> ended = child.Look()) {
            SetEnd(*ended, result);
            break;
        }
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now());
        if (left.count() <= 0 || cancelled) {
            child.Kill();
            result.end = CommandResult::End::TimedOut;
            result.code = 0;
            break;
        }
        const auto most = child.handle() >= 0 ? std::chrono::milliseconds(std::chrono::hours(1)) : kPauseWithoutPidfd;
        std::array<pollfd, 4> waiting = {{{output.descriptor(), POLLIN, 0},
                                          {errors.descriptor(), POLLIN, 0},
                                          {child.handle(), POLLIN, 0},
                                          {cancel, POLLIN, 0}}};
        poll(waiting.data(), waiting.size(), static_cast<int>(std::min(left, most).count()));
        if (waiting[0].revents != 0) {
            output.Read(kOneTurn);
        }
        if (waiting[1].revents != 0) {
            errors.Read(kOneTurn);
        }
        cancelled = waiting[3].revents != 0;
    }
    // What it left in the pipes. A child of its own may still hold them open: its words are not waited for.
    output.Read(kMostAfterEnd);
    errors.Read(kMostAfterEnd);
}

CommandResult NotStarted(int code) {
    CommandResult result;
    result.code = code;
    return result;
}

CommandResult Start(const Command& command, CommandChild& child, Clock::time_point end) {
    Pipe output;
    Pipe errors;
    Pipe status;
    child.input = MakeInput(command.input);
    if (!child.input || !MakePipe(output) || !MakePipe(errors) || !MakePipe(status)) {
        return NotStarted(errno);
    }
    child.output = std::move(output.write);
    child.errors = std::move(errors.write);
    child.status = std::move(status.write);

    pid_t pid = -1;
    int failure = 0;
    {
        const SignalsBlocked blocked;
        pid = fork();
        if (pid == 0) {
            RunChild(child);
        }
        failure = errno;
    }
    if (pid < 0) {
        return NotStarted(failure);
    }
    const bool group = command.ownGroup || command.ownSession;
    if (group && !command.ownSession) {
        setpgid(pid, pid);  // whichever of the two comes first; later the other one's fails, and that is no matter
    }
    child.output.Reset();
    child.errors.Reset();
    child.status.Reset();

    CommandResult result;
    ChildProcess running(pid, group ? ChildProcess::Reach::Group : ChildProcess::Reach::Process);
    Output out(std::move(output.read), command.outputLimit);
    Output err(std::move(errors.read), command.outputLimit);
    Follow(running, out, err, end, command.cancel, result);
    // Nothing more can come: the child has ended, and its exec, if it came to that, has closed the other end.
    if (read(status.read.get(), &failure, sizeof(failure)) == static_cast<ssize_t>(sizeof(failure))) {
        result = NotStarted(failure);
    }
    result.output = out.Take();
    result.errors = err.Take();
    if (!command.input.empty()) {
        WipeInput(child.input, command.input.view().size());
    }
    return result;
}

}  // namespace

void SetEnd(const ChildEnd& end, CommandResult& result) {
    result.end = end.how == ChildEnd::How::Exited      ? CommandResult::End::Exited
                 : end.how == ChildEnd::How::Signalled ? CommandResult::End::Signalled
                                                       : CommandResult::End::NotStarted;
    result.code = end.code;
}

std::string CommandResult::Describe() const {
    switch (end) {
        case End::Exited:
            return "exited with " + std::to_string(code);
        case End::Signalled:
            return "killed by signal " + std::to_string(code);
        case End::TimedOut:
            return "did not end within " + std::to_string(took.count()) + " ms";
        case End::NotStarted:
            break;
    }
    return "cannot be started: " + std::error_code(code, std::generic_category()).message();
}

CommandResult Run(const Command& command) {
    const auto begin = Clock::now();
    CommandChild child;
    CommandResult result =
        PrepareChild(command, child) ? Start(command, child, begin + command.deadline) : NotStarted(EINVAL);
    result.took = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - begin);
    return result;
}

}  // namespace appliance
