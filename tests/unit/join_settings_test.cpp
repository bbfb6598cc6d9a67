// "set": what a join changes ahead, the trusted-domain setting and the DNS servers.

#include <optional>
#include <string>
#include <vector>

#include "tests/unit/set_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;
using unit::FailsWith;
using unit::FromJson;
using unit::JoinRequest;
using unit::Logs;
using unit::Succeeds;
using unit::With;

using Texts = std::vector<std::string>;

std::string SetTrust(int setting) {
    return "VORNWinSetTrustDomain(" + std::to_string(setting) + ")";
}

class TrustSetting : public unit::SetTest {
protected:
    Texts Changes() const {
        return CallsOf({"VORNWinSetTrustDomain"});
    }
};

TEST_F(TrustSetting, ComesFromTheModeInTheInvertedSense) {
    struct Case {
        const char* mode;  // null: not sent
        int wanted;
    };
    for (const Case& each : {Case{nullptr, 1}, Case{"0", 1}, Case{"1", 0}, Case{"2", 0}, Case{"-1", 0},
                             Case{"2147483647", 0}, Case{"-2147483648", 0}}) {
        for (const int saved : {0, 1, 2, -1}) {
            SCOPED_TRACE(std::string(each.mode == nullptr ? "absent" : each.mode) + ", " + std::to_string(saved));
            Restart();
            state.trustSetting = saved;
            Json::Value parameters = JoinRequest();
            if (each.mode != nullptr) {
                parameters["manage_mode"] = FromJson(each.mode);
            }
            EXPECT_THAT(Call(DomainSet, parameters), Succeeds("null"));
            EXPECT_THAT(Changes(), ElementsAreArray(saved == each.wanted ? Texts() : Texts{SetTrust(each.wanted)}));
            EXPECT_EQ(state.trustSetting, each.wanted);
            EXPECT_EQ(appliance.CountOf("VORNWinIsEnableTrustDomain"), 1);
            EXPECT_THAT(appliance.Logs(), IsEmpty());
        }
    }
}

TEST_F(TrustSetting, IsPutBackAsItWasStored) {
    for (const char* mode : {"0", "1"}) {
        const int wanted = mode[0] == '0' ? 1 : 0;
        for (const int saved : {0, 1, 2, -1}) {
            SCOPED_TRACE(mode + (", " + std::to_string(saved)));
            Restart();
            MakeJoinFail();
            state.trustSetting = saved;
            Json::Value parameters = JoinRequest();
            parameters["manage_mode"] = FromJson(mode);
            EXPECT_THAT(Call(DomainSet, parameters), FailsWith(2617));
            EXPECT_THAT(Changes(),
                        ElementsAreArray(saved == wanted ? Texts() : Texts{SetTrust(wanted), SetTrust(saved)}));
            EXPECT_EQ(state.trustSetting, saved);
        }
    }
}

TEST_F(TrustSetting, OfAModeThatIsNoIntegerIsEnabledAndTheJoinGoesOn) {
    for (const char* mode : {R"("1")", R"("")", "true", "1.5", "null", "[]", "{}", "2147483648"}) {
        SCOPED_TRACE(mode);
        Restart();
        Json::Value parameters = JoinRequest();
        parameters["manage_mode"] = FromJson(mode);
        EXPECT_THAT(Call(DomainSet, parameters), Succeeds("null"));
        EXPECT_THAT(Changes(), ElementsAre(SetTrust(1)));
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d wrong the paramter: %s", "wrong the paramter: manage_mode")));
    }
}

TEST_F(TrustSetting, OfAModeThatIsNoIntegerIsWhatAFailedJoinAnswers) {
    MakeJoinFail("Invalid KDC ip.");
    EXPECT_THAT(Call(DomainSet, With(R"({"manage_mode": "1"})")), FailsWith(2618));
    EXPECT_THAT(Changes(), ElementsAre(SetTrust(1), SetTrust(0)));
    EXPECT_THAT(Messages(), ElementsAre("wrong the paramter: manage_mode", "Failed to save domain/workgroup info."));
}

TEST_F(TrustSetting, CountsAsChangedByAPositiveResult) {
    appliance.FailNth("VORNWinSetTrustDomain", 1, fake::Fault::Result(1));
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
}

class NewDns : public unit::SetTest {
protected:
    Texts Written() const {
        return CallsOf({"VORNNetDNSListSet"});
    }

    static Json::Value Request(const std::string& dns) {
        Json::Value parameters = JoinRequest();
        parameters["dns"] = dns;
        return parameters;
    }
};

