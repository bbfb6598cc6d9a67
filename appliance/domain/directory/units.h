// The organisational units of the appliance's own domain. What is known of them lies in /var/lib/vorn/units.json.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_UNITS_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_UNITS_H

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "appliance/domain/membership/membership.h"

namespace appliance {

inline constexpr char kUnitList[] = "/var/lib/vorn/units.json";

struct Unit {
    std::string name;               // to show
    std::string distinguishedName;  // its place, escaped as LDAP wants it: to hand on as it is

    bool operator==(const Unit& other) const {
        return name == other.name && distinguishedName == other.distinguishedName;
    }
};

// Asks the controller within `deadline` and stores the answer; an NT4-style domain has no units. Nothing, with a line
// in the log, when it can't be asked. Starts a program, so any thread of a server may call it.
std::optional<std::vector<Unit>> RefreshUnits(const Membership& membership, std::chrono::milliseconds deadline);

// The same by a session of its own, which does not depend on what Samba's tools remember of a controller's last
// failure. Starts a child process (RunWorker): for a process of one thread.
std::optional<std::vector<Unit>> FetchUnits(const Membership& membership);

// The units as RefreshUnits stored them last for this domain; nothing when it never has.
std::optional<std::vector<Unit>> LoadUnits(const Membership& membership);

// The units in what "net ads search ... distinguishedName" prints. A name with a control character in it is left out.
// Nothing when the text is damaged: when it holds fewer than it announces.
std::optional<std::vector<Unit>> ParseUnits(const std::string& text);

// The name in the first part of a distinguished name, with its escapes undone: "R, D" for "OU=R\, D,DC=lab,DC=test".
// Nothing when there is none, an escape is damaged, or the name can't be shown.
std::optional<std::string> NameOfUnit(const std::string& distinguishedName);

}  // namespace appliance

#endif
