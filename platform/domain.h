// The domain library: membership of a Windows domain, the domains in sight, the database of domain users and groups.
// See conventions.h for the rules that hold for every declaration.

#ifndef VORN_PLATFORM_DOMAIN_H
#define VORN_PLATFORM_DOMAIN_H

#include <cstddef>
#include <cstdint>

#include "platform/conventions.h"
#include "platform/core.h"

extern "C" {

// What to join or leave: the domain settings record of VORNWinJoin1. The order and the widths of its fields are part of
// the platform's binary interface. Zero the whole record first, then set what is needed.
struct _tag_VORN_WIN2_ {
    std::int32_t joinMode;   // 1: join the domain; 0: go back to a workgroup
    std::int32_t reserved1;  // the platform's own; 0
    const char* domainName;  // domain to join, or the workgroup to go back to; not owned
    const char* userName;    // account that joins; empty when leaving; not owned
    const char* password;    // its password; empty when leaving; not owned
    char kdc[128];           // domain controller to use; empty: found by the platform
    char reserved2[8196];    // the platform's own; 0
    char fqdn[256];          // the domain's DNS name; empty: found by the platform
    char netbiosName[128];   // the domain's NetBIOS name; empty: found by the platform
};

// Fills `name` (`size` bytes) with the current domain or workgroup name, and the two status flags. Both are non-zero on
// a member of a domain; the first alone tells that the appliance is set to domain mode. `second` may be null.
// Failure: -1.
int WINIQuery1(char* name, int size, int* first, int* second);

// Fills the key and the message text of the status that the join tool left behind last.
// Failure: -1.
int ErrWINIState1Get(char* key, int keySize, char* message, int messageSize);

// Joins or leaves as the record says. 0 when done. A record in which one of the three texts is null is refused.
// Failure: -1, 1.
int VORNWinJoin1(struct _tag_VORN_WIN2_* record);

// Tests the membership against the domain controller; `ads` is what VORNWinADSJoined answered. 0 or more: it works.
// Failure: -1.
int VORNWinTestJoin(int ads);

// Non-zero when the membership is one of Active Directory.
// Failure: none.
int VORNWinADSJoined(void);

// The trusted-domain setting as it is stored; non-zero when trusted domains are enabled.
// Failure: none.
int VORNWinIsEnableTrustDomain(void);

// Stores the trusted-domain setting: 1, 0, or a value that VORNWinIsEnableTrustDomain answered before.
// Failure: -1.
int VORNWinSetTrustDomain(int setting);

// Appends the names of all domains in sight, the own one first.
// Failure: -1.
int VORNWinsEnumAllDomains(struct VLIBSZLIST** domains);

// Fills two parallel lists with the organisational units: a name and the value to use for it.
// Failure: -1.
int VORNWinsEnumOU(struct VLIBSZLIST** names, struct VLIBSZLIST** values);

// Fills `fqdn` (`size` bytes) with the DNS name of a domain.
// Failure: -1.
int VORNWinsGetDomainFQDN(const char* domain, char* fqdn, int size);

// Non-zero when the appliance is a member of a domain.
// Failure: none.
int VORNWinsIsJoined(void);

// Non-zero when `domain` is the domain that the appliance is a member of.
// Failure: none.
int VORNWinsIsOwnDomain(const char* domain);

// Writes one key of a section of the file-sharing service's main configuration.
// Failure: -1.
int VORNWinsSetSectionKey(const char* section, const char* key, const char* value);

// Refreshes what the appliance knows of all domains (trusted domains enabled), or of its own one (disabled).
// Failure: -1.
int VORNWinUpdateAllDomains(void);
int VORNWinUpdateOU(void);

// Fetches the users (kind 0) or groups (kind 1) of the listed domains into the local database. 0 when done.
// Failure: -1, 1.
int VORNWinGetDomainUGByDomain(int kind, struct VLIBSZLIST* domains);

// Fills `workgroup` (`size` bytes) with the appliance's workgroup name.
// Failure: -1.
int VORNWorkgroupGet(char* workgroup, int size);

// 1 when the appliance is bound to an LDAP directory; any other result when it isn't. `flags` is 0.
// Failure: none.
int VORNLDAPIsBinded(int flags);

// Makes the domain's administrators administrators of the appliance, or ends that, as the options file says.
// Failure: -1.
int VORNGroupAddDomainAdminGroup(void);

// Includes (1) or excludes (0) the domain users' home folders in the file-sharing service.
// Failure: -1.
int VORNDomainUserHomeInclude(int include);

}  // extern "C"

// Offsets on a machine with pointers of 4 bytes, where the record's binary layout is fixed.
#if UINTPTR_MAX == 0xffffffffu
static_assert(offsetof(_tag_VORN_WIN2_, kdc) == 20, "KDC must lie at 20");
static_assert(offsetof(_tag_VORN_WIN2_, fqdn) == 8344, "FQDN must lie at 8344");
static_assert(offsetof(_tag_VORN_WIN2_, netbiosName) == 8600, "NetBIOS name must lie at 8600");
#endif
static_assert(offsetof(_tag_VORN_WIN2_, fqdn) - offsetof(_tag_VORN_WIN2_, kdc) == 8344 - 20,
              "the text fields keep their distance on every machine");
static_assert(offsetof(_tag_VORN_WIN2_, netbiosName) - offsetof(_tag_VORN_WIN2_, fqdn) == 256,
              "the NetBIOS name follows the FQDN");

#endif
