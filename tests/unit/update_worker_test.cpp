// The worker of a refresh.

#include "tests/unit/update_fixture.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::kGroupPid;
using unit::kUserPid;
using unit::Logs;
using unit::Succeeds;

constexpr const char* kRemoveUsers = "/bin/rm /usr/vorn/etc/private/domain_user* > /dev/null 2>&1";
constexpr const char* kRemoveGroups = "/bin/rm /usr/vorn/etc/private/domain_group* > /dev/null 2>&1";
constexpr const char* kFetchFailed = "%s:%d query domain user/group fail using specify domain=%s";
constexpr const char* kNamed = R"({"domain_name": "LAB"})";

const auto kDone = ElementsAre(Succeeds(R"({"status": "updating"})"), Succeeds(R"({"status": "finish"})"));
const auto kFailed = ElementsAre(Succeeds(R"({"status": "updating"})"), FailsWith(2623));

class UpdateWorker : public unit::FetchTest {
protected:
    std::vector<fake::Answer> Work(const std::string& parameters = "{}") {
        return RunTask(DomainUpdateStartFork, parameters);
    }
};

TEST_F(UpdateWorker, RefreshesEveryDomain) {
    EXPECT_THAT(Work(), kDone);
    EXPECT_FALSE(HasMarker());
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre(
            R"(VORN::APIResponse::SetSuccess({"status":"updating"}))", R"(VORN::APIRequest::HasParam("domain_name"))",
            "VORNWinIsEnableTrustDomain()", "VORNWinUpdateAllDomains()", "VLIBCSzListAlloc(1024)",
            "VORNWinsEnumAllDomains(list)", R"(VLIBCReadPidFile("/tmp/domain_user.pid"))",
            R"(system("/bin/rm /usr/vorn/etc/private/domain_user* > /dev/null 2>&1"))",
            R"(VORNWinGetDomainUGByDomain(0, ["LAB", "OTHER"]))", "VLIBCSzListFree(list)", "VLIBCSzListAlloc(1024)",
            "VORNWinsEnumAllDomains(list)", R"(VLIBCReadPidFile("/tmp/domain_group.pid"))",
            R"(system("/bin/rm /usr/vorn/etc/private/domain_group* > /dev/null 2>&1"))",
            R"(VORNWinGetDomainUGByDomain(1, ["LAB", "OTHER"]))", "VLIBCSzListFree(list)",
            R"(VORN::APIResponse::SetSuccess({"status":"finish"}))", R"(VLIBCSysRemove("/tmp/domain_updating"))"));
}

TEST_F(UpdateWorker, RefreshesOneDomainWithoutDeletingAnything) {
    EXPECT_THAT(Work(kNamed), kDone);
    EXPECT_FALSE(HasMarker());
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre(R"(VORN::APIResponse::SetSuccess({"status":"updating"}))",
                            R"(VORN::APIRequest::HasParam("domain_name"))",
                            R"(VORN::APIRequest::GetParam("domain_name", null))", "VLIBCSzListAlloc(1024)",
                            "VORNWinIsEnableTrustDomain()", R"(VLIBCSzListPush(list, "LAB"))",
                            R"(VLIBCReadPidFile("/tmp/domain_user.pid"))", R"(VORNWinGetDomainUGByDomain(0, ["LAB"]))",
                            "VLIBCSzListFree(list)", "VLIBCSzListAlloc(1024)", "VORNWinIsEnableTrustDomain()",
                            R"(VLIBCSzListPush(list, "LAB"))", R"(VLIBCReadPidFile("/tmp/domain_group.pid"))",
                            R"(VORNWinGetDomainUGByDomain(1, ["LAB"]))", "VLIBCSzListFree(list)",
                            R"(VORN::APIResponse::SetSuccess({"status":"finish"}))",
                            R"(VLIBCSysRemove("/tmp/domain_updating"))"));
}

