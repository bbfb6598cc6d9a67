#include "appliance/vornd/access.h"

namespace appliance {

std::optional<Peer> PeerOf(int socket) {
    ucred credentials{};
    socklen_t size = sizeof credentials;
    if (getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0) {
        return std::nullopt;
    }
    return Peer{credentials.pid, credentials.uid};
}

Access AccessOf(const Peer& peer) {
    return peer.user == 0 ? Access::Administrator : Access::None;
}

}  // namespace appliance
