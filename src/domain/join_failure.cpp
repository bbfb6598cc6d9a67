// Why a join failed: the DNS name check, then what the join tool says.

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "src/domain.h"
#include "src/support/log.h"
#include "src/support/paths.h"
#include "src/support/shell_name.h"

namespace {

enum class Match { kEquals, kContains, kBeginsWith };

struct JoinStatusRow {
    Match match;
    const char* text;
    int code;
};

// The first row that matches decides, so the order counts; it is not that of the codes. The texts are the join tool's.
constexpr JoinStatusRow kJoinStatusRows[] = {
    {Match::kEquals, "Error System.", kSystemError},
    {Match::kEquals, "Invalid KDC ip.", 2603},
    {Match::kEquals, "Invalid workgroup name.", 2604},
    {Match::kEquals, "Neither LDAP server nor PDC can be found.", 2605},
    {Match::kEquals, "445/tcp is unreachable for DC. Please check the network and firewall settings.", 2606},
    {Match::kEquals, "Wbinfo fail. It might be domain name error.", 2601},
    {Match::kContains, "Preauthentication failed while getting initial credential", 2607},
    {Match::kContains, "Client not found in Kerberos database while getting initial credentials", 2607},
    {Match::kEquals, "Clients credentials have been revoked while getting initial credentials", 2608},
    {Match::kContains, "The account was disabled", 2609},
    {Match::kContains, "The username or password was not correct.", 2610},
    {Match::kBeginsWith, "Unable to join domain", 2611},
    {Match::kEquals, "ads_join_realm: Insufficient access", 2611},
    {Match::kEquals, "Password has expired while getting initial credentials", 2612},
    {Match::kBeginsWith, "Could not connect to server", 2614},
    {Match::kEquals, "Can't get domain workgroup.", 2613},
};

bool Matches(const JoinStatusRow& row, const char* message) {
    if (row.match == Match::kEquals) {
        return std::strcmp(message, row.text) == 0;
    }
    if (row.match == Match::kContains) {
        return std::strstr(message, row.text) != nullptr;
    }
    return std::strncmp(message, row.text, std::strlen(row.text)) == 0;
}

// Whether the name resolves. The name comes from a client and the command goes to a shell, so a name that could mean
// anything to the shell counts as one that does not resolve, and no command runs.
bool ResolvesByDns(const char* name) {
    if (!IsHarmlessToShell(name)) {
        return false;
    }
    char command[1024] = {};
    // A name that fills the buffer cuts the command; the lookup then fails or leaves its output elsewhere, harmlessly.
    static_cast<void>(std::snprintf(command, sizeof(command), "/usr/bin/nslookup %s > %s 2>&1", name, kDnsQuery));
    return system(command) == 0;
}

}  // namespace

void DomainServiceHandler::RecordJoinFailure(const char* domain, bool dnsGiven) {
    // New DNS servers are the likeliest cause, and the status would not name them.
    if (dnsGiven && std::strchr(domain, '.') != nullptr && !ResolvesByDns(domain)) {
        syslog(LOG_ERR, "%s:%d domain dns name error", kDomainUnit, LOG_NUMBER(kJoinFailure));
        SetError(2602);
        return;
    }
    char key[24] = {};
    char message[512] = {};
    if (ErrWINIState1Get(key, sizeof(key), message, sizeof(message)) < 0) {
        syslog(LOG_ERR, "%s:%d Failed to join domain.", kDomainUnit, LOG_NUMBER(kJoinFailure));
        SetError(2615);
        return;
    }
    for (const JoinStatusRow& row : kJoinStatusRows) {
        if (Matches(row, message)) {
            SetError(row.code);
            return;
        }
    }
    syslog(LOG_ERR, "%s:%d szStatKey:%s, szStatValue:%s", kDomainUnit, LOG_NUMBER(kJoinFailure), key, message);
    SetError(2615);
}
