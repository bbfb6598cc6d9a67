// Is the appliance a member of a domain, and of which? Read from the file-sharing service's configuration and from the
// secrets that a join leaves; no process is started and no controller is asked.

#ifndef VORN_APPLIANCE_DOMAIN_MEMBERSHIP_MEMBERSHIP_H
#define VORN_APPLIANCE_DOMAIN_MEMBERSHIP_MEMBERSHIP_H

#include <chrono>
#include <optional>
#include <string>
#include <system_error>

#include "appliance/base/file_lock.h"

namespace appliance {

class ConfFile;

enum class DomainKind { Workgroup, ActiveDirectory, Nt4 };

struct Membership {
    DomainKind kind = DomainKind::Workgroup;  // key "security": ads, domain, anything else
    bool hasSecret = false;                   // the machine account's password for this domain is stored
    std::string domain;                       // NetBIOS name of the domain, or the workgroup: key "workgroup"
    std::string realm;                        // DNS name in capitals, Active Directory only: key "realm"
    std::string machine;                      // the appliance's NetBIOS name: key "netbios name", else the host's name
    std::string passwordServer;               // key "password server", or empty

    bool DomainMode() const {
        return kind != DomainKind::Workgroup;
    }
    bool Joined() const {
        return DomainMode() && hasSecret;
    }
    // "NAS1$", the account's name on the controller.
    std::string Account() const {
        return machine + "$";
    }
};

// Reads the membership. Fails when smb.conf is missing, unreadable or names no workgroup.
std::error_code ReadMembership(Membership& membership);

// What a configuration says of a membership; `hasSecret` stays false.
Membership MembershipOf(const ConfFile& conf);

// Every writer of smb.conf that reads, changes and replaces it holds this lock meanwhile, so that none loses another's
// change. Waits up to `wait`; nothing when the lock could not be had.
std::optional<FileLock> LockSmbConf(std::chrono::milliseconds wait);
inline constexpr char kSmbConfLock[] = "/run/vorn/smb.conf.lock";

// The trusted-domain setting: key "trustdomain" of the settings file, "yes" (also when absent) or "no".
bool TrustedDomainsEnabled();
bool TrustedDomainsEnabled(const ConfFile& settings);

}  // namespace appliance

#endif
