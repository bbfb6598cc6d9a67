// "set": the way back to the workgroup.

#include <string>

#include "tests/unit/set_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Optional;
using ::testing::Pair;
using ::testing::StrEq;
using unit::FailsWith;
using unit::kSettingsPath;
using unit::LastErrorText;
using unit::LeaveRequest;
using unit::Logs;
using unit::Succeeds;

class Leave : public unit::SetTest {
protected:
    Leave() {
        MakeMember();
    }

    void MakeMember() {
        BeMember();
        state.keyValueFiles[kSettingsPath][""] = {{"domain_dns", "192.0.2.1"}, {"hostname", "nas"}};
        state.keyValueFiles[unit::kSmbInfoPath]["global"] = {{"advanced_domain_option", "yes"},
                                                             {"register nic", "eth0"}};
    }

    bool DomainDnsStays() const {
        const auto& section = state.keyValueFiles.at(kSettingsPath).at("");
        return fake::FindKey(section, "domain_dns") != nullptr;
    }
};

const auto kNotSaved =
    Logs("domain.cpp", "%s:%d Failed to save domain/workgroup info.", "Failed to save domain/workgroup info.");

TEST_F(Leave, CallsThePlatformInOrder) {
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), Succeeds("null"));
    EXPECT_THAT(appliance.CallTexts(fake::kBookkeeping),
                ElementsAre(R"(VornConf::Def("supportdomain", ""))", "WINIQuery1(size 256, first, null)",
                            R"(VORNWinJoin1({joinMode 0, "WORKGROUP", "", "", kdc "", fqdn "", netbiosName ""}))",
                            R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                            R"(VLIBCFileITmpName("/usr/vorn/etc/smbinfo.conf", size 4095))",
                            R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                            R"({"advanced_domain_option": "no"}, "    %s=%s\x0a"))",
                            R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                            "VLIBCFileLock(2054, 5)", R"(VLIBCFileRemoveKey("/etc/vorninfo.conf", "domain_dns"))",
                            "VLIBCFileUnlock(2048)", R"(VORNLogSet1(2, 1, 293602566, "WORKGROUP", "", "", ""))"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(Leave, TakesTheLockByItsWordAndGivesItBackByAnother) {
    Call(DomainSet, LeaveRequest());
    EXPECT_EQ(appliance.CountOf("VLIBCFileLock"), 1);
    const auto words = CallsOf({"VLIBCFileLock", "VLIBCFileUnlock"});
    EXPECT_THAT(words, ElementsAre("VLIBCFileLock(" + std::to_string(0x806) + ", 5)",
                                   "VLIBCFileUnlock(" + std::to_string(0x800) + ")"));
}

TEST_F(Leave, GivesARecordWithNothingElseInIt) {
    Call(DomainSet, LeaveRequest());
    ASSERT_EQ(state.joins.size(), 1U);
    const fake::JoinRecord& join = state.joins[0];
    EXPECT_EQ(join.bytes.joinMode, 0);
    EXPECT_EQ(join.bytes.reserved1, 0);
    EXPECT_THAT(join.domainName, Optional(StrEq("WORKGROUP")));
    EXPECT_THAT(join.userName, Optional(StrEq("")));
    EXPECT_THAT(join.password, Optional(StrEq("")));
    for (const char byte : join.bytes.kdc) {
        EXPECT_EQ(byte, '\0');
    }
    for (const char byte : join.bytes.fqdn) {
        EXPECT_EQ(byte, '\0');
    }
    for (const char byte : join.bytes.netbiosName) {
        EXPECT_EQ(byte, '\0');
    }
    EXPECT_EQ(appliance.CountOf("strdup"), 0);
}

TEST_F(Leave, RemovesOnlyTheDomainsDnsFromTheSettings) {
    Call(DomainSet, LeaveRequest());
    EXPECT_THAT(state.keyValueFiles[kSettingsPath][""], ElementsAre(Pair("hostname", "nas")));
    EXPECT_THAT(state.keyValueFiles[unit::kSmbInfoPath]["global"], ElementsAre(Pair("advanced_domain_option", "no")));
}

TEST_F(Leave, WritesOneEvent) {
    Call(DomainSet, LeaveRequest());
    ASSERT_EQ(state.events.size(), 1U);
    EXPECT_EQ(state.events[0].kind, 2);
    EXPECT_EQ(state.events[0].level, 1);
    EXPECT_EQ(state.events[0].event, 0x11800506);
    EXPECT_THAT(state.events[0].arguments, ElementsAre("WORKGROUP", "", "", ""));
}

TEST_F(Leave, LeavesEverythingElseAsItIs) {
    state.trustSetting = 2;
    state.files.insert(unit::kJoinStatusPath);
    state.settings["enableduserhome"] = "yes";
    state.enabledServices = {"webdav-httpd-pure"};
    const auto servers = state.dnsServers;
    EXPECT_THAT(Call(DomainSet, unit::With(LeaveRequest(), R"({"dns": "192.0.2.7", "manage_mode": 1})")),
                Succeeds("null"));
    EXPECT_EQ(state.trustSetting, 2);
    EXPECT_EQ(state.dnsServers, servers);
    EXPECT_TRUE(state.Exists(unit::kJoinStatusPath));
    EXPECT_THAT(state.reloadedServices, IsEmpty());
    EXPECT_THAT(state.restartedServices, IsEmpty());
    EXPECT_EQ(state.adminGroupUpdates, 0);
    EXPECT_EQ(state.userHomesIncluded, 0);
}

TEST_F(Leave, CountsAPositiveResultAsDone) {
    for (const int result : {1, 2}) {
        SCOPED_TRACE(result);
        Restart();
        MakeMember();
        state.joinResult = result;
        EXPECT_THAT(Call(DomainSet, LeaveRequest()), Succeeds("null"));
        EXPECT_FALSE(DomainDnsStays());
        EXPECT_EQ(state.events.size(), 1U);
        EXPECT_THAT(appliance.Logs(), IsEmpty());
    }
}

TEST_F(Leave, Answers2617WhenThePlatformRefuses) {
    state.joinResult = -1;
    state.joinStatus = fake::JoinStatus{"stat", "Invalid KDC ip."};
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d Failed to clear domain info.", "Failed to clear domain info."),
                            kNotSaved));
    EXPECT_EQ(appliance.CountOf("VLIBCSzHashAlloc"), 0);
    EXPECT_EQ(appliance.CountOf("VLIBCFileLock"), 0);
    EXPECT_TRUE(DomainDnsStays());
    EXPECT_THAT(state.events, IsEmpty());
}

