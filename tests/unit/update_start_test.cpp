// "update_start": one refresh at a time, and which body its task runs.

#include "tests/unit/update_fixture.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::kGroupPid;
using unit::kMarker;
using unit::kUserPid;
using unit::Logs;
using unit::Succeeds;

constexpr const char* kUnfinished = R"({"finish": false, "success": false, "data": {"status": "updating"}})";
constexpr const char* kFinished = R"({"finish": true, "success": true, "data": {"status": "finish"}})";

class UpdateStart : public unit::UpdateTest {
protected:
    fake::Answer Start(const std::string& parameters = "{}") {
        return Call(DomainUpdateStart, unit::FromJson(parameters));
    }

    // The start is refused before anything was changed.
    void ExpectNothingStarted() {
        EXPECT_EQ(state.startedTasks, 0);
        EXPECT_FALSE(HasMarker());
        EXPECT_EQ(appliance.CountOf("VLIBCFileTouch"), 0);
    }
};

TEST_F(UpdateStart, StartsTheWorkerAndMakesTheMarker) {
    EXPECT_THAT(Start(), Succeeds(R"({"task_id": "DomainUpdate1"})"));
    EXPECT_EQ(state.startedBody, DomainUpdateStartFork);
    EXPECT_EQ(state.startedTasks, 1);
    EXPECT_TRUE(HasMarker());
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre("VORN::APIPolling::APIPolling()", R"(VLIBCSupportGet("supporttrustdomain"))",
                    R"(VORN::APIRequest::HasParam("domain_name"))", "VORN::APIPolling::APIPolling(request)",
                    R"(VORN::APIPolling::List("DomainUpdate", ["admin"], tasks))", "VORN::APIPolling::~APIPolling()",
                    "VORN::APIPolling::SetRequest(request)", R"(VORN::APIPolling::SetGroupAttr("admin"))",
                    "VORN::APIPolling::SetRemoveAttr(false)", R"(VORN::APIPolling::SetPrefixAttr("DomainUpdate"))",
                    R"(VLIBCFileTouch("/tmp/domain_updating"))", R"(VLIBCReadPidFile("/tmp/domain_user.pid"))",
                    R"(VLIBCReadPidFile("/tmp/domain_group.pid"))", "VORN::APIPolling::Start(response, body, null)",
                    "VORN::APIPolling::~APIPolling()"));
}

TEST_F(UpdateStart, TheTaskIsFoundAgainByItsGroupAndPrefixAndKeptAfterItsEnd) {
    Start();
    ASSERT_EQ(state.tasks.size(), 1U);
    EXPECT_EQ(state.tasks[0].group, "admin");
    EXPECT_EQ(state.tasks[0].prefix, "DomainUpdate");
    EXPECT_FALSE(state.tasks[0].removedWhenRead);
}

TEST_F(UpdateStart, TheTaskSeesTheParametersOfTheRequestAndNoUserData) {
    const std::string parameters = R"({"domain_name": "LAB", "other": [1]})";
    state.startedUserData = &state;
    Start(parameters);
    EXPECT_EQ(state.startedParameters, unit::FromJson(parameters));
    EXPECT_EQ(state.startedUserData, nullptr);
}

TEST_F(UpdateStart, OnlyTheTypeOfTheDomainNameIsLookedAt) {
    for (const char* name : {R"("LAB")", R"("")", R"("@all")", R"("no such domain; rm")"}) {
        state.tasks.clear();
        EXPECT_TRUE(Start(std::string(R"({"domain_name": )") + name + "}").success) << name;
    }
    EXPECT_EQ(appliance.CountOf("VORNWinsIsOwnDomain"), 0);
}

TEST_F(UpdateStart, Answers2625OnAModelWithoutTrustedDomains) {
    for (const bool named : {true, false}) {
        Restart();
        state.supports.clear();
        if (named) {
            state.supports["supporttrustdomain"] = 0;
        }
        EXPECT_THAT(Start(R"({"domain_name": 5})"), FailsWith(2625));
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d Not support trust domain", "Not support trust domain")));
        EXPECT_EQ(appliance.CountOf("VORN::APIRequest::HasParam"), 0);
        ExpectNothingStarted();
    }
}

TEST_F(UpdateStart, AnySupportButZeroIsEnough) {
    for (const int support : {2, -1}) {
        state.tasks.clear();
        state.supports["supporttrustdomain"] = support;
        EXPECT_TRUE(Start().success) << support;
    }
}

TEST_F(UpdateStart, Answers2618ForADomainNameThatIsNoString) {
    for (const char* name : {"5", "null", "true", "1.5", R"(["LAB"])", R"({"a": "LAB"})"}) {
        Restart();
        AddTask("DomainUpdate1", kUnfinished);
        EXPECT_THAT(Start(std::string(R"({"domain_name": )") + name + "}"), FailsWith(2618)) << name;
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d wrong the paramter: %s", "wrong the paramter: domain_name")));
        EXPECT_EQ(appliance.CountOf("VORN::APIPolling::List"), 0) << "the tasks are looked at later";
        ExpectNothingStarted();
    }
}

