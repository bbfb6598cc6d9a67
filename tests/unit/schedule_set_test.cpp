// "set" of the schedule: a task is made, rewritten or removed.

#include <string>
#include <vector>

#include "tests/unit/schedule_test.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::FromJson;
using unit::kFromDate;
using unit::kNever;
using unit::kOnWeekdays;
using unit::kRefreshCommand;
using unit::kWeekdaysSchedule;
using unit::Succeeds;

class ScheduleSet : public unit::ScheduleTest {
protected:
    // The line that ends a saving that failed.
    static ::testing::Matcher<const fake::LogLine&> LastLine() {
        return Line("set update period to crontab fail", "set update period to crontab fail");
    }

    static ::testing::Matcher<const fake::LogLine&> NotJoinedLine() {
        return Line("Domain not enable", "Domain not enable");
    }

    // The steps behind the checks of the parameters.
    std::vector<std::string> Work() const {
        return unit::CallsWithout(appliance, {"syslog", "VLIBCErrSetEx", "VORNSchedCTaskGetCommand",
                                              "VORN::APIRequest::HasParam", "VORN::APIRequest::GetParam"});
    }

    const std::string converts =
        std::string("VORNSchedTaskConvertFromJson_Schedule({\"schedule\":") + kWeekdaysSchedule + "}, task)";
    const std::string setsCommand = R"(VORNSchedCTaskSetCommand(task, "/usr/vorn/sbin/vornwin -updateDomain"))";
};

TEST_F(ScheduleSet, MakesATask) {
    EXPECT_THAT(Set(kOnWeekdays), Succeeds("null"));
    ASSERT_EQ(state.scheduledTasks.size(), 1U);
    const fake::ScheduledTask& task = state.scheduledTasks[0];
    EXPECT_GE(task.id, 0);
    EXPECT_EQ(task.command, kRefreshCommand);
    EXPECT_FALSE(task.listable);
    EXPECT_EQ(task.schedule, FromJson(kWeekdaysSchedule));
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
}

TEST_F(ScheduleSet, MakesATaskInThisOrder) {
    Set(kOnWeekdays);
    EXPECT_THAT(Work(), ElementsAre("VORNWinsIsJoined()", "VORNSchedTaskAlloc()", "VORNSchedTaskListGet(list, filter)",
                                    "VORNSchedTaskLoad(-1, task)", converts, "VORNSchedCTaskSetListable(task, false)",
                                    setsCommand, "VORNSchedTaskSave(task)", "VORNSchedTaskFree(task)",
                                    "VORN::APIResponse::SetSuccess(null)"));
}

TEST_F(ScheduleSet, RewritesTheTaskThatIsThere) {
    AddTask(3, "/bin/true", R"({"hour": 1})");
    AddTask(9, kRefreshCommand, R"({"hour": 2})");
    AddTask(4, kRefreshCommand, R"({"hour": 3})");
    EXPECT_THAT(Set(kOnWeekdays), Succeeds("null"));
    EXPECT_THAT(TaskIds(), ElementsAre(3, 9, 4));
    EXPECT_EQ(state.scheduledTasks[0].schedule, FromJson(R"({"hour": 1})"));
    EXPECT_EQ(state.scheduledTasks[1].schedule, FromJson(kWeekdaysSchedule));
    EXPECT_EQ(state.scheduledTasks[2].schedule, FromJson(R"({"hour": 3})"));
    EXPECT_FALSE(state.scheduledTasks[1].listable);
    EXPECT_TRUE(state.scheduledTasks[2].listable);
}

TEST_F(ScheduleSet, RewritesTheTaskInThisOrder) {
    AddTask(9);
    Set(kOnWeekdays);
    EXPECT_THAT(Work(),
                ElementsAre("VORNWinsIsJoined()", "VORNSchedTaskAlloc()", "VORNSchedTaskListGet(list, filter)",
                            "VORNSchedTaskGetID(task)", "VORNSchedTaskListFree(list)", "VORNSchedTaskLoad(9, task)",
                            converts, "VORNSchedCTaskSetListable(task, false)", setsCommand, "VORNSchedTaskSave(task)",
                            "VORNSchedTaskFree(task)", "VORN::APIResponse::SetSuccess(null)"));
}

