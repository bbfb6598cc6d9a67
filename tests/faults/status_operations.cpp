// "get" and "test_dc": reading the membership.

#include "src/api_table.h"
#include "tests/faults/appliances.h"
#include "tests/faults/operations.h"
#include "tests/faults/run.h"

namespace sweep {

namespace {

Effect OptionBecomes(const char* key, const char* json) {
    const Json::Value value = FromJson(json);
    return Edits([key, value](Outcome& outcome, const Event&) { outcome.data["advance_domain_conf"][key] = value; });
}

void StoredOptionsAreLost(Outcome& outcome, const Event& /*event*/) {
    outcome.data["advance_domain_conf"]["enable_advance_option"] = false;
    outcome.data["advance_domain_conf"]["register_nics"] = FromJson(R"(["all"])");
}

void TrustIsAsAnswered(Outcome& outcome, const Event& event) {
    outcome.data["manage_mode"] = event.Result() == 0 ? 1 : 0;
}

void ServerIsPassedOver(Outcome& outcome, const Event& event) {
    outcome.data["dns"][std::stoi(event.call.arguments.at(1))] = Json::Value();
}

std::vector<Rule> GetRules() {
    return {
        {"WINIQuery1", "", "", When::kNegative, Stops(2622)},
        {"VLIBCFileGetKeyValue", "\"security\"", "", When::kZeroOrLess, Stops(2621)},
        {"VLIBCFileGetKeyValue", "\"password server\"", "", When::kZeroOrLess, OptionBecomes("kdc", "\"\"")},
        {"VLIBCFileGetKeyValue", "\"workgroup\"", "", When::kZeroOrLess, OptionBecomes("netbios_name", "\"\"")},
        {"VLIBCFileGetKeyValue", "\"realm\"", "", When::kZeroOrLess, OptionBecomes("fqdn_name", "\"\"")},
        {"VORNWinIsEnableTrustDomain", "", "", When::kAny, Edits(TrustIsAsAnswered)},
        {"VLIBCSzListAlloc", "", "", When::kFails, Stops(2617)},
        {"VORNNetDNSListGet", "", "", When::kNegative, Stops(2617)},
        {"VLIBCSzListGet", "", "", When::kFails, Edits(ServerIsPassedOver)},
        {"VLIBCSzHashAlloc", "", "", When::kFails, Stops(2617)},
        {"VLIBCFileGetSection", "", "", When::kNegative, Edits(StoredOptionsAreLost)},
        {"VLIBCSzHashGetValue", "\"advanced_domain_option\"", "", When::kFails,
         OptionBecomes("enable_advance_option", "false")},
        {"VLIBCSzHashGetValue", "\"register nic\"", "", When::kFails, OptionBecomes("register_nics", R"(["all"])")},
    };
}

// The servers are kept as a list until all failures are known.
Json::Value JoinServers(const Json::Value& data) {
    if (!data.isMember("dns")) {
        return data;
    }
    std::string text;
    for (const Json::Value& server : data["dns"]) {
        if (server.isString()) {
            text += (text.empty() ? "" : ",") + server.asString();
        }
    }
    Json::Value answer = data;
    answer["dns"] = text;
    return answer;
}

const char* const kMemberAnswer = R"({"enable_domain": true, "domain_name": "LAB", "domain_type": "AD",
    "manage_mode": 0, "dns": ["10.0.0.1", "10.0.0.2"],
    "advance_domain_conf": {"enable_advance_option": true, "kdc": "10.0.0.5", "netbios_name": "LAB",
                            "fqdn_name": "LAB.TEST", "register_nics": ["eth0", "eth1"]}})";

