// The scheduled task of the refresh: how it is told from other tasks, found and removed.

#include <string>
#include <vector>

#include "tests/unit/schedule_test.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::kRefreshCommand;

class ScheduledRefresh : public unit::ScheduleTest {
protected:
    int FindId() {
        Step step;
        const int id = step.handler.GetScheduleTaskId();
        error = step.handler.error;
        return id;
    }

    int error = 0;
};

TEST_F(ScheduledRefresh, IsKnownByItsCommand) {
    AddTask(3, "/bin/true");
    AddTask(5);
    EXPECT_EQ(FindId(), 5);
    EXPECT_EQ(error, 2600);
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
}

TEST_F(ScheduledRefresh, IsNotATaskOfASimilarCommand) {
    const std::string command = kRefreshCommand;
    std::vector<std::string> others = {
        "",
        command + " ",
        command + "s",
        command + " -x",
        command + "\n",
        " " + command,
        command.substr(1),
        command.substr(0, command.size() - 1),
        "/usr/vorn/sbin/vornwin  -updateDomain",
        "/usr/vorn/sbin/vornwin\t-updateDomain",
        "/usr/vorn/sbin/vornwin -updatedomain",
        "/usr/vorn/sbin/vornwin -UpdateDomain",
        "/USR/VORN/SBIN/VORNWIN -UPDATEDOMAIN",
        "/usr/vorn/sbin/vornwin",
        "-updateDomain",
        "/usr/vorn/sbin/vornwin -updateDomains",
        "/usr/vorn/bin/vornwin -updateDomain",
        command + "; " + command,
    };
    for (std::size_t at = 0; at < command.size(); ++at) {
        std::string other = command;
        ++other[at];
        others.push_back(other);
    }
    for (const std::string& other : others) {
        state.scheduledTasks.clear();
        AddTask(5, other);
        EXPECT_EQ(FindId(), -1) << other;
    }
}

TEST_F(ScheduledRefresh, IsNoneWithoutTasks) {
    EXPECT_EQ(FindId(), -1);
    EXPECT_EQ(error, 2600);
    EXPECT_THAT(Steps(), ElementsAre("VORNSchedTaskListGet(list, filter)"));
}

TEST_F(ScheduledRefresh, IsTheFirstOfSeveral) {
    for (const int id : {9, 4, 7}) {
        AddTask(id);
    }
    EXPECT_EQ(FindId(), 9);
    EXPECT_THAT(Steps(), ElementsAre("VORNSchedTaskListGet(list, filter)", "VORNSchedTaskGetID(task)",
                                     "VORNSchedTaskListFree(list)"));
}

TEST_F(ScheduledRefresh, MayHaveTheIdZero) {
    AddTask(0);
    EXPECT_EQ(FindId(), 0);
}

TEST_F(ScheduledRefresh, IsReadThroughABufferOf1024Bytes) {
    AddTask(3, "/bin/true");
    AddTask(5);
    FindId();
    const auto isRead = [](const fake::Call& call) { return call.function == "VORNSchedCTaskGetCommand"; };
    EXPECT_THAT(appliance.CallTexts(isRead),
                ElementsAre("VORNSchedCTaskGetCommand(size 1024, task)", "VORNSchedCTaskGetCommand(size 1024, task)"));
}

TEST_F(ScheduledRefresh, IsNotANullTask) {
    FindId();
    ASSERT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
    // The last error carries the number of the line in the log.
    const std::string line = std::to_string(appliance.Logs()[0].line);
    EXPECT_THAT(appliance.CallTexts(fake::kLogs),
                ElementsAre("VORNSchedTaskListGet(list, filter)",
                            R"(VLIBCErrSetEx(3328, "domain_schedule.cpp", )" + line + ")"));
    EXPECT_EQ(state.lastError.code, 0x0D00);
    EXPECT_STREQ(state.lastError.file, "domain_schedule.cpp");
}

TEST_F(ScheduledRefresh, IsLoggedForANullTaskBeforeTheLastErrorIsSet) {
    FindId();
    ASSERT_EQ(appliance.Calls().size(), 3U);
    EXPECT_EQ(appliance.Calls()[1].function, "syslog");
    EXPECT_EQ(appliance.Calls()[2].function, "VLIBCErrSetEx");
}

TEST_F(ScheduledRefresh, IsNotATaskWhoseCommandCannotBeRead) {
    AddTask(5);
    AddTask(6);
    appliance.FailNth("VORNSchedCTaskGetCommand", 1, Fault::Result(-1));
    EXPECT_EQ(FindId(), 6);
    EXPECT_EQ(error, 2600);
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(NullTaskLine(), FailureLine("get task command failed. ", "VORNSchedCTaskGetCommand")));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs),
                ElementsAre("VORNSchedTaskListGet(list, filter)", ::testing::StartsWith("VLIBCErrSetEx("),
                            "VORNSchedCTaskGetCommand(size 1024, task)", "VLIBCErrGet()", "VLIBCErrorGetFile()",
                            "VLIBCErrorGetLine()", "VORNSchedCTaskGetCommand(size 1024, task)",
                            "VORNSchedTaskGetID(task)", "VORNSchedTaskListFree(list)"));
}

