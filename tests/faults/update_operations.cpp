// "update_start", "update_status" and "update_stop".

#include "src/api_table.h"
#include "tests/faults/appliances.h"
#include "tests/faults/operations.h"
#include "tests/faults/run.h"

namespace sweep {

namespace {

fake::BackgroundTask Task(const std::string& id, const char* record) {
    return {id, "admin", "DomainUpdate", FromJson(record), false};
}

const char* const kRunning = R"({"finish": false, "success": true, "data": {"status": "updating"}})";
const char* const kFinished = R"({"finish": true, "success": true, "data": {"status": "finish"}})";
const char* const kFailed = R"({"finish": true, "success": false, "error": {"code": 2623, "errors": null}})";

// The framework's answer to a task that could be started.
Json::Value Started(const char* id) {
    Json::Value answer;
    answer["task_id"] = id;
    return answer;
}

// ---- "update_start" ----

void TasksCannotBeListed(Outcome& outcome, const Event& /*event*/) {
    outcome.earlier.push_back({false, 117, Json::Value()});
}

void ErrorWasNotAnswered(Outcome& outcome, const Event& /*event*/) {
    outcome.earlier.clear();
}

void FrameworkRefuses(Outcome& outcome, const Event& event) {
    outcome.ending = fake::Answer{false, event.scenario.before.pollingError, Json::Value()};
}

std::vector<Rule> StartRules() {
    return {
        {"VLIBCSupportGet", "", "", When::kZero, Stops(2625), GoesOn()},
        {"VORN::APIPolling::List", "", "", When::kFails, Edits(TasksCannotBeListed)},
        {"VORN::APIResponse::SetError", "(117, ", "", When::kThrows, Edits(ErrorWasNotAnswered)},
        {"VORN::APIPolling::Status", "", "", When::kFails, Stops(2626)},
        {"VLIBCFileTouch", "", "", When::kNegative, StopsWithoutCode()},
        {"VLIBCReadPidFile", "", "", When::kAny, Ignored()},
        {"VORN::APIPolling::Start", "", "", When::kFails, Edits(FrameworkRefuses)},
    };
}

std::vector<Scenario> StartScenarios() {
    const Json::Value none(Json::objectValue);
    std::vector<Scenario> scenarios;
    scenarios.push_back({"worker", none, Member(), Started("DomainUpdate1"), {}});
    scenarios.push_back(
        {"named-domain", FromJson(R"({"domain_name": "EAST"})"), Member(), Started("DomainUpdate1"), {}});
    scenarios.push_back({"monitor-users", none, Member(), Started("DomainUpdate1"), {}});
    scenarios.back().before.pidFiles = {{kUserPid, 77}};
    scenarios.push_back({"monitor-groups", none, Member(), Started("DomainUpdate1"), {}});
    scenarios.back().before.pidFiles = {{kGroupPid, 0}};
    scenarios.push_back({"after-finished", none, Member(), Started("DomainUpdate3"), {}});
    scenarios.back().before.tasks = {Task("DomainUpdate1", kFinished), Task("DomainUpdate2", kFailed)};
    // A task that could not be found lets another one start.
    scenarios.push_back({"running",
                         none,
                         Member(),
                         Started("DomainUpdate3"),
                         {{"VORN::APIPolling::Status", "Update2\"", Stops(2626)}}});
    scenarios.back().before.tasks = {Task("DomainUpdate1", kFinished), Task("DomainUpdate2", kRunning)};
    scenarios.push_back(
        {"unsupported", none, Member(), Started("DomainUpdate1"), {{"VLIBCSupportGet", "", Stops(2625)}}});
    scenarios.back().before.supports.clear();
    scenarios.push_back({"refused",
                         FromJson(R"({"domain_name": 5})"),
                         Member(),
                         {},
                         {{"VORN::APIRequest::GetParam", "", Stops(2618)}}});
    return scenarios;
}

// The marker is there from the touch on, whatever follows; the task removes it.
void CheckMarkerOfStart(const Run& run, Findings& findings) {
    const std::optional<std::size_t> touch = run.FirstOf("VLIBCFileTouch");
    if (run.After().Exists(kMarker) != (touch && run.Worked(*touch))) {
        findings.Add("marker", touch ? "removed or never made" : "made too early");
    }
}

// The monitor runs when either fetch has a live process, which pid 0 is as well.
void CheckBody(const Run& run, Findings& findings) {
    bool live = false;
    for (const std::size_t place : run.PlacesOf("VLIBCReadPidFile")) {
        const bool users = run.Calls()[place].Text().find(kUserPid) != std::string::npos;
        const auto found = run.Before().pidFiles.find(users ? kUserPid : kGroupPid);
        const fake::Fault* fault = run.FaultAt(place);
        const int pid = found == run.Before().pidFiles.end() ? -1 : found->second;
        live = live || (fault != nullptr ? fault->result : pid) >= 0;
    }
    const VORN::APITaskFunction expected = live ? DomainMonitorUpdating : DomainUpdateStartFork;
    if (run.After().startedTasks != 0 && run.After().startedBody != expected) {
        findings.Add("task body", live ? "not the monitor" : "not the worker");
    }
}

// ---- "update_status" ----

void StatusCannotBeRead(Outcome& outcome, const Event& event) {
    outcome.ending = fake::Answer{false, 117, event.scenario.before.pollingError};
}

Effect TaskHasFailed(int code, const char* errors) {
    const Json::Value value = FromJson(errors);
    return Edits([code, value](Outcome& outcome, const Event&) { outcome.ending = fake::Answer{false, code, value}; });
}

std::vector<Scenario> StatusScenarios() {
    const Json::Value id = FromJson(R"({"task_id": "DomainUpdate1"})");
    const Json::Value none(Json::objectValue);
    const char* const status = "VORN::APIPolling::Status";
    std::vector<Scenario> scenarios;
    const auto add = [&](const char* name, const char* record, const Json::Value& data, std::vector<Natural> naturals) {
        scenarios.push_back({name, id, Member(), data, std::move(naturals)});
        scenarios.back().before.tasks = {Task("DomainUpdate1", record)};
    };
    add("running", kRunning, FromJson(R"({"status": "updating"})"), {});
    add("finished", kFinished, FromJson(R"({"status": "finish"})"), {});
    add("failed", kFailed, {}, {{status, "", TaskHasFailed(2623, "null")}});
    add("failed-with-errors", R"({"success": false, "error": {"code": 5, "errors": {"a": [1]}}})", {},
        {{status, "", TaskHasFailed(5, R"({"a": [1]})")}});
    add("bad-code", R"({"success": false, "error": {"code": "x"}})", {}, {{status, "", ThrowsLater()}});
    scenarios.push_back({"unknown", id, Member(), {}, {{status, "", Edits(StatusCannotBeRead)}}});
    scenarios.push_back({"no-id", none, Member(), {}, {{"VORN::APIRequest::HasParam", "", Stops(2618)}}});
    scenarios.push_back(
        {"wrong-id", FromJson(R"({"task_id": 1})"), Member(), {}, {{"VORN::APIRequest::GetParam", "", Stops(2618)}}});
    return scenarios;
}

// ---- "update_stop" ----

std::vector<Scenario> StopScenarios() {
    const Json::Value none(Json::objectValue);
    std::vector<Scenario> scenarios;
    scenarios.push_back({"no-tasks", none, Member(), Json::Value(), {}});
    scenarios.push_back({"two-tasks", none, Member(), Json::Value(), {}});
    scenarios.back().before.tasks = {Task("DomainUpdate1", kRunning), Task("DomainUpdate2", kFinished)};
    scenarios.push_back({"odd-list", none, Member(), Json::Value(), {}});
    scenarios.back().before.tasks = {Task("DomainUpdate1", kRunning)};
    scenarios.back().before.taskList = FromJson(R"({"a": "x", "admin": [1, "DomainUpdate1", "gone"], "z": null})");
    return scenarios;
}

void ListFails(Outcome& outcome, const Event& /*event*/) {
    outcome.ending = fake::Answer{false, 117, Json::Value()};
}

// The marker of a task that still runs is not this operation's.
void CheckNothingRemoved(const Run& run, Findings& findings) {
    if (run.After().files != run.Before().files) {
        findings.Add("marker", "a file was made or removed");
    }
}

}  // namespace

Operation DomainUpdateStartOperation() {
    Operation operation = MakeOperation("DomainUpdateStart", DomainUpdateStart);
    operation.answering = Answering::kHandsOn;
    operation.rules = StartRules();
    operation.scenarios = StartScenarios();
    operation.oracles = {CheckMarkerOfStart, CheckBody};
    return operation;
}

Operation DomainUpdateStatusOperation() {
    Operation operation = MakeOperation("DomainUpdateStatus", DomainUpdateStatus);
    operation.rules = {{"VORN::APIPolling::Status", "", "", When::kFails, Edits(StatusCannotBeRead)}};
    operation.scenarios = StatusScenarios();
    operation.oracles = {CheckNothingRemoved};
    return operation;
}

Operation DomainUpdateStopOperation() {
    Operation operation = MakeOperation("DomainUpdateStop", DomainUpdateStop);
    operation.rules = {
        {"VORN::APIPolling::List", "", "", When::kFails, Edits(ListFails)},
        {"VORN::APIPolling::Stop", "", "", When::kFails, Ignored()},
    };
    operation.scenarios = StopScenarios();
    operation.oracles = {CheckNothingRemoved};
    return operation;
}

}  // namespace sweep
