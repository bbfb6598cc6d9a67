// Who may do what.

#ifndef VORN_APPLIANCE_VORND_ACCESS_H
#define VORN_APPLIANCE_VORND_ACCESS_H

#include <sys/socket.h>
#include <sys/types.h>

#include <optional>

namespace appliance {

// The process at the other end of a connection, as the kernel knew it when it connected.
struct Peer {
    pid_t pid = 0;
    uid_t user = 0;
};

// Nothing when the kernel does not say.
std::optional<Peer> PeerOf(int socket);

enum class Access {
    None,           // every request is answered with NotAllowed
    Administrator,  // everything
};

// What a peer may do by itself. This is the one place that decides it: a process without rights that hands on requests
// of users who have logged in gets a case of its own here, and its requests are judged by their session then.
Access AccessOf(const Peer& peer);

}  // namespace appliance

#endif
