// "get" and "set" of the schedule.

#include "src/api_table.h"
#include "tests/faults/appliances.h"
#include "tests/faults/operations.h"
#include "tests/faults/run.h"

namespace sweep {

namespace {

constexpr const char* kCommand = "/usr/vorn/sbin/vornwin -updateDomain";

// The schedules of the tasks that a scenario has, the one with id 0 first.
const char* const kOther = R"({"date_type": 0, "week_name": "1", "hour": 1, "min": 2})";
const char* const kFirst = R"({"date_type": 0, "week_name": "0,6", "hour": 3, "min": 30})";
const char* const kSecond = R"({"date_type": 1, "date": "2026/11/29", "hour": 4, "min": 5})";

fake::State WithTasks(fake::State state) {
    state.scheduledTasks = {{0, "/bin/other", true, FromJson(kOther)},
                            {5, kCommand, false, FromJson(kFirst)},
                            {7, kCommand, false, FromJson(kSecond)}};
    return state;
}

fake::State WithOneTask(fake::State state) {
    state = WithTasks(std::move(state));
    state.scheduledTasks.pop_back();
    return state;
}

fake::State WithoutTask(fake::State state) {
    state = WithTasks(std::move(state));
    state.scheduledTasks.resize(1);
    return state;
}

// ---- "get": data is the schedule of each task, null where the task is another's ----

Json::Value FirstSchedule(const Json::Value& data) {
    for (const Json::Value& schedule : data) {
        if (!schedule.isNull()) {
            return schedule;
        }
    }
    return FromJson(R"({"date_type": 2})");
}

void NoSchedule(Outcome& outcome, const Event& /*event*/) {
    outcome.data = Json::Value(Json::arrayValue);
}

void TaskIsNotRecognised(Outcome& outcome, const Event& event) {
    outcome.data[static_cast<Json::ArrayIndex>(event.nth - 1)] = Json::Value();
}

void OtherTaskIsMeant(Outcome& outcome, const Event& event) {
    outcome.data = Json::Value(Json::arrayValue);
    if (event.Result() == 0) {
        outcome.data.append(FromJson(kOther));
    }
}

std::vector<Rule> GetRules() {
    return {
        {"VORNSchedTaskAlloc", "", "", When::kFails, Edits(NoSchedule)},
        {"VORNSchedTaskListGet", "", "", When::kNegative, Edits(NoSchedule)},
        {"VORNSchedCTaskGetCommand", "", "", When::kNegative, Edits(TaskIsNotRecognised)},
        {"VORNSchedTaskGetID", "", "", When::kAny, Edits(OtherTaskIsMeant)},
        {"VORNSchedTaskLoad", "", "", When::kNegative, Edits(NoSchedule)},
        {"VORNSchedTaskConvertToJson_Schedule", "", "", When::kFails, Edits(NoSchedule)},
    };
}

std::vector<Scenario> GetScenarios() {
    const Json::Value none(Json::objectValue);
    const Json::Value null;
    std::vector<Scenario> scenarios;
    const auto add = [&](const char* name, const fake::State& before, const std::vector<const char*>& schedules) {
        Json::Value data(Json::arrayValue);
        for (const char* schedule : schedules) {
            data.append(FromJson(schedule));
        }
        scenarios.push_back({name, none, before, data, {}});
    };
    add("no-task", WithoutTask(Member()), {"null"});
    add("one-task", WithOneTask(Member()), {"null", kFirst});
    add("two-tasks", WithTasks(Member()), {"null", kFirst, kSecond});
    add("workgroup", WithOneTask(Workgroup()), {"null", kFirst});
    add("nothing-at-all", fake::State(), {});
    return scenarios;
}

// ---- "set" ----

// The task is removed, and that it could be removed is the failure.
void IsNoMember(Outcome& outcome, const Event& /*event*/) {
    outcome.Record(2624);
    outcome.failing = true;
}

// Turns the failure of one that is no member into success; a member that removes its schedule does not look.
void TaskStays(Outcome& outcome, const Event& /*event*/) {
    outcome.Record(2617);
    outcome.failing = false;
}

std::vector<Rule> SetRules() {
    return {
        {"VORNWinsIsJoined", "", "", When::kZero, Edits(IsNoMember), GoesOn()},
        {"VORNSchedTaskAlloc", "", "", When::kFails, Stops(2617)},
        {"VORNSchedTaskListGet", "", "VORNSchedTaskAlloc", When::kNegative, Stops(2617)},
        {"VORNSchedTaskListGet", "", "", When::kNegative, Records(2617)},
        {"VORNSchedCTaskGetCommand", "", "", When::kAny, Ignored()},
        {"VORNSchedTaskGetID", "", "", When::kAny, Ignored()},
        {"VORNSchedTaskLoad", "", "", When::kNegative, Stops(2617)},
        {"VORNSchedTaskConvertFromJson_Schedule", "", "", When::kFails, Stops(2617)},
        {"VORNSchedCTaskSetCommand", "", "", When::kNotZero, Stops(2617)},
        {"VORNSchedTaskSave", "", "", When::kNegative, Stops(2617)},
        {"VORNSchedTaskRemove", "", "", When::kNegative, Edits(TaskStays)},
    };
}

const char* const kWeekdays = R"({"date_type": 0, "week_name": "0,6", "hour": 3, "min": 30, "repeat_hour": 0,
                                  "last_work_hour": 3})";
