// A request of a client as the door sees it: what counts of it, and nothing else.

#ifndef VORN_APPLIANCE_HTTPD_CLIENT_REQUEST_H
#define VORN_APPLIANCE_HTTPD_CLIENT_REQUEST_H

#include <boost/beast/http/fields.hpp>
#include <boost/beast/http/message.hpp>
#include <string>

namespace appliance {

// The other end of a connection.
struct ClientAddress {
    std::string text;         // the bare address, without port and scope
    bool isLoopback = false;  // it can only be this machine
};

struct ClientRequest {
    std::string verb;
    std::string target;  // as it was sent
    std::string origin;  // scheme and host that a page of this server has: "https://nas:8443"
    ClientAddress client;
    boost::beast::http::fields header;  // without what came behind the body
    std::string body;
};

}  // namespace appliance

#endif
