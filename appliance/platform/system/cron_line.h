// A task's schedule as lines of cron's table.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_CRON_LINE_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_CRON_LINE_H

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "appliance/platform/system/schedule.h"

namespace appliance {

// The longest command of a task after QuoteForCron, in bytes. Cron ignores a table that has one command of 1000 bytes,
// and the guard takes its share.
inline constexpr std::size_t kLongestQuotedCommand = 750;

// The command as one word for the shell inside a line of the table: cron takes "\%" for a percent sign, and a bare one
// for the end of the command. The text holds no control byte.
std::string QuoteForCron(std::string_view command);

// The lines, each with its newline, that run `command` as root by a possible schedule, with nothing in its environment
// but HOME=/, LC_ALL=C and PATH. Cron knows no first day, no year and no last day of a month: where the schedule needs
// these the line asks date(1) first.
std::vector<std::string> CronLines(const Schedule& schedule, std::string_view command);

// What stands in front of the lines: comments and settings.
std::string CronTableHead();

}  // namespace appliance

#endif