TEST_F(UpdateWorker, NoNameAnEmptyNameAndAtAllMeanEveryDomain) {
    for (const char* parameters :
         {"{}", R"({"domain_name": ""})", R"({"domain_name": "@all"})", R"({"domain_name": null})"}) {
        Restart();
        EXPECT_THAT(Work(parameters), kDone) << parameters;
        EXPECT_EQ(state.domainUpdates, 1) << parameters;
        EXPECT_THAT(state.commands, ElementsAre(kRemoveUsers, kRemoveGroups)) << parameters;
        EXPECT_THAT(state.fetchedDomains,
                    ElementsAre(fake::FetchedDomains{0, {"LAB", "OTHER"}}, fake::FetchedDomains{1, {"LAB", "OTHER"}}));
    }
}

TEST_F(UpdateWorker, AnyOtherSpellingOfAtAllIsADomain) {
    for (const char* name : {"@ALL", "@All", " @all", "@all ", "@al", "@alll", "all", " ", "LAB"}) {
        Restart();
        EXPECT_THAT(Work(std::string(R"({"domain_name": ")") + name + "\"}"), kDone) << name;
        EXPECT_THAT(state.fetchedDomains,
                    ElementsAre(fake::FetchedDomains{0, {name}}, fake::FetchedDomains{1, {name}}));
        EXPECT_EQ(state.domainUpdates + state.unitUpdates, 0) << name;
        EXPECT_THAT(state.commands, IsEmpty()) << name;
    }
}

TEST_F(UpdateWorker, RefreshesTheUnitsWhenTrustedDomainsAreDisabled) {
    state.trustSetting = 0;
    EXPECT_THAT(Work(), kDone);
    EXPECT_EQ(state.unitUpdates, 1);
    EXPECT_EQ(state.domainUpdates, 0);
    EXPECT_EQ(appliance.CountOf("VORNWinsIsOwnDomain"), 0);
    EXPECT_EQ(state.fetchedDomains.size(), 2U);
}

TEST_F(UpdateWorker, AnyTrustSettingButZeroIsEnabled) {
    for (const int setting : {2, -1}) {
        Restart();
        state.trustSetting = setting;
        EXPECT_THAT(Work(), kDone) << setting;
        EXPECT_EQ(state.domainUpdates, 1) << setting;
        EXPECT_THAT(Work(R"({"domain_name": "OTHER"})"), kDone) << setting;
    }
}

TEST_F(UpdateWorker, TheOwnDomainIsAllowedWhenTrustedOnesAreDisabled) {
    state.trustSetting = 0;
    EXPECT_THAT(Work(kNamed), kDone);
    EXPECT_THAT(state.fetchedDomains, ElementsAre(fake::FetchedDomains{0, {"LAB"}}, fake::FetchedDomains{1, {"LAB"}}));
    EXPECT_EQ(state.unitUpdates, 0);
}

TEST_F(UpdateWorker, AnyAnswerButZeroMakesADomainTheOwnOne) {
    for (const int answer : {2, -1}) {
        Restart();
        state.trustSetting = 0;
        appliance.FailNth("VORNWinsIsOwnDomain", 1, fake::Fault::Result(answer), true);
        EXPECT_THAT(Work(R"({"domain_name": "OTHER"})"), kDone) << answer;
    }
}

TEST_F(UpdateWorker, AnotherDomainEndsSilentlyWith2623WhenTrustedOnesAreDisabled) {
    state.trustSetting = 0;
    EXPECT_THAT(Work(R"({"domain_name": "OTHER"})"), kFailed);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_FALSE(HasMarker());
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre(R"(VORN::APIResponse::SetSuccess({"status":"updating"}))",
                            R"(VORN::APIRequest::HasParam("domain_name"))",
                            R"(VORN::APIRequest::GetParam("domain_name", null))", "VLIBCSzListAlloc(1024)",
                            "VORNWinIsEnableTrustDomain()", R"(VORNWinsIsOwnDomain("OTHER"))", "VLIBCSzListFree(list)",
                            R"(VLIBCSysRemove("/tmp/domain_updating"))", "VORN::APIResponse::SetError(2623, null)"));
}

// A step of the worker that fails, and what is still done.
struct Step {
    const char* name;
    const char* parameters;
    int trustSetting;
    const char* function;
    int nth;
    fake::Fault fault;
    std::size_t fetches;
};

