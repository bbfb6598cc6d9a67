// What cron and the shell make of a table, read from its text alone.

#ifndef VORN_TESTS_APPLIANCE_SYSTEM_CRON_MODEL_H
#define VORN_TESTS_APPLIANCE_SYSTEM_CRON_MODEL_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <set>
#include <string>
#include <vector>

namespace cron_model {

// Days since 1970-01-01, and a day as it stands in a calendar.
using DayNumber = std::int64_t;

struct Day {
    int year = 0;
    int month = 0;
    int day = 0;
    int weekday = 0;
};

Day DayOf(DayNumber number);
DayNumber NumberOf(int year, int month, int day);

// What the shell asks date(1) ahead of a command.
struct Condition {
    enum class Kind { From, On, LastOfMonth };
    Kind kind = Kind::From;
    int date = 0;  // From, On: as a number, 20261129
};

// A line of the table: the numbers of each field, and what follows.
struct Line {
    std::array<std::set<int>, 5> fields;  // minute, hour, day of the month, month, weekday
    bool anyDay = false;                  // the third field is "*"
    bool anyWeekday = false;              // the fifth field is "*"
    std::string user;
    std::vector<Condition> conditions;
    std::string command;  // as the shell gets it: "\%" is a percent sign
};

// The lines that run something. Fails the test when a line is none that cron takes.
std::vector<Line> Lines(const std::string& table);

// A moment: a day and a minute of it.
struct Moment {
    DayNumber day = 0;
    int minute = 0;
};
inline bool operator==(const Moment& first, const Moment& second) {
    return first.day == second.day && first.minute == second.minute;
}
inline bool operator<(const Moment& first, const Moment& second) {
    return first.day != second.day ? first.day < second.day : first.minute < second.minute;
}
void PrintTo(const Moment& moment, std::ostream* stream);

// The first `count` moments from `first` to `last` (days) at which the lines run their command: the fields match as
// cron matches them, and the conditions of the line hold.
std::vector<Moment> Runs(const std::vector<Line>& lines, DayNumber first, DayNumber last, std::size_t count);

}  // namespace cron_model

#endif
