#include "tests/appliance/system/cron_model.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <ctime>
#include <iomanip>
#include <ostream>
#include <regex>
#include <sstream>

namespace cron_model {

namespace {

constexpr std::int64_t kDaySeconds = 86400;

std::set<int> Field(const std::string& text, int least, int most) {
    std::set<int> numbers;
    if (text == "*") {
        for (int number = least; number <= most; ++number) {
            numbers.insert(number);
        }
        return numbers;
    }
    std::istringstream stream(text);
    for (std::string part; std::getline(stream, part, ',');) {
        EXPECT_TRUE(std::regex_match(part, std::regex("[0-9]{1,2}"))) << text;
        const int number = std::stoi(part);
        EXPECT_TRUE(number >= least && number <= most) << text;
        numbers.insert(number);
    }
    return numbers;
}

std::string Unescaped(const std::string& command) {
    std::string text;
    for (std::size_t place = 0; place < command.size(); ++place) {
        if (command[place] == '\\' && place + 1 < command.size()) {
            // Cron takes a backslash and its next byte together, and drops the backslash in front of a percent sign.
            if (command[place + 1] != '%') {
                text += command[place];
            }
            text += command[++place];
            continue;
        }
        EXPECT_NE(command[place], '%') << "the command ends at a bare percent sign: " << command;
        text += command[place];
    }
    return text;
}

bool FieldsMatch(const Line& line, const Day& day) {
    if (line.fields[3].count(day.month) == 0) {
        return false;
    }
    const bool onDay = line.fields[2].count(day.day) != 0;
    const bool onWeekday = line.fields[4].count(day.weekday) != 0;
    return line.anyDay || line.anyWeekday ? onDay && onWeekday : onDay || onWeekday;
}

// Reads "if CONDITION && CONDITION; then exec COMMAND; fi"; a plain "exec COMMAND" has none.
std::vector<Condition> ConditionsOf(const std::string& command) {
    static const std::regex kGuarded(R"(if (.*?); then exec .*; fi)");
    static const std::regex kCompared(R"re(\[ "\$\(date \+%Y%m%d\)" (-ge|=) ([0-9]{8}) \])re");
    static const std::string kLastDay = R"re([ "$(date -d 'tomorrow 12:00' +%d)" = 01 ])re";
    std::vector<Condition> conditions;
    std::smatch guarded;
    if (!std::regex_match(command, guarded, kGuarded)) {
        EXPECT_EQ(command.rfind("exec ", 0), 0U) << command;
        return conditions;
    }
    std::string rest = guarded[1];
    while (!rest.empty()) {
        const std::size_t end = rest.find(" && ");
        const std::string condition = rest.substr(0, end);
        rest = end == std::string::npos ? "" : rest.substr(end + 4);
        std::smatch compared;
        if (std::regex_match(condition, compared, kCompared)) {
            const auto kind = compared[1] == "=" ? Condition::Kind::On : Condition::Kind::From;
            conditions.push_back({kind, std::stoi(compared[2])});
        } else {
            EXPECT_EQ(condition, kLastDay);
            conditions.push_back({Condition::Kind::LastOfMonth, 0});
        }
    }
    return conditions;
}

bool Holds(const Condition& condition, DayNumber number) {
    if (condition.kind == Condition::Kind::LastOfMonth) {
        return DayOf(number + 1).day == 1;
    }
    const Day day = DayOf(number);
    const int today = day.year * 10000 + day.month * 100 + day.day;
    return condition.kind == Condition::Kind::On ? today == condition.date : today >= condition.date;
}

bool ConditionsHold(const Line& line, DayNumber number) {
    return std::all_of(line.conditions.begin(), line.conditions.end(),
                       [number](const Condition& condition) { return Holds(condition, number); });
}

}  // namespace

Day DayOf(DayNumber number) {
    const std::time_t seconds = number * kDaySeconds;
    std::tm parts = {};
    gmtime_r(&seconds, &parts);
    return {parts.tm_year + 1900, parts.tm_mon + 1, parts.tm_mday, parts.tm_wday};
}

DayNumber NumberOf(int year, int month, int day) {
    std::tm parts = {};
    parts.tm_year = year - 1900;
    parts.tm_mon = month - 1;
    parts.tm_mday = day;
    return timegm(&parts) / kDaySeconds;
}

std::vector<Line> Lines(const std::string& table) {
    std::vector<Line> lines;
    EXPECT_TRUE(table.empty() || table.back() == '\n');
    std::istringstream stream(table);
    for (std::string text; std::getline(stream, text);) {
        if (text.empty() || text[0] == '#' || std::regex_match(text, std::regex("[A-Z]+=.*"))) {
            continue;
        }
        static const std::regex kLine(R"((\S+) (\S+) (\S+) (\S+) (\S+) (\S+) (.*))");
        std::smatch parts;
        if (!std::regex_match(text, parts, kLine)) {
            ADD_FAILURE() << text;
            continue;
        }
        EXPECT_LT(parts[7].length(), 1000) << "cron takes no longer command";
        Line line;
        line.fields = {Field(parts[1], 0, 59), Field(parts[2], 0, 23), Field(parts[3], 1, 31), Field(parts[4], 1, 12),
                       Field(parts[5], 0, 6)};
        line.anyDay = parts[3] == "*";
        line.anyWeekday = parts[5] == "*";
        line.user = parts[6];
        line.command = Unescaped(parts[7]);
        line.conditions = ConditionsOf(line.command);
        lines.push_back(line);
    }
    return lines;
}

void PrintTo(const Moment& moment, std::ostream* stream) {
    const Day day = DayOf(moment.day);
    *stream << day.year << '/' << day.month << '/' << day.day << ' ' << std::setfill('0') << std::setw(2)
            << moment.minute / 60 << ':' << std::setw(2) << moment.minute % 60;
}

std::vector<Moment> Runs(const std::vector<Line>& lines, DayNumber first, DayNumber last, std::size_t count) {
    std::vector<Moment> runs;
    for (DayNumber number = first; number <= last && runs.size() < count; ++number) {
        const Day day = DayOf(number);
        std::multiset<int> minutes;
        for (const Line& line : lines) {
            if (!FieldsMatch(line, day) || !ConditionsHold(line, number)) {
                continue;
            }
            for (const int hour : line.fields[1]) {
                for (const int minute : line.fields[0]) {
                    minutes.insert(hour * 60 + minute);
                }
            }
        }
        for (const int minute : minutes) {
            runs.push_back({number, minute});
        }
    }
    if (runs.size() > count) {
        runs.resize(count);
    }
    return runs;
}

}  // namespace cron_model
