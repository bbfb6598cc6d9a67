#include "appliance/vornd/access.h"

#include <pwd.h>

#include <cerrno>
#include <vector>

namespace appliance {

std::optional<Peer> PeerOf(int socket) {
    ucred credentials{};
    socklen_t size = sizeof credentials;
    if (getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0) {
        return std::nullopt;
    }
    return Peer{credentials.pid, credentials.uid};
}

std::optional<uid_t> FindDoor(const std::string& account) {
    constexpr std::size_t kMostBytes = std::size_t{1} << 20;
    std::vector<char> buffer(std::size_t{1} << 12);
    passwd entry{};
    passwd* found = nullptr;
    while (getpwnam_r(account.c_str(), &entry, buffer.data(), buffer.size(), &found) == ERANGE &&
           buffer.size() < kMostBytes) {
        buffer.resize(2 * buffer.size());
    }
    return found == nullptr || found->pw_uid == 0 ? std::nullopt : std::optional(found->pw_uid);
}

Access AccessOf(const Peer& peer, std::optional<uid_t> door) {
    if (peer.user == 0) {
        return Access::Administrator;
    }
    return door && peer.user == *door ? Access::Door : Access::None;
}

}  // namespace appliance