TEST_F(ScheduleSet, RewritesTheTaskOfTheIdZero) {
    AddTask(0);
    EXPECT_THAT(Set(kOnWeekdays), Succeeds("null"));
    EXPECT_THAT(TaskIds(), ElementsAre(0));
}

TEST_F(ScheduleSet, MakesOneTaskHoweverOftenItIsCalled) {
    Set(kOnWeekdays);
    Set(kFromDate);
    ASSERT_EQ(state.scheduledTasks.size(), 1U);
    EXPECT_EQ(state.scheduledTasks[0].schedule["date"], "2026/11/29");
    EXPECT_EQ(state.scheduledTasks[0].schedule["date_type"], 1);
}

TEST_F(ScheduleSet, MakesATaskWhenTheIdCannotBeRead) {
    AddTask(9);
    appliance.FailNth("VORNSchedTaskGetID", 1, Fault::Result(-1));
    EXPECT_THAT(Set(kOnWeekdays), Succeeds("null"));
    EXPECT_THAT(TaskIds(), ElementsAre(9, 10));
}

TEST_F(ScheduleSet, RemovesTheTaskWhenItIsNeverToRun) {
    AddTask(9);
    AddTask(4);
    EXPECT_THAT(Set(kNever), Succeeds("null"));
    EXPECT_THAT(TaskIds(), ElementsAre(4));
    EXPECT_THAT(Work(), ElementsAre("VORNWinsIsJoined()", "VORNSchedTaskListGet(list, filter)",
                                    "VORNSchedTaskGetID(task)", "VORNSchedTaskListFree(list)", "VORNSchedTaskRemove(9)",
                                    "VORN::APIResponse::SetSuccess(null)"));
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
}

TEST_F(ScheduleSet, HasNothingToRemoveWithoutATask) {
    EXPECT_THAT(Set(kNever), Succeeds("null"));
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskRemove"), 0);
}

TEST_F(ScheduleSet, SucceedsAlsoWhenTheTaskThatIsNeverToRunStays) {
    AddTask(9);
    appliance.FailNth("VORNSchedTaskRemove", 1, Fault::Result(-1));
    EXPECT_THAT(Set(kNever), Succeeds("null"));
    EXPECT_THAT(TaskIds(), ElementsAre(9));
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine(), Line("Failed to delete task %d. [0x%04X %s:%d]",
                                                                   "Failed to delete task 9. " +
                                                                       unit::ErrorAfter("VORNSchedTaskRemove"))));
    appliance.FailNth("VORNSchedTaskListGet", 2, Fault::Result(-1));
    EXPECT_THAT(Set(kNever), Succeeds("null"));
}

TEST_F(ScheduleSet, Answers2624OutsideADomainAndLeavesNoTask) {
    for (const char* parameters : {kOnWeekdays, kFromDate, kNever}) {
        Restart();
        AddTask(9);
        EXPECT_THAT(Set(parameters), FailsWith(2624)) << parameters;
        EXPECT_THAT(TaskIds(), IsEmpty());
        EXPECT_THAT(appliance.Logs(), ElementsAre(NotJoinedLine(), NullTaskLine()));
        EXPECT_THAT(Work(), ElementsAre("VORNWinsIsJoined()", "VORNSchedTaskListGet(list, filter)",
                                        "VORNSchedTaskGetID(task)", "VORNSchedTaskListFree(list)",
                                        "VORNSchedTaskRemove(9)", "VORN::APIResponse::SetError(2624, null)"));
    }
}

TEST_F(ScheduleSet, Answers2624OutsideADomainAlsoWithoutATask) {
    state.joinedFlag = 0;
    EXPECT_THAT(Set(kOnWeekdays), FailsWith(2624));
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskRemove"), 0);
    appliance.FailNth("VORNSchedTaskListGet", 2, Fault::Result(-1));
    EXPECT_THAT(Set(kOnWeekdays), FailsWith(2624));
}

TEST_F(ScheduleSet, SucceedsOutsideADomainWhenTheTaskStays) {
    state.joinedFlag = 0;
    AddTask(9);
    appliance.FailNth("VORNSchedTaskRemove", 1, Fault::Result(-1));
    EXPECT_THAT(Set(kOnWeekdays), Succeeds("null"));
    EXPECT_THAT(TaskIds(), ElementsAre(9));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(NotJoinedLine(), NullTaskLine(),
                            Line("Failed to delete task %d. [0x%04X %s:%d]",
                                 "Failed to delete task 9. " + unit::ErrorAfter("VORNSchedTaskRemove"))));
}

