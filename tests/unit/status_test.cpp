// "get".

#include <string>

#include "src/api_table.h"
#include "tests/unit/module_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::FromJson;
using unit::LastErrorText;
using unit::Logs;
using unit::Succeeds;

constexpr const char* kNoMember = R"({"enable_domain": false})";

class Status : public unit::ModuleTest {
protected:
    Json::Value Member(const std::string& key) {
        const fake::Answer answer = Call(DomainGet);
        EXPECT_TRUE(answer.success);
        EXPECT_TRUE(answer.data.isMember(key));
        return answer.data[key];
    }

    void SetSecurity(const std::string& value) {
        fake::SetKey(state.keyValueFiles[unit::kSmbConfPath]["global"], "security", value);
    }
};

TEST_F(Status, ShowsEverythingOfAMember) {
    BeMember();
    state.trustSetting = 1;
    state.dnsServers = {"192.0.2.1", "192.0.2.2"};
    state.keyValueFiles[unit::kSmbInfoPath]["global"] = {{"advanced_domain_option", "yes"}, {"register nic", "eth0"}};
    fake::SetKey(state.keyValueFiles[unit::kSmbConfPath]["global"], "password server", "192.0.2.9");
    EXPECT_THAT(Call(DomainGet), Succeeds(R"({
        "enable_domain": true, "domain_name": "LAB", "domain_type": "AD", "manage_mode": 0,
        "dns": "192.0.2.1,192.0.2.2",
        "advance_domain_conf": {"enable_advance_option": true, "kdc": "192.0.2.9", "netbios_name": "LAB",
                                "fqdn_name": "LAB.TEST", "register_nics": ["eth0"]}})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(Status, AsksThePlatformInOrder) {
    BeMember();
    state.dnsServers = {"192.0.2.1", "192.0.2.2"};
    Call(DomainGet);
    EXPECT_THAT(appliance.CallTexts(fake::kAllBookkeeping),
                ElementsAre(R"(VornConf::Def("supportdomain", ""))", "WINIQuery1(size 128, first, second)",
                            R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "security", size 128, 0))",
                            "VORNWinIsEnableTrustDomain()", "VORNNetDNSListGet(list)",
                            R"(WebUtils::StringImplode(["192.0.2.1", "192.0.2.2"], ","))",
                            R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                            R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "password server", size 128, 0))",
                            R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "workgroup", size 128, 0))",
                            R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "realm", size 128, 0))"));
}

TEST_F(Status, IsReadWithoutAnyParameter) {
    BeMember();
    Call(DomainGet, FromJson(R"({"enable_domain": 5})"));
    EXPECT_EQ(appliance.CountOf("VORN::APIRequest::HasParam"), 0);
    EXPECT_EQ(appliance.CountOf("VORN::APIRequest::GetParam"), 0);
}

