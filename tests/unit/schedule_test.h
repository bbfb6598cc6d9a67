// What the tests of the schedule share: tasks in the scheduler, and calls of the two methods.

#ifndef VORN_TESTS_UNIT_SCHEDULE_TEST_H
#define VORN_TESTS_UNIT_SCHEDULE_TEST_H

#include <string>
#include <vector>

#include "src/api_table.h"
#include "src/domain_schedule.h"
#include "tests/unit/handler_step.h"

namespace unit {

constexpr const char* kRefreshCommand = "/usr/vorn/sbin/vornwin -updateDomain";

// Complete requests of each kind.
constexpr const char* kOnWeekdays = R"({"date_type": 0, "week_name": "0,6", "hour": 3, "min": 30})";
constexpr const char* kFromDate = R"({"date_type": 1, "date": "2026/11/29", "repeat": 1, "hour": 3, "min": 30})";
constexpr const char* kNever = R"({"date_type": 2})";

// What a request of kOnWeekdays gives the scheduler.
constexpr const char* kWeekdaysSchedule =
    R"({"date":"","date_type":0,"hour":3,"last_work_hour":0,"min":30,"repeat":0,"repeat_hour":0,"week_name":"0,6"})";

class ScheduleTest : public ModuleTest {
protected:
    using Step = unit::Step<DomainScheduleHandler>;

    ScheduleTest() {
        state.joinedFlag = 1;
    }

    fake::Answer Get() {
        return Call(DomainScheduleGet);
    }

    fake::Answer Set(const std::string& parameters) {
        return Call(DomainScheduleSet, FromJson(parameters));
    }

    void AddTask(int id, const std::string& command = kRefreshCommand, const std::string& schedule = "{}") {
        fake::ScheduledTask task;
        task.id = id;
        task.command = command;
        task.schedule = FromJson(schedule);
        state.scheduledTasks.push_back(task);
    }

    std::vector<int> TaskIds() const {
        std::vector<int> ids;
        for (const fake::ScheduledTask& task : state.scheduledTasks) {
            ids.push_back(task.id);
        }
        return ids;
    }

    // The calls without the log and without what the filter calls for each task, null included.
    std::vector<std::string> Steps() const {
        return CallsWithout(appliance, {"syslog", "VLIBCErrSetEx", "VORNSchedCTaskGetCommand"});
    }

    // The line that the filter writes for the null task, which every listing gives it.
    static ::testing::Matcher<const fake::LogLine&> NullTaskLine() {
        return Logs("domain_schedule.cpp", "%s:%d Invaild Argument (%s)=[%d]\n", "Invaild Argument (0 != pTask)=[0]\n");
    }

    static ::testing::Matcher<const fake::LogLine&> Line(const std::string& format, const std::string& message) {
        return Logs("domain_schedule.cpp", "%s:%d " + format, message);
    }

    // The line of a failing call, whose format ends in the last error.
    static ::testing::Matcher<const fake::LogLine&> FailureLine(const std::string& text, const std::string& function) {
        return Line(text + "[0x%04X %s:%d]", text + ErrorAfter(function));
    }
};

}  // namespace unit

#endif