TEST_F(ScheduleSet, TakesEveryResultButZeroForAMembership) {
    for (const int joined : {1, 2, -1}) {
        Restart();
        state.joinedFlag = joined;
        EXPECT_THAT(Set(kOnWeekdays), Succeeds("null")) << joined;
    }
}

TEST_F(ScheduleSet, ChecksTheParametersBeforeTheMembership) {
    state.joinedFlag = 0;
    AddTask(9);
    EXPECT_THAT(Set(R"({"date_type": 0})"), FailsWith(2618));
    EXPECT_EQ(appliance.CountOf("VORNWinsIsJoined"), 0);
    EXPECT_THAT(TaskIds(), ElementsAre(9));
}

TEST_F(ScheduleSet, Answers2617WhenNoRecordIsToBeHad) {
    appliance.FailNth("VORNSchedTaskAlloc", 1, Fault::Null());
    EXPECT_THAT(Set(kOnWeekdays), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(), ElementsAre(FailureLine("alloc task failed.", "VORNSchedTaskAlloc"), LastLine()));
    EXPECT_THAT(Work(),
                ElementsAre("VORNWinsIsJoined()", "VORNSchedTaskAlloc()", "VLIBCErrGet()", "VLIBCErrorGetFile()",
                            "VLIBCErrorGetLine()", "VORN::APIResponse::SetError(2617, null)"));
}

TEST_F(ScheduleSet, MakesNoSecondTaskWhenTheTasksCannotBeListed) {
    AddTask(9);
    appliance.FailNth("VORNSchedTaskListGet", 1, Fault::Result(-1));
    EXPECT_THAT(Set(kOnWeekdays), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(FailureLine("get task list failed. ", "VORNSchedTaskListGet"), LastLine()));
    EXPECT_THAT(Work(), ElementsAre("VORNWinsIsJoined()", "VORNSchedTaskAlloc()", "VORNSchedTaskListGet(list, filter)",
                                    "VLIBCErrGet()", "VLIBCErrorGetFile()", "VLIBCErrorGetLine()",
                                    "VORNSchedTaskFree(task)", "VORN::APIResponse::SetError(2617, null)"));
    EXPECT_THAT(TaskIds(), ElementsAre(9));
}

// A step of the saving that fails: what it is called, how it fails, and its line without the last error.
struct Failure {
    std::string function;
    Fault fault;
    std::string format;
    std::string message;
    bool showsLastError;
};

const std::vector<Failure> kFailures = {
    {"VORNSchedTaskLoad", Fault::Result(-1), "load task failed. id:[%d] ", "load task failed. id:[9] ", true},
    {"VORNSchedTaskConvertFromJson_Schedule", Fault::False(), "Convert task from json (schedule) failed. ",
     "Convert task from json (schedule) failed. ", true},
    {"VORNSchedCTaskSetCommand", Fault::Result(-1), "Set command failed", "Set command failed", false},
    {"VORNSchedCTaskSetCommand", Fault::Result(1), "Set command failed", "Set command failed", false},
    {"VORNSchedTaskSave", Fault::Result(-1), "Save task failed. ", "Save task failed. ", true},
};

TEST_F(ScheduleSet, Answers2617AndLeavesTheTaskAsItWasWhenAStepFails) {
    for (const Failure& failure : kFailures) {
        SCOPED_TRACE(failure.function + " " + failure.fault.Text());
        Restart();
        state.joinedFlag = 1;
        AddTask(9, kRefreshCommand, R"({"hour": 2})");
        appliance.FailNth(failure.function, 1, failure.fault);
        EXPECT_THAT(Set(kOnWeekdays), FailsWith(2617));
        EXPECT_THAT(
            appliance.Logs(),
            ElementsAre(NullTaskLine(),
                        Line(failure.format + (failure.showsLastError ? "[0x%04X %s:%d]" : ""),
                             failure.message + (failure.showsLastError ? unit::ErrorAfter(failure.function) : "")),
                        LastLine()));
        ASSERT_THAT(TaskIds(), ElementsAre(9));
        EXPECT_EQ(state.scheduledTasks[0].schedule, FromJson(R"({"hour": 2})"));
        EXPECT_TRUE(state.scheduledTasks[0].listable);
    }
}