TEST_F(Status, IsShortInAWorkgroup) {
    EXPECT_THAT(Call(DomainGet), Succeeds(kNoMember));
    EXPECT_THAT(appliance.CallTexts(fake::kAllBookkeeping),
                ElementsAre(R"(VornConf::Def("supportdomain", ""))", "WINIQuery1(size 128, first, second)"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(Status, NeedsBothFlagsOfAMember) {
    BeMember();
    for (const auto& flags : {std::make_pair(0, 1), std::make_pair(1, 0), std::make_pair(0, 0)}) {
        state.firstFlag = flags.first;
        state.secondFlag = flags.second;
        EXPECT_THAT(Call(DomainGet), Succeeds(kNoMember)) << flags.first << flags.second;
    }
    for (const auto& flags :
         {std::make_pair(1, 1), std::make_pair(2, 1), std::make_pair(1, 2), std::make_pair(-1, -1)}) {
        state.firstFlag = flags.first;
        state.secondFlag = flags.second;
        EXPECT_EQ(Member("enable_domain"), true) << flags.first << flags.second;
    }
}

TEST_F(Status, IsSuccessOnAModelWithoutDomainSupport) {
    BeMember();
    for (const char* capability : {"no", "", "yess", "ye", " yes", "yes "}) {
        state.capabilities["supportdomain"] = capability;
        EXPECT_THAT(Call(DomainGet), Succeeds(kNoMember)) << capability;
    }
    state.capabilities.clear();
    EXPECT_THAT(Call(DomainGet), Succeeds(kNoMember));
    EXPECT_EQ(appliance.CountOf("WINIQuery1"), 0);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(Status, TakesTheCapabilityInAnyCase) {
    BeMember();
    for (const char* capability : {"yes", "YES", "Yes", "yeS"}) {
        state.capabilities["supportdomain"] = capability;
        EXPECT_EQ(Member("enable_domain"), true) << capability;
    }
}

TEST_F(Status, CutsALongNameTo127Characters) {
    BeMember();
    state.domainName = std::string(127, 'n');
    EXPECT_EQ(Member("domain_name"), std::string(127, 'n'));
    state.domainName = std::string(128, 'n');
    EXPECT_EQ(Member("domain_name"), std::string(127, 'n'));
}

TEST_F(Status, TellsTheKindsOfDomainApart) {
    BeMember();
    EXPECT_EQ(Member("domain_type"), "AD");
    SetSecurity("domain");
    EXPECT_EQ(Member("domain_type"), "NT4");
}

TEST_F(Status, Answers2621ForAnyOtherKindOfDomain) {
    BeMember();
    for (const std::string kind : {"ADS", "Ads", "ads ", " ads", "ad", "adss", "user", "DOMAIN", "Domain", "domains",
                                   "domai", " domain", "domain "}) {
        SCOPED_TRACE(kind);
        SetSecurity(kind);
        const std::size_t before = appliance.Logs().size();
        EXPECT_THAT(Call(DomainGet), FailsWith(2621));
        ASSERT_EQ(appliance.Logs().size(), before + 1);
        EXPECT_THAT(appliance.Logs().back(),
                    Logs("domain.cpp", "%s:%d Unknown domain type %s", "Unknown domain type " + kind));
    }
    EXPECT_EQ(appliance.CountOf("VORNWinIsEnableTrustDomain"), 0);
}

TEST_F(Status, Answers2621WithoutAKindOfDomain) {
    BeMember();
    for (const int result : {0, -1}) {
        SCOPED_TRACE(result);
        Restart();
        BeMember();
        appliance.FailNth("VLIBCFileGetKeyValue", 1, fake::Fault::Result(result));
        EXPECT_THAT(Call(DomainGet), FailsWith(2621));
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d Unknown domain type", "Unknown domain type")));
        EXPECT_EQ(appliance.CountOf("VORNWinIsEnableTrustDomain"), 0);
    }
}

TEST_F(Status, TakesAKindOfOneCharacterForAnUnknownOne) {
    BeMember();
    SetSecurity("a");
    EXPECT_THAT(Call(DomainGet), FailsWith(2621));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d Unknown domain type %s", "Unknown domain type a")));
}

TEST_F(Status, ShowsTrustedDomainsInTheInvertedSense) {
    BeMember();
    for (const char* kind : {"ads", "domain"}) {
        SetSecurity(kind);
        for (const int setting : {1, 2, -1}) {
            state.trustSetting = setting;
            EXPECT_EQ(Member("manage_mode"), FromJson("0")) << kind << " " << setting;
        }
        state.trustSetting = 0;
        EXPECT_EQ(Member("manage_mode"), FromJson("1")) << kind;
    }
}

TEST_F(Status, JoinsTheDnsServersWithCommas) {
    BeMember();
    EXPECT_EQ(Member("dns"), "");
    state.dnsServers = {"192.0.2.1"};
    EXPECT_EQ(Member("dns"), "192.0.2.1");
    state.dnsServers = {"192.0.2.2", std::nullopt, "192.0.2.1", "192.0.2.3"};
    EXPECT_EQ(Member("dns"), "192.0.2.2,192.0.2.1,192.0.2.3");
}

TEST_F(Status, Answers2622WhenTheStateCannotBeRead) {
    BeMember();
    appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Call(DomainGet), FailsWith(2622));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Failed to get domain info.[0x%04X %s:%d]",
                                                   "Failed to get domain info." + LastErrorText(state))));
    EXPECT_EQ(appliance.CountOf("VLIBCFileGetKeyValue"), 0);
}

TEST_F(Status, TakesAPositiveResultOfTheStateForSuccess) {
    BeMember();
    appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(1));
    EXPECT_EQ(Member("domain_name"), "LAB");
}

TEST_F(Status, Answers2617WhenTheDnsServersCannotBeRead) {
    BeMember();
    appliance.FailNth("VORNNetDNSListGet", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Call(DomainGet), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Cannot get dns list", "Cannot get dns list"),
                                              Logs("domain.cpp", "%s:%d Cannnot get DNSList", "Cannnot get DNSList")));
    EXPECT_EQ(appliance.CountOf("WebUtils::StringImplode"), 0);
    EXPECT_EQ(appliance.CountOf("VLIBCSzHashAlloc"), 0);
}

TEST_F(Status, Answers2617WhenThereIsNoMemoryForTheDnsServers) {
    BeMember();
    appliance.FailNth("VLIBCSzListAlloc", 1, fake::Fault::Null());
    EXPECT_THAT(Call(DomainGet), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Cannot alloc memory", "Cannot alloc memory"),
                                              Logs("domain.cpp", "%s:%d Cannnot get DNSList", "Cannnot get DNSList")));
}

TEST_F(Status, AddsNothingToAFailureOfTheAdvancedOptions) {
    BeMember();
    appliance.FailNth("VLIBCSzHashAlloc", 1, fake::Fault::Null());
    EXPECT_THAT(Call(DomainGet), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d cannot alloc memory", "cannot alloc memory")));
}

TEST_F(Status, ChangesNothing) {
    BeMember();
    state.files.insert("/var/log/winlock.state");
    const auto before = state.keyValueFiles;
    Call(DomainGet);
    EXPECT_EQ(state.keyValueFiles, before);
    EXPECT_TRUE(state.Exists("/var/log/winlock.state"));
}

TEST_F(Status, LetsAnExceptionPassAndKeepsNothing) {
    for (const char* function : {"VornConf::VornConf", "VornConf::Def", "WebUtils::StringImplode"}) {
        SCOPED_TRACE(function);
        Restart();
        BeMember();
        appliance.FailNth(function, 1, fake::Fault::Throw());
        fake::Exchange exchange;
        EXPECT_THROW(DomainGet(&exchange.request, &exchange.response), fake::InjectedException);
        EXPECT_THAT(appliance.Answers(), IsEmpty());
    }
}

}  // namespace