class WorkerFailure : public UpdateWorker, public ::testing::WithParamInterface<Step> {};

INSTANTIATE_TEST_SUITE_P(
    Steps, WorkerFailure,
    ::testing::Values(Step{"AllDomains", "{}", 1, "VORNWinUpdateAllDomains", 1, fake::Fault::Result(-1), 0},
                      Step{"Units", "{}", 0, "VORNWinUpdateOU", 1, fake::Fault::Result(-1), 0},
                      Step{"ListForUsers", "{}", 1, "VLIBCSzListAlloc", 1, fake::Fault::Null(), 0},
                      Step{"DomainsForUsers", "{}", 1, "VORNWinsEnumAllDomains", 1, fake::Fault::Result(-1), 0},
                      Step{"ListForGroups", "{}", 1, "VLIBCSzListAlloc", 2, fake::Fault::Null(), 1},
                      Step{"DomainsForGroups", "{}", 1, "VORNWinsEnumAllDomains", 2, fake::Fault::Result(-1), 1},
                      Step{"ListForUsersOfOne", kNamed, 1, "VLIBCSzListAlloc", 1, fake::Fault::Null(), 0},
                      Step{"PushForUsersOfOne", kNamed, 1, "VLIBCSzListPush", 1, fake::Fault::Result(-1), 0},
                      Step{"ListForGroupsOfOne", kNamed, 1, "VLIBCSzListAlloc", 2, fake::Fault::Null(), 1},
                      Step{"PushForGroupsOfOne", kNamed, 1, "VLIBCSzListPush", 2, fake::Fault::Result(-1), 1}),
    [](const auto& instance) { return instance.param.name; });

TEST_P(WorkerFailure, EndsSilentlyWith2623AndWithoutTheMarker) {
    const Step& step = GetParam();
    state.trustSetting = step.trustSetting;
    appliance.FailNth(step.function, step.nth, step.fault);
    EXPECT_THAT(Work(step.parameters), kFailed);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_FALSE(HasMarker());
    EXPECT_EQ(state.fetchedDomains.size(), step.fetches);
    const std::vector<std::string> calls = appliance.CallTexts();
    ASSERT_GE(calls.size(), 2U);
    EXPECT_EQ(calls[calls.size() - 2], R"(VLIBCSysRemove("/tmp/domain_updating"))");
    EXPECT_EQ(calls[calls.size() - 1], "VORN::APIResponse::SetError(2623, null)");
}

TEST_F(UpdateWorker, StopsAtTheFetchThatFails) {
    for (const int result : {-1, 1, 2}) {
        for (const int nth : {1, 2}) {
            for (const char* parameters : {"{}", kNamed}) {
                Restart();
                appliance.FailNth("VORNWinGetDomainUGByDomain", nth, fake::Fault::Result(result));
                EXPECT_THAT(Work(parameters), kFailed) << result << nth << parameters;
                EXPECT_EQ(appliance.CountOf("VORNWinGetDomainUGByDomain"), nth);
                EXPECT_FALSE(HasMarker());
                const std::string domain = parameters == kNamed ? "LAB" : "(null)";
                EXPECT_THAT(appliance.Logs(),
                            ElementsAre(Logs("domain.cpp", kFetchFailed,
                                             "query domain user/group fail using specify domain=" + domain)));
            }
        }
    }
}

TEST_F(UpdateWorker, PositiveResultsOfTheOtherStepsAreNoFailures) {
    for (const char* function : {"VORNWinUpdateAllDomains", "VORNWinsEnumAllDomains", "VLIBCSysRemove", "system"}) {
        Restart();
        appliance.FailNth(function, 1, fake::Fault::Result(1), true);
        EXPECT_THAT(Work(), kDone) << function;
        EXPECT_EQ(state.fetchedDomains.size(), 2U);
    }
    Restart();
    appliance.FailNth("VLIBCSzListPush", 1, fake::Fault::Result(1), true);
    EXPECT_THAT(Work(kNamed), kDone);
    Restart();
    state.trustSetting = 0;
    appliance.FailNth("VORNWinUpdateOU", 1, fake::Fault::Result(1));
    EXPECT_THAT(Work(), kDone);
}

