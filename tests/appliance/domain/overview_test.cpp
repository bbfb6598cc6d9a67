// What the overview tells of the membership, the refresh and the join that run.

#include "appliance/module/overview_api.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <ctime>
#include <string>
#include <utility>

#include "appliance/base/file_lock.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "appliance/domain/directory/progress.h"
#include "appliance/domain/membership/last_test.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::EntryKind;
using appliance::FileLock;
using appliance::Path;

constexpr char kEnded[] = "ended before it was done";

class OverviewTest : public join_test::JoinTest {
protected:
    static Json::Value Overview() {
        const VORN::APIRequest request;
        return appliance::Overview(appliance::Parameters(request));
    }
    static Json::Value Progress() {
        const VORN::APIRequest request;
        const Json::Value progress = appliance::RefreshProgress(appliance::Parameters(request));
        EXPECT_EQ(Overview()["refresh"], progress);
        return progress;
    }
    // Runs `work` in a process of its own, which has ended when this comes back.
    template <typename Work>
    static void InAnother(const Work& work) {
        const pid_t child = fork();
        if (child == 0) {
            work();
            _exit(0);
        }
        int status = 0;
        waitpid(child, &status, 0);
        EXPECT_EQ(status, 0);
    }
};

TEST_F(OverviewTest, OfAWorkgroup) {
    const Json::Value overview = Overview();
    EXPECT_FALSE(overview["host_name"].asString().empty());
    for (const char* member : {"computer_account", "last_test", "refresh", "busy"}) {
        EXPECT_TRUE(overview.isMember(member) && overview[member].isNull()) << member;
    }
    ASSERT_TRUE(overview["interfaces"].isArray());
    for (const Json::Value& interface : overview["interfaces"]) {
        EXPECT_NE(interface["name"].asString(), "lo");
        EXPECT_TRUE(interface["addresses"].isArray());
    }
    EXPECT_EQ(overview.size(), 7U);
}

TEST_F(OverviewTest, TellsTheTimeAndTheZone) {
    const char* const before = std::getenv("TZ");
    const std::string zone = before == nullptr ? "" : before;
    for (const auto& [name, offset] :
         {std::pair("UTC", 0), std::pair("ODD-5:45", 20700), std::pair("WEST+3:30", -12600)}) {
        ASSERT_EQ(setenv("TZ", name, 1), 0);
        const Json::Value clock = Overview()["clock"];
        EXPECT_NEAR(static_cast<double>(clock["time"].asInt64()), static_cast<double>(std::time(nullptr)), 2) << name;
        EXPECT_EQ(clock["utc_offset"].asInt64(), offset) << name;
        EXPECT_EQ(clock.size(), 2U);
    }
    ASSERT_EQ(before == nullptr ? unsetenv("TZ") : setenv("TZ", zone.c_str(), 1), 0);
    tzset();
}

TEST_F(OverviewTest, OfAMember) {
    MakeMember("ads", "LAB", "LAB.TEST");
    appliance::Membership membership;
    ASSERT_FALSE(appliance::ReadMembership(membership));
    appliance::RecordTest(membership, {1764230400, false, 1200});
    const Json::Value overview = Overview();
    EXPECT_EQ(overview["computer_account"].asString(), overview["host_name"].asString() + "$");
    EXPECT_EQ(overview["last_test"]["time"].asInt64(), 1764230400);
    EXPECT_FALSE(overview["last_test"]["success"].asBool());
    EXPECT_EQ(overview["last_test"]["milliseconds"].asInt64(), 1200);
    EXPECT_EQ(overview["last_test"].size(), 3U);
}

TEST_F(OverviewTest, WithoutAConfigurationIsASystemError) {
    unlink(At(appliance::kSmbConf).c_str());
    try {
        Overview();
        FAIL();
    } catch (const appliance::CallFailure& failure) {
        EXPECT_EQ(failure.code(), 2617);
    }
}

TEST_F(OverviewTest, NamesTheJoinThatRuns) {
    Put(appliance::kJoinSteps, R"({"action": "leave", "finished": null, "steps": []})");
    EXPECT_TRUE(Overview()["busy"].isNull());
    {
        const auto lock = FileLock::Take(Path(appliance::kJoinLock), std::chrono::milliseconds(0));
        ASSERT_TRUE(lock);
        EXPECT_EQ(Overview()["busy"].asString(), "leave");
        Put(appliance::kJoinSteps, R"({"action": "join", "finished": null, "steps": []})");
        EXPECT_EQ(Overview()["busy"].asString(), "join");
        Put(appliance::kJoinSteps, R"({"action": "join", "finished": 1764230400, "steps": []})");
        EXPECT_TRUE(Overview()["busy"].isNull());
        unlink(At(appliance::kJoinSteps).c_str());
        EXPECT_TRUE(Overview()["busy"].isNull());
    }
    Put(appliance::kJoinSteps, R"({"action": "join", "finished": null, "steps": []})");
    EXPECT_TRUE(Overview()["busy"].isNull());
}

