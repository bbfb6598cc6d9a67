// "set": a join that works.

#include <string>
#include <vector>

#include "tests/unit/set_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Optional;
using ::testing::Pair;
using ::testing::StrEq;
using ::testing::UnorderedElementsAre;
using unit::FailsWith;
using unit::JoinRequest;
using unit::kJoinStatusPath;
using unit::Succeeds;
using unit::With;

class Join : public unit::SetTest {
protected:
    // The platform's calls in their order. Which of two texts is joined first when they are compared is open.
    std::vector<std::string> PlatformCalls() const {
        return appliance.CallTexts([](const fake::Call& call) {
            return (fake::KindOf(call) & fake::kAllBookkeeping) == 0 && call.function != "WebUtils::StringImplode";
        });
    }

    // The record of the only join.
    const fake::JoinRecord& Record() const {
        EXPECT_EQ(state.joins.size(), 1U);
        return state.joins.at(0);
    }
};

TEST_F(Join, WithAllParametersCallsThePlatformInOrder) {
    state.files.insert(kJoinStatusPath);
    state.settings["enableduserhome"] = "yes";
    state.enabledServices = {"webdav-httpd-pure"};
    state.onJoin = [this](const _tag_VORN_WIN2_&) { state.files.insert(kJoinStatusPath); };
    EXPECT_THAT(Call(DomainSet, With(R"({"dns": "192.0.2.7,192.0.2.8", "manage_mode": 0, "advance_domain_conf":
                    {"enable_advance_option": true, "kdc": "192.0.2.9", "netbios_name": "LAB",
                     "fqdn_name": "lab.test.", "register_nics": ["eth0", "eth1"]}})")),
                Succeeds("null"));
    EXPECT_THAT(
        PlatformCalls(),
        ElementsAre(R"(BlVLIBIsIpAddr("lab.test"))", R"(BlVLIBIsv6IpAddrValid("lab.test"))",
                    R"(VornConf::Def("supportdomain", ""))", "WINIQuery1(size 256, first, null)", "VORNLDAPIsBinded(0)",
                    "VORNWinIsEnableTrustDomain()", "VORNWinSetTrustDomain(1)", "VORNNetDNSListGet(list)",
                    R"(WebUtils::StringExplode("192.0.2.7,192.0.2.8", ","))",
                    R"(VORNNetDNSListSet(["192.0.2.7", "192.0.2.8"]))",
                    R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    R"(VLIBCFileITmpName("/usr/vorn/etc/smbinfo.conf", size 4095))",
                    R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                    R"({"advanced_domain_option": "yes", "register nic": "eth0,eth1"}, "    %s=%s\x0a"))",
                    R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                    R"(access("/var/log/winlock.state", 0))", R"(unlink("/var/log/winlock.state"))",
                    R"(VORNWinJoin1({joinMode 1, "lab.test", "joiner", "Canary-1", kdc "192.0.2.9", )"
                    R"(fqdn "lab.test.", netbiosName "LAB"}))",
                    "VORNGroupAddDomainAdminGroup()", R"(VLIBServiceReload("samba"))", R"(VLIBServiceReload("nmbd"))",
                    R"(VLIBServiceReload("winbindd"))", "WINIQuery1(size 256, first, null)",
                    R"(VORNLogSet1(2, 1, 293602308, "lab.test", "", "", ""))",
                    R"(VornConf::Info("enableduserhome", ""))", "VORNDomainUserHomeInclude(1)",
                    R"(VLIBServiceIsEnabled("webdav-httpd-pure"))", R"(VLIBServiceRestart("webdav-httpd-pure"))",
                    R"(access("/var/log/winlock.state", 0))", R"(unlink("/var/log/winlock.state"))"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(Join, WithTheLeastParametersCallsThePlatformInOrder) {
    state.trustSetting = 1;
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    EXPECT_THAT(
        PlatformCalls(),
        ElementsAre(R"(BlVLIBIsIpAddr("lab.test"))", R"(BlVLIBIsv6IpAddrValid("lab.test"))",
                    R"(VornConf::Def("supportdomain", ""))", "WINIQuery1(size 256, first, null)", "VORNLDAPIsBinded(0)",
                    "VORNWinIsEnableTrustDomain()", "VORNNetDNSListGet(list)",
                    R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    R"(VLIBCFileITmpName("/usr/vorn/etc/smbinfo.conf", size 4095))",
                    R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                    R"({"advanced_domain_option": "no"}, "    %s=%s\x0a"))",
                    R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                    R"(access("/var/log/winlock.state", 0))",
                    R"(VORNWinJoin1({joinMode 1, "lab.test", "joiner", "Canary-1", kdc "", fqdn "", netbiosName ""}))",
                    "VORNGroupAddDomainAdminGroup()", R"(VLIBServiceReload("samba"))", R"(VLIBServiceReload("nmbd"))",
                    R"(VLIBServiceReload("winbindd"))", "WINIQuery1(size 256, first, null)",
                    R"(VORNLogSet1(2, 1, 293602308, "lab.test", "", "", ""))",
                    R"(VornConf::Info("enableduserhome", ""))", "VORNDomainUserHomeInclude(0)",
                    R"(VLIBServiceIsEnabled("webdav-httpd-pure"))", R"(access("/var/log/winlock.state", 0))"));
}

TEST_F(Join, ReadsItsParametersInOrder) {
    Call(DomainSet, With(R"({"dns": "192.0.2.7", "manage_mode": 1})"));
    auto reads = appliance.CallTexts([](const fake::Call& call) { return fake::KindOf(call) == fake::kRequestReads; });
    // Those that follow the checks, which end with the advanced options.
    reads.erase(reads.begin(),
                std::find(reads.begin(), reads.end(), R"(VORN::APIRequest::HasParam("advance_domain_conf"))"));
    EXPECT_THAT(
        reads, ElementsAre(
                   R"(VORN::APIRequest::HasParam("advance_domain_conf"))",
                   R"(VORN::APIRequest::GetParam("enable_domain", null))",
                   R"(VORN::APIRequest::GetParam("domain_name", null))",
                   R"(VORN::APIRequest::GetParam("username", null))", R"(VORN::APIRequest::GetParam("password", null))",
                   R"(VORN::APIRequest::HasParam("manage_mode"))", R"(VORN::APIRequest::GetParam("manage_mode", null))",
                   R"(VORN::APIRequest::GetParam("manage_mode", null))", R"(VORN::APIRequest::HasParam("dns"))",
                   R"(VORN::APIRequest::GetParam("dns", ""))", R"(VORN::APIRequest::HasParam("advance_domain_conf"))"));
}

TEST_F(Join, ReadsAnAbsentModeWithTheDefaultOfNull) {
    Call(DomainSet, JoinRequest());
    EXPECT_THAT(appliance.CallTexts([](const fake::Call& call) {
        return fake::KindOf(call) == fake::kRequestReads && call.arguments[0] == "\"manage_mode\"";
    }),
                ElementsAre(R"(VORN::APIRequest::HasParam("manage_mode"))",
                            R"(VORN::APIRequest::GetParam("manage_mode", null))"));
}

TEST_F(Join, GivesARecordThatHoldsTheRequestAndNothingElse) {
    Call(DomainSet, JoinRequest());
    const fake::JoinRecord& record = Record();
    EXPECT_EQ(record.bytes.joinMode, 1);
    EXPECT_EQ(record.bytes.reserved1, 0);
    EXPECT_THAT(record.domainName, Optional(StrEq("lab.test")));
    EXPECT_THAT(record.userName, Optional(StrEq("joiner")));
    EXPECT_THAT(record.password, Optional(StrEq("Canary-1")));
    EXPECT_EQ(std::string(record.bytes.kdc, sizeof(record.bytes.kdc)), std::string(128, '\0'));
    EXPECT_EQ(std::string(record.bytes.fqdn, sizeof(record.bytes.fqdn)), std::string(256, '\0'));
    EXPECT_EQ(std::string(record.bytes.netbiosName, sizeof(record.bytes.netbiosName)), std::string(128, '\0'));
    EXPECT_EQ(std::string(record.bytes.reserved2, sizeof(record.bytes.reserved2)), std::string(8196, '\0'));
}

TEST_F(Join, GivesARecordWithTheAdvancedOptionsInTheirFields) {
    Call(DomainSet, With(R"({"advance_domain_conf": {"enable_advance_option": true, "kdc": "192.0.2.9",
                                                     "netbios_name": "LAB", "fqdn_name": "lab.test."}})"));
    EXPECT_STREQ(Record().bytes.kdc, "192.0.2.9");
    EXPECT_STREQ(Record().bytes.netbiosName, "LAB");
    EXPECT_STREQ(Record().bytes.fqdn, "lab.test.");
}

TEST_F(Join, GivesTextsOfAnyLengthAndAnyBytes) {
    Json::Value parameters = JoinRequest();
    const std::string domain = std::string(3000, 'd') + "\xFF\x01 \"'";
    const std::string user = "\xC3\xA4;" + std::string(3000, 'u');
    const std::string password = "$(x)\n" + std::string(3000, 'p');
    parameters["domain_name"] = domain;
    parameters["username"] = user;
    parameters["password"] = password;
    Call(DomainSet, parameters);
    EXPECT_THAT(Record().domainName, Optional(domain));
    EXPECT_THAT(Record().userName, Optional(user));
    EXPECT_THAT(Record().password, Optional(password));
}

TEST_F(Join, EndsEachTextAtItsFirstNul) {
    Json::Value parameters = JoinRequest();
    parameters["domain_name"] = std::string("lab\0x", 5);
    parameters["username"] = std::string("\0x", 2);
    parameters["password"] = std::string("secret\0x", 8);
    Call(DomainSet, parameters);
    EXPECT_THAT(Record().domainName, Optional(StrEq("lab")));
    EXPECT_THAT(Record().userName, Optional(StrEq("")));
    EXPECT_THAT(Record().password, Optional(StrEq("secret")));
}

TEST_F(Join, TakesEmptyTexts) {
    EXPECT_THAT(Call(DomainSet, With(R"({"domain_name": "", "username": "", "password": ""})")), Succeeds("null"));
    EXPECT_THAT(Record().domainName, Optional(StrEq("")));
}

TEST_F(Join, CopiesItsThreeTextsAndFreesThemAfterwards) {
    Call(DomainSet, JoinRequest());
    const auto copies = CallsOf({"strdup", "VORNWinJoin1", "free"});
    ASSERT_EQ(copies.size(), 7U);
    EXPECT_EQ(copies[0], R"(strdup("lab.test"))");
    EXPECT_EQ(copies[1], R"(strdup("joiner"))");
    EXPECT_EQ(copies[2], R"(strdup("Canary-1"))");
    EXPECT_THAT(copies[3], HasSubstr("VORNWinJoin1"));
    EXPECT_THAT(std::vector<std::string>(copies.begin() + 4, copies.end()),
                UnorderedElementsAre(R"(free("lab.test"))", R"(free("joiner"))", R"(free("Canary-1"))"));
}

TEST_F(Join, GoesOnWithANullFieldWhenATextCannotBeCopied) {
    const char* names[] = {"lab.test", "joiner", "Canary-1"};
    for (int lost = 0; lost < 3; ++lost) {
        SCOPED_TRACE(names[lost]);
        Restart();
        state.joinStatus = fake::JoinStatus{"stat", "Invalid KDC ip."};
        appliance.FailNth("strdup", lost + 1, fake::Fault::Null());
        EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(2603));
        const fake::OptionalTexts texts = {Record().domainName, Record().userName, Record().password};
        for (int i = 0; i < 3; ++i) {
            const auto at = static_cast<std::size_t>(i);
            EXPECT_EQ(texts[at], i == lost ? fake::OptionalText() : fake::OptionalText(names[at]));
        }
        EXPECT_EQ(appliance.CountOf("free"), 2);
    }
}

TEST_F(Join, SucceedsWithANullFieldWhenThePlatformTakesIt) {
    appliance.FailNth("strdup", 1, fake::Fault::Null(), true);
    appliance.FailNth("VORNWinJoin1", 1, fake::Fault::Result(0));
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    EXPECT_EQ(appliance.CountOf("free"), 0);
    ASSERT_EQ(state.events.size(), 1U);
}

TEST_F(Join, KeepsWhatItChangedAhead) {
    state.keyValueFiles[unit::kSmbInfoPath]["global"] = {
        {"advanced_domain_option", "yes"}, {"register nic", "eth0"}, {"server signing", "yes"}};
    EXPECT_THAT(Call(DomainSet, With(R"({"dns": "192.0.2.7", "manage_mode": 0})")), Succeeds("null"));
    EXPECT_EQ(state.trustSetting, 1);
    EXPECT_THAT(state.dnsServers, ElementsAre(Optional(StrEq("192.0.2.7"))));
    EXPECT_EQ(appliance.CountOf("VORNWinSetTrustDomain"), 1);
    EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 1);
    EXPECT_THAT(state.keyValueFiles[unit::kSmbInfoPath]["global"],
                ElementsAre(Pair("advanced_domain_option", "no"), Pair("server signing", "yes")));
    EXPECT_EQ(state.domainName, "lab.test");
    EXPECT_EQ(state.firstFlag, 1);
}

