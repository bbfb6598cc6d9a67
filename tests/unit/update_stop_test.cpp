// "update_stop": stops every task of this module.

#include "tests/unit/update_fixture.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;
using unit::FailsWith;
using unit::kMarker;
using unit::Succeeds;

class UpdateStop : public unit::UpdateTest {
protected:
    std::vector<std::string> StopCalls() {
        return appliance.CallTexts([](const fake::Call& call) { return call.function == "VORN::APIPolling::Stop"; });
    }
};

TEST_F(UpdateStop, StopsEveryTaskInTheOrderListed) {
    AddTask("DomainUpdate2", R"({"finish": false})");
    AddTask("DomainUpdate1", R"({"finish": false})");
    EXPECT_THAT(Call(DomainUpdateStop), Succeeds("null"));
    EXPECT_THAT(state.stoppedTasks, ElementsAre(Pair("DomainUpdate2", true), Pair("DomainUpdate1", true)));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VORN::APIPolling::APIPolling(request)",
                            R"(VORN::APIPolling::List("DomainUpdate", ["admin"], tasks))",
                            R"(VORN::APIPolling::Stop("DomainUpdate2", true))",
                            R"(VORN::APIPolling::Stop("DomainUpdate1", true))", "VORN::APIResponse::SetSuccess(null)",
                            "VORN::APIPolling::~APIPolling()"));
}

TEST_F(UpdateStop, StopsTasksThatHaveEndedAsWell) {
    AddTask("DomainUpdate1", R"({"finish": true, "success": true})");
    AddTask("DomainUpdate2", R"({"finish": true, "success": false})");
    EXPECT_THAT(Call(DomainUpdateStop), Succeeds("null"));
    EXPECT_EQ(state.stoppedTasks.size(), 2U);
    EXPECT_EQ(appliance.CountOf("VORN::APIPolling::Status"), 0);
}

TEST_F(UpdateStop, SucceedsWithNothingToStop) {
    EXPECT_THAT(Call(DomainUpdateStop), Succeeds("null"));
    EXPECT_EQ(appliance.CountOf("VORN::APIPolling::Stop"), 0);
}

TEST_F(UpdateStop, LeavesTasksOfOthersAlone) {
    state.tasks.push_back({"Backup1", "admin", "Backup", unit::FromJson(R"({"finish": false})"), false});
    state.tasks.push_back({"DomainUpdate1", "users", "DomainUpdate", unit::FromJson(R"({"finish": false})"), false});
    EXPECT_THAT(Call(DomainUpdateStop), Succeeds("null"));
    EXPECT_THAT(state.stoppedTasks, IsEmpty());
}

TEST_F(UpdateStop, GoesOnAfterATaskThatCannotBeStopped) {
    AddTask("DomainUpdate1", R"({"finish": false})");
    AddTask("DomainUpdate2", R"({"finish": false})");
    appliance.FailNth("VORN::APIPolling::Stop", 1, fake::Fault::False());
    EXPECT_THAT(Call(DomainUpdateStop), Succeeds("null"));
    EXPECT_THAT(state.stoppedTasks, ElementsAre(Pair("DomainUpdate2", true)));
}

TEST_F(UpdateStop, Answers117WhenTheTasksCannotBeListed) {
    AddTask("DomainUpdate1", R"({"finish": false})");
    appliance.FailNth("VORN::APIPolling::List", 1, fake::Fault::False());
    EXPECT_THAT(Call(DomainUpdateStop), FailsWith(117));
    EXPECT_THAT(state.stoppedTasks, IsEmpty());
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(UpdateStop, EveryArrayOfTheTaskListIsWalked) {
    state.taskList = unit::FromJson(R"({"a": ["A", 1, "B"], "b": "C", "c": {"d": ["D"]}, "d": [["E"], null, "F"]})");
    EXPECT_THAT(Call(DomainUpdateStop), Succeeds("null"));
    EXPECT_THAT(StopCalls(), ElementsAre(R"(VORN::APIPolling::Stop("A", true))", R"(VORN::APIPolling::Stop("B", true))",
                                         R"(VORN::APIPolling::Stop("F", true))"));
}

TEST_F(UpdateStop, AnArrayOfArraysIsATaskListToo) {
    state.taskList = unit::FromJson(R"(["A", ["B"], 1, ["C"]])");
    EXPECT_THAT(Call(DomainUpdateStop), Succeeds("null"));
    EXPECT_THAT(StopCalls(),
                ElementsAre(R"(VORN::APIPolling::Stop("B", true))", R"(VORN::APIPolling::Stop("C", true))"));
}

TEST_F(UpdateStop, ATaskListOfAnotherKindListsNothing) {
    for (const char* list : {"null", "true", "1", "1.5", R"("A")", "{}", "[]"}) {
        state.taskList = unit::FromJson(list);
        EXPECT_THAT(Call(DomainUpdateStop), Succeeds("null")) << list;
    }
    EXPECT_THAT(StopCalls(), IsEmpty());
}

TEST_F(UpdateStop, LeavesTheMarkerAndTheFetchProcessesAlone) {
    AddTask("DomainUpdate1", R"({"finish": false})");
    state.files.insert(kMarker);
    state.pidFiles[unit::kUserPid] = 4711;
    Call(DomainUpdateStop);
    EXPECT_TRUE(HasMarker());
    EXPECT_EQ(state.pidFiles.count(unit::kUserPid), 1U);
    EXPECT_EQ(appliance.CountOf("VLIBCSysRemove") + appliance.CountOf("VLIBCReadPidFile"), 0);
}

TEST_F(UpdateStop, ReadsNoParameters) {
    AddTask("DomainUpdate1", R"({"finish": false})");
    EXPECT_THAT(Call(DomainUpdateStop, unit::FromJson(R"({"task_id": 5})")), Succeeds("null"));
    EXPECT_EQ(appliance.CountOf("VORN::APIRequest::HasParam") + appliance.CountOf("VORN::APIRequest::GetParam"), 0);
}

}  // namespace
