// The scheduled task: the one in the platform's scheduler whose command is the refresh command.

#include <cstring>

#include "platform/scheduler.h"
#include "src/domain_schedule.h"
#include "src/support/handles.h"
#include "src/support/json_access.h"
#include "src/support/log.h"

namespace {

constexpr const char* kRefreshCommand = "/usr/vorn/sbin/vornwin -updateDomain";
constexpr int kInvalidArgument = 0x0D00;  // the platform's code for one

int IsUpdateTaskFilter(_tag_vorn_sched_task_* task) {
    if (task == nullptr) {
        const int number = LOG_NUMBER(kScheduleStore);
        syslog(LOG_ERR, "%s:%d Invaild Argument (%s)=[%d]\n", kScheduleUnit, number, "0 != pTask", 0);
        VLIBCErrSetEx(kInvalidArgument, kScheduleUnit, number);
        return 0;
    }
    char command[1024] = {};
    if (VORNSchedCTaskGetCommand(command, sizeof(command), task) < 0) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d get task command failed. [0x%04X %s:%d]", kScheduleUnit, LOG_NUMBER(kScheduleStore),
               last.Code(), last.file, last.line);
        return 0;
    }
    return std::strcmp(command, kRefreshCommand) == 0 ? 1 : 0;
}

}  // namespace

bool DomainScheduleHandler::LoadSchedule(Json::Value& out) {
    out = Json::Value();
    out["date_type"] = kNoSchedule;
    ScheduledTask task;
    if (!task) {
        return true;
    }
    const int id = GetScheduleTaskId();
    if (id < 0 || VORNSchedTaskLoad(id, task.get()) < 0) {
        return true;
    }
    Json::Value value;
    if (VORNSchedTaskConvertToJson_Schedule(task.get(), value)) {
        out = MemberOf(value, "schedule");
    }
    return true;
}

int DomainScheduleHandler::GetScheduleTaskId() {
    ScheduledTaskList tasks;
    if (VORNSchedTaskListGet(tasks.address(), IsUpdateTaskFilter) < 0) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d get task list failed. [0x%04X %s:%d]", kScheduleUnit, LOG_NUMBER(kScheduleStore),
               last.Code(), last.file, last.line);
        SetError(kSystemError);
        return -1;
    }
    // Of several tasks with the command the first is the one; the others are left alone.
    return tasks.first() == nullptr ? -1 : VORNSchedTaskGetID(tasks.first());
}

int DomainScheduleHandler::SetUpdatePeriod(const Json::Value& value) {
    if (MemberOf(MemberOf(value, "schedule"), "date_type").asInt() == kNoSchedule) {
        RemoveUpdatePeriod();
        return 0;
    }
    ScheduledTask task;
    if (!task) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d alloc task failed.[0x%04X %s:%d]", kScheduleUnit, LOG_NUMBER(kScheduleStore),
               last.Code(), last.file, last.line);
        SetError(kSystemError);
        return -1;
    }
    const int id = GetScheduleTaskId();
    if (id < 0 && error != kNoError) {
        return -1;  // the search failed: a task may be there, and a second one must not be made
    }
    if (VORNSchedTaskLoad(id, task.get()) < 0) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d load task failed. id:[%d] [0x%04X %s:%d]", kScheduleUnit, LOG_NUMBER(kScheduleStore), id,
               last.Code(), last.file, last.line);
        SetError(kSystemError);
        return -1;
    }
    if (!VORNSchedTaskConvertFromJson_Schedule(value, task.get())) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d Convert task from json (schedule) failed. [0x%04X %s:%d]", kScheduleUnit,
               LOG_NUMBER(kScheduleStore), last.Code(), last.file, last.line);
        SetError(kSystemError);
        return -1;
    }
    VORNSchedCTaskSetListable(task.get(), false);
    if (VORNSchedCTaskSetCommand(task.get(), kRefreshCommand) != 0) {
        syslog(LOG_ERR, "%s:%d Set command failed", kScheduleUnit, LOG_NUMBER(kScheduleStore));
        SetError(kSystemError);
        return -1;
    }
    if (VORNSchedTaskSave(task.get()) < 0) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d Save task failed. [0x%04X %s:%d]", kScheduleUnit, LOG_NUMBER(kScheduleStore),
               last.Code(), last.file, last.line);
        SetError(kSystemError);
        return -1;
    }
    return 0;
}

int DomainScheduleHandler::RemoveUpdatePeriod() {
    const int id = GetScheduleTaskId();
    if (id < 0) {
        return 0;
    }
    if (VORNSchedTaskRemove(id) < 0) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d Failed to delete task %d. [0x%04X %s:%d]", kScheduleUnit, LOG_NUMBER(kScheduleStore), id,
               last.Code(), last.file, last.line);
        SetError(kSystemError);
        return -1;
    }
    return 0;
}
