// The task scheduler.

#include "platform/scheduler.h"

#include <algorithm>
#include <memory>

#include "tests/double/recording.h"

struct _tag_vorn_sched_task_ {
    fake::ScheduledTask task;
    bool prepared = false;  // loaded, so that it may be saved
};

using fake::HandleKind;
using fake::Named;
using fake::Number;
using fake::Quoted;
using fake::Recording;
using fake::ScheduledTask;
using fake::State;
using fake::TheAppliance;

namespace {

std::vector<ScheduledTask>::iterator FindTask(State& state, int id) {
    return std::find_if(state.scheduledTasks.begin(), state.scheduledTasks.end(),
                        [id](const ScheduledTask& task) { return task.id == id; });
}

int NextId(const State& state) {
    int next = 1;
    for (const ScheduledTask& task : state.scheduledTasks) {
        next = std::max(next, task.id + 1);
    }
    return next;
}

// A record of either kind can be read; only one of VORNSchedTaskAlloc can be changed.
bool Readable(Recording& call, const _tag_vorn_sched_task_* task) {
    return TheAppliance().IsLive(task, HandleKind::kTaskList) || call.Live(task, HandleKind::kTask);
}

bool Possible(const Json::Value& time, int most) {
    return time.isNull() || (time.isInt() && time.asInt() >= 0 && time.asInt() <= most);
}

bool IsSchedule(const Json::Value& schedule) {
    return schedule.isObject() && Possible(schedule["hour"], 23) && Possible(schedule["min"], 59);
}

}  // namespace

int VORNSchedTaskListGet(_tag_vorn_sched_task_** list, VORNSchedTaskFilter filter) {
    Recording call("VORNSchedTaskListGet", {Named(list, "list"), filter == nullptr ? "null" : "filter"});
    if (call.Null(list)) {
        return call.Failure(-1);
    }
    if (*list != nullptr || filter == nullptr) {
        call.Misuse(filter == nullptr ? "null argument" : "the list must be null beforehand");
        return call.Failure(-1);
    }
    if (call.Fails()) {
        return call.Failure(-1);
    }
    // The filter has to bear null, so it gets one each time.
    if (filter(nullptr) != 0) {
        call.Misuse("a filter that takes null for one of its tasks");
    }
    const std::vector<ScheduledTask> tasks = TheAppliance().state.scheduledTasks;
    for (const ScheduledTask& task : tasks) {
        auto record = std::make_unique<_tag_vorn_sched_task_>();
        record->task = task;
        TheAppliance().AddHandle(record.get(), HandleKind::kTaskList, call.Text());
        const bool belongs = filter(record.get()) != 0;
        if (belongs && *list == nullptr) {
            *list = record.release();
        } else {
            TheAppliance().RemoveHandle(record.get());
        }
    }
    return call.Answer(0);
}

void VORNSchedTaskListFree(_tag_vorn_sched_task_** list) {
    Recording call("VORNSchedTaskListFree", {Named(list, "list")});
    if (call.Null(list) || *list == nullptr || !call.Live(*list, HandleKind::kTaskList)) {
        return;
    }
    TheAppliance().RemoveHandle(*list);
    delete *list;
    *list = nullptr;
}

int VORNSchedTaskGetID(const _tag_vorn_sched_task_* task) {
    Recording call("VORNSchedTaskGetID", {Named(task, "task")});
    if (!Readable(call, task) || call.Fails() || task->task.id < 0) {
        return call.Failure(-1);
    }
    return call.Answer(task->task.id);
}

_tag_vorn_sched_task_* VORNSchedTaskAlloc(void) {
    Recording call("VORNSchedTaskAlloc", {});
    if (call.Fails()) {
        return call.FailureNull();
    }
    auto* task = new _tag_vorn_sched_task_;
    TheAppliance().AddHandle(task, HandleKind::kTask, call.Text());
    return task;
}

