#include "appliance/httpd/listen_address.h"

#include <arpa/inet.h>
#include <netinet/tcp.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <cstring>

namespace appliance {
namespace {

constexpr int kBacklog = 512;
constexpr int kHighestPort = 65535;

bool IsLoopback(const in_addr& address) {
    return (ntohl(address.s_addr) >> 24U) == 127U;
}

template <typename Address>
Address As(const sockaddr_storage& storage) {
    Address address{};
    std::memcpy(&address, &storage, sizeof address);
    return address;
}

}  // namespace

std::optional<ListenAddress> ParseListenAddress(const std::string& text) {
    const std::size_t colon = text.rfind(':');
    if (colon == std::string::npos || colon == 0) {
        return std::nullopt;
    }
    int port = -1;
    const char* const end = text.data() + text.size();
    const auto [rest, error] = std::from_chars(text.data() + colon + 1, end, port);
    if (error != std::errc() || rest != end || port < 0 || port > kHighestPort) {
        return std::nullopt;
    }
    ListenAddress result;
    result.text = text;
    if (text.front() == '[') {
        sockaddr_in6 address{};
        address.sin6_family = AF_INET6;
        address.sin6_port = htons(static_cast<std::uint16_t>(port));
        if (text[colon - 1] != ']' || inet_pton(AF_INET6, text.substr(1, colon - 2).c_str(), &address.sin6_addr) != 1) {
            return std::nullopt;
        }
        result.isLoopback = IN6_IS_ADDR_LOOPBACK(&address.sin6_addr);
        result.size = sizeof address;
        std::memcpy(&result.address, &address, sizeof address);
    } else {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_port = htons(static_cast<std::uint16_t>(port));
        if (inet_pton(AF_INET, text.substr(0, colon).c_str(), &address.sin_addr) != 1) {
            return std::nullopt;
        }
        result.isLoopback = IsLoopback(address.sin_addr);
        result.size = sizeof address;
        std::memcpy(&result.address, &address, sizeof address);
    }
    return result;
}

FileDescriptor ListenOn(const ListenAddress& address) {
    FileDescriptor listener(socket(address.address.ss_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    const int on = 1;
    if (!listener) {
        return listener;
    }
    setsockopt(listener.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    // Connections inherit it.
    setsockopt(listener.get(), IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
    if (address.address.ss_family == AF_INET6) {
        setsockopt(listener.get(), IPPROTO_IPV6, IPV6_V6ONLY, &on, sizeof on);
    }
    if (bind(listener.get(), static_cast<const sockaddr*>(static_cast<const void*>(&address.address)), address.size) !=
            0 ||
        listen(listener.get(), kBacklog) != 0) {
        const int reason = errno;
        listener.Reset();
        errno = reason;
    }
    return listener;
}

int PortOf(int socket) {
    sockaddr_storage address{};
    socklen_t size = sizeof address;
    if (getsockname(socket, static_cast<sockaddr*>(static_cast<void*>(&address)), &size) != 0) {
        return 0;
    }
    if (address.ss_family == AF_INET6) {
        return ntohs(As<sockaddr_in6>(address).sin6_port);
    }
    return address.ss_family == AF_INET ? ntohs(As<sockaddr_in>(address).sin_port) : 0;
}

ClientAddress AddressOfClient(const sockaddr_storage& address) {
    ClientAddress client;
    std::array<char, INET6_ADDRSTRLEN> text{};
    if (address.ss_family == AF_INET) {
        const auto plain = As<sockaddr_in>(address);
        client.isLoopback = IsLoopback(plain.sin_addr);
        inet_ntop(AF_INET, &plain.sin_addr, text.data(), text.size());
    } else if (address.ss_family == AF_INET6) {
        const auto long_ = As<sockaddr_in6>(address);
        if (IN6_IS_ADDR_V4MAPPED(&long_.sin6_addr)) {
            in_addr inner{};
            std::memcpy(&inner, &long_.sin6_addr.s6_addr[12], sizeof inner);
            client.isLoopback = IsLoopback(inner);
            inet_ntop(AF_INET, &inner, text.data(), text.size());
        } else {
            client.isLoopback = IN6_IS_ADDR_LOOPBACK(&long_.sin6_addr);
            inet_ntop(AF_INET6, &long_.sin6_addr, text.data(), text.size());
        }
    }
    client.text = text.data();
    return client;
}

}  // namespace appliance
