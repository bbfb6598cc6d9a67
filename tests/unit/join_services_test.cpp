// "set": what follows a join that worked. Nothing of it can make the join a failure.

#include <string>

#include "tests/unit/set_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::JoinRequest;
using unit::Logs;
using unit::Succeeds;

constexpr const char* kWebFolder = "webdav-httpd-pure";

class AfterJoin : public unit::SetTest {
protected:
    // The appliance goes by another name than the one that the request gave.
    void MakeNameDiffer() {
        state.domainName = "LAB";
        appliance.FailNth("VORNWinJoin1", 1, fake::Fault::Result(0));
    }

    const fake::Event& Event() const {
        EXPECT_EQ(state.events.size(), 1U);
        return state.events.at(0);
    }
};

TEST_F(AfterJoin, TheEventNamesTheDomainThatThePlatformNames) {
    MakeNameDiffer();
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    EXPECT_EQ(Event().kind, 2);
    EXPECT_EQ(Event().level, 1);
    EXPECT_EQ(Event().event, 0x11800404);
    EXPECT_THAT(Event().arguments, ElementsAre("LAB", "", "", ""));
}

TEST_F(AfterJoin, TheEventNamesTheDomainAlsoForAPositiveResult) {
    MakeNameDiffer();
    appliance.FailNth("WINIQuery1", 2, fake::Fault::Result(1));
    Call(DomainSet, JoinRequest());
    EXPECT_THAT(Event().arguments, ElementsAre("LAB", "", "", ""));
}

TEST_F(AfterJoin, TheEventNamesTheRequestsDomainWhenThePlatformNamesNone) {
    MakeNameDiffer();
    appliance.FailNth("WINIQuery1", 2, fake::Fault::Result(-1));
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    EXPECT_EQ(Event().kind, 2);
    EXPECT_EQ(Event().level, 1);
    EXPECT_EQ(Event().event, 0x11800404);
    EXPECT_THAT(Event().arguments, ElementsAre("lab.test", "", "", ""));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_EQ(appliance.CallTexts([](const fake::Call& call) { return call.function == "VORN::APIRequest::GetParam"; })
                  .back(),
              R"(VORN::APIRequest::GetParam("domain_name", ""))");
}

TEST_F(AfterJoin, TheEventCutsALongNameTo255Characters) {
    Json::Value parameters = JoinRequest();
    parameters["domain_name"] = std::string(300, 'n');
    Call(DomainSet, parameters);
    EXPECT_EQ(Event().arguments[0], std::string(255, 'n'));
}

TEST_F(AfterJoin, UserHomesAreIncludedOnlyByAnExactYes) {
    for (const char* setting : {"yes", "Yes", "YES", "ye", "yess", " yes", "yes ", "no", "1", ""}) {
        SCOPED_TRACE(setting);
        Restart();
        state.settings["enableduserhome"] = setting;
        EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
        EXPECT_THAT(CallsOf({"VORNDomainUserHomeInclude"}),
                    ElementsAre(std::string(setting) == "yes" ? "VORNDomainUserHomeInclude(1)"
                                                              : "VORNDomainUserHomeInclude(0)"));
    }
}

TEST_F(AfterJoin, UserHomesAreExcludedWithoutTheSetting) {
    // A capability of this name is no setting.
    state.capabilities["enableduserhome"] = "yes";
    Call(DomainSet, JoinRequest());
    EXPECT_THAT(CallsOf({"VORNDomainUserHomeInclude"}), ElementsAre("VORNDomainUserHomeInclude(0)"));
}

TEST_F(AfterJoin, UserHomesThatFailAreLoggedOnly) {
    for (const char* setting : {"yes", "no"}) {
        SCOPED_TRACE(setting);
        Restart();
        state.settings["enableduserhome"] = setting;
        state.enabledServices = {kWebFolder};
        appliance.FailNth("VORNDomainUserHomeInclude", 1, fake::Fault::Result(-1));
        EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
        EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d VORNDomainUserHomeInclude failed.",
                                                       "VORNDomainUserHomeInclude failed.")));
        EXPECT_THAT(state.restartedServices, ElementsAre(kWebFolder));
    }
}

TEST_F(AfterJoin, UserHomesFailOnlyByTheResultOfMinus1) {
    for (const int result : {-2, 0, 1}) {
        SCOPED_TRACE(result);
        Restart();
        appliance.FailNth("VORNDomainUserHomeInclude", 1, fake::Fault::Result(result));
        EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
        EXPECT_THAT(appliance.Logs(), IsEmpty());
    }
}

TEST_F(AfterJoin, WebFoldersAreRestartedOnlyWhenEnabled) {
    for (const int enabled : {-1, 0, 1, 2}) {
        SCOPED_TRACE(enabled);
        Restart();
        appliance.FailNth("VLIBServiceIsEnabled", 1, fake::Fault::Result(enabled));
        EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
        EXPECT_EQ(appliance.CountOf("VLIBServiceRestart"), enabled == 1 ? 1 : 0);
        EXPECT_THAT(appliance.Logs(), IsEmpty());
    }
}

TEST_F(AfterJoin, WebFoldersThatFailAreLoggedOnly) {
    state.enabledServices = {kWebFolder};
    appliance.FailNth("VLIBServiceRestart", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d restart webdav failed.", "restart webdav failed.")));
}

TEST_F(AfterJoin, WebFoldersCountAsRestartedByAPositiveResult) {
    state.enabledServices = {kWebFolder};
    appliance.FailNth("VLIBServiceRestart", 1, fake::Fault::Result(1));
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AfterJoin, TheResultsOfTheOthersDoNotMatter) {
    state.settings["enableduserhome"] = "yes";
    state.enabledServices = {kWebFolder};
    Call(DomainSet, JoinRequest());
    const auto calls = appliance.CallTexts(fake::kNoCalls);
    for (const char* function : {"VORNGroupAddDomainAdminGroup", "VLIBServiceReload", "VORNLogSet1"}) {
        for (const int result : {-1, 1}) {
            SCOPED_TRACE(function + std::to_string(result));
            Restart();
            state.settings["enableduserhome"] = "yes";
            state.enabledServices = {kWebFolder};
            appliance.FailNth(function, 1, fake::Fault::Result(result), true);
            EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
            EXPECT_THAT(appliance.CallTexts(fake::kNoCalls), ::testing::ElementsAreArray(calls));
        }
    }
}

}  // namespace
