// A schedule's runs: what cron's table makes of it against a calculation that knows only docs/schedule.md.

#include <algorithm>
#include <cstdlib>
#include <random>
#include <string>
#include <vector>

#include "appliance/platform/system/cron_line.h"
#include "appliance/platform/system/schedule.h"
#include "tests/appliance/system/cron_model.h"
#include "tests/appliance/system/system_test.h"

namespace {

using appliance::Schedule;
using cron_model::Day;
using cron_model::DayNumber;
using cron_model::DayOf;
using cron_model::Moment;
using cron_model::NumberOf;

constexpr std::size_t kRuns = 500;
constexpr const char* kCommand = "/usr/vorn/sbin/vornwin -updateDomain";

std::string Table(const Schedule& schedule) {
    std::string table = appliance::CronTableHead();
    for (const std::string& line : appliance::CronLines(schedule, kCommand)) {
        table += line;
    }
    return table;
}

std::vector<int> MinutesOfDay(const Schedule& schedule) {
    std::vector<int> minutes;
    for (int hour = schedule.hour; hour < 24; ++hour) {
        const int later = hour - schedule.hour;
        const bool runs = later == 0 || (schedule.repeatHour != 0 && later % schedule.repeatHour == 0 &&
                                         hour <= schedule.lastWorkHour);
        if (runs) {
            minutes.push_back(hour * 60 + schedule.minute);
        }
    }
    return minutes;
}

// The day of a month, or the month's last one when it is shorter.
DayNumber InMonth(int year, int month, int day) {
    const DayNumber last = NumberOf(month == 12 ? year + 1 : year, month == 12 ? 1 : month + 1, 1) - 1;
    return std::min<DayNumber>(NumberOf(year, month, 1) + day - 1, last);
}

// The run days of a schedule that counts from `first`, at most `count`.
std::vector<DayNumber> DaysFrom(const Day& first, int repeat, std::size_t count) {
    const DayNumber start = NumberOf(first.year, first.month, first.day);
    std::vector<DayNumber> days;
    for (int step = 0; days.size() < count; ++step) {
        const int months = first.month - 1 + step;
        switch (repeat) {
            case 0:
                return {start};
            case 1:
                days.push_back(start + step);
                break;
            case 2:
                days.push_back(start + 7 * step);
                break;
            case 3:
                days.push_back(InMonth(first.year + months / 12, months % 12 + 1, first.day));
                break;
            default:
                days.push_back(InMonth(first.year + step, first.month, first.day));
                break;
        }
    }
    return days;
}

std::vector<DayNumber> DaysOnWeekdays(const std::string& weekName, DayNumber first, std::size_t count) {
    std::vector<DayNumber> days;
    for (DayNumber number = first; days.size() < count; ++number) {
        if (weekName.find(static_cast<char>('0' + DayOf(number).weekday)) != std::string::npos) {
            days.push_back(number);
        }
    }
    return days;
}

std::vector<Moment> Expected(const std::vector<DayNumber>& days, const Schedule& schedule) {
    std::vector<Moment> moments;
    for (const DayNumber day : days) {
        for (const int minute : MinutesOfDay(schedule)) {
            if (moments.size() < kRuns) {
                moments.push_back({day, minute});
            }
        }
    }
    return moments;
}

std::string DateText(const Day& day) {
    return std::to_string(day.year) + "/" + std::to_string(day.month) + "/" + std::to_string(day.day);
}

// Compares from a year before the first day, so that a run ahead of it shows.
void ExpectSameRuns(const Schedule& schedule, const Day& first) {
    ASSERT_EQ(appliance::Impossible(schedule), "");
    const std::string table = Table(schedule);
    const std::vector<cron_model::Line> lines = cron_model::Lines(table);
    const DayNumber start = NumberOf(first.year, first.month, first.day);
    const bool fromDate = schedule.dateType == appliance::kFromDate;
    const std::vector<DayNumber> days =
        fromDate ? DaysFrom(first, schedule.repeat, kRuns) : DaysOnWeekdays(schedule.weekName, start, kRuns);
    const std::vector<Moment> expected = Expected(days, schedule);
    constexpr DayNumber kBeyond = 1500;  // days after the last expected run, in which a surplus one shows
    EXPECT_EQ(cron_model::Runs(lines, fromDate ? start - 366 : start, expected.back().day + kBeyond, kRuns), expected)
        << table;
    for (const cron_model::Line& line : lines) {
        EXPECT_EQ(line.user, "root");
    }
}

TEST(ScheduleRuns, AreThoseOfAnIndependentCalculation) {
    std::mt19937 random(20261129);
    const auto number = [&random](int least, int most) { return std::uniform_int_distribution<>(least, most)(random); };
    for (int round = 0; round < 250; ++round) {
        Schedule schedule;
        schedule.hour = number(0, 23);
        schedule.minute = number(0, 59);
        schedule.repeatHour = number(0, 2) == 0 ? 0 : number(1, 23);
        schedule.lastWorkHour = number(schedule.repeatHour == 0 ? 0 : schedule.hour, 23);
        const Day first = DayOf(NumberOf(1999, 1, 1) + number(0, 40000));
        if (number(0, 4) == 0) {
            schedule.dateType = appliance::kOnWeekdays;
            for (int left = number(1, 9); left > 0; --left) {
                schedule.weekName += (schedule.weekName.empty() ? "" : ",") + std::to_string(number(0, 6));
            }
        } else {
            schedule.dateType = appliance::kFromDate;
            schedule.date = DateText(first);
            schedule.repeat = number(0, 4);
        }
        ExpectSameRuns(schedule, first);
        if (HasFailure()) {
            return;
        }
    }
}

TEST(ScheduleRuns, FallOnTheLastDayOfAShorterMonth) {
    for (const Day& first : {Day{2027, 1, 28, 0}, Day{2027, 1, 29, 0}, Day{2027, 1, 30, 0}, Day{2027, 1, 31, 0},
                             Day{2028, 2, 29, 0}, Day{2096, 2, 29, 0}, Day{2027, 2, 28, 0}, Day{2026, 12, 31, 0}}) {
        for (const int repeat : {appliance::kMonthly, appliance::kYearly}) {
            Schedule schedule;
            schedule.dateType = appliance::kFromDate;
            schedule.date = DateText(first);
            schedule.repeat = repeat;
            schedule.hour = 3;
            ExpectSameRuns(schedule, first);
        }
    }
}

// The shell and date(1) themselves judge the conditions, with a date that says which day it is.
TEST(ScheduleRuns, HaveConditionsThatTheShellJudgesTheSameWay) {
    char folder[] = "/tmp/vorn-date-XXXXXX";
    ASSERT_NE(mkdtemp(folder), nullptr);
    const std::string date = std::string(folder) + "/date";
    const std::string script =
        "#!/bin/sh\nif [ \"$1\" = -d ]; then exec /bin/date -d \"$DAY 12:00 +1 day\" \"$3\"; fi\n"
        "exec /bin/date -d \"$DAY\" \"$1\"\n";
    ASSERT_EQ(std::system(("printf '%s' '" + script + "' > " + date + " && chmod 755 " + date).c_str()), 0);
    Schedule schedule;
    schedule.dateType = appliance::kFromDate;
    schedule.date = "2027/1/31";
    schedule.repeat = appliance::kMonthly;
    int runs = 0;
    for (const std::string& text : appliance::CronLines(schedule, "touch " + std::string(folder) + "/ran")) {
        const cron_model::Line line = cron_model::Lines(text).at(0);
        for (const DayNumber number : {NumberOf(2026, 12, 31), NumberOf(2027, 1, 31), NumberOf(2027, 2, 28),
                                       NumberOf(2028, 2, 28), NumberOf(2028, 2, 29)}) {
            const std::string day = DateText(DayOf(number));
            const std::string ran = std::string(folder) + "/ran";
            static_cast<void>(std::remove(ran.c_str()));
            const std::string run = "cd / && DAY=" + day + " PATH=" + folder + ":$PATH sh -c \"$COMMAND\"";
            ASSERT_EQ(setenv("COMMAND", line.command.c_str(), 1), 0);
            ASSERT_EQ(std::system(run.c_str()), 0) << line.command;
            // Only the conditions count here, so the fields are made to match.
            cron_model::Line anyDay = line;
            anyDay.fields[2] = {DayOf(number).day};
            anyDay.fields[3] = {DayOf(number).month};
            const bool holds = !cron_model::Runs({anyDay}, number, number, 1).empty();
            EXPECT_EQ(std::system(("test -e " + ran).c_str()) == 0, holds) << day << ": " << line.command;
            runs += holds ? 1 : 0;
        }
    }
    EXPECT_EQ(runs, 3 * 4 + 3);  // three lines on the four days from the first on, the fourth on those that end a month
    ASSERT_EQ(unsetenv("COMMAND"), 0);
    ASSERT_EQ(std::system(("rm -r " + std::string(folder)).c_str()), 0);
}

}  // namespace