TEST_F(NewDns, IsSplitAtEveryCommaAndNotTrimmed) {
    struct Case {
        const char* text;
        const char* written;
    };
    for (const Case& each : {
             Case{"192.0.2.7", R"(["192.0.2.7"])"},
             Case{"192.0.2.7,192.0.2.8", R"(["192.0.2.7", "192.0.2.8"])"},
             Case{"192.0.2.7, 192.0.2.8", R"(["192.0.2.7", " 192.0.2.8"])"},
             Case{",", R"(["", ""])"},
             Case{"192.0.2.7,", R"(["192.0.2.7", ""])"},
             Case{" ", R"([" "])"},
             Case{"192.0.2.7;192.0.2.8", R"(["192.0.2.7;192.0.2.8"])"},
         }) {
        SCOPED_TRACE(each.text);
        Restart();
        EXPECT_THAT(Call(DomainSet, Request(each.text)), Succeeds("null"));
        EXPECT_THAT(Written(), ElementsAre("VORNNetDNSListSet(" + std::string(each.written) + ")"));
    }
}

TEST_F(NewDns, IsComparedAsJoinedTexts) {
    Call(DomainSet, Request("192.0.2.7,192.0.2.8"));
    EXPECT_THAT(CallsOf({"WebUtils::StringExplode"}),
                ElementsAre(R"(WebUtils::StringExplode("192.0.2.7,192.0.2.8", ","))"));
    EXPECT_THAT(CallsOf({"WebUtils::StringImplode"}),
                UnorderedElementsAre(R"(WebUtils::StringImplode(["192.0.2.7", "192.0.2.8"], ","))",
                                     R"(WebUtils::StringImplode(["192.0.2.1", "192.0.2.2"], ","))"));
}

TEST_F(NewDns, IsNotWrittenWhenItIsTheOldOne) {
    EXPECT_THAT(Call(DomainSet, Request("192.0.2.1,192.0.2.2")), Succeeds("null"));
    EXPECT_THAT(Written(), IsEmpty());
}

TEST_F(NewDns, IsWrittenForTheLeastDifference) {
    for (const char* text : {"192.0.2.2,192.0.2.1", "192.0.2.1, 192.0.2.2", "192.0.2.1,192.0.2.2,", "192.0.2.1",
                             "192.0.2.1,192.0.2.20", " 192.0.2.1,192.0.2.2"}) {
        SCOPED_TRACE(text);
        Restart();
        Call(DomainSet, Request(text));
        EXPECT_EQ(Written().size(), 1U);
    }
}

TEST_F(NewDns, IsComparedWithTheOldOneWithoutItsNullEntries) {
    state.dnsServers = {"192.0.2.1", std::nullopt, "192.0.2.2"};
    Call(DomainSet, Request("192.0.2.1,192.0.2.2"));
    EXPECT_THAT(Written(), IsEmpty());
}

TEST_F(NewDns, OfAnEmptyTextIsNone) {
    EXPECT_THAT(Call(DomainSet, Request("")), Succeeds("null"));
    EXPECT_THAT(Written(), IsEmpty());
    EXPECT_EQ(appliance.CountOf("WebUtils::StringImplode"), 0);
}

TEST_F(NewDns, IsNoneWhenItIsNotSent) {
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    EXPECT_THAT(CallsOf({"VORNNetDNSListGet", "VORNNetDNSListSet", "WebUtils::StringExplode"}),
                ElementsAre("VORNNetDNSListGet(list)"));
}

TEST_F(NewDns, ThatCannotBeWrittenDoesNotStopTheJoin) {
    struct Case {
        const char* function;
        int nth;
        fake::Fault fault;
        const char* line;
    };
    for (const Case& each : {Case{"VLIBCSzListAlloc", 2, fake::Fault::Null(), "Cannot alloc memory"},
                             Case{"VLIBCSzListPush", 1, fake::Fault::Result(-1), "Cannot push the list"},
                             Case{"VORNNetDNSListSet", 1, fake::Fault::Result(-1), "Cannot set the list"}}) {
        SCOPED_TRACE(each.function);
        Restart();
        const auto before = state.dnsServers;
        appliance.FailNth(each.function, each.nth, each.fault);
        EXPECT_THAT(Call(DomainSet, Request("192.0.2.7")), Succeeds("null"));
        EXPECT_THAT(Messages(), ElementsAre(each.line));
        EXPECT_EQ(state.dnsServers, before);

        Restart();
        MakeJoinFail("Invalid KDC ip.");
        state.trustSetting = 1;
        appliance.FailNth(each.function, each.nth, each.fault);
        EXPECT_THAT(Call(DomainSet, Request("192.0.2.7")), FailsWith(2617)) << "the first code that was recorded";
        EXPECT_EQ(appliance.CountOf("VORNWinJoin1"), 1);
        EXPECT_LE(appliance.CountOf("VORNNetDNSListSet"), 1) << "nothing was changed, so nothing is put back";
    }
}

}  // namespace