TEST_F(ScheduledRefresh, IsNotTakenFromWhatAFailedReadLeft) {
    AddTask(5);
    state.staleText = "/usr/vorn/sbin/vornwin -updateDomain";
    appliance.FailNth("VORNSchedCTaskGetCommand", 1, Fault::Result(-1));
    EXPECT_EQ(FindId(), -1);
}

TEST_F(ScheduledRefresh, IsFoundForAPositiveResultOfTheReading) {
    AddTask(5);
    appliance.FailNth("VORNSchedCTaskGetCommand", 1, Fault::Result(1));
    EXPECT_EQ(FindId(), 5);
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
}

TEST_F(ScheduledRefresh, Records2617WhenTheTasksCannotBeListed) {
    AddTask(5);
    appliance.FailNth("VORNSchedTaskListGet", 1, Fault::Result(-1));
    EXPECT_EQ(FindId(), -1);
    EXPECT_EQ(error, 2617);
    EXPECT_THAT(appliance.Logs(), ElementsAre(FailureLine("get task list failed. ", "VORNSchedTaskListGet")));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs), ElementsAre("VORNSchedTaskListGet(list, filter)", "VLIBCErrGet()",
                                                              "VLIBCErrorGetFile()", "VLIBCErrorGetLine()"));
}

TEST_F(ScheduledRefresh, IsFreedFromTheListWhenItsIdCannotBeRead) {
    AddTask(5);
    appliance.FailNth("VORNSchedTaskGetID", 1, Fault::Result(-1));
    EXPECT_EQ(FindId(), -1);
    EXPECT_EQ(error, 2600);
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskListFree"), 1);
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine()));
}

class ScheduledRefreshRemoval : public ScheduledRefresh {
protected:
    int RemoveTask() {
        Step step;
        const int result = step.handler.RemoveUpdatePeriod();
        error = step.handler.error;
        return result;
    }
};

TEST_F(ScheduledRefreshRemoval, RemovesTheFirstTaskOnly) {
    AddTask(3, "/bin/true");
    AddTask(9);
    AddTask(4);
    EXPECT_EQ(RemoveTask(), 0);
    EXPECT_EQ(error, 2600);
    EXPECT_THAT(TaskIds(), ElementsAre(3, 4));
    EXPECT_THAT(Steps(), ElementsAre("VORNSchedTaskListGet(list, filter)", "VORNSchedTaskGetID(task)",
                                     "VORNSchedTaskListFree(list)", "VORNSchedTaskRemove(9)"));
}

TEST_F(ScheduledRefreshRemoval, RemovesTheTaskOfTheIdZero) {
    AddTask(0);
    EXPECT_EQ(RemoveTask(), 0);
    EXPECT_THAT(TaskIds(), IsEmpty());
}

TEST_F(ScheduledRefreshRemoval, IsDoneWhenThereIsNoTask) {
    EXPECT_EQ(RemoveTask(), 0);
    EXPECT_EQ(error, 2600);
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskRemove"), 0);
}

TEST_F(ScheduledRefreshRemoval, IsDoneForEveryNegativeId) {
    AddTask(5);
    for (const int id : {-1, -2}) {
        appliance.FailNth("VORNSchedTaskGetID", appliance.CountOf("VORNSchedTaskGetID") + 1, Fault::Result(id));
        EXPECT_EQ(RemoveTask(), 0) << id;
    }
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskRemove"), 0);
    EXPECT_THAT(TaskIds(), ElementsAre(5));
}

TEST_F(ScheduledRefreshRemoval, IsDoneWhenTheTasksCannotBeListed) {
    AddTask(5);
    appliance.FailNth("VORNSchedTaskListGet", 1, Fault::Result(-1));
    EXPECT_EQ(RemoveTask(), 0);
    EXPECT_EQ(error, 2617);
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskRemove"), 0);
}

TEST_F(ScheduledRefreshRemoval, Records2617WhenTheSchedulerRefuses) {
    AddTask(5);
    appliance.FailNth("VORNSchedTaskRemove", 1, Fault::Result(-1));
    EXPECT_EQ(RemoveTask(), -1);
    EXPECT_EQ(error, 2617);
    EXPECT_THAT(appliance.Logs(), ElementsAre(NullTaskLine(), Line("Failed to delete task %d. [0x%04X %s:%d]",
                                                                   "Failed to delete task 5. " +
                                                                       unit::ErrorAfter("VORNSchedTaskRemove"))));
    EXPECT_THAT(TaskIds(), ElementsAre(5));
    EXPECT_THAT(Steps(), ElementsAre("VORNSchedTaskListGet(list, filter)", "VORNSchedTaskGetID(task)",
                                     "VORNSchedTaskListFree(list)", "VORNSchedTaskRemove(5)", "VLIBCErrGet()",
                                     "VLIBCErrorGetFile()", "VLIBCErrorGetLine()"));
}

TEST_F(ScheduledRefreshRemoval, IsDoneForAPositiveResult) {
    AddTask(5);
    appliance.FailNth("VORNSchedTaskRemove", 1, Fault::Result(1));
    EXPECT_EQ(RemoveTask(), 0);
    EXPECT_EQ(error, 2600);
    EXPECT_THAT(TaskIds(), IsEmpty());
}

}  // namespace
