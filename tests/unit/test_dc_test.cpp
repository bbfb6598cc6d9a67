// "test_dc".

#include "src/api_table.h"
#include "tests/unit/module_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::LastErrorText;
using unit::Logs;
using unit::Succeeds;

class TestDC : public unit::ModuleTest {};

TEST_F(TestDC, IsTrueWhenTheMembershipWorks) {
    BeMember();
    EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": true})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(TestDC, IsTrueForAPositiveResultOfTheTest) {
    BeMember();
    state.testJoinResult = 1;
    EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": true})"));
}

TEST_F(TestDC, IsFalseAndNoErrorWhenTheControllerRefusesTheAccount) {
    BeMember();
    state.testJoinResult = -1;
    EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": false})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(TestDC, IsFalseInAWorkgroup) {
    EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": false})"));
    EXPECT_EQ(appliance.CountOf("VORNWinTestJoin"), 0);
}

TEST_F(TestDC, NeedsBothFlagsOfAMember) {
    BeMember();
    state.firstFlag = 0;
    EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": false})"));
    state.firstFlag = 1;
    state.secondFlag = 0;
    EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": false})"));
    EXPECT_EQ(appliance.CountOf("VORNWinTestJoin"), 0);
}

TEST_F(TestDC, TakesAnyFlagsButZeroForAMember) {
    BeMember();
    state.firstFlag = -1;
    state.secondFlag = 2;
    EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": true})"));
}

TEST_F(TestDC, IsFalseOnAModelWithoutDomainSupport) {
    BeMember();
    for (const char* capability : {"no", "", "yess", "ye", " yes", "yes ", "1"}) {
        state.capabilities["supportdomain"] = capability;
        EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": false})")) << capability;
    }
    state.capabilities.clear();
    EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": false})"));
    EXPECT_EQ(appliance.CountOf("WINIQuery1"), 0);
}

TEST_F(TestDC, TakesTheCapabilityInAnyCase) {
    BeMember();
    for (const char* capability : {"YES", "Yes", "yEs"}) {
        state.capabilities["supportdomain"] = capability;
        EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": true})")) << capability;
    }
}

TEST_F(TestDC, Answers2622WhenTheStateCannotBeRead) {
    appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Call(DomainTestDC), FailsWith(2622));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Failed to get domain info.[0x%04X %s:%d]",
                                                   "Failed to get domain info." + LastErrorText(state))));
}

TEST_F(TestDC, APositiveResultOfTheReadIsNoFailure) {
    BeMember();
    appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(1));
    EXPECT_THAT(Call(DomainTestDC), Succeeds(R"({"test_join_success": true})"));
}

TEST_F(TestDC, ReadsNoParametersAndChangesNothing) {
    BeMember();
    Call(DomainTestDC, unit::FromJson(R"({"test_join_success": false})"));
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VornConf::VornConf()", R"(VornConf::Def("supportdomain", ""))", "VornConf::~VornConf()",
                            "WINIQuery1(size 128, first, second)", "VORNWinADSJoined()", "VORNWinTestJoin(1)",
                            R"(VORN::APIResponse::SetSuccess({"test_join_success":true}))"));
}

TEST_F(TestDC, HandsTheKindOfMembershipOnUnchanged) {
    BeMember();
    state.adsJoined = 7;
    Call(DomainTestDC);
    EXPECT_THAT(appliance.CallTexts(fake::kAllBookkeeping),
                ElementsAre(R"(VornConf::Def("supportdomain", ""))", "WINIQuery1(size 128, first, second)",
                            "VORNWinADSJoined()", "VORNWinTestJoin(7)"));
}

}  // namespace
