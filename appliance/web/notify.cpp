#include "appliance/web/notify.h"

#include <stdlib.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>

#include <charconv>
#include <cstddef>
#include <cstring>
#include <string_view>

#include "appliance/base/file.h"
#include "appliance/base/log.h"

namespace appliance {
namespace {

struct Manager {
    std::string socket;
    std::chrono::microseconds watchdog{0};
};

Manager& TheManager() {
    static Manager manager;
    return manager;
}

long long ReadNumber(const char* name) {
    const char* text = getenv(name);
    long long number = 0;
    if (text != nullptr) {
        std::from_chars(text, text + std::strlen(text), number);
    }
    return number;
}

}  // namespace

void AdoptNotifySocket() {
    Manager& manager = TheManager();
    if (const char* socket = getenv("NOTIFY_SOCKET")) {
        manager.socket = socket;
    }
    const long long pid = ReadNumber("WATCHDOG_PID");
    if (pid == 0 || pid == getpid()) {
        manager.watchdog = std::chrono::microseconds(ReadNumber("WATCHDOG_USEC"));
    }
    unsetenv("NOTIFY_SOCKET");
    unsetenv("WATCHDOG_PID");
    unsetenv("WATCHDOG_USEC");
}

void Notify(const std::string& state) {
    const std::string& name = TheManager().socket;
    sockaddr_un address{};
    if (name.empty() || name.size() >= sizeof address.sun_path) {
        return;
    }
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, name.data(), name.size());
    if (name.front() == '@') {
        address.sun_path[0] = '\0';
    }
    const FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    // A manager that is busy for a moment must not hold up the server; a beat that is lost is followed by others.
    const timeval patience{0, state == kWatchdogBeat ? 1 : 500000};
    setsockopt(socket.get(), SOL_SOCKET, SO_SNDTIMEO, &patience, sizeof patience);
    const auto length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + name.size());
    if (sendto(socket.get(), state.data(), state.size(), MSG_NOSIGNAL,
               static_cast<const sockaddr*>(static_cast<const void*>(&address)), length) < 0 &&
        state != kWatchdogBeat) {
        Log(LOG_WARNING, "the service manager can't be told " + state);
    }
}

std::chrono::microseconds WatchdogInterval() {
    // Half of what is allowed, so that one beat may come late.
    return TheManager().watchdog / 2;
}

}  // namespace appliance
