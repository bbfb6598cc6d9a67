// What "set" may be asked for, and on which appliance.

#include "tests/faults/appliances.h"
#include "tests/faults/oracles.h"
#include "tests/faults/set_operation.h"

namespace sweep {

namespace {

// Joins "lab.test"; `more` are further members of the request.
Json::Value JoinRequest(const char* more = "{}") {
    Json::Value request = FromJson(R"({"enable_domain": true, "domain_name": "lab.test", "username": "joiner"})");
    request["password"] = kPassword;
    const Json::Value members = FromJson(more);
    for (const std::string& name : members.getMemberNames()) {
        request[name] = members[name];
    }
    return request;
}

// A join that is made to fail is told apart by the status that it leaves.
Scenario Join(const char* name, const char* more, const fake::State& before) {
    return {name, JoinRequest(more), before, Json::Value(), {{"ErrWINIState1Get", "", Stops(2603)}}};
}

// A join that fails by itself; the status decides unless the DNS name check does.
Scenario FailingJoin(const char* name, const char* more, const char* message, int code) {
    Scenario scenario = Join(name, more, Workgroup());
    scenario.before.joinResult = 1;
    scenario.before.trustSetting = 0;
    scenario.before.joinStatus->message = message;
    scenario.naturals = {{"VORNWinJoin1", "", FailsLater()}, {"ErrWINIState1Get", "", Stops(code)}};
    return scenario;
}

void AddJoins(std::vector<Scenario>& scenarios) {
    const char* const servers = R"({"dns": "10.0.0.7,10.0.0.8"})";
    const char* const everything = R"({"manage_mode": 0, "dns": "10.0.0.7, 10.0.0.8", "advance_domain_conf":
        {"enable_advance_option": true, "kdc": "10.0.0.5", "netbios_name": "LAB", "fqdn_name": "lab.test",
         "register_nics": ["eth0", "eth1"]}})";

    scenarios.push_back(Join("join", "{}", Workgroup()));

    Scenario all = Join("join-all", everything, Workgroup());
    all.before.trustSetting = 0;
    all.before.settings["enableduserhome"] = "yes";
    all.before.enabledServices = {"webdav-httpd-pure"};
    scenarios.push_back(all);

    scenarios.push_back(Join("join-as-member", everything, Member()));

    scenarios.push_back(Join("join-trust-off", R"({"manage_mode": 1})", Workgroup()));
    scenarios.push_back(Join("join-trust-kept-off", R"({"manage_mode": 1})", Workgroup()));
    scenarios.back().before.trustSetting = 0;
    scenarios.push_back(Join("join-trust-normalised", R"({"manage_mode": 0})", Workgroup()));
    scenarios.back().before.trustSetting = 2;
    scenarios.push_back(Join("join-trust-of-wrong-type", R"({"manage_mode": "1"})", Workgroup()));
    scenarios.back().before.trustSetting = 0;
    scenarios.back().naturals.push_back({"VORN::APIRequest::GetParam", "\"manage_mode\"", Records(2618)});

    scenarios.push_back(Join("join-servers", servers, Workgroup()));
    scenarios.push_back(Join("join-servers-kept", R"({"dns": "10.0.0.1,10.0.0.2"})", Workgroup()));
    scenarios.push_back(Join("join-servers-empty", R"({"dns": ""})", Workgroup()));
    scenarios.push_back(Join("join-servers-first", servers, Workgroup()));
    scenarios.back().before.dnsServers.clear();
    scenarios.push_back(Join("join-servers-gap", servers, Workgroup()));
    scenarios.back().before.dnsServers = {"10.0.0.1", fake::OptionalText(), "10.0.0.2"};

    scenarios.push_back(
        Join("join-options-off", R"({"advance_domain_conf": {"enable_advance_option": false}})", Member()));
    scenarios.push_back(Join("join-all-nics", R"({"advance_domain_conf":
        {"enable_advance_option": true, "register_nics": ["eth0", "all"]}})",
                             Member()));
    scenarios.push_back(Join("join-bad-nic", R"({"manage_mode": 1, "dns": "10.0.0.7", "advance_domain_conf":
        {"enable_advance_option": true, "register_nics": [{}]}})",
                             Workgroup()));
    scenarios.back().naturals.push_back({"VLIBCFileGetSection", "", ThrowsLater()});

    scenarios.push_back(Join("join-web-folders", "{}", Workgroup()));
    scenarios.back().before.enabledServices = {"webdav-httpd-pure"};
}

