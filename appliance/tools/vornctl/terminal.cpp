#include "appliance/tools/vornctl/terminal.h"

#include <fcntl.h>
#include <poll.h>
#include <termios.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>

#include "appliance/base/file.h"
#include "appliance/base/text.h"
#include "appliance/tools/vornctl/exit_code.h"
#include "appliance/tools/vornctl/interrupt.h"
#include "appliance/tools/vornctl/output.h"

namespace appliance::ctl {

namespace {

constexpr std::size_t kPasswordLimit = 1024;
constexpr int kSignalCheck = 100;  // milliseconds

FileDescriptor OpenTerminal() {
    return FileDescriptor(open("/dev/tty", O_RDWR | O_CLOEXEC | O_NOCTTY));
}

// Switches the echo off and, at its end, back on. Ctrl-Z is ignored meanwhile: a shell would get the terminal without
// its echo.
class SilentTerminal {
public:
    explicit SilentTerminal(int terminal) : terminal_(terminal) {
        known_ = tcgetattr(terminal_, &saved_) == 0;
        if (known_) {
            termios silent = saved_;
            silent.c_lflag &= ~static_cast<tcflag_t>(ECHO | ECHONL);
            known_ = tcsetattr(terminal_, TCSAFLUSH, &silent) == 0;
        }
        struct sigaction ignore {};
        ignore.sa_handler = SIG_IGN;
        sigaction(SIGTSTP, &ignore, &savedStop_);
    }
    ~SilentTerminal() {
        if (known_) {
            tcsetattr(terminal_, TCSAFLUSH, &saved_);
        }
        sigaction(SIGTSTP, &savedStop_, nullptr);
    }
    SilentTerminal(const SilentTerminal&) = delete;
    SilentTerminal& operator=(const SilentTerminal&) = delete;

    bool IsSilent() const {
        return known_;
    }

private:
    int terminal_;
    bool known_ = false;
    termios saved_{};
    struct sigaction savedStop_ {};
};

void Say(int terminal, std::string_view text) {
    while (!text.empty()) {
        const ssize_t written = write(terminal, text.data(), text.size());
        if (written <= 0) {
            return;
        }
        text.remove_prefix(static_cast<std::size_t>(written));
    }
}

// A line in a fixed buffer that is wiped at the end.
struct LineBuffer {
    std::array<char, kPasswordLimit + 1> bytes{};
    std::size_t size = 0;

    ~LineBuffer() {
        explicit_bzero(bytes.data(), bytes.size());
    }
    std::string_view view() const {
        return {bytes.data(), size};
    }
};

// Reads up to the end of the line, byte by byte, so that nothing of what follows is taken. False when the line is too
// long. Throws Failure after Ctrl-C, and when there is nothing to read.
bool ReadLine(int descriptor, LineBuffer& line) {
    while (true) {
        char byte = '\0';
        WaitForInput(descriptor);
        const ssize_t count = read(descriptor, &byte, 1);
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count < 0) {
            throw Failure(kUsage, "The input can't be read.");
        }
        if (count == 0 || byte == '\n') {
            if (line.size > 0 && line.bytes[line.size - 1] == '\r') {
                --line.size;
            }
            return line.size <= kPasswordLimit;
        }
        if (line.size < line.bytes.size()) {
            line.bytes[line.size++] = byte;
        }
    }
}

Secret CheckedPassword(bool fits, const LineBuffer& line) {
    if (!fits) {
        throw Failure(kUsage, "The password is longer than " + std::to_string(kPasswordLimit) + " bytes.");
    }
    if (line.size == 0) {
        throw Failure(kUsage, "The password is empty.");
    }
    if (line.view().find('\0') != std::string_view::npos || !IsUtf8(line.view())) {
        throw Failure(kUsage, "The password holds bytes that can't be sent: it must be UTF-8 without a NUL.");
    }
    return Secret(line.view());
}

}  // namespace

void WaitForInput(int descriptor) {
    pollfd input{descriptor, POLLIN, 0};
    int ready = 0;
    // With a limit, since a signal may come just before the wait begins.
    while (ready == 0 || (ready < 0 && errno == EINTR)) {
        if (Interrupted()) {
            throw Failure(kInterrupted, "Interrupted. Nothing was changed.");
        }
        ready = poll(&input, 1, kSignalCheck);
    }
}

bool CanAsk() {
    return static_cast<bool>(OpenTerminal());
}

Secret AskPassword(const std::string& prompt) {
    const FileDescriptor terminal = OpenTerminal();
    if (!terminal) {
        throw Failure(kUsage,
                      "There is no terminal to ask for the password on: give it on standard input with "
                      "--password-stdin.");
    }
    LineBuffer line;
    bool fits = false;
    {
        const SilentTerminal silent(terminal.get());
        if (!silent.IsSilent()) {
            throw Failure(kUsage,
                          "This terminal can't be kept from showing the password: give it on standard input with "
                          "--password-stdin.");
        }
        Say(terminal.get(), prompt);
        try {
            fits = ReadLine(terminal.get(), line);
        } catch (const Failure&) {
            Say(terminal.get(), "\n");
            throw;
        }
        Say(terminal.get(), "\n");
    }
    return CheckedPassword(fits, line);
}

Secret ReadPasswordFromInput() {
    LineBuffer line;
    const bool fits = ReadLine(STDIN_FILENO, line);
    return CheckedPassword(fits, line);
}

std::string Ask(const std::string& question) {
    const FileDescriptor terminal = OpenTerminal();
    if (!terminal) {
        throw Failure(kUsage, "There is no terminal to ask on.");
    }
    Say(terminal.get(), question);
    LineBuffer line;
    try {
        ReadLine(terminal.get(), line);
    } catch (const Failure&) {
        Say(terminal.get(), "\n");
        throw;
    }
    return Lower(Trim(line.view()));
}

}  // namespace appliance::ctl
