#include "appliance/base/paths.h"
#include "appliance/domain/directory/admin_group.h"
#include "appliance/domain/directory/time_sync.h"
#include "tests/appliance/directory/directory_test.h"

namespace appliance_test {
namespace {

using appliance::ClockStep;
using appliance::DecideStep;
using appliance::ErrorCode;
using appliance::ParseDomainSid;
using appliance::ParseTime;

constexpr std::chrono::seconds kPatience{20};
constexpr char kSids[] =
    "SID for local machine NAS1 is: S-1-5-21-2872217150-2617190287-591229512\n"
    "SID for domain LAB is: S-1-5-21-1199070361-2413314540-1962081955\n";

TEST(DomainSidTest, ReadsTheDomainsOwn) {
    EXPECT_EQ(ParseDomainSid(kSids, "lab"), "S-1-5-21-1199070361-2413314540-1962081955");
    for (const char* text :
         {"", "Could not fetch domain SID\n", "SID for domain OTHER is: S-1-5-21-1-2-3\n", "SID for domain LAB is: \n",
          "SID for domain LAB is: S-1-5-32\n", "SID for domain LAB is: S-1-5-21-1-2-3 -U x\n",
          "SID for domain LAB is: S-1-5-21-1-2-3-500\n"}) {
        EXPECT_EQ(ParseDomainSid(text, "LAB"), "") << text;
    }
}

class AdminGroupTest : public DirectoryTest {
protected:
    AdminGroupTest() {
        MakeMember(true);
        EXPECT_FALSE(appliance::ReadMembership(membership));
        Put(folder / "sids", kSids);
    }
    // A "net" that records what it is asked, and answers a change of members with `change`.
    void PutNet(const std::string& change) {
        PutProgram("net", "shift\necho \"$*\" >> '" + folder / "asked" + "'\ncase \"$1\" in getdomainsid) cat '" +
                              folder / "sids" + "'; exit;; esac\ncase \"$2\" in *mem) " + change + ";; esac");
    }
    bool Apply() {
        Put(folder / "asked", "");
        return appliance::ApplyDomainAdministrators(membership, kPatience, code);
    }

