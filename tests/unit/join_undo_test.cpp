// "set": a join that fails puts back what it changed ahead, whichever way it ends.

#include <json/json.h>

#include <string>
#include <vector>

#include "tests/unit/set_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Optional;
using ::testing::StrEq;
using unit::FailsWith;
using unit::JoinRequest;
using unit::kJoinStatusPath;
using unit::Logs;
using unit::Succeeds;
using unit::With;

const auto kNotSaved =
    Logs("domain.cpp", "%s:%d Failed to save domain/workgroup info.", "Failed to save domain/workgroup info.");

class JoinUndo : public unit::SetTest {
protected:
    JoinUndo() {
        Prepare();
    }

    void Again() {
        Restart();
        Prepare();
    }

    // A request that changes the DNS servers and the trusted-domain setting, from 2 to 0.
    static Json::Value ChangeAll() {
        return With(R"({"dns": "192.0.2.7,192.0.2.8", "manage_mode": 1})");
    }

    std::vector<std::string> Changes() const {
        return CallsOf({"VORNWinSetTrustDomain", "VORNNetDNSListGet", "VORNNetDNSListSet", "access", "unlink",
                        "VORNWinJoin1", "ErrWINIState1Get", "system"});
    }

    void ExpectAsBefore() {
        EXPECT_EQ(state.trustSetting, 2);
        EXPECT_THAT(state.dnsServers, ElementsAre(Optional(StrEq("192.0.2.1")), Optional(StrEq("192.0.2.2"))));
        EXPECT_FALSE(state.Exists(kJoinStatusPath));
    }

    void ExpectAsWanted() {
        EXPECT_EQ(state.trustSetting, 0);
        EXPECT_THAT(state.dnsServers, ElementsAre(Optional(StrEq("192.0.2.7")), Optional(StrEq("192.0.2.8"))));
        EXPECT_FALSE(state.Exists(kJoinStatusPath));
    }

private:
    void Prepare() {
        state.trustSetting = 2;
        state.files.insert(kJoinStatusPath);
    }
};

constexpr const char* kJoinCall =
    R"(VORNWinJoin1({joinMode 1, "lab.test", "joiner", "Canary-1", kdc "", fqdn "", netbiosName ""}))";

TEST_F(JoinUndo, FollowsAJoinThatThePlatformRefuses) {
    for (const int result : {-1, 1, 2, -2}) {
        SCOPED_TRACE(result);
        Again();
        MakeJoinFail("Invalid KDC ip.");
        state.joinResult = result;
        state.onJoin = [this](const _tag_VORN_WIN2_&) { state.files.insert(kJoinStatusPath); };
        EXPECT_THAT(Call(DomainSet, ChangeAll()), FailsWith(2603));
        EXPECT_THAT(
            Changes(),
            ElementsAre("VORNWinSetTrustDomain(0)", "VORNNetDNSListGet(list)",
                        R"(VORNNetDNSListSet(["192.0.2.7", "192.0.2.8"]))", R"(access("/var/log/winlock.state", 0))",
                        R"(unlink("/var/log/winlock.state"))", kJoinCall,
                        R"(system("/usr/bin/nslookup lab.test > )"
                        R"(/usr/vorn/etc/private/dns_query 2>&1"))",
                        "ErrWINIState1Get(size 24, size 512)", R"(access("/var/log/winlock.state", 0))",
                        R"(unlink("/var/log/winlock.state"))", R"(VORNNetDNSListSet(["192.0.2.1", "192.0.2.2"]))",
                        "VORNWinSetTrustDomain(2)"));
        EXPECT_THAT(appliance.Logs(), ElementsAre(kNotSaved));
        ExpectAsBefore();
        EXPECT_THAT(state.events, IsEmpty());
        EXPECT_THAT(state.reloadedServices, IsEmpty());
        EXPECT_EQ(state.adminGroupUpdates, 0);
        EXPECT_EQ(appliance.CountOf("WINIQuery1"), 1);
    }
}

TEST_F(JoinUndo, DoesNotFollowAJoinThatWorks) {
    EXPECT_THAT(Call(DomainSet, ChangeAll()), Succeeds("null"));
    ExpectAsWanted();
    EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 1);
    EXPECT_EQ(appliance.CountOf("VORNWinSetTrustDomain"), 1);
}

TEST_F(JoinUndo, PutsBackOnlyWhatWasChanged) {
    MakeJoinFail();
    EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(2617));
    EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 0);
    ExpectAsBefore();

    Again();
    MakeJoinFail();
    EXPECT_THAT(Call(DomainSet, With(R"({"dns": "192.0.2.1,192.0.2.2"})")), FailsWith(2617));
    EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 0);

    Again();
    MakeJoinFail();
    state.trustSetting = 1;
    EXPECT_THAT(Call(DomainSet, With(R"({"dns": "192.0.2.7"})")), FailsWith(2617));
    EXPECT_EQ(appliance.CountOf("VORNWinSetTrustDomain"), 0);
    EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 2);
}