int VORNSchedTaskLoad(int id, _tag_vorn_sched_task_* task) {
    Recording call("VORNSchedTaskLoad", {Number(id), Named(task, "task")});
    if (!call.Live(task, HandleKind::kTask) || call.Fails()) {
        return call.Failure(-1);
    }
    if (id == -1) {
        task->task = ScheduledTask();
        task->prepared = true;
        return call.Answer(0);
    }
    State& state = TheAppliance().state;
    const auto found = FindTask(state, id);
    if (found == state.scheduledTasks.end()) {
        return call.Failure(-1);
    }
    task->task = *found;
    task->prepared = true;
    return call.Answer(0);
}

int VORNSchedTaskSave(_tag_vorn_sched_task_* task) {
    Recording call("VORNSchedTaskSave", {Named(task, "task")});
    if (!call.Live(task, HandleKind::kTask) || call.Fails()) {
        return call.Failure(-1);
    }
    if (!task->prepared) {
        call.Misuse("the record was never loaded");
        return call.Failure(-1);
    }
    State& state = TheAppliance().state;
    if (task->task.id < 0) {
        task->task.id = NextId(state);
        state.scheduledTasks.push_back(task->task);
        return call.Answer(0);
    }
    const auto found = FindTask(state, task->task.id);
    if (found == state.scheduledTasks.end()) {
        return call.Failure(-1);
    }
    *found = task->task;
    return call.Answer(0);
}

int VORNSchedTaskRemove(int id) {
    Recording call("VORNSchedTaskRemove", {Number(id)});
    State& state = TheAppliance().state;
    const auto found = FindTask(state, id);
    if (call.Fails() || found == state.scheduledTasks.end()) {
        return call.Failure(-1);
    }
    state.scheduledTasks.erase(found);
    return call.Answer(0);
}

void VORNSchedTaskFree(_tag_vorn_sched_task_* task) {
    Recording call("VORNSchedTaskFree", {Named(task, "task")});
    if (task != nullptr && call.Live(task, HandleKind::kTask)) {
        TheAppliance().RemoveHandle(task);
        delete task;
    }
}

int VORNSchedCTaskGetCommand(char* command, int size, const _tag_vorn_sched_task_* task) {
    Recording call("VORNSchedCTaskGetCommand", {fake::SizeText(size), Named(task, "task")});
    if (call.BadBuffer(command, size)) {
        return call.Failure(-1);
    }
    if (!Readable(call, task) || call.Fails()) {
        call.Spoil(command, size);
        return call.Failure(-1);
    }
    call.Fill(command, size, task->task.command);
    return call.Answer(0);
}

int VORNSchedCTaskSetCommand(_tag_vorn_sched_task_* task, const char* command) {
    Recording call("VORNSchedCTaskSetCommand", {Named(task, "task"), Quoted(command)});
    if (!call.Live(task, HandleKind::kTask) || call.Null(command) || call.Fails()) {
        return call.Failure(-1);
    }
    task->task.command = command;
    return call.Answer(0);
}

void VORNSchedCTaskSetListable(_tag_vorn_sched_task_* task, bool listable) {
    Recording call("VORNSchedCTaskSetListable", {Named(task, "task"), fake::Flag(listable)});
    if (call.Live(task, HandleKind::kTask)) {
        task->task.listable = listable;
    }
}

bool VORNSchedTaskConvertFromJson_Schedule(const Json::Value& value, _tag_vorn_sched_task_* task) {
    Recording call("VORNSchedTaskConvertFromJson_Schedule", {fake::Compact(value), Named(task, "task")});
    if (!call.Live(task, HandleKind::kTask) || call.Fails() || !TheAppliance().state.taskScheduleConvertible ||
        !value.isObject() || !IsSchedule(value["schedule"])) {
        return call.FailureFalse();
    }
    task->task.schedule = value["schedule"];
    return true;
}

bool VORNSchedTaskConvertToJson_Schedule(const _tag_vorn_sched_task_* task, Json::Value& value) {
    Recording call("VORNSchedTaskConvertToJson_Schedule", {Named(task, "task"), "value"});
    if (!Readable(call, task) || call.Fails()) {
        return call.FailureFalse();
    }
    if (!value.isObject()) {
        value = Json::Value(Json::objectValue);
    }
    value["schedule"] = task->task.schedule;
    return true;
}
