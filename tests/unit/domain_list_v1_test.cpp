// "get_domain_list", version 1, and what both versions begin with.

#include <string>
#include <vector>

#include "src/api_table.h"
#include "src/domain.h"
#include "tests/unit/module_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::LastErrorText;
using unit::Logs;
using unit::Succeeds;

struct Version {
    const char* name;
    VORN::APIFunction function;
};

class DomainListBegin : public unit::ModuleTest, public ::testing::WithParamInterface<Version> {
protected:
    fake::Answer Ask() {
        return Call(GetParam().function);
    }
};

INSTANTIATE_TEST_SUITE_P(Versions, DomainListBegin,
                         ::testing::Values(Version{"Version1", DomainGetDomainList},
                                           Version{"Version2", DomainGetDomainList_V2}),
                         [](const auto& instance) { return instance.param.name; });

TEST_P(DomainListBegin, IsEmptyInAWorkgroup) {
    state.domains = {"LAB"};
    state.unitNames = {"Sales"};
    state.unitValues = {"ou=Sales"};
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": []})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(appliance.CallTexts(), ElementsAre("VornConf::VornConf()", R"(VornConf::Def("supportdomain", ""))",
                                                   "VornConf::~VornConf()", "WINIQuery1(size 128, first, second)",
                                                   R"(VORN::APIResponse::SetSuccess({"domain_list":[]}))"));
}

TEST_P(DomainListBegin, IsEmptyUnlessBothFlagsOfAMemberAreSet) {
    BeMember();
    state.domains = {"LAB"};
    for (const auto& [first, second] : std::vector<std::pair<int, int>>{{0, 0}, {0, 1}, {1, 0}, {0, -1}, {-1, 0}}) {
        state.firstFlag = first;
        state.secondFlag = second;
        EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": []})")) << first << " " << second;
    }
    EXPECT_EQ(appliance.CountOf("VLIBCSzListAlloc"), 0);
}

TEST_P(DomainListBegin, TakesAnyFlagsButZeroForAMember) {
    BeMember();
    state.trustSetting = 1;
    state.domains = {"LAB"};
    for (const auto& [first, second] : std::vector<std::pair<int, int>>{{2, 1}, {1, 2}, {-1, 1}, {1, -1}}) {
        state.firstFlag = first;
        state.secondFlag = second;
        EXPECT_EQ(Ask().data["domain_list"].size(), 1U) << first << " " << second;
    }
}

TEST_P(DomainListBegin, Answers2619OnAModelWithoutDomainSupport) {
    BeMember();
    for (const char* capability : {"no", "", "yess", "ye", " yes", "yes ", "true", "1"}) {
        Restart();
        BeMember();
        state.capabilities["supportdomain"] = capability;
        EXPECT_THAT(Ask(), FailsWith(2619)) << capability;
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d Doesn't support domain", "Doesn't support domain")));
        EXPECT_THAT(appliance.CallTexts(fake::kAllBookkeeping), ElementsAre(R"(VornConf::Def("supportdomain", ""))"));
    }
    Restart();
    state.capabilities.clear();
    EXPECT_THAT(Ask(), FailsWith(2619));
}

TEST_P(DomainListBegin, TakesTheCapabilityInAnyCase) {
    for (const char* capability : {"yes", "YES", "Yes", "yEs"}) {
        state.capabilities["supportdomain"] = capability;
        EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": []})")) << capability;
    }
}

TEST_P(DomainListBegin, Answers2622WhenTheStateCannotBeRead) {
    BeMember();
    appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Ask(), FailsWith(2622));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Failed to get domain info.[0x%04X %s:%d]",
                                                   "Failed to get domain info." + LastErrorText(state))));
    EXPECT_EQ(appliance.CountOf("VLIBCSzListAlloc"), 0);
}

TEST_P(DomainListBegin, APositiveResultOfTheReadIsNoFailure) {
    appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(1));
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": []})"));
}