TEST_F(ScheduleSet, DoesNothingBehindTheStepThatFails) {
    for (const Failure& failure : kFailures) {
        SCOPED_TRACE(failure.function);
        Restart();
        state.joinedFlag = 1;
        appliance.FailNth(failure.function, 1, failure.fault);
        Set(kOnWeekdays);
        std::vector<std::string> expected = {"VORNWinsIsJoined()",
                                             "VORNSchedTaskAlloc()",
                                             "VORNSchedTaskListGet(list, filter)",
                                             "VORNSchedTaskLoad(-1, task)",
                                             converts,
                                             "VORNSchedCTaskSetListable(task, false)",
                                             setsCommand,
                                             "VORNSchedTaskSave(task)"};
        while (expected.back().compare(0, failure.function.size(), failure.function) != 0) {
            expected.pop_back();
        }
        if (failure.showsLastError) {
            expected.insert(expected.end(), {"VLIBCErrGet()", "VLIBCErrorGetFile()", "VLIBCErrorGetLine()"});
        }
        expected.insert(expected.end(), {"VORNSchedTaskFree(task)", "VORN::APIResponse::SetError(2617, null)"});
        EXPECT_EQ(Work(), expected);
    }
}

TEST_F(ScheduleSet, NamesTheIdOfATaskThatCannotBeMade) {
    appliance.FailNth("VORNSchedTaskLoad", 1, Fault::Result(-1));
    EXPECT_THAT(Set(kOnWeekdays), FailsWith(2617));
    ASSERT_EQ(appliance.Logs().size(), 3U);
    EXPECT_EQ(appliance.Logs()[1].message, "load task failed. id:[-1] " + unit::ErrorAfter("VORNSchedTaskLoad"));
}

TEST_F(ScheduleSet, TakesPositiveResultsForDone) {
    for (const char* function : {"VORNSchedTaskListGet", "VORNSchedTaskLoad", "VORNSchedTaskSave"}) {
        Restart();
        state.joinedFlag = 1;
        appliance.FailNth(function, 1, Fault::Result(1));
        EXPECT_THAT(Set(kOnWeekdays), Succeeds("null")) << function;
        EXPECT_EQ(state.scheduledTasks.size(), 1U);
    }
}

TEST_F(ScheduleSet, LeavesTimesThatCannotBeToTheScheduler) {
    EXPECT_THAT(Set(R"({"date_type": 0, "week_name": "0", "hour": 25, "min": 30})"), FailsWith(2617));
    EXPECT_THAT(state.scheduledTasks, IsEmpty());
    state.taskScheduleConvertible = false;
    EXPECT_THAT(Set(kOnWeekdays), FailsWith(2617));
    EXPECT_THAT(state.scheduledTasks, IsEmpty());
}

TEST_F(ScheduleSet, ThrowsForAnUncheckedValueThatCannotBeConverted) {
    for (const char* parameters : {R"({"date_type": 0, "week_name": "0", "hour": 3, "min": 30, "date": {}})",
                                   R"({"date_type": 0, "week_name": "0", "hour": 3, "min": 30, "repeat": "1"})",
                                   R"({"date_type": 1, "date": "", "repeat": 1, "hour": 3, "min": 3, "week_name": []})",
                                   R"({"date_type": 2, "hour": "3"})"}) {
        SCOPED_TRACE(parameters);
        Restart();
        state.joinedFlag = 1;
        AddTask(9);
        fake::Exchange exchange(FromJson(parameters));
        EXPECT_THROW(DomainScheduleSet(&exchange.request, &exchange.response), Json::Exception);
        EXPECT_THAT(appliance.Answers(), IsEmpty());
        EXPECT_THAT(Work(), ElementsAre("VORNWinsIsJoined()"));
        EXPECT_THAT(TaskIds(), ElementsAre(9));
    }
}

TEST_F(ScheduleSet, DoesNotConvertTheValuesOutsideADomain) {
    state.joinedFlag = 0;
    EXPECT_THAT(Set(R"({"date_type": 0, "week_name": "0", "hour": 3, "min": 30, "date": {}})"), FailsWith(2624));
}

}  // namespace
