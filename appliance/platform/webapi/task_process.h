// The processes of background tasks, as the server sees them.

#ifndef VORN_APPLIANCE_PLATFORM_WEBAPI_TASK_PROCESS_H
#define VORN_APPLIANCE_PLATFORM_WEBAPI_TASK_PROCESS_H

#include <chrono>
#include <string>
#include <vector>

namespace appliance {

// Where tasks are recorded, and what runs them.
struct TaskHost {
    std::string database;              // the file of the records
    std::vector<std::string> command;  // the program by its absolute path, and arguments; "--task ID" is added

    // The appliance's own.
    static TaskHost Default();
};

// Starts the process of a recorded task and waits until it has claimed its record and loaded the body, at most
// `deadline` (milliseconds). The process is no child of the caller's. Empty on success, else the reason in words.
std::string StartTaskProcess(const TaskHost& host, const std::string& id, std::chrono::milliseconds deadline);

}  // namespace appliance

#endif
