#include "appliance/platform/system/schedule.h"

#include <algorithm>
#include <ctime>

#include "appliance/base/text.h"

namespace appliance {

namespace {

constexpr int kFirstYear = 1970;

bool IsLeapYear(int year) {
    return (year % 4 == 0 && year % 100 != 0) || year % 400 == 0;
}

// A number of `least` to `most` decimal digits, no sign and no blank.
std::optional<int> ParseDigits(std::string_view text, std::size_t least, std::size_t most) {
    if (text.size() < least || text.size() > most) {
        return std::nullopt;
    }
    int number = 0;
    for (const char digit : text) {
        if (digit < '0' || digit > '9') {
            return std::nullopt;
        }
        number = number * 10 + (digit - '0');
    }
    return number;
}

bool InRange(int number, int least, int most) {
    return number >= least && number <= most;
}

std::string OutOfRange(const char* name, int number, const char* range) {
    return std::string(name) + " " + std::to_string(number) + " is not " + range;
}

std::string ImpossibleDays(const Schedule& schedule) {
    if (schedule.dateType == kOnWeekdays) {
        return ParseWeekName(schedule.weekName) ? "" : "week_name is no list of days 0 to 6";
    }
    if (!ParseDate(schedule.date)) {
        return "date is no day in the form YYYY/M/D";
    }
    return InRange(schedule.repeat, kOnce, kYearly) ? "" : OutOfRange("repeat", schedule.repeat, "0 to 4");
}

}  // namespace

int DaysInMonth(int year, int month) {
    constexpr int kDays[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
    return month == 2 && IsLeapYear(year) ? 29 : kDays[month - 1];
}

int WeekdayOf(const Date& date) {
    // Zeller's congruence, shifted so that Sunday is 0; January and February belong to the year before.
    const int month = date.month < 3 ? date.month + 12 : date.month;
    const int year = date.month < 3 ? date.year - 1 : date.year;
    const int fromSaturday = (date.day + 13 * (month + 1) / 5 + year + year / 4 - year / 100 + year / 400) % 7;
    return (fromSaturday + 6) % 7;
}

Date Today() {
    const std::time_t now = std::time(nullptr);
    std::tm local = {};
    localtime_r(&now, &local);
    return {local.tm_year + 1900, local.tm_mon + 1, local.tm_mday};
}

std::optional<Date> ParseDate(std::string_view text) {
    const std::vector<std::string> parts = Split(text, "/");
    if (parts.size() != 3) {
        return std::nullopt;
    }
    const std::optional<int> year = ParseDigits(parts[0], 4, 4);
    const std::optional<int> month = ParseDigits(parts[1], 1, 2);
    const std::optional<int> day = ParseDigits(parts[2], 1, 2);
    if (!year || !month || !day || *year < kFirstYear || !InRange(*month, 1, 12) ||
        !InRange(*day, 1, DaysInMonth(*year, *month))) {
        return std::nullopt;
    }
    return Date{*year, *month, *day};
}

std::optional<std::vector<int>> ParseWeekName(std::string_view text) {
    std::vector<int> days;
    for (const std::string& part : Split(text, ",")) {
        const std::optional<int> day = ParseDigits(part, 1, 1);
        if (!day || *day > 6) {
            return std::nullopt;
        }
        days.push_back(*day);
    }
    if (days.empty()) {
        return std::nullopt;
    }
    std::sort(days.begin(), days.end());
    days.erase(std::unique(days.begin(), days.end()), days.end());
    return days;
}

std::string Impossible(const Schedule& schedule) {
    if (schedule.dateType != kOnWeekdays && schedule.dateType != kFromDate) {
        return OutOfRange("date_type", schedule.dateType, "0 or 1");
    }
    if (!InRange(schedule.hour, 0, 23)) {
        return OutOfRange("hour", schedule.hour, "0 to 23");
    }
    if (!InRange(schedule.minute, 0, 59)) {
        return OutOfRange("min", schedule.minute, "0 to 59");
    }
    if (!InRange(schedule.repeatHour, 0, 23)) {
        return OutOfRange("repeat_hour", schedule.repeatHour, "0 to 23");
    }
    if (!InRange(schedule.lastWorkHour, 0, 23)) {
        return OutOfRange("last_work_hour", schedule.lastWorkHour, "0 to 23");
    }
    if (schedule.repeatHour > 0 && schedule.lastWorkHour < schedule.hour) {
        return "last_work_hour lies before hour";
    }
    for (const std::string* text : {&schedule.date, &schedule.weekName}) {
        if (text->size() > kLongestScheduleText || HasControlBytes(*text)) {
            return text == &schedule.date ? "date can't be stored" : "week_name can't be stored";
        }
    }
    return ImpossibleDays(schedule);
}

std::vector<int> RunHours(const Schedule& schedule) {
    std::vector<int> hours = {schedule.hour};
    if (schedule.repeatHour > 0) {
        for (int hour = schedule.hour + schedule.repeatHour; hour <= schedule.lastWorkHour;
             hour += schedule.repeatHour) {
            hours.push_back(hour);
        }
    }
    return hours;
}

bool IsOver(const Schedule& schedule, const Date& today) {
    if (schedule.dateType != kFromDate || schedule.repeat != kOnce) {
        return false;
    }
    const std::optional<Date> date = ParseDate(schedule.date);
    return date && *date < today;
}

}  // namespace appliance