TEST_F(UpdateStart, Answers2626WhileATaskRuns) {
    AddTask("DomainUpdate1", kUnfinished);
    EXPECT_THAT(Start(), FailsWith(2626));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Domain is updating", "Domain is updating")));
    ExpectNothingStarted();
    EXPECT_EQ(appliance.CountOf("VORN::APIPolling::SetRequest"), 0);
}

TEST_F(UpdateStart, ASecondStartIsRefusedUntilTheFirstTaskHasEnded) {
    EXPECT_TRUE(Start().success);
    EXPECT_THAT(Start(), FailsWith(2626));
    state.tasks[0].record = unit::FromJson(kFinished);
    EXPECT_THAT(Start(), Succeeds(R"({"task_id": "DomainUpdate2"})"));
}

TEST_F(UpdateStart, TasksThatHaveEndedDoNotMatter) {
    AddTask("DomainUpdate1", kFinished);
    AddTask("DomainUpdate2", R"({"finish": true, "success": false})");
    EXPECT_TRUE(Start().success);
    EXPECT_EQ(appliance.CountOf("VORN::APIPolling::Status"), 2);
}

TEST_F(UpdateStart, TasksOfOthersDoNotMatter) {
    state.tasks.push_back({"Backup1", "admin", "Backup", unit::FromJson(kUnfinished), false});
    state.tasks.push_back({"DomainUpdate1", "users", "DomainUpdate", unit::FromJson(kUnfinished), false});
    EXPECT_TRUE(Start().success);
}

TEST_F(UpdateStart, TheFirstRunningTaskEndsTheSearch) {
    AddTask("DomainUpdate1", kFinished);
    AddTask("DomainUpdate2", kUnfinished);
    AddTask("DomainUpdate3", kFinished);
    EXPECT_THAT(Start(), FailsWith(2626));
    EXPECT_THAT(appliance.CallTexts([](const fake::Call& call) { return call.function == "VORN::APIPolling::Status"; }),
                ElementsAre(R"(VORN::APIPolling::Status("DomainUpdate1", status))",
                            R"(VORN::APIPolling::Status("DomainUpdate2", status))"));
}

TEST_F(UpdateStart, ATaskIsFinishedOnlyWhenItsRecordSaysSo) {
    for (const char* record : {"{}", R"({"finish": null})", R"({"finish": 0})", R"({"finish": "true"})",
                               R"({"finish": [true]})", R"({"finish": {}})", R"({"Finish": true})",
                               R"({"success": true})", "null", "true", R"("finish")", R"(["finish"])"}) {
        Restart();
        AddTask("DomainUpdate1", record);
        EXPECT_THAT(Start(), FailsWith(2626)) << record;
    }
    AddTask("DomainUpdate1", R"({"finish": 1})");
    state.tasks.erase(state.tasks.begin());
    EXPECT_TRUE(Start().success);
}

// The record of a task that was read before does not stand in for one that can't be read.
TEST_F(UpdateStart, ATaskThatCannotBeReadCountsAsRunning) {
    AddTask("DomainUpdate1", kFinished);
    AddTask("DomainUpdate2", kFinished);
    appliance.FailNth("VORN::APIPolling::Status", 2, fake::Fault::False());
    EXPECT_THAT(Start(), FailsWith(2626));
}

TEST_F(UpdateStart, EveryArrayOfTheTaskListIsSearched) {
    AddTask("X", kUnfinished);
    AddTask("Y", kFinished);
    for (const char* list : {R"({"admin": ["X"]})", R"({"a": [], "b": ["Y"], "c": ["Y", "X"]})",
                             R"({"a": "Y", "b": 1, "c": null, "d": {"e": ["Y"]}, "f": ["X"]})", R"([["X"]])",
                             R"([1, ["Y"], ["X"]])", R"({"admin": [1, null, "X"]})"}) {
        state.taskList = unit::FromJson(list);
        EXPECT_THAT(Start(), FailsWith(2626)) << list;
    }
}

TEST_F(UpdateStart, WhatIsNoIdInAnArrayIsPassedOver) {
    AddTask("X", kUnfinished);
    AddTask("1", kUnfinished);
    for (const char* list :
         {"{}", "[]", "null", "true", "1", R"("X")", R"(["X"])", R"({"admin": "X"})", R"({"admin": {"id": "X"}})",
          R"({"admin": {"ids": ["X"]}})", R"({"X": []})", R"({"admin": [1, 1.5, true, null, ["X"], {"id": "X"}]})"}) {
        state.taskList = unit::FromJson(list);
        EXPECT_TRUE(Start().success) << list;
    }
    EXPECT_EQ(appliance.CountOf("VORN::APIPolling::Status"), 0);
}