TEST_F(JoinUndo, FollowsATrustSettingThatCannotBeChanged) {
    appliance.FailNth("VORNWinSetTrustDomain", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Call(DomainSet, ChangeAll()), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(), ElementsAre(kNotSaved));
    EXPECT_THAT(Changes(), ElementsAre("VORNWinSetTrustDomain(0)", R"(access("/var/log/winlock.state", 0))",
                                       R"(unlink("/var/log/winlock.state"))", "VORNWinSetTrustDomain(2)"));
    EXPECT_EQ(appliance.CountOf("free"), 3);
    ExpectAsBefore();
}

TEST_F(JoinUndo, FollowsDnsServersThatCannotBeRead) {
    appliance.FailNth("VORNNetDNSListGet", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Call(DomainSet, ChangeAll()), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d Cannot get dns list", "Cannot get dns list"),
                            Logs("domain.cpp", "%s:%d Cannot get the dns list", "Cannot get the dns list"), kNotSaved));
    EXPECT_THAT(Changes(), ElementsAre("VORNWinSetTrustDomain(0)", "VORNNetDNSListGet(list)",
                                       R"(access("/var/log/winlock.state", 0))", R"(unlink("/var/log/winlock.state"))",
                                       "VORNWinSetTrustDomain(2)"));
    EXPECT_EQ(appliance.CountOf("WebUtils::StringExplode"), 0);
    ExpectAsBefore();
}

TEST_F(JoinUndo, FollowsAdvancedOptionsThatCannotBeStored) {
    appliance.FailNth("VLIBCFileITmpName", 1, fake::Fault::Result(-1));
    EXPECT_THAT(Call(DomainSet, ChangeAll()), FailsWith(2617));
    EXPECT_THAT(
        appliance.Logs(),
        ElementsAre(Logs("domain.cpp", "%s:%d cannot store smbinfo.conf", "cannot store smbinfo.conf"), kNotSaved));
    EXPECT_THAT(Changes(), ElementsAre("VORNWinSetTrustDomain(0)", "VORNNetDNSListGet(list)",
                                       R"(VORNNetDNSListSet(["192.0.2.7", "192.0.2.8"]))",
                                       R"(access("/var/log/winlock.state", 0))", R"(unlink("/var/log/winlock.state"))",
                                       R"(VORNNetDNSListSet(["192.0.2.1", "192.0.2.2"]))", "VORNWinSetTrustDomain(2)"));
    ExpectAsBefore();
}

TEST_F(JoinUndo, ThatFailsItselfChangesNoCode) {
    for (const char* function : {"VORNNetDNSListSet", "VORNWinSetTrustDomain"}) {
        SCOPED_TRACE(function);
        Again();
        MakeJoinFail("Invalid KDC ip.");
        appliance.FailNth(function, 2, fake::Fault::Result(-1));
        EXPECT_THAT(Call(DomainSet, ChangeAll()), FailsWith(2603));
        EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 2);
        EXPECT_EQ(appliance.CountOf("VORNWinSetTrustDomain"), 2);
        EXPECT_EQ(appliance.CountOf("free"), 3);
    }
}

TEST_F(JoinUndo, LogsServersThatCannotBePutBack) {
    MakeJoinFail("Invalid KDC ip.");
    appliance.FailNth("VORNNetDNSListSet", 2, fake::Fault::Result(-1));
    Call(DomainSet, ChangeAll());
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d Cannot set the list", "Cannot set the list"), kNotSaved));
}

TEST_F(JoinUndo, FollowsInterfacesThatAreNoTexts) {
    for (const char* nics : {R"([["x"]])", R"([{"x": 1}])", R"(["eth0", ["x"]])"}) {
        SCOPED_TRACE(nics);
        Again();
        Json::Value parameters = ChangeAll();
        parameters["advance_domain_conf"]["enable_advance_option"] = true;
        parameters["advance_domain_conf"]["register_nics"] = unit::FromJson(nics);
        ExpectThrow<Json::LogicError>(parameters);
        EXPECT_THAT(state.joins, IsEmpty());
        EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 2);
        EXPECT_EQ(appliance.CountOf("VORNWinSetTrustDomain"), 2);
        EXPECT_EQ(appliance.CountOf("free"), 3);
        EXPECT_THAT(appliance.Logs(), IsEmpty());
        ExpectAsBefore();
    }
}

// The number of the call of `function` among those that the request makes, found by its text.
int Nth(const fake::Appliance& appliance, const std::string& function, const std::string& text, int occurrence = 1) {
    int nth = 0;
    for (const fake::Call& call : appliance.Calls()) {
        nth += call.function == function ? 1 : 0;
        if (call.Text() == text && --occurrence == 0) {
            return nth;
        }
    }
    ADD_FAILURE() << "no call " << text;
    return 1;
}

