#include "appliance/vornd/listener.h"

#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <optional>
#include <utility>

#include "appliance/vornd/startup.h"

namespace appliance {
namespace {

constexpr int kBacklog = 256;
constexpr mode_t kSocketMode = 0666;

StartError Failure(const std::string& path, int error) {
    StartError failure("socket " + path + ": " + std::strerror(error));
    return failure;
}

}  // namespace

Listener Listen(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (path.empty() || path.size() >= sizeof address.sun_path) {
        throw StartError("socket " + path + ": the path has more than " + std::to_string(sizeof address.sun_path - 1) +
                         " bytes");
    }
    std::memcpy(address.sun_path, path.data(), path.size());
    std::optional<FileLock> lock = FileLock::Take(path + ".lock", std::chrono::milliseconds(0));
    if (!lock) {
        throw errno == EAGAIN ? StartError("another vornd serves " + path) : Failure(path + ".lock", errno);
    }
    struct stat found {};
    if (lstat(path.c_str(), &found) == 0) {
        if (!S_ISSOCK(found.st_mode)) {
            throw StartError("socket " + path + ": something else has this name");
        }
        if (unlink(path.c_str()) != 0) {
            throw Failure(path, errno);
        }
    }
    FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (!socket ||
        bind(socket.get(), static_cast<const sockaddr*>(static_cast<const void*>(&address)), sizeof address) != 0 ||
        chmod(path.c_str(), kSocketMode) != 0 || listen(socket.get(), kBacklog) != 0) {
        throw Failure(path, errno);
    }
    return {std::move(*lock), std::move(socket)};
}

}  // namespace appliance
