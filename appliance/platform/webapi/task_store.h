// The records of background tasks: one SQLite file, used by the server, by the task processes and by the server's
// successor alike. Everything here throws SqliteError.

#ifndef VORN_APPLIANCE_PLATFORM_WEBAPI_TASK_STORE_H
#define VORN_APPLIANCE_PLATFORM_WEBAPI_TASK_STORE_H

#include <json/value.h>

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "appliance/base/sqlite.h"
#include "appliance/platform/webapi/framework_codes.h"
#include "appliance/platform/webapi/process_session.h"

namespace appliance {

// What a task is started with. The body is a function that a module exports, by the module's file and the symbol.
struct NewTask {
    std::string group;
    std::string prefix;
    bool removedWhenRead = false;
    std::string module;
    std::string symbol;
    Json::Value parameters;
};

enum class TaskState : int {
    Starting = 0,  // recorded by a server; its process has not claimed it yet
    Running = 1,   // by the process of the record
    Stopping = 2,  // asked to end; what it publishes is not kept any more
    Ended = 3,
};

struct TaskRecord {
    std::string id;
    NewTask task;
    TaskState state = TaskState::Starting;
    ProcessIdentity process;  // the task's own once it is claimed; before that of the server that recorded it

    // While it runs: what it published last. At its end: its result.
    bool success = true;
    Json::Value data;
    int code = 0;
    Json::Value errors;

    // The form in which modules see a task.
    Json::Value Status() const;
};

// How a task ended.
struct TaskEnd {
    bool success = false;
    Json::Value data;    // of a success; after a failure the last progress stays
    int code = 0;        // of a failure
    Json::Value errors;  // likewise
};

class TaskStore {
public:
    // Opens the file, and makes it with its tables when it is missing.
    explicit TaskStore(const std::string& path);

    // Records a new task in state Starting and answers its id: the prefix, "_" and 32 random hexadecimal digits. What
    // looks like a secret is left out of the parameters. Old records of ended tasks go.
    std::string Add(const NewTask& task);

    // The ids of a group's tasks that begin with `prefix`, in the order of their start.
    std::vector<std::string> List(std::string_view prefix, std::string_view group);

    // The record of a task; nothing when there is none. Any text may be asked for.
    std::optional<TaskRecord> Find(std::string_view id);

    void Remove(std::string_view id);

    // The task's own process takes it over. False when the task has been stopped or removed meanwhile.
    bool Claim(std::string_view id, const ProcessIdentity& process);

    // Keeps `data` as the progress, and ends the task. Neither has an effect on a task that does not run.
    void Publish(std::string_view id, const Json::Value& data);
    void End(std::string_view id, const TaskEnd& end);

    // Stopping a task that runs: between both calls the caller ends its processes. One that no process has claimed yet
    // ends at once, and one that has ended stays as it is.
    void MarkStopping(std::string_view id);
    void MarkStopped(std::string_view id);

    // Ends the records of those tasks whose process is gone. Returns how many. List and Find do so, too.
    int EndDead();

private:
    void RemoveOld();
    void SetEnd(std::string_view id, TaskState from, const TaskEnd& end);

    Database database_;
};

// How many ended tasks are kept for each prefix, and for how long (seconds). Older ones are not found any more, and go with
// the next new task.
inline constexpr int kEndedTasksKept = 32;
inline constexpr int kEndedTasksAge = 7 * 24 * 60 * 60;

// True when an id, a prefix or a group may stand in a record: letters, digits, "_", "-" and "."; at most 128 bytes.
bool IsTaskName(std::string_view text);

// The parameters without what may be a secret, at any depth: members whose names hold "pass", "pwd", "secret" or
// "token".
Json::Value WithoutSecrets(const Json::Value& parameters);

}  // namespace appliance

#endif
