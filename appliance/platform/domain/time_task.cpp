#include "appliance/platform/contract.h"
//
#include "appliance/platform/domain/time_task.h"

#include <json/value.h>

#include <array>
#include <cstring>
#include <memory>

#include "appliance/domain/directory/time_sync.h"
#include "appliance/platform/domain/vornwin_start.h"
#include "appliance/platform/last_error.h"

namespace appliance {

namespace {

constexpr int kCommandSize = 1024;
constexpr int kNewTask = -1;
constexpr char kSyncOption[] = "-syncTime";

int IsSyncTask(_tag_vorn_sched_task_* task) {
    std::array<char, kCommandSize> command{};
    return task != nullptr && VORNSchedCTaskGetCommand(command.data(), kCommandSize, task) >= 0 &&
                   strcmp(command.data(), kSyncTimeCommand) == 0
               ? 1
               : 0;
}

// The id of the first such task, kNewTask when there is none; false when the tasks can't be read.
bool FindTask(int& id) {
    _tag_vorn_sched_task_* list = nullptr;
    if (VORNSchedTaskListGet(&list, IsSyncTask) < 0) {
        return false;
    }
    id = list == nullptr ? kNewTask : VORNSchedTaskGetID(list);
    VORNSchedTaskListFree(&list);
    return true;
}

// Every day, every hour, at a minute at which few others run.
Json::Value Hourly() {
    Json::Value schedule;
    schedule["date_type"] = 0;
    schedule["week_name"] = "0,1,2,3,4,5,6";
    schedule["date"] = "";
    schedule["repeat"] = 0;
    schedule["hour"] = 0;
    schedule["min"] = 43;
    schedule["repeat_hour"] = 1;
    schedule["last_work_hour"] = 23;
    Json::Value value;
    value["schedule"] = schedule;
    return value;
}

struct FreeTask {
    void operator()(_tag_vorn_sched_task_* task) const {
        VORNSchedTaskFree(task);
    }
};

int MakeTask() {
    int id = kNewTask;
    if (!FindTask(id)) {
        return -1;
    }
    if (id != kNewTask) {
        return 0;
    }
    const std::unique_ptr<_tag_vorn_sched_task_, FreeTask> task(VORNSchedTaskAlloc());
    if (!task || VORNSchedTaskLoad(kNewTask, task.get()) < 0 ||
        !VORNSchedTaskConvertFromJson_Schedule(Hourly(), task.get())) {
        return -1;
    }
    VORNSchedCTaskSetListable(task.get(), false);
    if (VORNSchedCTaskSetCommand(task.get(), kSyncTimeCommand) != 0 || VORNSchedTaskSave(task.get()) < 0) {
        return -1;
    }
    return 0;
}

int RemoveTask() {
    for (;;) {
        int id = kNewTask;
        if (!FindTask(id)) {
            return -1;
        }
        if (id == kNewTask) {
            return 0;
        }
        if (VORNSchedTaskRemove(id) < 0) {
            return -1;
        }
    }
}

}  // namespace

int ApplyTimeSynchronisation() {
    if (!IsTimeSynchronised()) {
        return RemoveTask();
    }
    const int result = MakeTask();
    StartVornwin(kSyncOption);
    return result;
}

}  // namespace appliance
