// "get" and "set" of the five options.

#include "src/api_table.h"
#include "tests/faults/appliances.h"
#include "tests/faults/operations.h"
#include "tests/faults/run.h"

namespace sweep {

namespace {

const char* const kDefaults = R"({"enable_sync_time": false, "enable_server_signing": false,
    "enable_rpc_enum_usergroup": false, "domain_nested_group": 1, "disable_domain_admins": false})";
const char* const kAllOn = R"({"enable_sync_time": true, "enable_server_signing": true,
    "enable_rpc_enum_usergroup": true, "domain_nested_group": 5, "disable_domain_admins": true})";

fake::State WithAllOn(fake::State state) {
    fake::SetKey(Global(state, kSmbConf), "vorn sync dctime", "yes");
    Global(state, kSmbInfo) = {{"server signing", "yes"},
                               {"enable nt4 enum", "yes"},
                               {"disable domain admins", "yes"},
                               {"winbind expand groups", "5"}};
    return state;
}

fake::State WithAllOff(fake::State state) {
    Global(state, kSmbInfo) = {{"advanced_domain_option", "no"}};
    return state;
}

// ---- "get" ----

Effect OptionIsDefault(const char* key) {
    const Json::Value value = FromJson(kDefaults)[key];
    return Edits([key, value](Outcome& outcome, const Event&) { outcome.data[key] = value; });
}

void StoredOptionsAreDefaults(Outcome& outcome, const Event& /*event*/) {
    const Json::Value sync = outcome.data["enable_sync_time"];
    outcome.data = FromJson(kDefaults);
    outcome.data["enable_sync_time"] = sync;
}

std::vector<Rule> GetRules() {
    return {
        {"VLIBCFileGetKeyValue", "", "", When::kZeroOrLess, OptionIsDefault("enable_sync_time")},
        {"VLIBCSzHashAlloc", "", "", When::kFails, Stops(2617)},
        {"VLIBCFileGetSection", "", "", When::kNegative, Edits(StoredOptionsAreDefaults)},
        {"VLIBCSzHashGetValue", "\"server signing\"", "", When::kFails, OptionIsDefault("enable_server_signing")},
        {"VLIBCSzHashGetValue", "\"enable nt4 enum\"", "", When::kFails, OptionIsDefault("enable_rpc_enum_usergroup")},
        {"VLIBCSzHashGetValue", "\"disable domain admins\"", "", When::kFails,
         OptionIsDefault("disable_domain_admins")},
        {"VLIBCSzHashGetValue", "\"winbind expand groups\"", "", When::kFails, OptionIsDefault("domain_nested_group")},
    };
}

std::vector<Scenario> GetScenarios() {
    const Json::Value none(Json::objectValue);
    std::vector<Scenario> scenarios;
    scenarios.push_back({"all-on", none, WithAllOn(Member()), FromJson(kAllOn), {}});
    scenarios.push_back({"all-off", none, WithAllOff(Member()), FromJson(kDefaults), {}});
    scenarios.push_back({"no-files", none, fake::State(), FromJson(kDefaults), {}});
    return scenarios;
}

// ---- "set" ----

std::vector<Rule> SetRules() {
    return {
        {"VLIBCFileGetKeyValue", "", "", When::kAny, Ignored()},
        {"VORNWinsSetSectionKey", "", "", When::kNegative, Stops(2617)},
        {"VLIBCSzHashAlloc", "", "", When::kFails, Stops(2617)},
        {"VLIBCFileGetSection", "", "", When::kAny, Ignored()},
        {"VLIBCSzHashGetValue", "", "", When::kAny, Ignored()},
        {"VLIBCSzHashSetValue", "", "", When::kAny, Ignored()},
        {"VLIBCSzHashRemoveKey", "", "", When::kAny, Ignored()},
        {"VORNWinsIsJoined", "", "", When::kAny, Ignored()},
        {"VLIBCFileExist", "", "", When::kAny, Ignored()},
        {"VLIBCSysRemove", "", "", When::kAny, Ignored()},
        {"VLIBCFileAddSection", "", "", When::kZero, Stops(2617)},
        {"VLIBCSysRename", "", "", When::kNotZero, Stops(2617)},
        {"VORNGroupAddDomainAdminGroup", "", "", When::kAny, Ignored()},
        {"VLIBServiceTypeReload", "", "", When::kAny, Ignored()},
        {"VLIBServiceReload", "", "", When::kAny, Ignored()},
    };
}