void AddFailingJoins(std::vector<Scenario>& scenarios) {
    const char* const servers = R"({"dns": "10.0.0.7,10.0.0.8"})";
    scenarios.push_back(FailingJoin("fails-by-password", servers, "The username or password was not correct.", 2610));
    scenarios.push_back(FailingJoin("fails-without-servers", "{}", "Unable to join domain at all", 2611));
    scenarios.push_back(FailingJoin("fails-by-unknown-status", "{}", "No idea", 2615));
    scenarios.push_back(FailingJoin("fails-without-status", "{}", "", 2615));
    scenarios.back().before.joinStatus.reset();

    scenarios.push_back(FailingJoin("fails-by-name", servers, "Error System.", 2617));
    scenarios.back().before.systemResult = 1;
    scenarios.back().naturals.push_back({"system", "", Stops(2602)});

    scenarios.push_back(FailingJoin("fails-by-shell-name", servers, "Error System.", 2617));
    scenarios.back().parameters["domain_name"] = "lab;.test";
    scenarios.back().naturals = {{"VORNWinJoin1", "", Stops(2602)}};

    scenarios.push_back(FailingJoin("fails-undotted", servers, "Invalid workgroup name.", 2604));
    scenarios.back().parameters["domain_name"] = "LAB";

    scenarios.push_back(FailingJoin("fails-after-wrong-type", R"({"manage_mode": null})", "Invalid KDC ip.", 2603));
    scenarios.back().naturals.push_back({"VORN::APIRequest::GetParam", "\"manage_mode\"", Records(2618)});

    scenarios.push_back(FailingJoin("fails-with-options", R"({"manage_mode": 0, "advance_domain_conf":
        {"enable_advance_option": true, "kdc": "10.0.0.5"}})",
                                    "Could not connect to server 10.0.0.5", 2614));
    scenarios.back().before.joinResult = -1;
}

void AddLeaving(std::vector<Scenario>& scenarios) {
    const Json::Value leave = FromJson(R"({"enable_domain": false})");
    scenarios.push_back({"leave", leave, Member(), Json::Value(), {}});
    scenarios.push_back({"leave-lock-taken", leave, Member(), Json::Value(), {}});
    scenarios.back().before.heldLocks = {0x800};
    scenarios.push_back({"leave-no-files", leave, Member(), Json::Value(), {}});
    scenarios.back().before.keyValueFiles.clear();
    scenarios.push_back({"leave-broken-membership", leave, Member(), Json::Value(), {}});
    scenarios.back().before.secondFlag = 0;
    scenarios.push_back({"leave-refused", leave, Member(), Json::Value(), {{"VORNWinJoin1", "", Stops(2617)}}});
    scenarios.back().before.joinResult = -1;
    scenarios.push_back({"nothing", leave, Workgroup(), Json::Value(), {}});
}

void AddRefusals(std::vector<Scenario>& scenarios) {
    const auto refuse = [&](const char* name, const Json::Value& parameters, const Natural& natural) {
        scenarios.push_back({name, parameters, Workgroup(), Json::Value(), {natural}});
    };
    refuse("refused-empty", Json::Value(Json::objectValue), {"VORN::APIRequest::HasParam", "", Stops(2618)});
    refuse("refused-no-name", FromJson(R"({"enable_domain": true})"),
           {"VORN::APIRequest::HasParam", "\"domain_name\"", Stops(2618)});
    refuse("refused-password", JoinRequest(R"({"password": 5})"),
           {"VORN::APIRequest::GetParam", "\"password\"", Stops(2618)});
    refuse("refused-servers", JoinRequest(R"({"dns": []})"), {"VORN::APIRequest::GetParam", "\"dns\"", Stops(2618)});
    refuse("refused-options", JoinRequest(R"({"advance_domain_conf": {"kdc": "10.0.0.5"}})"),
           {"VORN::APIRequest::GetParam", "\"advance_domain_conf\"", Stops(2618)});
    refuse("refused-options-leaving", FromJson(R"({"enable_domain": false, "advance_domain_conf": "x"})"),
           {"VORN::APIRequest::GetParam", "\"advance_domain_conf\"", Stops(2618)});

    // A call that denies the address lets the join go on, and that works.
    scenarios.push_back(Join("refused-address", R"({"domain_name": "10.0.0.3"})", Workgroup()));
    scenarios.back().naturals.push_back({"BlVLIBIsIpAddr", "", Stops(2601)});
    scenarios.push_back(Join("refused-long-address", R"({"domain_name": "fe80::1"})", Workgroup()));
    scenarios.back().naturals.push_back({"BlVLIBIsv6IpAddrValid", "", Stops(2601)});
    scenarios.push_back(Join("refused-directory", "{}", Workgroup()));
    scenarios.back().before.ldapBound = 1;
    scenarios.back().naturals.push_back({"VORNLDAPIsBinded", "", Stops(2620)});
    scenarios.push_back(Join("refused-unsupported", "{}", Workgroup()));
    scenarios.back().before.capabilities["supportdomain"] = "YES";
    scenarios.back().naturals.push_back({"VornConf::Def", "", Stops(2619)});
}

}  // namespace

std::vector<Scenario> SetScenarios() {
    std::vector<Scenario> scenarios;
    AddJoins(scenarios);
    AddFailingJoins(scenarios);
    AddLeaving(scenarios);
    AddRefusals(scenarios);
    return scenarios;
}

}  // namespace sweep