TEST_F(JoinUndo, FollowsAnyExceptionBeforeTheJoin) {
    struct Case {
        const char* function;
        const char* text;
        int occurrence;
        int servers;  // how often they are written
        int trust;    // how often the setting is written
    };
    const Case cases[] = {
        {"VORN::APIRequest::HasParam", R"(VORN::APIRequest::HasParam("manage_mode"))", 1, 0, 1},
        {"VORN::APIRequest::GetParam", R"(VORN::APIRequest::GetParam("manage_mode", null))", 1, 0, 1},
        {"VORN::APIRequest::GetParam", R"(VORN::APIRequest::GetParam("manage_mode", null))", 2, 0, 1},
        {"VORN::APIRequest::HasParam", R"(VORN::APIRequest::HasParam("dns"))", 2, 0, 2},
        {"VORN::APIRequest::GetParam", R"(VORN::APIRequest::GetParam("dns", ""))", 1, 0, 2},
        {"WebUtils::StringExplode", R"(WebUtils::StringExplode("192.0.2.7,192.0.2.8", ","))", 1, 0, 2},
        {"WebUtils::StringImplode", R"(WebUtils::StringImplode(["192.0.2.7", "192.0.2.8"], ","))", 1, 0, 2},
        {"WebUtils::StringImplode", R"(WebUtils::StringImplode(["192.0.2.1", "192.0.2.2"], ","))", 1, 0, 2},
        {"VORN::APIRequest::HasParam", R"(VORN::APIRequest::HasParam("advance_domain_conf"))", 2, 2, 2},
    };
    for (const Case& each : cases) {
        SCOPED_TRACE(each.text + std::to_string(each.occurrence));
        Again();
        Call(DomainSet, ChangeAll());
        const int nth = Nth(appliance, each.function, each.text, each.occurrence);
        Again();
        appliance.FailNth(each.function, nth, fake::Fault::Throw());
        ExpectThrow<fake::InjectedException>(ChangeAll());
        EXPECT_THAT(state.joins, IsEmpty());
        EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), each.servers);
        // Before the mode is known, enabled is what is wanted, and that differs from what is stored.
        EXPECT_EQ(appliance.CountOf("VORNWinSetTrustDomain"), each.trust);
        EXPECT_EQ(appliance.CountOf("free"), 3);
        EXPECT_THAT(appliance.Logs(), IsEmpty());
        ExpectAsBefore();
    }
}

TEST_F(JoinUndo, DoesNotFollowAnExceptionAfterTheJoin) {
    struct Case {
        const char* function;
        int nth;
    };
    for (const Case& each : {Case{"VornConf::VornConf", 2}, Case{"VornConf::Info", 1}}) {
        SCOPED_TRACE(each.function);
        Again();
        state.onJoin = [this](const _tag_VORN_WIN2_&) { state.files.insert(kJoinStatusPath); };
        appliance.FailNth(each.function, each.nth, fake::Fault::Throw());
        ExpectThrow<fake::InjectedException>(ChangeAll());
        EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 1);
        EXPECT_EQ(appliance.CountOf("VORNWinSetTrustDomain"), 1);
        EXPECT_EQ(appliance.CountOf("free"), 3);
        ExpectAsWanted();
    }
}

TEST_F(JoinUndo, DoesNotFollowAnExceptionWhileTheEventIsWritten) {
    const auto prepare = [this] {
        Again();
        state.onJoin = [this](const _tag_VORN_WIN2_&) { state.files.insert(kJoinStatusPath); };
        appliance.FailNth("WINIQuery1", 2, fake::Fault::Result(-1));
    };
    prepare();
    Call(DomainSet, ChangeAll());
    const int nth = Nth(appliance, "VORN::APIRequest::GetParam", R"(VORN::APIRequest::GetParam("domain_name", ""))");
    prepare();
    appliance.FailNth("VORN::APIRequest::GetParam", nth, fake::Fault::Throw());
    ExpectThrow<fake::InjectedException>(ChangeAll());
    EXPECT_THAT(state.events, IsEmpty());
    ExpectAsWanted();
}

TEST_F(JoinUndo, LeavesNoCopyBehindWhenTheTextsCannotBeRead) {
    const char* names[] = {"domain_name", "username", "password"};
    for (int copies = 0; copies < 3; ++copies) {
        const std::string text = "VORN::APIRequest::GetParam(\"" + std::string(names[copies]) + "\", null)";
        SCOPED_TRACE(text);
        Again();
        Call(DomainSet, ChangeAll());
        // The checks read each once; of the domain's name the check for an address is a second reader.
        const int nth = Nth(appliance, "VORN::APIRequest::GetParam", text, copies == 0 ? 3 : 2);
        Again();
        appliance.FailNth("VORN::APIRequest::GetParam", nth, fake::Fault::Throw());
        ExpectThrow<fake::InjectedException>(ChangeAll());
        EXPECT_EQ(appliance.CountOf("strdup"), copies);
        EXPECT_EQ(appliance.CountOf("free"), copies);
        EXPECT_EQ(appliance.CountOf("VORNWinSetTrustDomain"), 0);
    }
}

}  // namespace
