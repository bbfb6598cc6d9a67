// Asking the domain's key distribution centre about accounts, before anything is changed.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_ACCOUNT_CHECK_H
#define VORN_APPLIANCE_DOMAIN_JOIN_ACCOUNT_CHECK_H

#include <chrono>
#include <string>

#include "appliance/domain/membership/samba.h"

namespace appliance {

// What came of asking for a first ticket. The names of the outcomes are those of the protocol's error codes.
struct TicketResult {
    enum class Outcome {
        Granted,
        WrongPassword,
        UnknownAccount,
        Revoked,  // disabled, locked or expired: the protocol does not say which
        PasswordExpired,
        Unreachable,  // no KDC answers in time, or the realm is unknown
        Failed,       // anything else
        NotAsked,     // no process could be started
    };
    Outcome outcome = Outcome::NotAsked;
    std::string words;         // the library's own, in one line
    long clockDifference = 0;  // seconds that the controller's clock is ahead; with Granted only
};

// Asks for a ticket of the account in `realm` with its password, by the library's configuration file `configuration`,
// in a process of its own that ends within `deadline` (milliseconds). An account may be written as NAME, NAME@REALM or
// DOMAIN\NAME with the domain's own NetBIOS name.
TicketResult AskForTicket(const Credentials& credentials, const std::string& realm, const std::string& domain,
                          const std::string& configuration, std::chrono::milliseconds deadline);

// Can the realm's KDC say anything about the account? Not about DOMAIN\NAME with another domain's NetBIOS name, whose
// realm nobody knows.
bool KdcKnowsOf(const std::string& user, const std::string& realm, const std::string& domain);

// Does the KDC know the account ("NAS1$")? No password is offered, so nothing counts as an attempt to log on.
enum class AccountState { Absent, Present, Unknown };
AccountState LookUpAccount(const std::string& account, const std::string& realm, const std::string& configuration,
                           std::chrono::milliseconds deadline);

// The status message for an outcome that is not Granted; `pinned`: the controller was given by the caller. A revoked
// account needs a second question: this answers the text for one that is locked or expired.
std::string TicketFailureMessage(const TicketResult& result, bool pinned);

}  // namespace appliance

#endif