TEST_P(DomainListBegin, Answers2617WithoutMemoryForAList) {
    BeMember();
    appliance.FailNth("VLIBCSzListAlloc", 1, fake::Fault::Null());
    EXPECT_THAT(Ask(), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d Error: cannot alloc memory", "Error: cannot alloc memory")));
    EXPECT_THAT(appliance.CallTexts(fake::kBookkeeping & ~fake::kContainers),
                ElementsAre(R"(VornConf::Def("supportdomain", ""))", "WINIQuery1(size 128, first, second)",
                            "VLIBCSzListAlloc(1024)", ::testing::StartsWith("syslog(3, \"domain.cpp:")));
}

TEST_P(DomainListBegin, Answers2617WhenTheDomainsCannotBeListed) {
    BeMember();
    state.trustSetting = 1;
    appliance.FailNth("VORNWinsEnumAllDomains", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Ask(), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d Cannot: get the domain", "Cannot: get the domain")));
    EXPECT_EQ(appliance.CountOf("VLIBCSzListGet"), 0);
    EXPECT_EQ(appliance.CountOf("VLIBCSzListFree"), 1);
}

TEST_P(DomainListBegin, APositiveResultOfTheListingIsNoFailure) {
    BeMember();
    state.trustSetting = 1;
    state.domains = {"LAB"};
    appliance.FailNth("VORNWinsEnumAllDomains", 1, fake::Fault::Result(1));
    EXPECT_EQ(Ask().data["domain_list"].size(), 1U);
}

class DomainListV1 : public unit::ModuleTest {};

TEST_F(DomainListV1, ListsTheNamesInThePlatformsOrder) {
    BeMember();
    state.domains = {"LAB", "OTHER", "ALPHA"};
    EXPECT_THAT(Call(DomainGetDomainList), Succeeds(R"({"domain_list": ["LAB", "OTHER", "ALPHA"]})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VornConf::VornConf()", R"(VornConf::Def("supportdomain", ""))", "VornConf::~VornConf()",
                            "WINIQuery1(size 128, first, second)", "VLIBCSzListAlloc(1024)",
                            "VORNWinsEnumAllDomains(list)", "VLIBCSzListGet(list, 0)", "VLIBCSzListGet(list, 1)",
                            "VLIBCSzListGet(list, 2)", "VLIBCSzListFree(list)",
                            R"(VORN::APIResponse::SetSuccess({"domain_list":["LAB","OTHER","ALPHA"]}))"));
}

TEST_F(DomainListV1, IsAnEmptyArrayWhenNoDomainIsInSight) {
    BeMember();
    EXPECT_THAT(Call(DomainGetDomainList), Succeeds(R"({"domain_list": []})"));
}

TEST_F(DomainListV1, SkipsNullEntriesAndKeepsEmptyOnes) {
    BeMember();
    state.domains = {std::nullopt, "LAB", std::nullopt, "", "OTHER", std::nullopt};
    EXPECT_THAT(Call(DomainGetDomainList), Succeeds(R"({"domain_list": ["LAB", "", "OTHER"]})"));
}

TEST_F(DomainListV1, ListsTheDomainsAlsoWhenTrustedOnesAreDisabled) {
    BeMember();
    state.domains = {"LAB"};
    state.unitNames = {"Sales"};
    state.unitValues = {"ou=Sales"};
    for (const int setting : {0, 1}) {
        state.trustSetting = setting;
        EXPECT_THAT(Call(DomainGetDomainList), Succeeds(R"({"domain_list": ["LAB"]})")) << setting;
    }
    EXPECT_EQ(appliance.CountOf("VORNWinIsEnableTrustDomain"), 0);
}

TEST_F(DomainListV1, ReadsNoParameters) {
    BeMember();
    state.domains = {"LAB"};
    const Json::Value parameters = unit::FromJson(R"({"domain_list": 1, "domain_name": "OTHER"})");
    EXPECT_THAT(Call(DomainGetDomainList, parameters), Succeeds(R"({"domain_list": ["LAB"]})"));
    EXPECT_EQ(appliance.CountOf("VORN::APIRequest::HasParam") + appliance.CountOf("VORN::APIRequest::GetParam"), 0);
}

// The step that tells a member from a workgroup, which other operations share.
class Membership : public unit::ModuleTest {};

TEST_F(Membership, TheNameIsReadIntoTheBuffer) {
    BeMember();
    fake::Exchange exchange;
    DomainServiceHandler handler(&exchange.request, &exchange.response);
    bool isMember = false;
    char name[DomainServiceHandler::kNameSize];
    EXPECT_TRUE(handler.LoadMembership(isMember, name));
    EXPECT_TRUE(isMember);
    EXPECT_STREQ(name, "LAB");
    EXPECT_EQ(sizeof(name), 128U);
}

TEST_F(Membership, AWorkgroupIsNoFailure) {
    fake::Exchange exchange;
    DomainServiceHandler handler(&exchange.request, &exchange.response);
    bool isMember = true;
    char name[DomainServiceHandler::kNameSize];
    EXPECT_TRUE(handler.LoadMembership(isMember, name));
    EXPECT_FALSE(isMember);
    EXPECT_EQ(handler.error, 2600);
}

TEST_F(Membership, AFailureRecords2622) {
    fake::Exchange exchange;
    DomainServiceHandler handler(&exchange.request, &exchange.response);
    appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(-1));
    bool isMember = false;
    char name[DomainServiceHandler::kNameSize];
    EXPECT_FALSE(handler.LoadMembership(isMember, name));
    EXPECT_EQ(handler.error, 2622);
}

// Code, file and line of the last error are asked for in this order, before the line is written.
TEST_F(Membership, TheLastErrorIsLoggedWithItsCodeInFourHexDigitsOrMore) {
    fake::Exchange exchange;
    DomainServiceHandler handler(&exchange.request, &exchange.response);
    appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(-1));
    bool isMember = false;
    char name[DomainServiceHandler::kNameSize];
    handler.LoadMembership(isMember, name);
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("WINIQuery1(size 128, first, second)", "VLIBCErrGet()", "VLIBCErrorGetFile()",
                            "VLIBCErrorGetLine()", ::testing::EndsWith(LastErrorText(state) + "\")")));
}

}  // namespace