TEST_F(OverviewTest, ARefreshRunsFromTheUsersToTheGroups) {
    EXPECT_TRUE(Progress().isNull());
    {
        appliance::FetchProgress users(EntryKind::User, 2);
        users.Begin("OTHER");
        users.Fail("it is dead");
        users.End();
        users.Begin("LAB");
        users.Count(7);
        users.End();
    }
    // This process may go on with the groups.
    Json::Value progress = Progress();
    EXPECT_TRUE(progress["running"].asBool());
    EXPECT_TRUE(progress["finished"].isNull());
    EXPECT_FALSE(progress.isMember("process"));
    EXPECT_EQ(progress["domains_done"].asInt(), 2);
    EXPECT_EQ(progress["count"].asInt(), 7);
    const Json::Value started = progress["started"];
    appliance::FetchProgress groups(EntryKind::Group, 1);
    progress = Progress();
    EXPECT_TRUE(progress["running"].asBool());
    EXPECT_EQ(progress["kind"].asString(), "group");
    EXPECT_EQ(progress["started"], started);
    groups.Begin("LAB");
    groups.Fail("no groups");
    groups.End();
    progress = Progress();
    EXPECT_FALSE(progress["running"].asBool());
    EXPECT_GE(progress["finished"].asInt64(), started.asInt64());
    ASSERT_EQ(progress["errors"].size(), 2U);
    EXPECT_EQ(progress["errors"][0]["domain"].asString(), "OTHER");
    EXPECT_EQ(progress["errors"][0]["kind"].asString(), "user");
    EXPECT_EQ(progress["errors"][1]["reason"].asString(), "no groups");
    ASSERT_EQ(groups.failures().size(), 1U);
    // The next one begins anew.
    appliance::FetchProgress next(EntryKind::User, 1);
    progress = Progress();
    EXPECT_TRUE(progress["running"].asBool());
    EXPECT_EQ(progress["errors"].size(), 0U);
}

TEST_F(OverviewTest, ARefreshThatFailsBeforeItsFetchesIsOneThatFailed) {
    InAnother([] {
        appliance::FetchProgress users(EntryKind::User, 1);
        users.Begin("LAB");
        users.End();
    });
    EXPECT_FALSE(Progress()["running"].asBool());
    EXPECT_EQ(Progress()["errors"].size(), 0U);
    InAnother([] {
        appliance::RecordRefreshBegin();
        appliance::RecordRefreshFailure("LAB", "nobody answers");
    });
    const Json::Value progress = Progress();
    EXPECT_FALSE(progress["running"].asBool());
    EXPECT_TRUE(progress["finished"].isInt64());
    ASSERT_EQ(progress["errors"].size(), 1U);
    EXPECT_EQ(progress["errors"][0]["reason"].asString(), "nobody answers");
    appliance::RecordRefreshBegin();
    EXPECT_TRUE(Progress()["running"].asBool());
    EXPECT_EQ(Progress()["errors"].size(), 0U);
    appliance::FetchProgress groups(EntryKind::Group, 1);
    EXPECT_EQ(Progress()["domains"].asInt(), 1);
}

TEST_F(OverviewTest, AKilledRefreshHasAnEnd) {
    InAnother([] {
        appliance::FetchProgress users(EntryKind::User, 2);
        users.Begin("OTHER");
        users.Fail("it is dead");
        users.End();
        usleep(210000);
        users.Begin("LAB");
    });
    const Json::Value progress = Progress();
    EXPECT_FALSE(progress["running"].asBool());
    EXPECT_EQ(progress["finished"], progress["updated"]);
    ASSERT_EQ(progress["errors"].size(), 2U);
    EXPECT_EQ(progress["errors"][1]["domain"].asString(), "LAB");
    EXPECT_EQ(progress["errors"][1]["kind"].asString(), "user");
    EXPECT_EQ(progress["errors"][1]["reason"].asString(), kEnded);
}

TEST_F(OverviewTest, AFetchOfTheAppliancesOwnRunsToo) {
    InAnother([] { appliance::FetchProgress(EntryKind::User, 1).End(); });
    Put(appliance::kGroupPid, "");
    unlink(At(appliance::kGroupPid).c_str());
    EXPECT_FALSE(Progress()["running"].asBool());
    ASSERT_TRUE(appliance::WritePidFile(At(appliance::kGroupPid)));
    EXPECT_TRUE(Progress()["running"].asBool());
    EXPECT_TRUE(Progress()["finished"].isNull());
}

// Between the request and the first record of its process.
TEST_F(OverviewTest, ARefreshThatWasJustAskedForRuns) {
    Put(appliance::kUpdatingMarker, "");
    Json::Value progress = Progress();
    EXPECT_TRUE(progress["running"].asBool());
    EXPECT_EQ(progress["domains"].asInt(), 0);
    EXPECT_EQ(progress["updated"], progress["started"]);
    usleep(20000);
    InAnother([] { appliance::FetchProgress(EntryKind::User, 1).End(); });
    EXPECT_FALSE(Progress()["running"].asBool());
    usleep(20000);
    Put(appliance::kUpdatingMarker, "x");
    EXPECT_TRUE(Progress()["running"].asBool());
    EXPECT_EQ(Progress()["domains"].asInt(), 0);
    // One that a killed task has left.
    const timespec old[2] = {{time(nullptr) - 3, 0}, {time(nullptr) - 3, 0}};
    utimensat(AT_FDCWD, At(appliance::kUpdatingMarker).c_str(), old, 0);
    EXPECT_FALSE(Progress()["running"].asBool());
}

}  // namespace
