#include "appliance/platform/system/cron_line.h"

#include <cstdio>

namespace appliance {

namespace {

constexpr const char kPathSetting[] = "PATH=/usr/sbin:/usr/bin:/sbin:/bin";

// The last three of the five fields, and what date(1) must say on the day.
struct Days {
    std::string days = "*";
    std::string months = "*";
    std::string weekdays = "*";
    std::vector<std::string> guards = {};
};

std::string Joined(const std::vector<int>& numbers) {
    std::string text;
    for (const int number : numbers) {
        text += (text.empty() ? "" : ",") + std::to_string(number);
    }
    return text;
}

std::string Number(const Date& date) {
    char text[40];
    std::snprintf(text, sizeof(text), "%04d%02d%02d", date.year, date.month, date.day);
    return text;
}

std::string TodayIs(const char* comparison, const Date& date) {
    return R"sh([ "$(date +\%Y\%m\%d)" )sh" + std::string(comparison) + " " + Number(date) + " ]";
}

// Noon exists on every day, also on those on which the clock is put forward.
std::string TomorrowIsTheFirst() {
    return R"sh([ "$(date -d 'tomorrow 12:00' +\%d)" = 01 ])sh";
}

// A month that lacks the day has its run on its last day.
std::vector<Days> MonthlyDays(const Date& first) {
    const std::string fromThen = TodayIs("-ge", first);
    std::vector<Days> lines = {{std::to_string(first.day), "*", "*", {fromThen}}};
    if (first.day > 30) {
        lines.push_back({"30", "4,6,9,11", "*", {fromThen}});
    }
    if (first.day > 29) {
        lines.push_back({"29", "2", "*", {fromThen}});
    }
    if (first.day > 28) {
        lines.push_back({"28", "2", "*", {fromThen, TomorrowIsTheFirst()}});
    }
    return lines;
}

std::vector<Days> YearlyDays(const Date& first) {
    const std::string fromThen = TodayIs("-ge", first);
    std::vector<Days> lines = {{std::to_string(first.day), std::to_string(first.month), "*", {fromThen}}};
    if (first.month == 2 && first.day == 29) {
        lines.push_back({"28", "2", "*", {fromThen, TomorrowIsTheFirst()}});
    }
    return lines;
}

std::vector<Days> DaysFrom(const Date& first, int repeat) {
    switch (repeat) {
        case kDaily:
            return {{"*", "*", "*", {TodayIs("-ge", first)}}};
        case kWeekly:
            return {{"*", "*", std::to_string(WeekdayOf(first)), {TodayIs("-ge", first)}}};
        case kMonthly:
            return MonthlyDays(first);
        case kYearly:
            return YearlyDays(first);
        default:
            return {{std::to_string(first.day), std::to_string(first.month), "*", {TodayIs("=", first)}}};
    }
}

std::vector<Days> DaysOf(const Schedule& schedule) {
    if (schedule.dateType == kOnWeekdays) {
        return {{"*", "*", Joined(ParseWeekName(schedule.weekName).value_or(std::vector<int>{})), {}}};
    }
    const std::optional<Date> first = ParseDate(schedule.date);
    return first ? DaysFrom(*first, schedule.repeat) : std::vector<Days>{};
}

}  // namespace

std::string QuoteForCron(std::string_view command) {
    std::string word = "'";
    char before = '\'';
    for (const char byte : command) {
        if (byte == '\'') {
            word += R"('\'')";
        } else if (byte == '%') {
            // A backslash of the command in front would make cron read "\\" and a bare percent sign: the quotes that
            // are closed and opened again part the two.
            word += before == '\\' ? R"(''\%)" : R"(\%)";
        } else {
            word += byte;
        }
        before = byte;
    }
    return word + "'";
}

std::vector<std::string> CronLines(const Schedule& schedule, std::string_view command) {
    const std::string run =
        "exec env -i HOME=/ LC_ALL=C " + std::string(kPathSetting) + " sh -c -- " + QuoteForCron(command);
    std::vector<std::string> lines;
    for (const Days& days : DaysOf(schedule)) {
        std::string guard;
        for (const std::string& condition : days.guards) {
            guard += (guard.empty() ? "if " : " && ") + condition;
        }
        lines.push_back(std::to_string(schedule.minute) + " " + Joined(RunHours(schedule)) + " " + days.days + " " +
                        days.months + " " + days.weekdays + " root " +
                        (guard.empty() ? run : guard + "; then " + run + "; fi") + "\n");
    }
    return lines;
}

std::string CronTableHead() {
    return std::string(
               "# Made from the scheduled tasks of the appliance; changes are overwritten at the next save.\n") +
           "SHELL=/bin/sh\n" + kPathSetting + "\nMAILTO=\"\"\n";
}

}  // namespace appliance
