// What the join tool is asked to do, and how that reaches it.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_JOIN_REQUEST_H
#define VORN_APPLIANCE_DOMAIN_JOIN_JOIN_REQUEST_H

#include <string>
#include <string_view>

#include "appliance/domain/membership/samba.h"

namespace appliance {

struct JoinRequest {
    enum class Action { Join, Leave };
    Action action = Action::Join;
    std::string domain;            // to join, by its DNS or NetBIOS name; or the workgroup to go back to
    Credentials credentials;       // of the account that joins or that removes the computer account; else empty
    std::string controller = {};   // domain controller to use, by address or name; empty: found
    std::string realm = {};        // the domain's DNS name; empty: found
    std::string netbiosName = {};  // the domain's NetBIOS name; empty: found
    bool deleteAccount = false;    // leaving: remove the computer account on the controller first
    bool resetOptions = false;     // leaving: reset the advanced options of the domain, too
};

// The request as the join tool reads it from its standard input: one line of JSON without the password, then the
// password's bytes as they are.
Secret FormatJoinRequest(const JoinRequest& request);

// Reads such a text. False when it is not one; `error` says why in one line without any secret.
bool ParseJoinRequest(std::string_view text, JoinRequest& request, std::string& error);

}  // namespace appliance

#endif