    appliance::Membership membership;
    ErrorCode code = ErrorCode::Internal;
};

constexpr char kMember[] = "Administrators S-1-5-21-1199070361-2413314540-1962081955-512\n";

TEST_F(AdminGroupTest, AddsOrRemovesAsTheOptionSays) {
    PutNet("exit 0");
    EXPECT_TRUE(Apply());
    EXPECT_EQ(Got(folder / "asked"),
              "getdomainsid\nsam createbuiltingroup Administrators\nsam addmem " + std::string(kMember));
    Put(appliance::Path(appliance::kSmbInfo), "[global]\n    disable domain admins=yes\n");
    EXPECT_TRUE(Apply());
    EXPECT_EQ(Got(folder / "asked"),
              "getdomainsid\nsam createbuiltingroup Administrators\nsam delmem " + std::string(kMember));
    Put(appliance::Path(appliance::kSmbInfo), "[global]\n    disable domain admins=no\n");
    EXPECT_TRUE(Apply());
    EXPECT_NE(Got(folder / "asked").find("addmem"), std::string::npos);
}

TEST_F(AdminGroupTest, WhatIsSoAlreadyIsDone) {
    PutNet("echo 'Adding local group member failed with NT_STATUS_MEMBER_IN_ALIAS' >&2; exit 255");
    EXPECT_TRUE(Apply());
    Put(appliance::Path(appliance::kSmbInfo), "[global]\n    disable domain admins=yes\n");
    EXPECT_FALSE(Apply());
    PutNet("echo 'Deleting local group member failed with NT_STATUS_MEMBER_NOT_IN_ALIAS' >&2; exit 255");
    EXPECT_TRUE(Apply());
}

TEST_F(AdminGroupTest, SaysWhenItCannot) {
    PutNet("echo 'Could not find member' >&2; exit 255");
    EXPECT_FALSE(Apply());
    EXPECT_EQ(code, ErrorCode::CommandFailed);
    Put(folder / "sids", "");
    EXPECT_FALSE(Apply());
    membership.hasSecret = false;
    EXPECT_FALSE(Apply());
    EXPECT_EQ(code, ErrorCode::NotMember);
    EXPECT_EQ(Got(folder / "asked"), "");
}

TEST_F(AdminGroupTest, GivesUpInTimeWhileWinbindIsBusy) {
    PutNet("sleep 20");
    const auto began = std::chrono::steady_clock::now();
    EXPECT_FALSE(appliance::ApplyDomainAdministrators(membership, std::chrono::seconds(1), code));
    EXPECT_LT(std::chrono::steady_clock::now() - began, std::chrono::seconds(10));
    EXPECT_EQ(code, ErrorCode::TimedOut);
}

TEST(ClockTest, ReadsWhatNetTimePrints) {
    EXPECT_EQ(ParseTime("Sat Nov 21 19:22:03 2026\n"), 1795288923);
    for (const char* text :
         {"", "\n", "Could not connect to server", "Sat Nov 21 19:22:03 2026 extra", "Sat Nov 99 1:2:3"}) {
        EXPECT_FALSE(ParseTime(text)) << text;
    }
}

TEST(ClockTest, FollowsOnlyWhatCanBeRight) {
    constexpr std::int64_t kNow = 1795288923;
    constexpr std::int64_t kDay = 86400;
    EXPECT_EQ(DecideStep(kNow, kNow), ClockStep::None);
    EXPECT_EQ(DecideStep(kNow, kNow + 1), ClockStep::None);
    EXPECT_EQ(DecideStep(kNow, kNow - 1), ClockStep::None);
    EXPECT_EQ(DecideStep(kNow, kNow + 2), ClockStep::Set);
    EXPECT_EQ(DecideStep(kNow, kNow - 600), ClockStep::Set);
    EXPECT_EQ(DecideStep(kNow, kNow + kDay), ClockStep::Set);
    EXPECT_EQ(DecideStep(kNow, kNow + kDay + 1), ClockStep::TooFar);
    EXPECT_EQ(DecideStep(kNow, kNow - kDay - 1), ClockStep::TooFar);
    EXPECT_EQ(DecideStep(100, kNow), ClockStep::Set);  // a clock that was never set
    EXPECT_EQ(DecideStep(kNow, 0), ClockStep::Impossible);
    EXPECT_EQ(DecideStep(100, 101), ClockStep::Impossible);
}

class TimeSyncTest : public DirectoryTest {};

TEST_F(TimeSyncTest, IsOnWithYesOnly) {
    EXPECT_FALSE(appliance::IsTimeSynchronised());
    Put(appliance::Path(appliance::kSmbConf), "[global]\n    vorn sync dctime = yes\n");
    EXPECT_TRUE(appliance::IsTimeSynchronised());
    Put(appliance::Path(appliance::kSmbConf), "[global]\n    vorn sync dctime = no\n");
    EXPECT_FALSE(appliance::IsTimeSynchronised());
}

// A clock that differs by a second is right, so nothing is ever set; the program has two seconds to end.
TEST_F(TimeSyncTest, AsksTheControllerAndRefusesAbsurdTimes) {
    MakeMember(false);
    PutProgram("net", "echo \"$*\" > '" + folder / "asked" + "'; date -d '1 second' '+%a %b %e %H:%M:%S %Y'");
    EXPECT_TRUE(appliance::SynchroniseTime());
    EXPECT_NE(Got(folder / "asked").find("time -S " + ControllerAddress()), std::string::npos);
    PutAnswer("net", "Sat Nov 21 19:22:03 1998\n");
    EXPECT_FALSE(appliance::SynchroniseTime());
    PutAnswer("net", "Sat Nov 21 19:22:03 2037\n");
    EXPECT_FALSE(appliance::SynchroniseTime());
    PutAnswer("net", "", 255);
    EXPECT_FALSE(appliance::SynchroniseTime());
}

TEST_F(TimeSyncTest, HasNothingToDoInAWorkgroup) {
    Put(appliance::Path(appliance::kSmbConf), "[global]\n    workgroup = WORKGROUP\n    security = user\n");
    EXPECT_TRUE(appliance::SynchroniseTime());
}

}  // namespace
}  // namespace appliance_test
