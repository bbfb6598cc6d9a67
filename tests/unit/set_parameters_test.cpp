// "set": what a request may hold.

#include <string>
#include <vector>

#include "src/domain.h"
#include "tests/unit/set_test.h"

namespace {

using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::StartsWith;
using unit::FailsWith;
using unit::FromJson;
using unit::JoinRequest;
using unit::LeaveRequest;
using unit::Logs;
using unit::Succeeds;
using unit::With;
using unit::Without;

class SetParameters : public unit::SetTest {
protected:
    // Nothing but the tests for addresses may have been called.
    void ExpectUntouched() {
        EXPECT_THAT(appliance.CallTexts(fake::kAllBookkeeping), Each(StartsWith("BlVLIBIs")));
    }

    void ExpectMissing(const Json::Value& parameters, const std::string& name) {
        SCOPED_TRACE("missing " + name);
        Restart();
        EXPECT_THAT(Call(DomainSet, parameters), FailsWith(2618));
        EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d cannot get the paramter: %s",
                                                       "cannot get the paramter: " + name)));
        ExpectUntouched();
    }

    void ExpectWrong(const Json::Value& parameters, const std::string& name) {
        SCOPED_TRACE("wrong " + name + " in " + parameters.toStyledString());
        Restart();
        EXPECT_THAT(Call(DomainSet, parameters), FailsWith(2618));
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d wrong the paramter: %s", "wrong the paramter: " + name)));
        ExpectUntouched();
    }
};

TEST_F(SetParameters, OfAJoinAreTakenAndAnsweredWithNull) {
    EXPECT_THAT(Call(DomainSet, JoinRequest()), Succeeds("null"));
    EXPECT_EQ(state.joins.size(), 1U);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(SetParameters, OfALeaveAreOne) {
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), Succeeds("null"));
    BeMember();
    EXPECT_THAT(Call(DomainSet, LeaveRequest()), Succeeds("null"));
    EXPECT_EQ(state.joins.size(), 1U);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(SetParameters, OfAJoinAreAllNeeded) {
    ExpectMissing(FromJson("{}"), "enable_domain");
    for (const char* name : {"enable_domain", "domain_name", "username", "password"}) {
        ExpectMissing(Without(JoinRequest(), name), name);
    }
}

TEST_F(SetParameters, AreNeverConverted) {
    for (const char* value : {R"("true")", "1", "0", "null", "[]", "{}"}) {
        Json::Value parameters = JoinRequest();
        parameters["enable_domain"] = FromJson(value);
        ExpectWrong(parameters, "enable_domain");
    }
    for (const char* name : {"domain_name", "username", "password", "dns"}) {
        for (const char* value : {"5", "true", "null", R"(["192.0.2.7"])", "{}", "1.5"}) {
            Json::Value parameters = JoinRequest();
            parameters[name] = FromJson(value);
            ExpectWrong(parameters, name);
        }
    }
}

TEST_F(SetParameters, AreCheckedInOrder) {
    Json::Value parameters = FromJson(R"({"enable_domain": 1, "domain_name": 1, "username": 1, "password": 1, "dns": 1,
                                          "advance_domain_conf": {}})");
    ExpectWrong(parameters, "enable_domain");
    parameters["enable_domain"] = true;
    ExpectWrong(parameters, "domain_name");
    parameters["domain_name"] = "192.0.2.7";
    Restart();
    EXPECT_THAT(Call(DomainSet, parameters), FailsWith(2601));
    parameters["domain_name"] = "lab.test";
    ExpectWrong(parameters, "username");
    parameters["username"] = "joiner";
    ExpectWrong(parameters, "password");
    parameters["password"] = "secret";
    ExpectWrong(parameters, "dns");
    parameters["dns"] = "192.0.2.7";
    ExpectMissing(parameters, "enable_advance_option");
    parameters["advance_domain_conf"] = FromJson(R"({"enable_advance_option": false})");
    Restart();
    EXPECT_THAT(Call(DomainSet, parameters), Succeeds("null"));
}

