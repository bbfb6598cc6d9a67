// "get" of the schedule.

#include <string>
#include <vector>

#include "tests/unit/schedule_test.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FromJson;
using unit::kRefreshCommand;
using unit::Succeeds;

constexpr const char* kNone = R"({"date_type": 2})";
constexpr const char* kSchedule = R"({"date_type": 0, "week_name": "0", "hour": 3, "min": 30})";

class ScheduleGet : public unit::ScheduleTest {};

TEST_F(ScheduleGet, AnswersTheTasksSchedule) {
    AddTask(5, kRefreshCommand, kSchedule);
    EXPECT_THAT(Get(), Succeeds(kSchedule));
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
}

TEST_F(ScheduleGet, AnswersTheScheduleUnchanged) {
    for (const char* schedule : {R"({"date_type": 1, "hour": 99, "unknown": [1, {"a": null}]})", "{}", "null"}) {
        state.scheduledTasks.clear();
        AddTask(5, kRefreshCommand, schedule);
        EXPECT_THAT(Get(), Succeeds(schedule));
    }
}

TEST_F(ScheduleGet, AsksTheSchedulerInThisOrder) {
    AddTask(5, kRefreshCommand, kSchedule);
    Get();
    EXPECT_THAT(Steps(),
                ElementsAre("VORNSchedTaskAlloc()", "VORNSchedTaskListGet(list, filter)", "VORNSchedTaskGetID(task)",
                            "VORNSchedTaskListFree(list)", "VORNSchedTaskLoad(5, task)",
                            "VORNSchedTaskConvertToJson_Schedule(task, value)", "VORNSchedTaskFree(task)",
                            R"(VORN::APIResponse::SetSuccess({"date_type":0,"hour":3,"min":30,"week_name":"0"}))"));
}

TEST_F(ScheduleGet, IsTheSameOutsideADomain) {
    state.joinedFlag = 0;
    AddTask(5, kRefreshCommand, kSchedule);
    EXPECT_THAT(Get(), Succeeds(kSchedule));
    EXPECT_EQ(appliance.CountOf("VORNWinsIsJoined"), 0);
}

TEST_F(ScheduleGet, AnswersNoneWithoutATask) {
    EXPECT_THAT(Get(), Succeeds(kNone));
    EXPECT_THAT(Steps(), ElementsAre("VORNSchedTaskAlloc()", "VORNSchedTaskListGet(list, filter)",
                                     "VORNSchedTaskFree(task)", R"(VORN::APIResponse::SetSuccess({"date_type":2}))"));
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
}

TEST_F(ScheduleGet, AnswersNoneWithOtherTasksOnly) {
    AddTask(5, "/bin/true", kSchedule);
    EXPECT_THAT(Get(), Succeeds(kNone));
}

TEST_F(ScheduleGet, AnswersTheFirstOfSeveralTasks) {
    AddTask(3, "/bin/true", R"({"hour": 1})");
    AddTask(9, kRefreshCommand, R"({"hour": 2})");
    AddTask(4, kRefreshCommand, R"({"hour": 3})");
    EXPECT_THAT(Get(), Succeeds(R"({"hour": 2})"));
}

TEST_F(ScheduleGet, TakesAnIdOfZeroForATask) {
    AddTask(0, kRefreshCommand, kSchedule);
    EXPECT_THAT(Get(), Succeeds(kSchedule));
}

TEST_F(ScheduleGet, StopsWhenNoRecordIsToBeHad) {
    AddTask(5, kRefreshCommand, kSchedule);
    appliance.FailNth("VORNSchedTaskAlloc", 1, Fault::Null());
    EXPECT_THAT(Get(), Succeeds(kNone));
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VORNSchedTaskAlloc()", R"(VORN::APIResponse::SetSuccess({"date_type":2}))"));
}

