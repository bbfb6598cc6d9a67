// The process of a background task.

#ifndef VORN_APPLIANCE_VORND_TASK_MAIN_H
#define VORN_APPLIANCE_VORND_TASK_MAIN_H

#include <string>

#include "appliance/platform/webapi/task_process.h"

namespace appliance {

// Runs the recorded task `id` in a process of its own, which leads a session of its own. Returns twice: in the caller
// with 0 as soon as the task is at work, or with 1 when it could not begin, the reason in the log; and in the task's
// process at its end.
int RunTask(const TaskHost& host, const std::string& id);

}  // namespace appliance

#endif