const char* const kFromDate = R"({"date_type": 1, "date": "2026/11/29", "repeat": 0, "hour": 4, "min": 5})";
const char* const kNever = R"({"date_type": 2})";

std::vector<Scenario> SetScenarios() {
    const std::vector<Natural> noMember = {{"VORNWinsIsJoined", "", Edits(IsNoMember)}};
    std::vector<Scenario> scenarios;
    const auto add = [&](const char* name, const char* parameters, const fake::State& before,
                         const std::vector<Natural>& naturals = {}) {
        scenarios.push_back({name, FromJson(parameters), before, Json::Value(), naturals});
    };
    add("weekdays-new", kWeekdays, WithoutTask(Member()));
    add("weekdays-replaced", kWeekdays, WithOneTask(Member()));
    add("date-new", kFromDate, WithoutTask(Member()));
    add("date-of-two", kFromDate, WithTasks(Member()));
    add("first-task-ever", kFromDate, Member());
    add("never-none", kNever, WithoutTask(Member()));
    add("never-one", kNever, WithOneTask(Member()));
    add("never-of-two", kNever, WithTasks(Member()));
    add("never-odd-date", R"({"date_type": 2, "date": {}})", WithOneTask(Member()),
        {{"VORN::APIRequest::GetParam", "\"date\"", ThrowsLater()}});
    add("workgroup-weekdays", kWeekdays, WithOneTask(Workgroup()), noMember);
    add("workgroup-never", kNever, WithTasks(Workgroup()), noMember);
    add("workgroup-none", kFromDate, WithoutTask(Workgroup()), noMember);
    add("impossible-hour", R"({"date_type": 1, "date": "2026/11/29", "repeat": 0, "hour": 99, "min": 5})",
        WithOneTask(Member()), {{"VORNSchedTaskConvertFromJson_Schedule", "", Stops(2617)}});
    add("refused-none", "{}", WithOneTask(Member()), {{"VORN::APIRequest::HasParam", "", Stops(2618)}});
    add("refused-kind", R"({"date_type": 3, "hour": 1, "min": 2})", WithOneTask(Member()),
        {{"VORN::APIRequest::GetParam", "\"min\"", Stops(2618)}});
    add("refused-minute", R"({"date_type": 0, "hour": 1, "min": "2"})", WithOneTask(Member()),
        {{"VORN::APIRequest::GetParam", "\"min\"", Stops(2618)}});
    add("refused-week", R"({"date_type": 0, "hour": 1, "min": 2})", WithOneTask(Member()),
        {{"VORN::APIRequest::HasParam", "\"week_name\"", Stops(2618)}});
    add("refused-repeat-hour", R"({"date_type": 2, "repeat_hour": "0"})", WithOneTask(Member()),
        {{"VORN::APIRequest::GetParam", "\"repeat_hour\"", Stops(2618)}});
    return scenarios;
}

bool SameTasks(const std::vector<fake::ScheduledTask>& left, const std::vector<fake::ScheduledTask>& right) {
    if (left.size() != right.size()) {
        return false;
    }
    for (std::size_t i = 0; i < left.size(); ++i) {
        if (left[i].id != right[i].id || left[i].command != right[i].command || left[i].listable != right[i].listable ||
            left[i].schedule != right[i].schedule) {
            return false;
        }
    }
    return true;
}

// The task is as it was unless it was saved or removed, and then it runs the refresh, hidden, at the asked times.
void CheckTask(const Run& run, Findings& findings) {
    const std::vector<fake::ScheduledTask>& before = run.Before().scheduledTasks;
    const std::vector<fake::ScheduledTask>& after = run.After().scheduledTasks;
    const std::optional<std::size_t> save = run.FirstOf("VORNSchedTaskSave");
    const std::optional<std::size_t> removal = run.FirstOf("VORNSchedTaskRemove");
    const bool saved = save && run.Worked(*save);
    const bool removed = removal && run.Worked(*removal);
    if (!saved && !removed && !SameTasks(before, after)) {
        findings.Add("task", "changed without being saved or removed");
    }
    if (removed && after.size() + 1 != before.size()) {
        findings.Add("task", "not removed");
    }
    const bool failed = !run.Answers().empty() && !run.Answers().back().success;
    if (saved && failed) {
        findings.Add("task", "saved and yet a failure");
    }
    if (!saved) {
        return;
    }
    for (const fake::ScheduledTask& task : after) {
        const Json::Value& schedule = task.schedule;
        const Json::Value& asked = run.scenario.parameters;
        if (task.command == kCommand && !task.listable && schedule.size() == 8 &&
            schedule["date_type"] == asked["date_type"] && schedule["hour"] == asked["hour"] &&
            schedule["min"] == asked["min"] && schedule["repeat_hour"] == 0) {
            return;
        }
    }
    findings.Add("task", "saved with other values");
}

}  // namespace

Operation DomainScheduleGetOperation() {
    Operation operation = MakeOperation("DomainScheduleGet", DomainScheduleGet);
    operation.rules = GetRules();
    operation.scenarios = GetScenarios();
    operation.shape = FirstSchedule;
    operation.oracles = {CheckTask};
    return operation;
}

Operation DomainScheduleSetOperation() {
    Operation operation = MakeOperation("DomainScheduleSet", DomainScheduleSet);
    operation.rules = SetRules();
    operation.scenarios = SetScenarios();
    operation.oracles = {CheckTask};
    return operation;
}

}  // namespace sweep
