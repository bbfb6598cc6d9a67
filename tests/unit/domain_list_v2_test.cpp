// "get_domain_list", version 2: the rows for trusted domains enabled and disabled.

#include <string>

#include "src/api_table.h"
#include "tests/unit/module_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::Logs;
using unit::Succeeds;

class DomainListV2 : public unit::ModuleTest {
protected:
    DomainListV2() {
        BeMember();
    }

    fake::Answer Ask() {
        return Call(DomainGetDomainList_V2);
    }
};

class TrustedDomains : public DomainListV2 {
protected:
    TrustedDomains() {
        state.trustSetting = 1;
        state.domains = {"LAB", "OTHER"};
        state.fqdns = {{"LAB", "lab.test"}, {"OTHER", "other.test"}};
    }
};

class OrganisationalUnits : public DomainListV2 {
protected:
    OrganisationalUnits() {
        state.trustSetting = 0;
        state.workgroup = "GROUP";
        state.unitNames = {"Sales", "Labs"};
        state.unitValues = {"ou=Sales", "ou=Labs"};
    }
};

TEST_F(TrustedDomains, EachGivesARowOfNameNameAndDnsName) {
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": [["LAB", "LAB", "lab.test"], ["OTHER", "OTHER", "other.test"]]})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VornConf::VornConf()", R"(VornConf::Def("supportdomain", ""))", "VornConf::~VornConf()",
                            "WINIQuery1(size 128, first, second)", "VLIBCSzListAlloc(1024)",
                            "VORNWinIsEnableTrustDomain()", "VORNWinsEnumAllDomains(list)", "VLIBCSzListGet(list, 0)",
                            R"(VORNWinsGetDomainFQDN("LAB", size 4095))", "VLIBCSzListGet(list, 1)",
                            R"(VORNWinsGetDomainFQDN("OTHER", size 4095))", "VLIBCSzListFree(list)",
                            R"(VORN::APIResponse::SetSuccess({"domain_list":[["LAB","LAB","lab.test"],)"
                            R"(["OTHER","OTHER","other.test"]]}))"));
}

TEST_F(TrustedDomains, ADnsNameThatCannotBeFoundIsEmpty) {
    state.fqdns.erase("LAB");
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": [["LAB", "LAB", ""], ["OTHER", "OTHER", "other.test"]]})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(TrustedDomains, APositiveResultForADnsNameIsNoFailure) {
    appliance.FailNth("VORNWinsGetDomainFQDN", 1, fake::Fault::Result(1));
    EXPECT_EQ(Ask().data["domain_list"][0][2], "lab.test");
}

TEST_F(TrustedDomains, ADnsNameOfFullLengthIsKeptAndALongerOneCut) {
    state.fqdns["LAB"] = std::string(4094, 'a');
    state.fqdns["OTHER"] = std::string(4095, 'b');
    const fake::Answer answer = Ask();
    EXPECT_EQ(answer.data["domain_list"][0][2], std::string(4094, 'a'));
    EXPECT_EQ(answer.data["domain_list"][1][2], std::string(4094, 'b'));
}

TEST_F(TrustedDomains, NullEntriesAreSkippedAndEmptyOnesKept) {
    state.domains = {std::nullopt, "LAB", std::nullopt, ""};
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": [["LAB", "LAB", "lab.test"], ["", "", ""]]})"));
    EXPECT_EQ(appliance.CountOf("VORNWinsGetDomainFQDN"), 2);
}

TEST_F(TrustedDomains, NoneGivesNoRow) {
    state.domains.clear();
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": []})"));
}

TEST_F(TrustedDomains, AreEnabledByAnySettingButZero) {
    for (const int setting : {2, -1}) {
        state.trustSetting = setting;
        EXPECT_EQ(Ask().data["domain_list"][0][0], "LAB") << setting;
    }
    EXPECT_EQ(appliance.CountOf("VORNWinsEnumOU"), 0);
}

