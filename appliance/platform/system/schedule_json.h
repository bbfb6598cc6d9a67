// A schedule as a JSON object: {"date_type": 0, "date": "", "hour": 3, "last_work_hour": 0, "min": 30, "repeat": 0,
// "repeat_hour": 0, "week_name": "0,6"}.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_SCHEDULE_JSON_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_SCHEDULE_JSON_H

#include <json/value.h>

#include <string>

#include "appliance/platform/system/schedule.h"

namespace appliance {

// Reads a possible schedule. "date_type", "hour" and "min" must be there; of the others an absent one counts as 0 or
// empty. Returns an empty text, or what is wrong, with `schedule` unchanged.
std::string ScheduleFromJson(const Json::Value& object, Schedule& schedule);

// All eight values.
Json::Value ScheduleToJson(const Schedule& schedule);

}  // namespace appliance

#endif