TEST_F(UpdateWorker, WhatTheDeletionAnswersDoesNotMatter) {
    for (const int result : {256, -1}) {
        state.systemResult = result;
        EXPECT_THAT(Work(), kDone) << result;
    }
}

TEST_F(UpdateWorker, AKindThatTheApplianceFetchesByItselfCountsAsDone) {
    for (const int pid : {4711, 0}) {
        for (const char* parameters : {"{}", kNamed}) {
            Restart();
            state.pidFiles[kUserPid] = pid;
            EXPECT_THAT(Work(parameters), kDone) << pid;
            ASSERT_EQ(state.fetchedDomains.size(), 1U);
            EXPECT_EQ(state.fetchedDomains[0].kind, 1);
            EXPECT_EQ(state.commands,
                      parameters == kNamed ? std::vector<std::string>() : std::vector<std::string>({kRemoveGroups}));
            state.pidFiles[kGroupPid] = pid;
            EXPECT_THAT(Work(parameters), kDone) << pid;
            EXPECT_EQ(state.fetchedDomains.size(), 1U);
        }
    }
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(UpdateWorker, ANameThatIsNoTextIsReadAsOneWhereItCanBe) {
    EXPECT_THAT(Work(R"({"domain_name": 5})"), kDone);
    EXPECT_THAT(state.fetchedDomains, ElementsAre(fake::FetchedDomains{0, {"5"}}, fake::FetchedDomains{1, {"5"}}));
}

TEST_F(UpdateWorker, ANameThatCannotBeReadRemovesTheMarkerAndGoesToTheCaller) {
    for (const char* parameters : {R"({"domain_name": {}})", R"({"domain_name": ["LAB"]})"}) {
        EXPECT_THROW(Work(parameters), Json::LogicError) << parameters;
        EXPECT_FALSE(HasMarker()) << parameters;
    }
    EXPECT_THAT(state.fetchedDomains, IsEmpty());
    EXPECT_EQ(appliance.Answers().size(), 2U) << "only the progress";
}

TEST_F(UpdateWorker, AnExceptionRemovesTheMarkerAndGoesToTheCaller) {
    const std::vector<std::pair<const char*, int>> throwers = {{"VORN::APIResponse::SetSuccess", 1},
                                                               {"VORN::APIResponse::SetSuccess", 2},
                                                               {"VORN::APIRequest::HasParam", 1},
                                                               {"VORN::APIRequest::GetParam", 1}};
    for (const auto& [function, nth] : throwers) {
        Restart();
        appliance.FailNth(function, nth, fake::Fault::Throw());
        EXPECT_THROW(Work(kNamed), fake::InjectedException) << function << nth;
        EXPECT_FALSE(HasMarker()) << function << nth;
        EXPECT_EQ(appliance.LiveHandles(), 0) << appliance.LiveHandleNames();
    }
}

TEST_F(UpdateWorker, TheMarkerIsGoneBeforeAFailureIsReported) {
    state.trustSetting = 0;
    appliance.FailNth("VORN::APIResponse::SetError", 1, fake::Fault::Throw());
    EXPECT_THROW(Work(R"({"domain_name": "OTHER"})"), fake::InjectedException);
    EXPECT_FALSE(HasMarker());
    EXPECT_EQ(appliance.CountOf("VLIBCSysRemove"), 1);
}

TEST_F(UpdateWorker, AMarkerThatCannotBeRemovedIsNoError) {
    appliance.FailNth("VLIBCSysRemove", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Work(), kDone);
}

TEST_F(UpdateWorker, UserDataIsNotUsed) {
    fake::Exchange exchange;
    int nothing = 0;
    DomainUpdateStartFork(&exchange.request, &exchange.response, &nothing);
    EXPECT_THAT(appliance.Answers(), kDone);
    EXPECT_EQ(nothing, 0);
}

}  // namespace
