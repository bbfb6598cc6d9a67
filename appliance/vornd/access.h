// Who may do what.

#ifndef VORN_APPLIANCE_VORND_ACCESS_H
#define VORN_APPLIANCE_VORND_ACCESS_H

#include <sys/socket.h>
#include <sys/types.h>

#include <optional>
#include <string>

namespace appliance {

// The process at the other end of a connection, as the kernel knew it when it connected.
struct Peer {
    pid_t pid = 0;
    uid_t user = 0;
};

// Nothing when the kernel does not say.
std::optional<Peer> PeerOf(int socket);

// In rising order.
enum class Access {
    None,           // the server's figures, and nothing else
    Door,           // to log in; with the session of an administrator what an administrator may
    Administrator,  // everything
};

// The account of the server that stands between browsers and this one.
inline constexpr const char kDoorAccount[] = "vorn-httpd";

// The id of an account that may be the door: nothing when the system does not know it, or when it is root's.
std::optional<uid_t> FindDoor(const std::string& account);

// What a peer may do by itself. This is the one place that decides it.
Access AccessOf(const Peer& peer, std::optional<uid_t> door);

}  // namespace appliance

#endif
