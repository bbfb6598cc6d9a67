// The event log of the appliance: a database file that several processes write and read at once.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_EVENT_LOG_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_EVENT_LOG_H

#include <cstdint>
#include <string>
#include <vector>

#include "appliance/platform/system/event_text.h"

namespace appliance {

// The log keeps this many events, the newest.
inline constexpr int kMostEvents = 10000;

// An argument is kept up to this many bytes.
inline constexpr int kLongestEventArgument = 1024;

struct Event {
    std::int64_t time = 0;  // seconds since 1970
    int kind = 0;           // see EventKindName
    int level = 0;          // see EventLevelName
    int code = 0;
    std::string text;  // EventText: one line of UTF-8
};

struct EventPage {
    std::int64_t total = 0;  // events in the log
    std::vector<Event> events;
};

// Adds an event at the present time. Throws SqliteError when it can't be kept (a full disk, another's lock for more
// than 5 seconds, a broken file), and std::system_error when its folder can't be made; the log is then as it was.
void AddEvent(int kind, int level, int code, const EventArguments& arguments);

// `limit` events, newest first, beyond the `offset` newest; negative numbers count as 0. A log that was never written
// is empty. Throws SqliteError.
EventPage ReadEvents(std::int64_t offset, std::int64_t limit);

}  // namespace appliance

#endif
