// The monitor: waits for the end of a fetch that the appliance started by itself.

#include "tests/unit/update_fixture.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::kGroupPid;
using unit::kUserPid;
using unit::Succeeds;

class UpdateMonitor : public unit::UpdateTest {
protected:
    // The pid files name a live process until this read of one.
    void EndFetchesAtRead(int read) {
        appliance.FailNth("VLIBCReadPidFile", read, fake::Fault::Result(-1), true);
    }
};

TEST_F(UpdateMonitor, PausesThreeSecondsEvenWhenNothingIsFetched) {
    EXPECT_THAT(RunTask(DomainMonitorUpdating),
                ElementsAre(Succeeds(R"({"status": "updating"})"), Succeeds(R"({"status": "finish"})")));
    EXPECT_EQ(state.sleptSeconds, 3U);
    EXPECT_FALSE(HasMarker());
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(appliance.CallTexts(), ElementsAre(R"(VORN::APIResponse::SetSuccess({"status":"updating"}))",
                                                   "sleep(3)", R"(VLIBCReadPidFile("/tmp/domain_user.pid"))",
                                                   R"(VLIBCReadPidFile("/tmp/domain_group.pid"))",
                                                   R"(VORN::APIResponse::SetSuccess({"status":"finish"}))",
                                                   R"(VLIBCSysRemove("/tmp/domain_updating"))"));
}

TEST_F(UpdateMonitor, PausesAgainAsLongAsUsersAreFetched) {
    state.pidFiles[kUserPid] = 4711;
    EndFetchesAtRead(3);
    RunTask(DomainMonitorUpdating);
    EXPECT_THAT(appliance.CallTexts(), ElementsAre(R"(VORN::APIResponse::SetSuccess({"status":"updating"}))",
                                                   "sleep(3)", R"(VLIBCReadPidFile("/tmp/domain_user.pid"))",
                                                   "sleep(3)", R"(VLIBCReadPidFile("/tmp/domain_user.pid"))",
                                                   "sleep(3)", R"(VLIBCReadPidFile("/tmp/domain_user.pid"))",
                                                   R"(VLIBCReadPidFile("/tmp/domain_group.pid"))",
                                                   R"(VORN::APIResponse::SetSuccess({"status":"finish"}))",
                                                   R"(VLIBCSysRemove("/tmp/domain_updating"))"));
}

TEST_F(UpdateMonitor, PausesAgainAsLongAsGroupsAreFetched) {
    state.pidFiles[kGroupPid] = 0;
    EndFetchesAtRead(5);
    EXPECT_THAT(RunTask(DomainMonitorUpdating),
                ElementsAre(Succeeds(R"({"status": "updating"})"), Succeeds(R"({"status": "finish"})")));
    EXPECT_EQ(state.sleptSeconds, 9U);
}

TEST_F(UpdateMonitor, HasNoLimitOfItsOwn) {
    state.pidFiles[kUserPid] = 4711;
    EndFetchesAtRead(2001);
    RunTask(DomainMonitorUpdating);
    EXPECT_EQ(state.sleptSeconds, 6003U);
    EXPECT_FALSE(HasMarker());
}

TEST_F(UpdateMonitor, AnInterruptedPauseDoesNotMatter) {
    appliance.FailNth("sleep", 1, fake::Fault::Result(1));
    EXPECT_THAT(RunTask(DomainMonitorUpdating),
                ElementsAre(Succeeds(R"({"status": "updating"})"), Succeeds(R"({"status": "finish"})")));
    EXPECT_EQ(appliance.CountOf("sleep"), 1);
}

TEST_F(UpdateMonitor, FetchesNothingAndReadsNoParameters) {
    RunTask(DomainMonitorUpdating, R"({"domain_name": "LAB"})");
    EXPECT_THAT(state.fetchedDomains, IsEmpty());
    EXPECT_THAT(state.commands, IsEmpty());
    EXPECT_EQ(appliance.CountOf("VORN::APIRequest::HasParam"), 0);
}

TEST_F(UpdateMonitor, AMarkerThatCannotBeRemovedIsNoError) {
    appliance.FailNth("VLIBCSysRemove", 1, fake::Fault::Result(-1));
    EXPECT_THAT(RunTask(DomainMonitorUpdating),
                ElementsAre(Succeeds(R"({"status": "updating"})"), Succeeds(R"({"status": "finish"})")));
    EXPECT_EQ(appliance.CountOf("VLIBCSysRemove"), 1);
}

TEST_F(UpdateMonitor, RemovesTheMarkerAlsoWhenItsProgressCannotBePublished) {
    for (const int nth : {1, 2}) {
        Restart();
        appliance.FailNth("VORN::APIResponse::SetSuccess", nth, fake::Fault::Throw());
        EXPECT_THROW(RunTask(DomainMonitorUpdating), fake::InjectedException) << nth;
        EXPECT_FALSE(HasMarker()) << nth;
        EXPECT_EQ(appliance.CountOf("sleep"), nth - 1);
        EXPECT_EQ(appliance.Answers().size(), static_cast<std::size_t>(nth - 1));
    }
}

TEST_F(UpdateMonitor, UserDataIsNotUsed) {
    fake::Exchange exchange;
    int nothing = 0;
    DomainMonitorUpdating(&exchange.request, &exchange.response, &nothing);
    EXPECT_EQ(appliance.Answers().size(), 2U);
    EXPECT_EQ(nothing, 0);
}

}  // namespace
