// What the event log says about an event: the texts of the codes, the names of kinds and levels.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_EVENT_TEXT_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_EVENT_TEXT_H

#include <array>
#include <string>
#include <string_view>

namespace appliance {

// Events that the appliance knows. Both are of kind 2 and level 1.
inline constexpr int kEventJoinedDomain = 0x11800404;     // argument 1: the domain
inline constexpr int kEventBackToWorkgroup = 0x11800506;  // argument 1: the workgroup

inline constexpr int kKindDomain = 2;        // domain membership
inline constexpr int kLevelInformation = 1;  // nothing to be done about it

using EventArguments = std::array<std::string, 4>;

// The text of an event with its arguments in place. A code without a text of its own is shown as a number with its
// arguments, without empty ones at the end: "event 0x11800999: \"one\", \"\", \"three\"".
std::string EventText(int code, const EventArguments& arguments);

// "domain" and "information"; any other number as "kind 7", "level 3".
std::string EventKindName(int kind);
std::string EventLevelName(int level);

// The bytes as one line of proper UTF-8: control bytes, and bytes that are not part of a character, as \xNN.
std::string Shown(std::string_view text);

}  // namespace appliance

#endif
