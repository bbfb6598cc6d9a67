// "get_domain_list", versions 1 and 2.

#include "src/api_table.h"
#include "tests/faults/appliances.h"
#include "tests/faults/operations.h"

namespace sweep {

namespace {

// What both versions have in common.
std::vector<Rule> CommonRules() {
    return {
        {"WINIQuery1", "", "", When::kNegative, Stops(2622)},
        {"VLIBCSzListAlloc", "", "", When::kFails, Stops(2617)},
        {"VORNWinsEnumAllDomains", "", "", When::kNegative, Stops(2617)},
    };
}

int IndexOf(const Event& event) {
    return std::stoi(event.call.arguments.at(1));
}

// The rows of what was not passed over.
Json::Value Present(const Json::Value& rows) {
    Json::Value answer;
    Json::Value& present = answer["domain_list"] = Json::Value(Json::arrayValue);
    for (const Json::Value& row : rows) {
        if (!row.isNull()) {
            present.append(row);
        }
    }
    return answer;
}

// Scenarios that end before the two versions differ.
std::vector<Scenario> CommonScenarios(const Json::Value& empty) {
    const Json::Value none(Json::objectValue);
    std::vector<Scenario> scenarios;
    scenarios.push_back({"workgroup", none, Workgroup(), empty, {}});
    scenarios.push_back({"broken-membership", none, Member(), empty, {}});
    scenarios.back().before.secondFlag = 0;
    scenarios.push_back({"unsupported", none, Member(), empty, {{"VornConf::Def", "", Stops(2619)}}});
    scenarios.back().before.capabilities["supportdomain"] = "no";
    return scenarios;
}

// ---- Version 1: data is the list of names ----

void NameIsPassedOver(Outcome& outcome, const Event& event) {
    outcome.data[IndexOf(event)] = Json::Value();
}

std::vector<Scenario> Scenarios() {
    const Json::Value none(Json::objectValue);
    std::vector<Scenario> scenarios = CommonScenarios(Json::Value(Json::arrayValue));
    scenarios.push_back({"three-domains", none, Member(), FromJson(R"(["LAB", "EAST", "WEST"])"), {}});
    scenarios.push_back({"gap-among-domains", none, Member(), FromJson(R"(["LAB", null, "WEST"])"), {}});
    scenarios.back().before.domains = {"LAB", fake::OptionalText(), "WEST"};
    scenarios.push_back({"no-domains", none, Member(), Json::Value(Json::arrayValue), {}});
    scenarios.back().before.domains.clear();
    return scenarios;
}

// ---- Version 2: data is {"trusted": which of the two, "domains": rows, "units": rows} ----

void KindIsAsAnswered(Outcome& outcome, const Event& event) {
    outcome.data["trusted"] = event.Result() != 0;
}

void RowIsPassedOver(Outcome& outcome, const Event& event) {
    if (outcome.data["trusted"].asBool()) {
        outcome.data["domains"][IndexOf(event)] = Json::Value();
    } else {
        outcome.data["units"][IndexOf(event) + 1] = Json::Value();  // behind the row of the workgroup
    }
}

void DnsNameIsEmpty(Outcome& outcome, const Event& event) {
    for (Json::Value& row : outcome.data["domains"]) {
        if (row.isArray() && Quoted(row[0].asString()) == event.call.arguments.at(0)) {
            row[2] = "";
        }
    }
}

std::vector<Rule> RulesV2() {
    std::vector<Rule> rules = CommonRules();
    rules.push_back({"VORNWinIsEnableTrustDomain", "", "", When::kAny, Edits(KindIsAsAnswered)});
    rules.push_back({"VLIBCSzListGet", "", "", When::kFails, Edits(RowIsPassedOver)});
    rules.push_back({"VORNWinsGetDomainFQDN", "", "", When::kNegative, Edits(DnsNameIsEmpty)});
    rules.push_back({"VORNWinsEnumOU", "", "", When::kNegative, Stops(2617)});
    rules.push_back({"VORNWorkgroupGet", "", "", When::kNegative, StopsWithoutCode()});
    return rules;
}

Json::Value ShapeV2(const Json::Value& data) {
    return Present(data["trusted"].asBool() ? data["domains"] : data["units"]);
}

const char* const kAllRows = R"({"trusted": true,
    "domains": [["LAB", "LAB", "lab.test"], ["EAST", "EAST", "east.test"], ["WEST", "WEST", "west.test"]],
    "units": [["--", "", "LAB"], ["Sales", "ou=sales", "ou=sales"], ["Staff", "ou=staff", "ou=staff"]]})";

std::vector<Scenario> ScenariosV2() {
    const Json::Value none(Json::objectValue);
    std::vector<Scenario> scenarios = CommonScenarios(FromJson(R"({"trusted": true, "domains": [], "units": []})"));
    scenarios.push_back({"trust-on", none, Member(), FromJson(kAllRows), {}});
    scenarios.push_back({"trust-on-gap", none, Member(), FromJson(kAllRows), {}});
    scenarios.back().before.domains = {"LAB", fake::OptionalText(), "WEST"};
    scenarios.back().data["domains"][1] = Json::Value();
    scenarios.push_back({"trust-off", none, Member(), FromJson(kAllRows), {}});
    scenarios.back().before.trustSetting = 0;
    scenarios.back().data["trusted"] = false;
    scenarios.push_back({"trust-off-gap", none, Member(), FromJson(kAllRows), {}});
    scenarios.back().before.trustSetting = 0;
    scenarios.back().before.unitValues = {fake::OptionalText(), "ou=staff"};
    scenarios.back().data["trusted"] = false;
    scenarios.back().data["units"][1] = Json::Value();
    return scenarios;
}

}  // namespace

Operation DomainGetDomainListOperation() {
    Operation operation = MakeOperation("DomainGetDomainList", DomainGetDomainList);
    operation.rules = CommonRules();
    operation.rules.push_back({"VLIBCSzListGet", "", "", When::kFails, Edits(NameIsPassedOver)});
    operation.scenarios = Scenarios();
    operation.shape = Present;
    return operation;
}

Operation DomainGetDomainListV2Operation() {
    Operation operation = MakeOperation("DomainGetDomainList_V2", DomainGetDomainList_V2);
    operation.rules = RulesV2();
    operation.scenarios = ScenariosV2();
    operation.shape = ShapeV2;
    return operation;
}

}  // namespace sweep
