// Where a log line comes from.
//
// Every line in the system log begins with "unit:number ". The unit is one of two names, whichever file logs. The number
// is 1000 times the number of the file, as listed here, plus the line in that file: "domain.cpp:6042" was written by
// line 42 of domain/join.cpp. So a number leads to one statement also where a unit has several files.
//
// Everything is logged at LOG_ERR, also what is not an error: the appliance keeps nothing below it.

#ifndef VORN_SRC_SUPPORT_LOG_H
#define VORN_SRC_SUPPORT_LOG_H

#include <syslog.h>

#include "platform/core.h"

constexpr const char* kDomainUnit = "domain.cpp";
constexpr const char* kScheduleUnit = "domain_schedule.cpp";

// The files that log. tests/unit/log_numbers_test.cpp holds this list against the sources.
enum class LogFile : int {
    kHandlerRules = 1,        // support/handler_rules.cpp, for both units
    kMembershipState = 2,     // domain/membership_state.cpp
    kStatus = 3,              // domain/status.cpp
    kSet = 4,                 // domain/set.cpp
    kMembership = 5,          // domain/membership.cpp
    kJoin = 6,                // domain/join.cpp
    kJoinFailure = 7,         // domain/join_failure.cpp
    kDnsList = 8,             // domain/dns_list.cpp
    kAdvancedOptions = 9,     // domain/advanced_options.cpp
    kAdditionalOptions = 10,  // domain/additional_options.cpp
    kDomainList = 11,         // domain/domain_list.cpp
    kUpdate = 12,             // domain/update.cpp
    kSchedule = 13,           // domain_schedule.cpp
    kScheduleStore = 14,      // domain_schedule_store.cpp
};

constexpr int kLogLinesPerFile = 1000;

constexpr int LogNumber(LogFile file, int line) {
    return static_cast<int>(file) * kLogLinesPerFile + line;
}

// The number of a log line at this place of `file`.
#define LOG_NUMBER(file) LogNumber(LogFile::file, __LINE__)

// The platform's last error, read in a fixed order (the order in which arguments are evaluated is the compiler's).
struct PlatformError {
    int code = VLIBCErrGet();
    const char* file = VLIBCErrorGetFile();
    int line = VLIBCErrorGetLine();

    // For "%04X", which takes an unsigned number.
    unsigned Code() const {
        return static_cast<unsigned>(code);
    }
};

#endif
