// The schedule of the refresh, from the command line into the API's values and from those into words.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_SCHEDULE_WORDS_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_SCHEDULE_WORDS_H

#include <json/value.h>

#include <string>
#include <vector>

namespace appliance::ctl {

// What the command line says; an empty text and -1 are what it does not say.
struct ScheduleWish {
    std::vector<std::string> weekdays;  // "sun", "wednesday", "0", "all"
    std::string date;                   // "2026-11-29"
    std::string repeat;                 // "once", "daily", "weekly", "monthly", "yearly"
    std::string time;                   // "03:30"
    int every = -1;                     // hours
    int until = -1;                     // hour
    bool off = false;
};

// The request of "set". Throws Failure (kUsage) with what is wrong or missing.
Json::Value ScheduleRequest(const ScheduleWish& wish);

// The answer of "get" as a sentence.
std::string ScheduleWords(const Json::Value& schedule);

}  // namespace appliance::ctl

#endif
