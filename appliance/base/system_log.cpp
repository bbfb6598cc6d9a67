#include "appliance/base/system_log.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <utility>

namespace appliance {
namespace {

constexpr std::chrono::seconds kPauseWithoutLogger{1};

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
    logger_ = std::move(logger);
    return true;
}

bool SystemLog::Send(int priority, std::string_view text) {
    const std::string line = Prefix(name_, facility_ | priority) + std::string(text);
    const std::lock_guard<std::mutex> lock(mutex_);
    // A logger that was started anew has another socket behind the same name.
    for (int attempt = 0; attempt < 2; ++attempt) {
        if (!logger_ && !Connect()) {
            return false;
        }
        if (send(logger_.get(), line.data(), line.size(), MSG_NOSIGNAL) >= 0) {
            return true;
        }
        if (errno == EAGAIN || errno == ENOBUFS || errno == EMSGSIZE) {
            return false;
        }
        logger_.Reset();
    }
    return false;
}

}  // namespace appliance