TEST_F(Join, NeitherChecksTheNameNorAsksForTheStatus) {
    state.joinStatus = fake::JoinStatus{"stat", "Error System."};
    EXPECT_THAT(Call(DomainSet, With(R"({"dns": "192.0.2.7"})")), Succeeds("null"));
    EXPECT_THAT(state.commands, IsEmpty());
    EXPECT_EQ(appliance.CountOf("ErrWINIState1Get"), 0);
}

TEST_F(Join, LeavesNoStatusBehind) {
    for (const bool before : {false, true}) {
        for (const bool written : {false, true}) {
            SCOPED_TRACE(std::to_string(before) + std::to_string(written));
            Restart();
            if (before) {
                state.files.insert(kJoinStatusPath);
            }
            bool seen = true;
            state.onJoin = [&](const _tag_VORN_WIN2_&) {
                seen = state.Exists(kJoinStatusPath);
                if (written) {
                    state.files.insert(kJoinStatusPath);
                }
            };
            EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
            EXPECT_FALSE(seen) << "a status of an earlier join";
            EXPECT_FALSE(state.Exists(kJoinStatusPath));
            EXPECT_EQ(appliance.CountOf("unlink"), (before ? 1 : 0) + (written ? 1 : 0));
        }
    }
}

TEST_F(Join, DoesNotMindAStatusThatCannotBeRemoved) {
    state.files.insert(kJoinStatusPath);
    appliance.FailNth("unlink", 1, fake::Fault::Result(-1), true);
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    EXPECT_EQ(appliance.CountOf("unlink"), 2);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

}  // namespace
