#include "appliance/base/system_log.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <utility>

namespace appliance {
namespace {

constexpr std::chrono::seconds kPauseWithoutLogger{1};
constexpr std::chrono::seconds kPauseAfterWait{10};

// What the system's logger expects in front of a line.
std::string Prefix(const std::string& name, int priority) {
    const std::time_t now = std::time(nullptr);
    std::tm parts{};
    localtime_r(&now, &parts);
    std::array<char, 32> time{};
    std::strftime(time.data(), time.size(), "%b %e %H:%M:%S ", &parts);
    return "<" + std::to_string(priority) + ">" + time.data() + name + "[" + std::to_string(getpid()) + "]: ";
}

}  // namespace

SystemLog::SystemLog(std::string name, int facility, std::string socket)
    : name_(std::move(name)), facility_(facility), socket_(std::move(socket)) {}

bool SystemLog::Connect() {
    const auto now = std::chrono::steady_clock::now();
    if (now < nextTry_) {
        return false;
    }
    nextTry_ = now + kPauseWithoutLogger;
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (socket_.size() >= sizeof address.sun_path) {
        return false;
    }
    std::memcpy(address.sun_path, socket_.data(), socket_.size());
    FileDescriptor logger(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (!logger ||
        connect(logger.get(), static_cast<const sockaddr*>(static_cast<const void*>(&address)), sizeof address) != 0) {
        return false;
    }
    logger_ = std::make_shared<const FileDescriptor>(std::move(logger));
    return true;
}

std::string SystemLog::Form(int priority, std::string_view text) const {
    return Prefix(name_, facility_ | priority) + std::string(text);
}

bool SystemLog::Lost() {
    ++lost_;
    return false;
}

void SystemLog::TellLost() {
    if (lost_ != 0 &&
        Try(Form(LOG_WARNING, "lines lost before this one: " + std::to_string(lost_))) == Outcome::Taken) {
        lost_ = 0;
    }
}

SystemLog::Outcome SystemLog::Try(const std::string& line) {
    // A logger that was started anew has another socket behind the same name.
    for (int attempt = 0; attempt < 2; ++attempt) {
        if (logger_ == nullptr && !Connect()) {
            return Outcome::Failed;
        }
        if (send(logger_->get(), line.data(), line.size(), MSG_NOSIGNAL) >= 0) {
            return Outcome::Taken;
        }
        if (errno == EAGAIN) {
            return Outcome::Full;
        }
        if (errno == EMSGSIZE || errno == ENOBUFS) {
            return Outcome::Failed;
        }
        logger_.reset();
    }
    return Outcome::Failed;
}

bool SystemLog::Send(int priority, std::string_view text, std::chrono::milliseconds patience) {
    const std::string line = Form(priority, text);
    const auto end = std::chrono::steady_clock::now() + patience;
    for (;;) {
        std::shared_ptr<const FileDescriptor> logger;
        {
            const std::lock_guard<std::mutex> lock(mutex_);
            TellLost();
            const Outcome outcome = Try(line);
            if (outcome == Outcome::Taken) {
                return true;
            }
            if (outcome == Outcome::Failed) {
                return Lost();
            }
            const auto now = std::chrono::steady_clock::now();
            if (patience.count() == 0 || now < nextWait_) {
                return Lost();
            }
            if (now >= end) {
                nextWait_ = now + kPauseAfterWait;
                return Lost();
            }
            logger = logger_;
        }
        // Without the lock: others may be of less patience.
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - std::chrono::steady_clock::now());
        pollfd room{logger->get(), POLLOUT, 0};
        poll(&room, 1, static_cast<int>(std::max<std::chrono::milliseconds::rep>(left.count(), 0)));
    }
}

}  // namespace appliance