TEST_F(UpdateStart, AListThatCannotBeReadAnswers117AndTheTaskStartsAllTheSame) {
    AddTask("DomainUpdate1", kUnfinished);
    appliance.FailNth("VORN::APIPolling::List", 1, fake::Fault::False());
    EXPECT_THAT(CallFreely(DomainUpdateStart, "{}"),
                ElementsAre(FailsWith(117), Succeeds(R"({"task_id": "DomainUpdate2"})")));
    EXPECT_EQ(state.startedTasks, 1);
    EXPECT_TRUE(HasMarker());
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(UpdateStart, TheCodeOfAnUnreadableListIsNotRecorded) {
    appliance.FailNth("VORN::APIPolling::List", 1, fake::Fault::False());
    appliance.FailNth("VLIBCFileTouch", 1, fake::Fault::Result(-1));
    EXPECT_THAT(CallFreely(DomainUpdateStart, "{}"), ElementsAre(FailsWith(117), FailsWith(2600)));
}

TEST_F(UpdateStart, Answers2600SilentlyWhenTheMarkerCannotBeMade) {
    appliance.FailNth("VLIBCFileTouch", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Start(), FailsWith(2600));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_EQ(state.startedTasks, 0);
    EXPECT_EQ(appliance.CountOf("VLIBCReadPidFile"), 0);
    EXPECT_EQ(appliance.CountOf("VLIBCSysRemove"), 0);
}

TEST_F(UpdateStart, APositiveResultForTheMarkerIsNoFailure) {
    appliance.FailNth("VLIBCFileTouch", 1, fake::Fault::Result(1));
    EXPECT_TRUE(Start().success);
}

TEST_F(UpdateStart, AMarkerThatWasLeftBehindIsNoObstacle) {
    state.files.insert(kMarker);
    EXPECT_TRUE(Start().success);
    EXPECT_TRUE(HasMarker());
}

TEST_F(UpdateStart, StartsTheMonitorWhileTheApplianceFetchesByItself) {
    for (const char* path : {kUserPid, kGroupPid}) {
        for (const int pid : {4711, 1, 0}) {
            Restart();
            state.pidFiles[path] = pid;
            EXPECT_THAT(Start(), Succeeds(R"({"task_id": "DomainUpdate1"})")) << path << pid;
            EXPECT_EQ(state.startedBody, DomainMonitorUpdating) << path << pid;
            EXPECT_EQ(state.startedUserData, nullptr);
            EXPECT_TRUE(HasMarker());
            EXPECT_EQ(appliance.CountOf("VLIBCReadPidFile"), path == kUserPid ? 1 : 2) << path;
        }
    }
}

TEST_F(UpdateStart, StartsTheWorkerWhenThePidFilesNameNoLiveProcess) {
    state.pidFiles = {{kUserPid, -1}, {kGroupPid, -1}};
    Start();
    EXPECT_EQ(state.startedBody, DomainUpdateStartFork);
}

TEST_F(UpdateStart, AFailedStartIsAnsweredByTheFrameworkAndLeavesTheMarker) {
    appliance.FailNth("VORN::APIPolling::Start", 1, fake::Fault::False());
    EXPECT_THAT(Start(), FailsWith(1001));
    EXPECT_TRUE(HasMarker());
    EXPECT_EQ(appliance.CountOf("VLIBCSysRemove"), 0);
}

TEST_F(UpdateStart, AnExceptionOfTheStartLeavesTheMarker) {
    appliance.FailNth("VORN::APIPolling::Start", 1, fake::Fault::Throw());
    EXPECT_THROW(CallFreely(DomainUpdateStart, "{}"), fake::InjectedException);
    EXPECT_TRUE(HasMarker());
    EXPECT_EQ(appliance.CountOf("VLIBCSysRemove"), 0);
}

class RunningTests : public unit::UpdateTest {
protected:
    fake::Exchange exchange;
    DomainServiceHandler handler{&exchange.request, &exchange.response};
};

TEST_F(RunningTests, ATaskListThatCannotBeReadIsTakenForAnEmptyOne) {
    AddTask("DomainUpdate1", kUnfinished);
    appliance.FailNth("VORN::APIPolling::List", 1, fake::Fault::False());
    EXPECT_FALSE(handler.CheckUpdating());
    EXPECT_EQ(handler.error, 2600);
    EXPECT_THAT(appliance.Answers(), ElementsAre(FailsWith(117)));
    EXPECT_TRUE(handler.CheckUpdating());
}

TEST_F(RunningTests, TheGroupsPidFileIsReadOnlyWhenTheUsersNamesNoLiveProcess) {
    EXPECT_FALSE(handler.CheckDomainDBUpdating());
    EXPECT_THAT(appliance.CallTexts(), ElementsAre(R"(VLIBCReadPidFile("/tmp/domain_user.pid"))",
                                                   R"(VLIBCReadPidFile("/tmp/domain_group.pid"))"));
    Restart();
    state.pidFiles = {{kUserPid, 0}, {kGroupPid, 0}};
    EXPECT_TRUE(handler.CheckDomainDBUpdating());
    EXPECT_THAT(appliance.CallTexts(), ElementsAre(R"(VLIBCReadPidFile("/tmp/domain_user.pid"))"));
}

}  // namespace