TEST_F(SetParameters, AreReadAsSent) {
    appliance.FailNth("BlVLIBIsIpAddr", 1, fake::Fault::Result(1));
    Call(DomainSet, JoinRequest());
    EXPECT_THAT(appliance.CallTexts(fake::kLogs | fake::kAnswers),
                ElementsAre(R"(VORN::APIRequest::HasParam("enable_domain"))",
                            R"(VORN::APIRequest::GetParam("enable_domain", null))",
                            R"(VORN::APIRequest::GetParam("enable_domain", null))",
                            R"(VORN::APIRequest::HasParam("domain_name"))",
                            R"(VORN::APIRequest::GetParam("domain_name", null))",
                            R"(VORN::APIRequest::GetParam("domain_name", null))", R"(BlVLIBIsIpAddr("lab.test"))"));
}

TEST_F(SetParameters, BesideEnableDomainAreNotLookedAtWhenLeaving) {
    for (const bool member : {false, true}) {
        SCOPED_TRACE(member);
        Restart();
        if (member) {
            BeMember();
        }
        EXPECT_THAT(Call(DomainSet, With(LeaveRequest(), R"({"domain_name": 5, "username": [], "password": {},
                                                             "dns": true, "manage_mode": "x"})")),
                    Succeeds("null"));
        EXPECT_THAT(appliance.Logs(), IsEmpty());
        EXPECT_EQ(appliance.CountOf("BlVLIBIsIpAddr"), 0);
    }
}

TEST_F(SetParameters, MayNotNameAnAddressAsDomain) {
    for (const std::string address : {"192.0.2.7", "0.0.0.0", "fe80::1", "::", "2001:db8::7"}) {
        SCOPED_TRACE(address);
        Restart();
        Json::Value parameters = JoinRequest();
        parameters["domain_name"] = address;
        EXPECT_THAT(Call(DomainSet, parameters), FailsWith(2601));
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d Invalid domain name [%s], it seems a IP address.",
                                     "Invalid domain name [" + address + "], it seems a IP address.")));
        ExpectUntouched();
    }
}

TEST_F(SetParameters, AskForAnAddressOfTheOlderKindFirst) {
    Json::Value parameters = With(R"({"domain_name": "192.0.2.7"})");
    Call(DomainSet, parameters);
    EXPECT_THAT(CallsOf({"BlVLIBIsIpAddr", "BlVLIBIsv6IpAddrValid"}), ElementsAre(R"(BlVLIBIsIpAddr("192.0.2.7"))"));
    Restart();
    parameters["domain_name"] = "fe80::1";
    Call(DomainSet, parameters);
    EXPECT_THAT(CallsOf({"BlVLIBIsIpAddr", "BlVLIBIsv6IpAddrValid"}),
                ElementsAre(R"(BlVLIBIsIpAddr("fe80::1"))", R"(BlVLIBIsv6IpAddrValid("fe80::1"))"));
}

TEST_F(SetParameters, MayNameAnythingElseAsDomain) {
    for (const char* name : {"lab.test", "LAB", "", "192.0.2", "192.0.2.256", "192.0.2.7x", " ", "fe80"}) {
        SCOPED_TRACE(name);
        Restart();
        Json::Value parameters = JoinRequest();
        parameters["domain_name"] = name;
        EXPECT_THAT(Call(DomainSet, parameters), Succeeds("null"));
        EXPECT_THAT(appliance.Logs(), IsEmpty());
    }
}

TEST_F(SetParameters, NameAnAddressOnlyByTheResult1) {
    for (const char* function : {"BlVLIBIsIpAddr", "BlVLIBIsv6IpAddrValid"}) {
        for (const int result : {-1, 0, 1, 2}) {
            SCOPED_TRACE(function + std::to_string(result));
            Restart();
            appliance.FailNth(function, 1, fake::Fault::Result(result));
            EXPECT_EQ(Call(DomainSet, JoinRequest()).code, result == 1 ? 2601 : 0);
        }
    }
}

TEST_F(SetParameters, EndANameAtItsFirstNul) {
    Json::Value parameters = JoinRequest();
    parameters["domain_name"] = std::string("192.0.2.7\0.lab", 14);
    EXPECT_THAT(Call(DomainSet, parameters), FailsWith(2601));
    EXPECT_THAT(Messages(), ElementsAre("Invalid domain name [192.0.2.7], it seems a IP address."));
}

class AdvancedParameters : public SetParameters {
protected:
    static Json::Value Options(const char* json) {
        Json::Value parameters = JoinRequest();
        parameters["advance_domain_conf"] = FromJson(json);
        return parameters;
    }