std::vector<Scenario> GetScenarios() {
    const Json::Value none(Json::objectValue);
    const Json::Value noMember = FromJson(R"({"enable_domain": false})");
    std::vector<Scenario> scenarios;

    scenarios.push_back({"active-directory", none, Member(), FromJson(kMemberAnswer), {}});

    Scenario nt4{"nt4-trust-off", none, Member(), FromJson(kMemberAnswer), {}};
    nt4.before.trustSetting = 0;
    fake::SetKey(Global(nt4.before, kSmbConf), "security", "domain");
    nt4.data["domain_type"] = "NT4";
    nt4.data["manage_mode"] = 1;
    scenarios.push_back(nt4);

    Scenario bare{"bare-files", none, Member(), FromJson(kMemberAnswer), {}};
    bare.before.keyValueFiles.erase(kSmbInfo);
    Global(bare.before, kSmbConf) = {{"security", "ads"}, {"realm", "*"}};
    bare.data["advance_domain_conf"] = FromJson(
        R"({"enable_advance_option": false, "kdc": "", "netbios_name": "", "fqdn_name": "", "register_nics": ["all"]})");
    scenarios.push_back(bare);

    Scenario gaps{"gaps-among-servers", none, Member(), FromJson(kMemberAnswer), {}};
    gaps.before.dnsServers = {"10.0.0.1", fake::OptionalText(), "10.0.0.2"};
    gaps.data["dns"] = FromJson(R"(["10.0.0.1", null, "10.0.0.2"])");
    scenarios.push_back(gaps);

    Scenario noServers{"no-servers", none, Member(), FromJson(kMemberAnswer), {}};
    noServers.before.dnsServers.clear();
    noServers.data["dns"] = Json::Value(Json::arrayValue);
    scenarios.push_back(noServers);

    Scenario unknown{"unknown-type", none, Member(), {}, {{"VLIBCFileGetKeyValue", "\"security\"", Stops(2621)}}};
    fake::SetKey(Global(unknown.before, kSmbConf), "security", "ADS");
    scenarios.push_back(unknown);

    Scenario noType = unknown;
    noType.name = "no-type";
    fake::RemoveKey(Global(noType.before, kSmbConf), "security");
    scenarios.push_back(noType);

    scenarios.push_back({"workgroup", none, Workgroup(), noMember, {}});

    Scenario unsupported{"unsupported", none, Member(), noMember, {}};
    unsupported.before.capabilities["supportdomain"] = "no";
    scenarios.push_back(unsupported);
    return scenarios;
}

void TestIsAsAnswered(Outcome& outcome, const Event& event) {
    outcome.data["test_join_success"] = event.Result() >= 0;
}

std::vector<Scenario> TestScenarios() {
    const Json::Value none(Json::objectValue);
    const Json::Value works = FromJson(R"({"test_join_success": true})");
    const Json::Value fails = FromJson(R"({"test_join_success": false})");
    std::vector<Scenario> scenarios;
    scenarios.push_back({"works", none, Member(), works, {}});
    scenarios.push_back({"refused", none, Member(), fails, {}});
    scenarios.back().before.testJoinResult = -1;
    scenarios.push_back({"nt4", none, Member(), works, {}});
    scenarios.back().before.adsJoined = 0;
    scenarios.push_back({"workgroup", none, Workgroup(), fails, {}});
    scenarios.push_back({"unsupported", none, Member(), fails, {}});
    scenarios.back().before.capabilities.clear();
    return scenarios;
}

// The test is told the kind of membership as it was answered.
void CheckTestedKind(const Run& run, Findings& findings) {
    for (const std::size_t test : run.PlacesOf("VORNWinTestJoin")) {
        const std::optional<std::size_t> kind = run.FirstOf("VORNWinADSJoined");
        const fake::Fault* fault = kind ? run.FaultAt(*kind) : nullptr;
        const int answered = fault != nullptr ? fault->result : run.Before().adsJoined;
        if (run.Calls()[test].arguments.at(0) != std::to_string(answered)) {
            findings.Add("tested kind", "expected " + std::to_string(answered) + ": " + run.Calls()[test].Text());
        }
    }
}

}  // namespace

Operation DomainGetOperation() {
    Operation operation = MakeOperation("DomainGet", DomainGet);
    operation.rules = GetRules();
    operation.scenarios = GetScenarios();
    operation.shape = JoinServers;
    return operation;
}

Operation DomainTestDCOperation() {
    Operation operation = MakeOperation("DomainTestDC", DomainTestDC);
    operation.rules = {
        {"WINIQuery1", "", "", When::kNegative, Stops(2622)},
        {"VORNWinADSJoined", "", "", When::kAny, Ignored()},
        {"VORNWinTestJoin", "", "", When::kAny, Edits(TestIsAsAnswered)},
    };
    operation.scenarios = TestScenarios();
    operation.oracles = {CheckTestedKind};
    return operation;
}

}  // namespace sweep