std::vector<Scenario> SetScenarios() {
    std::vector<Scenario> scenarios;
    const auto add = [&](const char* name, const fake::State& before, const char* parameters) {
        scenarios.push_back({name, FromJson(parameters), before, Json::Value(), {}});
    };
    const fake::State on = WithAllOn(Member());
    const fake::State off = WithAllOff(Member());

    add("nothing", off, "{}");
    add("sync-on", off, R"({"enable_sync_time": true})");
    add("sync-off", on, R"({"enable_sync_time": false})");
    add("sync-kept", on, R"({"enable_sync_time": true})");
    add("signing-on", off, R"({"enable_server_signing": true})");
    add("signing-off", on, R"({"enable_server_signing": false})");
    add("signing-kept", on, R"({"enable_server_signing": true})");
    add("enum-on", off, R"({"enable_rpc_enum_usergroup": true})");
    add("enum-off", on, R"({"enable_rpc_enum_usergroup": false})");
    add("groups-new", off, R"({"domain_nested_group": 150})");
    add("groups-kept", on, R"({"domain_nested_group": 5})");
    add("admins-on", off, R"({"disable_domain_admins": true})");
    add("admins-off", on, R"({"disable_domain_admins": false})");
    add("admins-kept", on, R"({"disable_domain_admins": true})");
    add("admins-on-workgroup", WithAllOff(Workgroup()), R"({"disable_domain_admins": true})");
    add("all-on", off, kAllOn);
    add("all-off", on, kDefaults);
    add("all-kept", on, kAllOn);

    fake::State leftOver = off;
    Global(leftOver, "/usr/vorn/etc/smbinfo.conf.tmp") = {{"stale", "yes"}};
    add("left-over-file", leftOver, R"({"enable_server_signing": true, "disable_domain_admins": true})");
    add("no-files", fake::State(), kAllOn);

    add("wrong-first", off, R"({"enable_sync_time": "yes"})");
    scenarios.back().naturals = {{"VORN::APIRequest::GetParam", "\"enable_sync_time\"", Stops(2618)}};
    add("wrong-last", off, R"({"enable_server_signing": true, "domain_nested_group": "5"})");
    scenarios.back().naturals = {{"VORN::APIRequest::GetParam", "\"domain_nested_group\"", Stops(2618)}};
    return scenarios;
}

// The file services are reloaded after everything was written, all three in their order, and never after a failure.
void CheckReloads(const Run& run, Findings& findings) {
    std::vector<std::string> reloaded;
    for (const std::size_t place : run.PlacesOf("VLIBServiceReload")) {
        reloaded.push_back(run.Calls()[place].arguments.at(0));
    }
    const bool renamed = run.Called("VLIBCSysRename");
    const bool succeeded = !run.Answers().empty() && run.Answers().back().success;
    const bool failed = !run.Answers().empty() && !succeeded;
    const std::vector<std::string> all = {"\"samba\"", "\"nmbd\"", "\"winbindd\""};
    if (failed && !reloaded.empty()) {
        findings.Add("reloads", "after a failure");
    }
    if (succeeded && reloaded != (renamed ? all : std::vector<std::string>())) {
        findings.Add("reloads", renamed ? "not the three services" : "nothing changed");
    }
}

// The administrators' group is added after the file was written, when the switch changed on a member.
void CheckAdministrators(const Run& run, Findings& findings) {
    const bool changed = run.Called("VLIBCSzHashSetValue", "\"disable domain admins\"") ||
                         run.Called("VLIBCSzHashRemoveKey", "\"disable domain admins\"");
    const std::optional<std::size_t> asked = run.FirstOf("VORNWinsIsJoined");
    const fake::Fault* fault = asked ? run.FaultAt(*asked) : nullptr;
    const bool joined = (fault != nullptr ? fault->result : run.Before().joinedFlag) != 0;
    const bool expected = changed && joined && run.Called("VLIBCSysRename");
    if (run.Called("VORNGroupAddDomainAdminGroup") != expected ||
        run.Called("VLIBServiceTypeReload", "(8)") != expected) {
        findings.Add("administrators", expected ? "not added" : "added");
    }
}

// Until the rename the file is as it was.
void CheckFile(const Run& run, Findings& findings) {
    const auto before = run.Before().keyValueFiles.find(kSmbInfo);
    const auto after = run.After().keyValueFiles.find(kSmbInfo);
    const bool existed = before != run.Before().keyValueFiles.end();
    const bool exists = after != run.After().keyValueFiles.end();
    const std::optional<std::size_t> rename = run.FirstOf("VLIBCSysRename");
    const bool same = existed == exists && (!exists || before->second == after->second);
    if ((!rename || run.Failed(*rename)) && !same) {
        findings.Add("options file", "changed without a rename");
    }
}

}  // namespace

Operation DomainGetOptionOperation() {
    Operation operation = MakeOperation("DomainGetOption", DomainGetOption);
    operation.rules = GetRules();
    operation.scenarios = GetScenarios();
    return operation;
}

Operation DomainSetOptionOperation() {
    Operation operation = MakeOperation("DomainSetOption", DomainSetOption);
    operation.rules = SetRules();
    operation.scenarios = SetScenarios();
    operation.oracles = {CheckReloads, CheckAdministrators, CheckFile};
    return operation;
}

}  // namespace sweep
