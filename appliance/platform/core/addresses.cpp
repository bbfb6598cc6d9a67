// Tests of addresses.

#include <arpa/inet.h>

#include "appliance/platform/contract.h"

extern "C" {

int BlVLIBIsIpAddr(const char* text) {
    in_addr address = {};
    return text != nullptr && inet_pton(AF_INET, text, &address) == 1 ? 1 : 0;
}

int BlVLIBIsv6IpAddrValid(const char* text) {
    in6_addr address = {};
    return text != nullptr && inet_pton(AF_INET6, text, &address) == 1 ? 1 : 0;
}

}  // extern "C"
