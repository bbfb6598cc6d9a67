// The task scheduler: commands that the appliance runs at set times.
// See conventions.h for the rules that hold for every declaration.

#ifndef VORN_PLATFORM_SCHEDULER_H
#define VORN_PLATFORM_SCHEDULER_H

#include <json/value.h>

#include "platform/conventions.h"

extern "C" {

// The record of a task. Its content is the scheduler's.
struct _tag_vorn_sched_task_;

// Non-zero for a task that belongs to the list. The task is the scheduler's; the filter must accept null.
typedef int (*VORNSchedTaskFilter)(struct _tag_vorn_sched_task_* task);

// Sets `*list` to the first of the tasks that pass the filter, in the scheduler's order, or to null when there is none.
// `*list` is null beforehand.
// Failure: -1.
int VORNSchedTaskListGet(struct _tag_vorn_sched_task_** list, VORNSchedTaskFilter filter);

// Frees a list of VORNSchedTaskListGet and sets `*list` to null.
// Failure: none.
void VORNSchedTaskListFree(struct _tag_vorn_sched_task_** list);

// The id of a task: 0 or more, or -1 for one that was never saved.
// Failure: -1.
int VORNSchedTaskGetID(const struct _tag_vorn_sched_task_* task);

// A new, empty record.
// Failure: null.
struct _tag_vorn_sched_task_* VORNSchedTaskAlloc(void);

// Loads the task of an id into the record. The id -1 prepares the record for a task that is to be made.
// Failure: -1.
int VORNSchedTaskLoad(int id, struct _tag_vorn_sched_task_* task);

// Saves the record: a new task gets an id, a known one is replaced.
// Failure: -1.
int VORNSchedTaskSave(struct _tag_vorn_sched_task_* task);

// Removes a task by its id.
// Failure: -1.
int VORNSchedTaskRemove(int id);

// Frees a record of VORNSchedTaskAlloc.
// Failure: none.
void VORNSchedTaskFree(struct _tag_vorn_sched_task_* task);

// Fills `command` (`size` bytes) with the command of a task.
// Failure: -1.
int VORNSchedCTaskGetCommand(char* command, int size, const struct _tag_vorn_sched_task_* task);

// Sets the command of a task. 0 when done.
// Failure: -1, 1.
int VORNSchedCTaskSetCommand(struct _tag_vorn_sched_task_* task, const char* command);

// Whether the administrator's list of tasks shows this one.
// Failure: none.
void VORNSchedCTaskSetListable(struct _tag_vorn_sched_task_* task, bool listable);

// Sets the task's schedule from the member "schedule" of a JSON object; refuses times that can't be.
// Failure: false.
bool VORNSchedTaskConvertFromJson_Schedule(const Json::Value& value, struct _tag_vorn_sched_task_* task);

// Sets the member "schedule" of `value`, made an object, to the task's schedule.
// Failure: false.
bool VORNSchedTaskConvertToJson_Schedule(const struct _tag_vorn_sched_task_* task, Json::Value& value);

}  // extern "C"

#endif