    static Json::Value LeavingOptions(const char* json) {
        Json::Value parameters = LeaveRequest();
        parameters["advance_domain_conf"] = FromJson(json);
        return parameters;
    }
};

TEST_F(AdvancedParameters, NeedTheSwitch) {
    ExpectMissing(Options("{}"), "enable_advance_option");
    ExpectMissing(LeavingOptions("{}"), "enable_advance_option");
    ExpectMissing(Options(R"({"kdc": "192.0.2.9", "netbios_name": 1})"), "enable_advance_option");
}

TEST_F(AdvancedParameters, MayBeTheSwitchAlone) {
    for (const char* options : {R"({"enable_advance_option": true})", R"({"enable_advance_option": false})"}) {
        EXPECT_THAT(Call(DomainSet, Options(options)), Succeeds("null")) << options;
        EXPECT_THAT(Call(DomainSet, LeavingOptions(options)), Succeeds("null")) << options;
    }
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedParameters, MustBeAnObject) {
    for (const char* value : {R"("enable_advance_option")", R"("")", "[]", R"(["enable_advance_option"])", "5", "1.5",
                              "true", "false", "null"}) {
        SCOPED_TRACE(value);
        ExpectMissing(Options(value), "enable_advance_option");
        ExpectMissing(LeavingOptions(value), "enable_advance_option");
    }
}

TEST_F(AdvancedParameters, AreNeverConverted) {
    for (const char* value : {R"("true")", "1", "null", "[]", "{}"}) {
        Json::Value parameters = Options("{}");
        parameters["advance_domain_conf"]["enable_advance_option"] = FromJson(value);
        ExpectWrong(parameters, "enable_advance_option");
    }
    for (const char* name : {"kdc", "netbios_name", "fqdn_name"}) {
        for (const char* value : {"1", "true", "null", "[]", "{}"}) {
            Json::Value parameters = Options(R"({"enable_advance_option": true})");
            parameters["advance_domain_conf"][name] = FromJson(value);
            ExpectWrong(parameters, name);
        }
    }
    for (const char* value : {"1", "true", R"("eth0")", "{}"}) {
        Json::Value parameters = Options(R"({"enable_advance_option": true})");
        parameters["advance_domain_conf"]["register_nics"] = FromJson(value);
        ExpectWrong(parameters, "register_nics");
    }
}

TEST_F(AdvancedParameters, AreCheckedInOrderAlsoWhenLeaving) {
    const char* names[] = {"enable_advance_option", "kdc", "netbios_name", "fqdn_name", "register_nics"};
    const char* good[] = {"false", R"("192.0.2.9")", R"("LAB")", R"("lab.test")", R"(["eth0"])"};
    Json::Value joining = Options("{}");
    Json::Value leaving = LeavingOptions("{}");
    for (const char* name : names) {
        joining["advance_domain_conf"][name] = 1;
        leaving["advance_domain_conf"][name] = 1;
    }
    for (std::size_t i = 0; i < 5; ++i) {
        ExpectWrong(joining, names[i]);
        ExpectWrong(leaving, names[i]);
        joining["advance_domain_conf"][names[i]] = FromJson(good[i]);
        leaving["advance_domain_conf"][names[i]] = FromJson(good[i]);
    }
    EXPECT_THAT(Call(DomainSet, joining), Succeeds("null"));
    EXPECT_THAT(Call(DomainSet, leaving), Succeeds("null"));
}

TEST_F(AdvancedParameters, AreReadOnceForAllChecks) {
    Call(DomainSet, LeavingOptions(R"({"enable_advance_option": "x"})"));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs | fake::kAnswers),
                ElementsAre(R"(VORN::APIRequest::HasParam("enable_domain"))",
                            R"(VORN::APIRequest::GetParam("enable_domain", null))",
                            R"(VORN::APIRequest::GetParam("enable_domain", null))",
                            R"(VORN::APIRequest::HasParam("advance_domain_conf"))",
                            R"(VORN::APIRequest::GetParam("advance_domain_conf", null))"));
}

TEST_F(SetParameters, ThatThrowAreNotAnswered) {
    for (const char* function : {"VORN::APIRequest::HasParam", "VORN::APIRequest::GetParam"}) {
        SCOPED_TRACE(function);
        Restart();
        appliance.FailNth(function, 1, fake::Fault::Throw());
        ExpectThrow<fake::InjectedException>(JoinRequest());
        ExpectUntouched();
    }
}

}  // namespace