TEST_F(OrganisationalUnits, FollowTheRowOfTheWorkgroup) {
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": [["--", "", "GROUP"], ["Sales", "ou=Sales", "ou=Sales"],
                                    ["Labs", "ou=Labs", "ou=Labs"]]})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre("VornConf::VornConf()", R"(VornConf::Def("supportdomain", ""))", "VornConf::~VornConf()",
                    "WINIQuery1(size 128, first, second)", "VLIBCSzListAlloc(1024)", "VORNWinIsEnableTrustDomain()",
                    "VLIBCSzListAlloc(1024)", "VORNWinsEnumOU(list, list)", "VORNWorkgroupGet(size 4095)",
                    "VLIBCSzListGet(list, 0)", "VLIBCSzListGet(list, 0)", "VLIBCSzListGet(list, 1)",
                    "VLIBCSzListGet(list, 1)", "VLIBCSzListFree(list)", "VLIBCSzListFree(list)",
                    R"(VORN::APIResponse::SetSuccess({"domain_list":[["--","","GROUP"],)"
                    R"(["Sales","ou=Sales","ou=Sales"],["Labs","ou=Labs","ou=Labs"]]}))"));
}

TEST_F(OrganisationalUnits, NoneLeavesTheRowOfTheWorkgroup) {
    state.unitNames.clear();
    state.unitValues.clear();
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": [["--", "", "GROUP"]]})"));
    state.workgroup = "";
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": [["--", "", ""]]})"));
}

TEST_F(OrganisationalUnits, OneIsSkippedWhenEitherOfItsEntriesIsNull) {
    state.unitNames = {std::nullopt, "Sales", "Labs", "", std::nullopt};
    state.unitValues = {"ou=None", "ou=Sales", std::nullopt, "", std::nullopt};
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": [["--", "", "GROUP"], ["Sales", "ou=Sales", "ou=Sales"],
                                    ["", "", ""]]})"));
}

// The names decide how many there are.
TEST_F(OrganisationalUnits, NamesWithoutAValueAndValuesWithoutANameAreSkipped) {
    state.unitNames = {"Sales", "Labs"};
    state.unitValues = {"ou=Sales"};
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": [["--", "", "GROUP"], ["Sales", "ou=Sales", "ou=Sales"]]})"));
    state.unitNames = {"Sales"};
    state.unitValues = {"ou=Sales", "ou=Labs"};
    EXPECT_THAT(Ask(), Succeeds(R"({"domain_list": [["--", "", "GROUP"], ["Sales", "ou=Sales", "ou=Sales"]]})"));
}

TEST_F(OrganisationalUnits, AWorkgroupOfFullLengthIsKeptAndALongerOneCut) {
    for (const std::size_t length : {4094U, 4095U}) {
        state.workgroup = std::string(length, 'g');
        EXPECT_EQ(Ask().data["domain_list"][0][2], std::string(4094, 'g')) << length;
    }
}

TEST_F(OrganisationalUnits, Answer2617WithoutMemoryForTheSecondList) {
    appliance.FailNth("VLIBCSzListAlloc", 2, fake::Fault::Null());
    EXPECT_THAT(Ask(), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d Error: cannot alloc memory", "Error: cannot alloc memory")));
    EXPECT_EQ(appliance.CountOf("VORNWinsEnumOU"), 0);
    EXPECT_EQ(appliance.CountOf("VLIBCSzListFree"), 1);
}

TEST_F(OrganisationalUnits, Answer2617WhenTheyCannotBeListed) {
    appliance.FailNth("VORNWinsEnumOU", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Ask(), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d Cannot: get the domain", "Cannot: get the domain")));
    EXPECT_EQ(appliance.CountOf("VORNWorkgroupGet"), 0);
    EXPECT_EQ(appliance.CountOf("VLIBCSzListFree"), 2);
}

TEST_F(OrganisationalUnits, Answer2600SilentlyWhenTheWorkgroupCannotBeRead) {
    appliance.FailNth("VORNWorkgroupGet", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Ask(), FailsWith(2600));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_EQ(appliance.CountOf("VLIBCSzListGet"), 0);
    EXPECT_EQ(appliance.CountOf("VLIBCSzListFree"), 2);
}

TEST_F(OrganisationalUnits, PositiveResultsAreNoFailures) {
    appliance.FailNth("VORNWinsEnumOU", 1, fake::Fault::Result(1));
    appliance.FailNth("VORNWorkgroupGet", 1, fake::Fault::Result(1));
    EXPECT_EQ(Ask().data["domain_list"].size(), 3U);
}

TEST_F(DomainListV2, ReadsNoParameters) {
    const Json::Value parameters = unit::FromJson(R"({"domain_list": 1, "domain_name": "OTHER"})");
    EXPECT_THAT(Call(DomainGetDomainList_V2, parameters), Succeeds(R"({"domain_list": [["--", "", "LAB"]]})"));
    EXPECT_EQ(appliance.CountOf("VORN::APIRequest::HasParam") + appliance.CountOf("VORN::APIRequest::GetParam"), 0);
}

}  // namespace
