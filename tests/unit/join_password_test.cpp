// The password of a join reaches the platform's record and nothing else.

#include <string>
#include <vector>

#include "tests/unit/set_test.h"

namespace {

using ::testing::Each;
using ::testing::HasSubstr;
using ::testing::Not;
using unit::JoinRequest;
using unit::LeaveRequest;
using unit::With;

constexpr const char* kPassword = "Canary-1";

class JoinPassword : public unit::SetTest {
protected:
    void ExpectHidden() {
        const auto hidden = Not(HasSubstr(kPassword));
        EXPECT_THAT(appliance.CallTexts([](const fake::Call& call) {
            return call.function != "strdup" && call.function != "free" && call.function != "VORNWinJoin1";
        }),
                    Each(hidden));
        for (const fake::LogLine& line : appliance.Logs()) {
            EXPECT_THAT(line.message, hidden);
            EXPECT_THAT(line.format, hidden);
        }
        for (const fake::Answer& answer : appliance.Answers()) {
            EXPECT_THAT(answer.data.toStyledString(), hidden);
        }
        for (const fake::Event& event : state.events) {
            EXPECT_THAT(event.arguments, Each(hidden));
        }
        for (const auto& file : state.keyValueFiles) {
            for (const auto& section : file.second) {
                for (const auto& entry : section.second) {
                    EXPECT_THAT(entry.first + "=" + entry.second, hidden);
                }
            }
        }
        for (const std::string& path : state.files) {
            EXPECT_THAT(path, hidden);
        }
        for (const fake::JoinRecord& join : state.joins) {
            EXPECT_NE(join.domainName, kPassword);
            EXPECT_NE(join.userName, kPassword);
        }
        EXPECT_THAT(state.commands, Each(hidden));
    }
};

TEST_F(JoinPassword, IsShownNowhereWhateverBecomesOfTheJoin) {
    const Json::Value request = With(R"({"dns": "192.0.2.7", "manage_mode": "x", "advance_domain_conf":
                                         {"enable_advance_option": true, "kdc": "192.0.2.9"}})");
    const char* failing[] = {"",
                             "VornConf::Def",
                             "WINIQuery1",
                             "VORNWinSetTrustDomain",
                             "VORNNetDNSListGet",
                             "VORNNetDNSListSet",
                             "VLIBCFileITmpName",
                             "VORNWinJoin1",
                             "ErrWINIState1Get",
                             "VORNDomainUserHomeInclude",
                             "VLIBServiceRestart",
                             "VornConf::Info",
                             "WebUtils::StringExplode"};
    for (const std::string function : failing) {
        for (const int lookup : {0, 1}) {
            SCOPED_TRACE(function + std::to_string(lookup));
            Restart();
            state.systemResult = lookup;
            state.enabledServices = {"webdav-httpd-pure"};
            state.joinStatus = fake::JoinStatus{"stat", "unheard of"};
            if (!function.empty()) {
                appliance.FailNth(function, 1, *fake::DefaultFault(function));
            }
            fake::Exchange exchange(request);
            try {
                DomainSet(&exchange.request, &exchange.response);
            } catch (const fake::InjectedException& exception) {
                EXPECT_THAT(exception.what(), HasSubstr(function));
            }
            ExpectHidden();
        }
    }
}

TEST_F(JoinPassword, IsNotShownWhenTheRequestIsRefused) {
    for (const char* change :
         {R"({"domain_name": "192.0.2.7"})", R"({"username": 5})", R"({"dns": 5})", R"({"advance_domain_conf": {}})"}) {
        SCOPED_TRACE(change);
        Restart();
        EXPECT_FALSE(Call(DomainSet, With(change)).success);
        ExpectHidden();
    }
}

TEST_F(JoinPassword, IsShownNowhereWhenTheTextsCannotBeCopied) {
    state.joinStatus = fake::JoinStatus{"stat", "unheard of"};
    appliance.FailNth("strdup", 1, fake::Fault::Null(), true);
    Call(DomainSet, JoinRequest());
    ExpectHidden();
}

TEST_F(JoinPassword, OfALeaveIsNotGivenOn) {
    BeMember();
    Call(DomainSet, With(LeaveRequest(), R"({"password": "Canary-1"})"));
    ExpectHidden();
    ASSERT_EQ(state.joins.size(), 1U);
    EXPECT_EQ(state.joins[0].password, "");
}

}  // namespace
