// "set": what the request asks for decides between join, leave and nothing.

#include <cstring>
#include <new>
#include <string>

#include "src/domain.h"
#include "tests/unit/set_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::JoinRequest;
using unit::LeaveRequest;
using unit::Logs;
using unit::Succeeds;

class MembershipChange : public unit::SetTest {};

TEST_F(MembershipChange, IsDecidedByTheFirstFlagAndTheRequest) {
    for (const int first : {0, 1, 2, -1}) {
        for (const int second : {0, 1}) {
            for (const bool enable : {false, true}) {
                SCOPED_TRACE(std::to_string(first) + std::to_string(second) + (enable ? " join" : " leave"));
                Restart();
                state.firstFlag = first;
                state.secondFlag = second;
                EXPECT_THAT(Call(DomainSet, enable ? JoinRequest() : LeaveRequest()), Succeeds("null"));
                EXPECT_THAT(appliance.Logs(), IsEmpty());
                if (enable) {
                    ASSERT_EQ(state.joins.size(), 1U);
                    EXPECT_EQ(state.joins[0].bytes.joinMode, 1);
                    EXPECT_EQ(appliance.CountOf("VORNLDAPIsBinded"), 1);
                } else if (first != 0) {
                    ASSERT_EQ(state.joins.size(), 1U);
                    EXPECT_EQ(state.joins[0].bytes.joinMode, 0);
                    EXPECT_EQ(appliance.CountOf("VORNLDAPIsBinded"), 0);
                } else {
                    EXPECT_THAT(state.joins, IsEmpty());
                }
            }
        }
    }
}

TEST_F(MembershipChange, OfAWorkgroupNeedsNothingToStayOne) {
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), Succeeds("null"));
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre(R"(VORN::APIRequest::HasParam("enable_domain"))",
                            R"(VORN::APIRequest::GetParam("enable_domain", null))",
                            R"(VORN::APIRequest::GetParam("enable_domain", null))",
                            R"(VORN::APIRequest::HasParam("advance_domain_conf"))", "VornConf::VornConf()",
                            R"(VornConf::Def("supportdomain", ""))", "WINIQuery1(size 256, first, null)",
                            R"(VORN::APIRequest::GetParam("enable_domain", null))", "VornConf::~VornConf()",
                            "VORN::APIResponse::SetSuccess(null)"));
    EXPECT_THAT(state.events, IsEmpty());
}

TEST_F(MembershipChange, OfADomainIsRenewedWithoutLeavingFirst) {
    BeMember();
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    ASSERT_EQ(state.joins.size(), 1U);
    EXPECT_EQ(state.joins[0].bytes.joinMode, 1);
    EXPECT_THAT(state.reloadedServices, ElementsAre("samba", "nmbd", "winbindd"));
}

TEST_F(MembershipChange, CannotBeChangedWithoutTheCapabilityAsItIsWritten) {
    for (const char* capability : {"YES", "Yes", "yeS", "no", "", "ye", "yess", " yes", "yes "}) {
        for (const bool enable : {false, true}) {
            SCOPED_TRACE(capability);
            Restart();
            state.capabilities["supportdomain"] = capability;
            EXPECT_THAT(Call(DomainSet, enable ? JoinRequest() : LeaveRequest()), FailsWith(2619));
            EXPECT_THAT(appliance.Logs(),
                        ElementsAre(Logs("domain.cpp", "%s:%d Not support domain", "Not support domain")));
            EXPECT_EQ(appliance.CountOf("WINIQuery1"), 0);
        }
    }
    Restart();
    state.capabilities.clear();
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), FailsWith(2619));
}

TEST_F(MembershipChange, IsShownButNotChangedWithTheCapabilityInCapitals) {
    BeMember();
    state.capabilities["supportdomain"] = "YES";
    EXPECT_EQ(Call(DomainGet).data["enable_domain"], true);
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), FailsWith(2619));
}

TEST_F(MembershipChange, ThatCannotBeReadIsNotChanged) {
    for (const bool enable : {false, true}) {
        SCOPED_TRACE(enable);
        Restart();
        BeMember();
        appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(-1));
        EXPECT_THAT(Call(DomainSet, enable ? JoinRequest() : LeaveRequest()), FailsWith(2622));
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d Failed to get domain info.", "Failed to get domain info."),
                                Logs("domain.cpp", "%s:%d Failed to save domain/workgroup info.",
                                     "Failed to save domain/workgroup info.")));
        EXPECT_EQ(appliance.CountOf("VORNLDAPIsBinded"), 0);
        EXPECT_THAT(state.joins, IsEmpty());
    }
}

TEST_F(MembershipChange, CountsAsReadByAPositiveResult) {
    BeMember();
    appliance.FailNth("WINIQuery1", 1, fake::Fault::Result(1));
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), Succeeds("null"));
    EXPECT_EQ(state.joins.size(), 1U);
}

TEST_F(MembershipChange, IsNotSoughtWhileBoundToADirectory) {
    for (const bool member : {false, true}) {
        SCOPED_TRACE(member);
        Restart();
        if (member) {
            BeMember();
        }
        state.ldapBound = 1;
        EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(2620));
        EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d LDAP is binded", "LDAP is binded"),
                                                  Logs("domain.cpp", "%s:%d Failed to save domain/workgroup info.",
                                                       "Failed to save domain/workgroup info.")));
        EXPECT_THAT(appliance.CallTexts(fake::kAllBookkeeping),
                    ElementsAre(R"(BlVLIBIsIpAddr("lab.test"))", R"(BlVLIBIsv6IpAddrValid("lab.test"))",
                                R"(VornConf::Def("supportdomain", ""))", "WINIQuery1(size 256, first, null)",
                                "VORNLDAPIsBinded(0)"));
    }
}

TEST_F(MembershipChange, IsSoughtForAnyOtherStateOfTheDirectory) {
    for (const int bound : {0, 2, -1}) {
        SCOPED_TRACE(bound);
        Restart();
        state.ldapBound = bound;
        EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
        EXPECT_EQ(state.joins.size(), 1U);
    }
}

TEST_F(MembershipChange, CanBeLeftWhileBoundToADirectory) {
    BeMember();
    state.ldapBound = 1;
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), Succeeds("null"));
}

TEST_F(MembershipChange, KeepsNothingWhenAnExceptionPasses) {
    for (const char* function : {"VornConf::VornConf", "VornConf::Def"}) {
        SCOPED_TRACE(function);
        Restart();
        appliance.FailNth(function, 1, fake::Fault::Throw());
        ExpectThrow<fake::InjectedException>(JoinRequest());
    }
    Restart();
    appliance.FailNth("VORN::APIRequest::GetParam", 3, fake::Fault::Throw());  // of "enable_domain", once it is decided
    BeMember();
    ExpectThrow<fake::InjectedException>(LeaveRequest());
    EXPECT_THAT(state.joins, IsEmpty());
}

TEST(DomainHandler, StartsWithoutACodeAndWithoutAWishForTheAdministratorsGroup) {
    alignas(DomainServiceHandler) unsigned char memory[sizeof(DomainServiceHandler)];
    std::memset(memory, 0xFF, sizeof(memory));
    fake::Exchange exchange;
    auto* handler = new (memory) DomainServiceHandler(&exchange.request, &exchange.response);
    EXPECT_EQ(handler->request, &exchange.request);
    EXPECT_EQ(handler->response, &exchange.response);
    EXPECT_EQ(handler->error, 2600);
    EXPECT_FALSE(handler->needAddDomainAdminGroup);
    handler->~DomainServiceHandler();
}

}  // namespace
