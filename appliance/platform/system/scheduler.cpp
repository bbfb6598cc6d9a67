// The contract's task scheduler.

#include "appliance/platform/contract.h"
//
#include <memory>
#include <utility>
#include <vector>

#include "appliance/base/text.h"
#include "appliance/platform/last_error.h"
#include "appliance/platform/system/schedule_json.h"
#include "appliance/platform/system/task_store.h"

struct _tag_vorn_sched_task_ {
    appliance::ScheduledTask task;
    std::unique_ptr<_tag_vorn_sched_task_> next = nullptr;  // in a list
};

namespace {

using appliance::ErrorCode;
using appliance::ScheduledTask;

// The code is known at run time only, so the last error carries the place that the caller names.
int FailWith(ErrorCode code, int line) {
    VLIBCErrSetEx(static_cast<int>(code), appliance::SourceName(__FILE__), line);
    return -1;
}

void LogRefusal(const std::string& why) {
    appliance::Log(LOG_ERR, "scheduled tasks: a schedule is refused: " + why);
}

// The tasks that pass the filter, as a chain.
std::unique_ptr<_tag_vorn_sched_task_> Chain(std::vector<ScheduledTask> tasks, VORNSchedTaskFilter filter) {
    std::unique_ptr<_tag_vorn_sched_task_> first;
    std::unique_ptr<_tag_vorn_sched_task_>* end = &first;
    for (ScheduledTask& task : tasks) {
        auto record = std::make_unique<_tag_vorn_sched_task_>();
        record->task = std::move(task);
        if (filter(record.get()) != 0) {
            *end = std::move(record);
            end = &(*end)->next;
        }
    }
    return first;
}

}  // namespace

extern "C" {

int VORNSchedTaskListGet(struct _tag_vorn_sched_task_** list, VORNSchedTaskFilter filter) {
    VORN_GUARD(-1, {
        if (list == nullptr || *list != nullptr || filter == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        std::vector<ScheduledTask> tasks;
        if (const auto failure = appliance::LoadTasks(tasks)) {
            return FailWith(*failure, __LINE__);
        }
        *list = Chain(std::move(tasks), filter).release();
        return 0;
    })
}

void VORNSchedTaskListFree(struct _tag_vorn_sched_task_** list) {
    if (list == nullptr) {
        return;
    }
    // One by one: a long chain must not be freed by a deep recursion.
    std::unique_ptr<_tag_vorn_sched_task_> task(*list);
    *list = nullptr;
    while (task) {
        task = std::move(task->next);
    }
}

int VORNSchedTaskGetID(const struct _tag_vorn_sched_task_* task) {
    if (task == nullptr) {
        return VORN_FAIL(BadArgument);
    }
    return task->task.id < 0 ? VORN_FAIL(NotFound) : task->task.id;
}

struct _tag_vorn_sched_task_* VORNSchedTaskAlloc(void) {
    VORN_GUARD(nullptr, { return new _tag_vorn_sched_task_; })
}

int VORNSchedTaskLoad(int id, struct _tag_vorn_sched_task_* task) {
    VORN_GUARD(-1, {
        if (task == nullptr || id < -1) {
            return VORN_FAIL(BadArgument);
        }
        if (id == -1) {
            task->task = ScheduledTask();
            return 0;
        }
        std::vector<ScheduledTask> tasks;
        if (const auto failure = appliance::LoadTasks(tasks)) {
            return FailWith(*failure, __LINE__);
        }
        for (ScheduledTask& candidate : tasks) {
            if (candidate.id == id) {
                task->task = std::move(candidate);
                return 0;
            }
        }
        return VORN_FAIL(NotFound);
    })
}

int VORNSchedTaskSave(struct _tag_vorn_sched_task_* task) {
    VORN_GUARD(-1, {
        if (task == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        const auto failure = appliance::SaveTask(task->task);
        return failure ? FailWith(*failure, __LINE__) : 0;
    })
}

int VORNSchedTaskRemove(int id) {
    VORN_GUARD(-1, {
        const auto failure = appliance::RemoveTask(id);
        return failure ? FailWith(*failure, __LINE__) : 0;
    })
}

void VORNSchedTaskFree(struct _tag_vorn_sched_task_* task) {
    VORNSchedTaskListFree(&task);
}

int VORNSchedCTaskGetCommand(char* command, int size, const struct _tag_vorn_sched_task_* task) {
    if (task == nullptr || !appliance::CopyToBuffer(task->task.command, command, size)) {
        return VORN_FAIL(BadArgument);
    }
    return 0;
}

int VORNSchedCTaskSetCommand(struct _tag_vorn_sched_task_* task, const char* command) {
    VORN_GUARD(-1, {
        if (task == nullptr || command == nullptr) {
            return VORN_FAIL(BadArgument);
        }
        const std::string why = appliance::ImpossibleCommand(command);
        if (!why.empty()) {
            LogRefusal(why);
            return VORN_FAIL(BadArgument);
        }
        task->task.command = command;
        return 0;
    })
}

void VORNSchedCTaskSetListable(struct _tag_vorn_sched_task_* task, bool listable) {
    if (task != nullptr) {
        task->task.listable = listable;
    }
}

bool VORNSchedTaskConvertFromJson_Schedule(const Json::Value& value, struct _tag_vorn_sched_task_* task) {
    VORN_GUARD(false, {
        if (task == nullptr || !value.isObject()) {
            return VORN_FAIL_WITH(BadArgument, false);
        }
        const std::string why = appliance::ScheduleFromJson(value["schedule"], task->task.schedule);
        if (!why.empty()) {
            LogRefusal(why);
            return VORN_FAIL_WITH(BadArgument, false);
        }
        return true;
    })
}

bool VORNSchedTaskConvertToJson_Schedule(const struct _tag_vorn_sched_task_* task, Json::Value& value) {
    VORN_GUARD(false, {
        if (task == nullptr) {
            return VORN_FAIL_WITH(BadArgument, false);
        }
        if (task->task.schedule.dateType == appliance::kNever) {
            return VORN_FAIL_WITH(NotFound, false);
        }
        if (!value.isObject()) {
            value = Json::Value(Json::objectValue);
        }
        value["schedule"] = appliance::ScheduleToJson(task->task.schedule);
        return true;
    })
}

}  // extern "C"
