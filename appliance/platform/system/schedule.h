// When a task runs. docs/schedule.md says the same for administrators.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_SCHEDULE_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_SCHEDULE_H

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace appliance {

// Values of Schedule::dateType.
inline constexpr int kOnWeekdays = 0;
inline constexpr int kFromDate = 1;
inline constexpr int kNever = 2;  // says that there is no schedule, so it is never stored

// Values of Schedule::repeat.
inline constexpr int kOnce = 0;
inline constexpr int kDaily = 1;
inline constexpr int kWeekly = 2;
inline constexpr int kMonthly = 3;
inline constexpr int kYearly = 4;

// The eight values of a schedule, as they were set: what the kind has no use for is kept, too.
struct Schedule {
    int dateType = kNever;
    std::string date;  // kFromDate: the first day, "2026/11/29"
    int hour = 0;
    int lastWorkHour = 0;  // with repeatHour: the last hour of the day at which a run may start
    int minute = 0;
    int repeat = kOnce;    // kFromDate: how the days count on from the first
    int repeatHour = 0;    // 0: one run on a day; N: a run every N hours from `hour` on
    std::string weekName;  // kOnWeekdays: "0,6", 0 is Sunday
};

struct Date {
    int year = 0;
    int month = 0;  // 1 to 12
    int day = 0;
};

inline bool operator==(const Date& first, const Date& second) {
    return first.year == second.year && first.month == second.month && first.day == second.day;
}
inline bool operator<(const Date& first, const Date& second) {
    if (first.year != second.year) {
        return first.year < second.year;
    }
    return first.month != second.month ? first.month < second.month : first.day < second.day;
}

int DaysInMonth(int year, int month);
// 0 is Sunday.
int WeekdayOf(const Date& date);
// The present day in local time.
Date Today();

// A date "YYYY/M/D" that exists: the year has four digits (1970 or later), month and day one or two.
std::optional<Date> ParseDate(std::string_view text);

// The days of a week name in ascending order, each once; nothing when it is none: numbers 0 to 6 of one digit,
// separated by one comma each.
std::optional<std::vector<int>> ParseWeekName(std::string_view text);

// The longest text value of a schedule, in bytes.
inline constexpr std::size_t kLongestScheduleText = 255;

// What is impossible about the schedule, in words for a log line; empty when it can be kept.
std::string Impossible(const Schedule& schedule);

// The hours at which a possible schedule runs on a day, ascending, at least one.
std::vector<int> RunHours(const Schedule& schedule);

// True when a possible schedule has no run left on `today` or later.
bool IsOver(const Schedule& schedule, const Date& today);

}  // namespace appliance

#endif
