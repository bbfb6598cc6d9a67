#include "tests/appliance/directory/fake_ldap_server.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstdlib>

namespace appliance_test {

namespace {

// One element of the encoding that LDAP uses: a tag, a length and what is in it.
std::string Element(unsigned char tag, const std::string& content) {
    std::string element(1, static_cast<char>(tag));
    if (content.size() < 0x80) {
        element += static_cast<char>(content.size());
    } else {
        element += '\x82';
        element += static_cast<char>(content.size() >> 8);
        element += static_cast<char>(content.size() & 0xFF);
    }
    return element + content;
}

constexpr unsigned char kInteger = 0x02;
constexpr unsigned char kText = 0x04;
constexpr unsigned char kEnumerated = 0x0A;
constexpr unsigned char kSequence = 0x30;
constexpr unsigned char kSet = 0x31;
constexpr unsigned char kEntry = 0x64;
constexpr unsigned char kResult = 0x65;
constexpr unsigned char kControls = 0xA0;

std::string Attribute(const std::string& name, const std::string& value) {
    return Element(kSequence, Element(kText, name) + Element(kSet, Element(kText, value)));
}

std::string Entry(const std::string& id, int number) {
    const std::string name = "user" + std::to_string(number);
    const std::string attributes = Attribute("sAMAccountName", name) + Attribute("displayName", std::string("a\0b", 3));
    return Element(kSequence, id + Element(kEntry, Element(kText, "CN=" + name + ",DC=lab,DC=test") +
                                                       Element(kSequence, attributes)));
}

std::string Result(const std::string& id, int code, const std::string& text, const std::string& controls) {
    const std::string result =
        Element(kEnumerated, std::string(1, static_cast<char>(code))) + Element(kText, "") + Element(kText, text);
    return Element(kSequence, id + Element(kResult, result) + controls);
}

std::string PageControl(const std::string& cookie) {
    const std::string value = Element(kSequence, Element(kInteger, std::string(1, '\0')) + Element(kText, cookie));
    return Element(kControls, Element(kSequence, Element(kText, "1.2.840.113556.1.4.319") + Element(kText, value)));
}

// Reads one whole message; empty when the client is gone.
std::string ReadMessage(int connection) {
    std::string message;
    char byte = 0;
    std::size_t wanted = 2;
    while (message.size() < wanted) {
        if (read(connection, &byte, 1) != 1) {
            return "";
        }
        message += byte;
        if (message.size() == 2) {
            const auto length = static_cast<unsigned char>(message[1]);
            wanted = length < 0x80 ? 2u + length : 2u + (length & 0x7Fu);
        } else if (const auto more = static_cast<unsigned char>(message[1]);
                   more >= 0x80 && message.size() == 2u + (more & 0x7Fu)) {
            std::size_t length = 0;
            for (std::size_t place = 2; place < message.size(); ++place) {
                length = length * 256 + static_cast<unsigned char>(message[place]);
            }
            wanted = message.size() + length;
        }
    }
    return message;
}

// The element with the message's number, to answer with.
std::string IdOf(const std::string& message) {
    const auto length = static_cast<unsigned char>(message[1]);
    const std::size_t place = length < 0x80 ? 2u : 2u + (length & 0x7Fu);
    return message.substr(place, 2u + static_cast<unsigned char>(message[place + 1]));
}

void Send(int connection, const std::string& bytes) {
    static_cast<void>(send(connection, bytes.data(), bytes.size(), MSG_NOSIGNAL));
}

}  // namespace

FakeLdapServer::FakeLdapServer(int entries, std::vector<Page> pages) : entries_(entries), pages_(std::move(pages)) {
    listener_ = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t size = sizeof(address);
    auto* generic = reinterpret_cast<sockaddr*>(&address);
    if (listener_ < 0 || bind(listener_, generic, size) != 0 || listen(listener_, 4) != 0 ||
        getsockname(listener_, generic, &size) != 0) {
        std::abort();
    }
    port_ = ntohs(address.sin_port);
    thread_ = std::thread([this] { Serve(); });
}

FakeLdapServer::~FakeLdapServer() {
    shutdown(listener_, SHUT_RDWR);
    if (const int connection = connection_.load(); connection >= 0) {
        shutdown(connection, SHUT_RDWR);
    }
    thread_.join();
    close(listener_);
}

void FakeLdapServer::Serve() {
    const int connection = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
    if (connection < 0) {
        return;
    }
    connection_ = connection;
    Answer(connection);
    connection_ = -1;
    close(connection);
}

void FakeLdapServer::Answer(int connection) {
    int number = 0;
    for (const Page page : pages_) {
        const std::string message = ReadMessage(connection);
        if (message.empty()) {
            return;
        }
        const std::string id = IdOf(message);
        if (page == Page::Silence) {
            ReadMessage(connection);  // until the client has had enough
            return;
        }
        for (int entry = 0; entry < entries_; ++entry) {
            Send(connection, Entry(id, ++number));
        }
        if (page == Page::Stall || page == Page::Close) {
            Send(connection, Entry(id, ++number).substr(0, 20));
            if (page == Page::Stall) {
                ReadMessage(connection);
            }
            return;
        }
        if (page == Page::Refused) {
            Send(connection, Result(id, 4, "too many\nfor you", ""));
        } else {
            const std::string control = page == Page::Unsaid ? "" : PageControl(page == Page::More ? "cookie" : "");
            Send(connection, Result(id, 0, "", control));
        }
    }
    ReadMessage(connection);
}

}  // namespace appliance_test
