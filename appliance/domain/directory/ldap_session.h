// A connection to a domain controller's LDAP service, as the machine account. It may block in spite of its time-outs:
// to be used in a process that can be killed (worker.h), which it also gives an environment of its own.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_LDAP_SESSION_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_LDAP_SESSION_H

#include <ldap.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace appliance {

// An entry that a search found; valid only while it is handed out.
class LdapEntry {
public:
    LdapEntry(LDAP* session, LDAPMessage* message) : session_(session), message_(message) {}

    // The first value of an attribute, all bytes of it; empty when there is none.
    std::string First(const char* attribute) const;

private:
    LDAP* session_;
    LDAPMessage* message_;
};

// What to search for.
struct LdapSearch {
    std::string base;
    bool wholeTree = true;  // false: the base entry only
    std::string filter;
    std::vector<std::string> attributes;
};

// Throws DirectoryError.
class LdapSession {
public:
    struct Server {
        std::string name;  // its full DNS name: the name of its Kerberos service
        int port = 389;
        bool anonymous = false;  // do not say who we are: enough for the root entry
    };

    // Connects, and proves the machine account by its ticket (TakeMachineTicket), with the traffic signed and sealed.
    // `patience` is how long one answer of the server may take; proving the account takes 10 seconds at most.
    LdapSession(const Server& server, std::chrono::milliseconds patience);

    // Hands each entry that is found to `take`, page by page. Returns only when the server has given all of them.
    void Search(const LdapSearch& search, const std::function<void(const LdapEntry&)>& take);

private:
    struct Unbind {
        void operator()(LDAP* session) const {
            ldap_unbind_ext(session, nullptr, nullptr);
        }
    };

    void WaitAtMost(std::chrono::milliseconds time);
    bool SearchPage(const LdapSearch& search, berval& cookie, const std::function<void(const LdapEntry&)>& take);
    [[noreturn]] void Fail(int result, const std::string& doing, const char* detail = nullptr) const;

    std::string name_;
    std::chrono::milliseconds patience_;
    std::unique_ptr<LDAP, Unbind> session_;
};

// "DC=lab,DC=test" for "lab.test".
std::string BaseOfDomain(std::string_view dnsName);

// The last number of a security identifier in binary form that belongs to a domain (S-1-5-21-x-y-z-RID); nothing for
// any other.
std::optional<std::uint32_t> RidOfSid(std::string_view sid);

}  // namespace appliance

#endif
