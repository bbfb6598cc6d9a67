// The file of scheduled tasks as text.

#ifndef VORN_APPLIANCE_PLATFORM_SYSTEM_TASK_FILE_H
#define VORN_APPLIANCE_PLATFORM_SYSTEM_TASK_FILE_H

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "appliance/platform/system/schedule.h"

namespace appliance {

struct ScheduledTask {
    int id = -1;          // -1: not saved so far
    std::string command;  // a command line for root's shell
    bool listable = true;
    Schedule schedule;
};

// All tasks, by ascending id, and the id that the next new one gets: the id of a removed task is not used again.
struct TaskFile {
    std::vector<ScheduledTask> tasks;
    int nextId = 1;
};

// What speaks against the command, in words for a log line; empty when it can be a task's.
std::string ImpossibleCommand(const std::string& command);

// What speaks against keeping the task, in words for a log line; empty when it can be kept.
std::string Impossible(const ScheduledTask& task);

// Reads the text. Returns an empty text, or what is wrong with it and in which line, with `file` unchanged: a task that
// can't be read must not be lost at the next save.
std::string ParseTasks(std::string_view text, TaskFile& file);

// The text: a section for each task, named by its id.
std::string FormatTasks(const TaskFile& file);

// The table for cron: the tasks that have a run left on `today` or later; empty when there is none.
std::string CronTable(const TaskFile& file, const Date& today);

}  // namespace appliance

#endif