TEST_F(Leave, StaysDoneWhenTheAdvancedOptionsCannotBeReset) {
    appliance.FailNth("VLIBCSzHashAlloc", 1, fake::Fault::Null());
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d remove advance option keys Fail [0x%04X %s:%d]",
                                                   "remove advance option keys Fail " + LastErrorText(state)),
                                              kNotSaved));
    EXPECT_EQ(state.firstFlag, 0);
    EXPECT_EQ(appliance.CountOf("VLIBCFileLock"), 0);
    EXPECT_TRUE(DomainDnsStays());
    EXPECT_THAT(state.events, IsEmpty());
}

TEST_F(Leave, AddsItsOwnLineToThatOfTheAdvancedOptions) {
    appliance.FailNth("VLIBCFileITmpName", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d cannot store smbinfo.conf", "cannot store smbinfo.conf"),
                            Logs("domain.cpp", "%s:%d remove advance option keys Fail [0x%04X %s:%d]",
                                 "remove advance option keys Fail " + LastErrorText(state)),
                            kNotSaved));
}

TEST_F(Leave, KeepsTheDomainsDnsWithoutTheLockAndSucceeds) {
    for (const int result : {-1, 1, 2}) {
        SCOPED_TRACE(result);
        Restart();
        MakeMember();
        appliance.FailNth("VLIBCFileLock", 1, fake::Fault::Result(result));
        EXPECT_THAT(Call(DomainSet, LeaveRequest()), Succeeds("null"));
        EXPECT_TRUE(DomainDnsStays());
        EXPECT_EQ(appliance.CountOf("VLIBCFileRemoveKey"), 0);
        EXPECT_EQ(appliance.CountOf("VLIBCFileUnlock"), 0);
        EXPECT_EQ(state.events.size(), 1U);
        EXPECT_THAT(appliance.Logs(), IsEmpty());
    }
}

TEST_F(Leave, DoesNotMindWhatFailsAfterwards) {
    for (const char* function : {"VLIBCFileRemoveKey", "VLIBCFileUnlock", "VORNLogSet1"}) {
        for (const int result : {-1, 1}) {
            SCOPED_TRACE(function + std::to_string(result));
            Restart();
            MakeMember();
            appliance.FailNth(function, 1, fake::Fault::Result(result));
            EXPECT_THAT(Call(DomainSet, LeaveRequest()), Succeeds("null"));
            EXPECT_EQ(appliance.CountOf("VLIBCFileUnlock"), 1);
            EXPECT_EQ(appliance.CountOf("VORNLogSet1"), 1);
            EXPECT_THAT(appliance.Logs(), IsEmpty());
        }
    }
}

}  // namespace
