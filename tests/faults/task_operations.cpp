// The bodies of the background tasks: the worker and the monitor.

#include "src/api_table.h"
#include "tests/faults/appliances.h"
#include "tests/faults/operations.h"
#include "tests/faults/run.h"

namespace sweep {

namespace {

Json::Value Finish() {
    return FromJson(R"({"status": "finish"})");
}

void NothingWasPublished(Outcome& outcome, const Event& /*event*/) {
    outcome.earlier.clear();
}

fake::State Updating(fake::State state) {
    state.files.insert(kMarker);
    return state;
}

std::vector<Rule> WorkerRules() {
    return {
        {"VORN::APIResponse::SetSuccess", "updating", "", When::kThrows, Edits(NothingWasPublished)},
        {"VORNWinIsEnableTrustDomain", "", "", When::kAny, Ignored()},
        {"VORNWinUpdateAllDomains", "", "", When::kNegative, Stops(2623)},
        {"VORNWinUpdateOU", "", "", When::kNegative, Stops(2623)},
        {"VLIBCSzListAlloc", "", "", When::kFails, Stops(2623)},
        {"VORNWinsIsOwnDomain", "", "", When::kZero, Stops(2623), GoesOn()},
        {"VLIBCSzListPush", "", "", When::kNegative, Stops(2623)},
        {"VORNWinsEnumAllDomains", "", "", When::kNegative, Stops(2623)},
        {"VLIBCReadPidFile", "", "", When::kAny, Ignored()},
        {"system", "", "", When::kAny, Ignored()},
        {"VORNWinGetDomainUGByDomain", "", "", When::kNotZero, Stops(2623)},
        {"VLIBCSysRemove", "", "", When::kAny, Ignored()},
    };
}

std::vector<Scenario> WorkerScenarios() {
    const Json::Value none(Json::objectValue);
    const Json::Value own = FromJson(R"({"domain_name": "LAB"})");
    const Json::Value foreign = FromJson(R"({"domain_name": "EAST"})");
    const Natural refusal = {"VORNWinsIsOwnDomain", "", Stops(2623)};
    const fake::State trusting = Updating(Member());
    fake::State alone = trusting;
    alone.trustSetting = 0;

    std::vector<Scenario> scenarios;
    scenarios.push_back({"all-trust-on", none, trusting, Finish(), {}});
    scenarios.push_back({"all-trust-off", none, alone, Finish(), {}});
    scenarios.push_back({"all-by-name", FromJson(R"({"domain_name": "@all"})"), trusting, Finish(), {}});
    scenarios.push_back({"all-by-empty-name", FromJson(R"({"domain_name": ""})"), alone, Finish(), {}});
    scenarios.push_back({"own-trust-on", own, trusting, Finish(), {}});
    scenarios.push_back({"own-trust-off", own, alone, Finish(), {}});
    scenarios.push_back({"foreign-trust-on", foreign, trusting, Finish(), {refusal}});
    scenarios.push_back({"foreign-trust-off", foreign, alone, Finish(), {refusal}});
    scenarios.push_back({"users-live", none, trusting, Finish(), {}});
    scenarios.back().before.pidFiles = {{kUserPid, 77}};
    scenarios.push_back({"groups-live-own", own, alone, Finish(), {}});
    scenarios.back().before.pidFiles = {{kGroupPid, 0}};
    scenarios.push_back({"both-live", none, alone, Finish(), {}});
    scenarios.back().before.pidFiles = {{kUserPid, 77}, {kGroupPid, 78}};
    scenarios.push_back({"bad-name",
                         FromJson(R"({"domain_name": {}})"),
                         trusting,
                         Finish(),
                         {{"VORN::APIRequest::GetParam", "", ThrowsLater()}}});
    return scenarios;
}

// The task's end removes the marker, also by an exception. Only the answer of a failure may follow.
void CheckMarkerIsGone(const Run& run, Findings& findings) {
    const std::vector<std::size_t> removals = run.PlacesOf("VLIBCSysRemove", kMarker);
    if (removals.size() != 1) {
        findings.Add("marker", "removed " + std::to_string(removals.size()) + " times");
        return;
    }
    if (run.After().Exists(kMarker) && run.Worked(removals.front())) {
        findings.Add("marker", "still there");
    }
    for (std::size_t place = removals.front() + 1; place < run.Calls().size(); ++place) {
        if (run.Calls()[place].function != "VORN::APIResponse::SetError") {
            findings.Add("marker", "removed ahead of " + run.Calls()[place].Text());
        }
    }
}

bool NamesLiveProcess(const Run& run, std::size_t place) {
    const fake::Fault* fault = run.FaultAt(place);
    if (fault != nullptr) {
        return fault->result >= 0;
    }
    const bool users = run.Calls()[place].Text().find(kUserPid) != std::string::npos;
    const auto found = run.Before().pidFiles.find(users ? kUserPid : kGroupPid);
    return found != run.Before().pidFiles.end() && found->second >= 0;
}

// A kind is deleted and fetched unless the appliance fetches it already; one domain is fetched without deleting.
void CheckFetches(const Run& run, Findings& findings) {
    const std::string name = run.scenario.parameters["domain_name"].isString()
                                 ? run.scenario.parameters["domain_name"].asString()
                                 : std::string();
    const bool all = name.empty() || name == "@all";
    for (const bool users : {true, false}) {
        const std::optional<std::size_t> look = run.FirstOf("VLIBCReadPidFile", users ? kUserPid : kGroupPid);
        const bool fetches = look && !NamesLiveProcess(run, *look);
        if (run.Called("VORNWinGetDomainUGByDomain", users ? "(0, " : "(1, ") != fetches) {
            findings.Add("fetches", fetches ? "not fetched" : "fetched");
        }
        if (run.Called("system", users ? "/domain_user*" : "/domain_group*") != (fetches && all)) {
            findings.Add("fetches", fetches && all ? "not deleted" : "deleted");
        }
    }
}

// Pauses are of 3 seconds, one ahead of each look, and the last look finds no process.
void CheckPauses(const Run& run, Findings& findings) {
    const std::size_t looks = run.PlacesOf("VLIBCReadPidFile", kUserPid).size();
    if (!run.thrown && (run.PlacesOf("sleep", "(3)").size() != looks || looks == 0)) {
        findings.Add("pauses", "not one for each look");
    }
    const std::vector<std::size_t> all = run.PlacesOf("VLIBCReadPidFile");
    if (!run.thrown && (all.empty() || NamesLiveProcess(run, all.back()))) {
        findings.Add("pauses", "ended too early");
    }
}

}  // namespace

Operation DomainUpdateStartForkOperation() {
    Operation operation;
    operation.name = "DomainUpdateStartFork";
    operation.body = [](VORN::APIRequest* request, VORN::APIResponse* response) {
        DomainUpdateStartFork(request, response, nullptr);
    };
    operation.functions = FunctionsOf(operation.name);
    operation.answering = Answering::kProgress;
    operation.rules = WorkerRules();
    operation.scenarios = WorkerScenarios();
    operation.oracles = {CheckMarkerIsGone, CheckFetches};
    return operation;
}

Operation DomainMonitorUpdatingOperation() {
    Operation operation;
    operation.name = "DomainMonitorUpdating";
    operation.body = [](VORN::APIRequest* request, VORN::APIResponse* response) {
        DomainMonitorUpdating(request, response, nullptr);
    };
    operation.functions = FunctionsOf(operation.name);
    operation.answering = Answering::kProgress;
    operation.rules = {
        {"VORN::APIResponse::SetSuccess", "updating", "", When::kThrows, Edits(NothingWasPublished)},
        {"sleep", "", "", When::kAny, Ignored()},
        {"VLIBCReadPidFile", "", "", When::kAny, Ignored()},
        {"VLIBCSysRemove", "", "", When::kAny, Ignored()},
    };
    operation.scenarios = {{"no-fetch", Json::Value(Json::objectValue), Updating(Member()), Finish(), {}}};
    operation.oracles = {CheckMarkerIsGone, CheckPauses};
    // The monitor waits as long as a fetch runs, and there is no limit.
    operation.endless = [](const std::string& function, const fake::Fault& fault) {
        return function == "VLIBCReadPidFile" && fault.result >= 0;
    };
    return operation;
}

}  // namespace sweep