TEST_F(ScheduleGet, AnswersNoneWhenTheTasksCannotBeListed) {
    AddTask(5, kRefreshCommand, kSchedule);
    appliance.FailNth("VORNSchedTaskListGet", 1, Fault::Result(-1));
    EXPECT_THAT(Get(), Succeeds(kNone));
    EXPECT_THAT(appliance.Logs(), ElementsAre(FailureLine("get task list failed. ", "VORNSchedTaskListGet")));
    EXPECT_THAT(Steps(), ElementsAre("VORNSchedTaskAlloc()", "VORNSchedTaskListGet(list, filter)", "VLIBCErrGet()",
                                     "VLIBCErrorGetFile()", "VLIBCErrorGetLine()", "VORNSchedTaskFree(task)",
                                     R"(VORN::APIResponse::SetSuccess({"date_type":2}))"));
}

TEST_F(ScheduleGet, AnswersNoneForEveryNegativeId) {
    for (const int id : {-1, -2, -100}) {
        Restart();
        AddTask(5, kRefreshCommand, kSchedule);
        appliance.FailNth("VORNSchedTaskGetID", 1, Fault::Result(id));
        EXPECT_THAT(Get(), Succeeds(kNone)) << id;
        EXPECT_EQ(appliance.CountOf("VORNSchedTaskListFree"), 1);
        EXPECT_EQ(appliance.CountOf("VORNSchedTaskLoad"), 0);
        EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
    }
}

TEST_F(ScheduleGet, AnswersNoneWhenTheTaskCannotBeLoaded) {
    AddTask(5, kRefreshCommand, kSchedule);
    appliance.FailNth("VORNSchedTaskLoad", 1, Fault::Result(-1));
    EXPECT_THAT(Get(), Succeeds(kNone));
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskConvertToJson_Schedule"), 0);
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
}

TEST_F(ScheduleGet, AnswersNoneWhenTheScheduleCannotBeConverted) {
    AddTask(5, kRefreshCommand, kSchedule);
    appliance.FailNth("VORNSchedTaskConvertToJson_Schedule", 1, Fault::False());
    EXPECT_THAT(Get(), Succeeds(kNone));
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
}

TEST_F(ScheduleGet, TakesPositiveResultsForDone) {
    for (const char* function : {"VORNSchedTaskListGet", "VORNSchedTaskLoad"}) {
        Restart();
        AddTask(5, kRefreshCommand, kSchedule);
        appliance.FailNth(function, 1, Fault::Result(1));
        EXPECT_THAT(Get(), Succeeds(kSchedule)) << function;
    }
}

TEST_F(ScheduleGet, ReplacesWhatTheCallerHad) {
    Step step;
    Json::Value out = FromJson(R"({"date_type": 0, "hour": 5})");
    EXPECT_TRUE(step.handler.LoadSchedule(out));
    EXPECT_EQ(out, FromJson(kNone));
    AddTask(5, kRefreshCommand, R"({"hour": 3})");
    EXPECT_TRUE(step.handler.LoadSchedule(out));
    EXPECT_EQ(out, FromJson(R"({"hour": 3})"));
    out = "text";
    appliance.FailNth("VORNSchedTaskAlloc", 3, Fault::Null());
    EXPECT_TRUE(step.handler.LoadSchedule(out));
    EXPECT_EQ(out, FromJson(kNone));
}

TEST_F(ScheduleGet, KeepsTheCodeOfAListThatCannotBeReadToItself) {
    appliance.FailNth("VORNSchedTaskListGet", 1, Fault::Result(-1));
    Step step;
    Json::Value out;
    EXPECT_TRUE(step.handler.LoadSchedule(out));
    EXPECT_EQ(step.handler.error, 2617);
}

TEST_F(ScheduleGet, ShowsWhatSetStored) {
    Set(unit::kOnWeekdays);
    EXPECT_THAT(Get(), Succeeds(unit::kWeekdaysSchedule));
    Set(unit::kNever);
    EXPECT_THAT(Get(), Succeeds(kNone));
}

}  // namespace
