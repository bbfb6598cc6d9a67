// The scheduled tasks, kept in a file of their own and rendered into cron's table. Every change is made under a lock
// between processes and threads. A failure is an ErrorCode, and a log line says what and where.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_TASK_STORE_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_TASK_STORE_H

#include <cstddef>
#include <optional>
#include <vector>

#include "appliance/base/error_code.h"
#include "appliance/platform/system/task_file.h"

namespace appliance {

// More tasks than this are refused: cron ignores a table of more than 10,000 lines, and a task takes up to five.
inline constexpr std::size_t kMostTasks = 1000;

// All tasks by ascending id; a missing file has none. Nothing when done.
std::optional<ErrorCode> LoadTasks(std::vector<ScheduledTask>& tasks);

// Those that an administrator's list of tasks shows.
std::optional<ErrorCode> LoadListableTasks(std::vector<ScheduledTask>& tasks);

// Keeps a task: the id -1 makes a new one and sets its id, any other replaces the task of that id, which must be there.
// When cron's table can't be written, the tasks stay as they were.
std::optional<ErrorCode> SaveTask(ScheduledTask& task);

// Removes a task, which must be there.
std::optional<ErrorCode> RemoveTask(int id);

// Makes cron's table what the tasks say, when it is not: after a save that was killed between the two files, or after
// somebody changed or removed the table. For the start of a server.
std::optional<ErrorCode> RepairCronTable();

}  // namespace appliance

#endif
