// Where the door listens.

#ifndef VORN_APPLIANCE_HTTPD_LISTEN_ADDRESS_H
#define VORN_APPLIANCE_HTTPD_LISTEN_ADDRESS_H

#include <netinet/in.h>
#include <sys/socket.h>

#include <optional>
#include <string>

#include "appliance/base/file.h"
#include "appliance/httpd/client_request.h"

namespace appliance {

struct ListenAddress {
    sockaddr_storage address{};
    socklen_t size = 0;
    std::string text;  // as it was given
    bool isLoopback = false;
};

// "127.0.0.1:8443" or "[::1]:8443": an address, no name, and a port from 0 (any that is free) to 65535.
std::optional<ListenAddress> ParseListenAddress(const std::string& text);

// A listening, non-blocking socket. None, with errno, when it can't be had.
FileDescriptor ListenOn(const ListenAddress& address);

// The port that a socket is bound to; 0 when it has none.
int PortOf(int socket);

// The other end of a connection. An IPv4 address within an IPv6 one is shown as what it is.
ClientAddress AddressOfClient(const sockaddr_storage& address);

}  // namespace appliance

#endif
