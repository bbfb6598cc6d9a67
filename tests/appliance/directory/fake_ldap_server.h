// A small LDAP server on the loopback that answers a search as a test wants it, well or badly.

#ifndef VORN_TESTS_APPLIANCE_DIRECTORY_FAKE_LDAP_SERVER_H
#define VORN_TESTS_APPLIANCE_DIRECTORY_FAKE_LDAP_SERVER_H

#include <atomic>
#include <string>
#include <thread>
#include <vector>

namespace appliance_test {

class FakeLdapServer {
public:
    enum class Page {
        More,     // a result that announces another page
        Last,     // a result that says this was all
        Unsaid,   // a result without the control that says so
        Refused,  // a result with an error: size limit exceeded
        Stall,    // half an entry, then nothing
        Silence,  // nothing at all
        Close,    // half an entry, then the connection is closed
    };

    // Each search is answered with `entries` entries and the end that stands next in `pages`.
    FakeLdapServer(int entries, std::vector<Page> pages);
    ~FakeLdapServer();
    FakeLdapServer(const FakeLdapServer&) = delete;
    FakeLdapServer& operator=(const FakeLdapServer&) = delete;

    int port() const {
        return port_;
    }

private:
    void Serve();
    void Answer(int connection);

    int entries_;
    std::vector<Page> pages_;
    int listener_ = -1;
    int port_ = 0;
    std::atomic<int> connection_{-1};
    std::thread thread_;
};

}  // namespace appliance_test

#endif
