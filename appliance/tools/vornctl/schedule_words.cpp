#include "appliance/tools/vornctl/schedule_words.h"

#include <climits>
#include <cstdio>
#include <set>

#include "appliance/base/text.h"
#include "appliance/tools/vornctl/client.h"
#include "appliance/tools/vornctl/exit_code.h"
#include "appliance/tools/vornctl/output.h"

namespace appliance::ctl {

namespace {

constexpr int kOnWeekdays = 0;
constexpr int kFromDate = 1;
constexpr int kNever = 2;

constexpr const char* kDays[] = {"Sunday", "Monday", "Tuesday", "Wednesday", "Thursday", "Friday", "Saturday"};
constexpr const char* kRepeats[] = {"once", "daily", "weekly", "monthly", "yearly"};

std::string WeekName(const std::vector<std::string>& names) {
    std::set<int> days;
    for (const std::string& name : names) {
        const std::string text = Lower(Trim(name));
        bool known = text == "all";
        for (int day = 0; day < 7; ++day) {
            const std::string full = Lower(kDays[day]);
            if (text == "all" || text == full || text == full.substr(0, 3) || text == std::to_string(day)) {
                days.insert(day);
                known = true;
            }
        }
        if (!known) {
            throw Failure(kUsage, "\"" + Escape(name) + "\" is no day of the week: sun, mon, ... sat, or all.");
        }
    }
    std::string list;
    for (const int day : days) {
        list += (list.empty() ? "" : ",") + std::to_string(day);
    }
    return list;
}

void SetTime(const std::string& text, Json::Value& request) {
    const std::vector<std::string> parts = Split(text, ":");
    const auto number = [](const std::string& digits) {
        const bool plain =
            !digits.empty() && digits.size() <= 2 && digits.find_first_not_of("0123456789") == std::string::npos;
        return plain ? std::stoi(digits) : INT_MAX;
    };
    const int hour = number(parts.size() == 2 ? parts[0] : "");
    const int minute = number(parts.size() == 2 ? parts[1] : "");
    if (hour > 23 || minute > 59) {
        throw Failure(kUsage, "\"" + Escape(text) + "\" is no time of day: write it as 03:30.");
    }
    request["hour"] = hour;
    request["min"] = minute;
}

std::string SlashDate(std::string text) {
    for (char& byte : text) {
        byte = byte == '-' ? '/' : byte;
    }
    const std::vector<std::string> parts = Split(text, "/");
    if (parts.size() != 3 || parts[0].size() != 4 || text.find_first_not_of("0123456789/") != std::string::npos) {
        throw Failure(kUsage, "\"" + Escape(text) + "\" is no date: write it as 2026-11-29.");
    }
    return text;
}

int RepeatNumber(const std::string& text) {
    for (int number = 0; number < 5; ++number) {
        if (text == kRepeats[number]) {
            return number;
        }
    }
    throw Failure(kUsage, "--repeat is one of once, daily, weekly, monthly and yearly.");
}

std::string ClockText(Json::Int64 hour, Json::Int64 minute) {
    char text[64];
    std::snprintf(text, sizeof(text), "%02lld:%02lld", static_cast<long long>(hour), static_cast<long long>(minute));
    return text;
}

std::string Listed(const std::vector<std::string>& items) {
    std::string text;
    for (std::size_t i = 0; i < items.size(); ++i) {
        text += (i == 0 ? "" : i + 1 == items.size() ? " and " : ", ") + items[i];
    }
    return text;
}

std::string TimesOfDay(const Json::Value& schedule) {
    const Json::Int64 hour = NumberOf(schedule, "hour");
    const Json::Int64 minute = NumberOf(schedule, "min");
    const Json::Int64 every = NumberOf(schedule, "repeat_hour");
    std::string text = "at " + ClockText(hour, minute);
    if (every <= 0 || NumberOf(schedule, "last_work_hour") < hour + every) {
        return text;
    }
    const Json::Int64 last = hour + (NumberOf(schedule, "last_work_hour") - hour) / every * every;
    return text + " and every " + (every == 1 ? "hour" : std::to_string(every) + " hours") + " from then to " +
           ClockText(last, minute);
}

std::string DayName(const std::string& number) {
    return number.size() == 1 && number[0] >= '0' && number[0] <= '6' ? kDays[number[0] - '0'] : number;
}

std::string WeekdayWords(const std::string& weekName) {
    std::vector<std::string> names;
    for (const std::string& number : Split(weekName, ",")) {
        names.push_back(DayName(number));
    }
    return names.size() == 7 ? "Every day" : "Every " + Listed(names);
}

std::string DateWords(const Json::Value& schedule) {
    const std::string date = TextOf(schedule, "date");
    const std::vector<std::string> parts = Split(date, "/");
    if (parts.size() != 3) {
        return "From " + date + " on";
    }
    switch (NumberOf(schedule, "repeat")) {
        case 0:
            return "Once, on " + date;
        case 1:
            return "Every day from " + date + " on";
        case 2:
            return "Every seventh day from " + date + " on";
        case 3:
            return "Every month on day " + parts[2] +
                   (parts[2].size() == 2 && parts[2] > "28" ? ", or its last one," : "") + " from " + date + " on";
        case 4:
            return "Every year on " + parts[1] + "/" + parts[2] + " from " + date + " on";
        default:
            return "From " + date + " on";
    }
}

}  // namespace

Json::Value ScheduleRequest(const ScheduleWish& wish) {
    Json::Value request(Json::objectValue);
    const bool weekly = !wish.weekdays.empty();
    const bool dated = !wish.date.empty();
    const bool timed = !wish.time.empty() || wish.every >= 0 || wish.until >= 0 || !wish.repeat.empty();
    if (wish.off) {
        if (weekly || dated || timed) {
            throw Failure(kUsage, "--off stands alone.");
        }
        request["date_type"] = kNever;
        return request;
    }
    if (weekly == dated) {
        throw Failure(kUsage, "Say on which days: either --weekly or --date.");
    }
    if (wish.time.empty()) {
        throw Failure(kUsage, "Say when: --at HH:MM.");
    }
    if (weekly && !wish.repeat.empty()) {
        throw Failure(kUsage, "--repeat goes with --date.");
    }
    if (wish.until >= 0 && wish.every < 0) {
        throw Failure(kUsage, "--until goes with --every.");
    }
    SetTime(wish.time, request);
    request["date_type"] = weekly ? kOnWeekdays : kFromDate;
    if (weekly) {
        request["week_name"] = WeekName(wish.weekdays);
    } else {
        request["date"] = SlashDate(wish.date);
        request["repeat"] = wish.repeat.empty() ? 0 : RepeatNumber(wish.repeat);
    }
    if (wish.every > 0) {
        request["repeat_hour"] = wish.every;
        request["last_work_hour"] = wish.until >= 0 ? wish.until : 23;
        if (request["last_work_hour"].asInt() < request["hour"].asInt()) {
            throw Failure(kUsage, "--until lies before the time of --at.");
        }
    }
    return request;
}

std::string ScheduleWords(const Json::Value& schedule) {
    switch (NumberOf(schedule, "date_type")) {
        case kOnWeekdays:
            return WeekdayWords(TextOf(schedule, "week_name")) + " " + TimesOfDay(schedule) + ".";
        case kFromDate:
            return DateWords(schedule) + ", " + TimesOfDay(schedule) + ".";
        default:
            return "There is no schedule: users and groups are refreshed by hand only.";
    }
}

}  // namespace appliance::ctl
