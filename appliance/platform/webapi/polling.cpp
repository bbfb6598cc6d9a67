// Background tasks. A task is a process of its own, recorded in the task store; this server, its successor and other
// programs find it there.

#include <dlfcn.h>

#include <optional>
#include <utility>

#include "appliance/base/log.h"
#include "appliance/platform/last_error.h"
#include "appliance/platform/webapi/exchange.h"
#include "appliance/platform/webapi/framework_codes.h"
#include "appliance/platform/webapi/task_process.h"
#include "appliance/platform/webapi/task_store.h"

namespace VORN {

using appliance::FrameworkCode;
using appliance::NewTask;
using appliance::TaskHost;
using appliance::TaskRecord;
using appliance::TaskState;
using appliance::TaskStore;

namespace {

constexpr std::chrono::milliseconds kStartLimit{15000};
constexpr std::chrono::milliseconds kStopPatience{1500};  // between SIGTERM and SIGKILL

// The file and the symbol of a function that a loaded module exports.
bool FindBody(APITaskFunction body, NewTask& task) {
    Dl_info found{};
    if (dladdr(reinterpret_cast<void*>(body), &found) == 0 || found.dli_sname == nullptr ||
        found.dli_fname == nullptr || found.dli_saddr != reinterpret_cast<void*>(body)) {
        return false;
    }
    task.module = found.dli_fname;
    task.symbol = found.dli_sname;
    return true;
}

bool AreNames(const Json::Value& groups) {
    if (!groups.isArray()) {
        return false;
    }
    for (const Json::Value& group : groups) {
        if (!group.isString() || !appliance::IsTaskName(group.asString())) {
            return false;
        }
    }
    return true;
}

}  // namespace

class APIPolling::Impl {
public:
    TaskHost Host() const {
        return request != nullptr && request->impl->taskHost != nullptr ? *request->impl->taskHost
                                                                        : TaskHost::Default();
    }

    // Opened at its first use and kept: an update looks at many records in a row.
    TaskStore& Store() {
        if (!store) {
            store.emplace(Host().database);
        }
        return *store;
    }

    // Runs `work` (true: done; false: it has set the error), and turns a failing store into an error.
    template <typename Work>
    bool Do(Work work) {
        try {
            return work();
        } catch (const appliance::SqliteError& failure) {
            appliance::Log(LOG_ERR, std::string("the records of background tasks: ") + failure.what());
            store.reset();
            error = static_cast<int>(FrameworkCode::TaskStoreFailed);
            return VORN_FAIL_WITH(Database, false);
        }
    }

    APIRequest* request = nullptr;
    std::string group;
    std::string prefix;
    bool removedWhenRead = false;
    int error = 0;

private:
    std::optional<TaskStore> store;
};

// Records the framework's code and is false.
#define POLLING_FAIL(code, lastError) \
    (impl->error = static_cast<int>(FrameworkCode::code), VORN_FAIL_WITH(lastError, false))

APIPolling::APIPolling() : impl(std::make_unique<Impl>()) {}

APIPolling::APIPolling(APIRequest* request) : impl(std::make_unique<Impl>()) {
    impl->request = request;
}

APIPolling::~APIPolling() = default;

void APIPolling::SetRequest(APIRequest* request) {
    impl->request = request;
}

void APIPolling::SetGroupAttr(const std::string& group) {
    impl->group = group;
}

void APIPolling::SetPrefixAttr(const std::string& prefix) {
    impl->prefix = prefix;
}

void APIPolling::SetRemoveAttr(bool remove) {
    impl->removedWhenRead = remove;
}

bool APIPolling::Start(APIResponse* response, APITaskFunction body, void* userData) {
    const bool started = impl->Do([&] {
        NewTask task;
        // A pointer of this process means nothing to another one, so there is no user data to hand on.
        if (response == nullptr || body == nullptr || impl->request == nullptr || userData != nullptr ||
            !appliance::IsTaskName(impl->group) || !appliance::IsTaskName(impl->prefix) || !FindBody(body, task)) {
            appliance::Log(LOG_ERR,
                           "a background task was asked for that can't be: its body must be exported by a "
                           "module, with a request, a response and without user data");
            return POLLING_FAIL(BadTaskArgument, BadArgument);
        }
        task.group = impl->group;
        task.prefix = impl->prefix;
        task.removedWhenRead = impl->removedWhenRead;
        task.parameters = impl->request->impl->parameters;
        const std::string id = impl->Store().Add(task);
        const std::string reason = appliance::StartTaskProcess(impl->Host(), id, kStartLimit);
        const std::optional<TaskRecord> left = reason.empty() ? std::nullopt : impl->Store().Find(id);
        // One that somebody has stopped before it began was started all the same: its status says what became of it.
        const bool stopped =
            left && (left->state == TaskState::Stopping ||
                     (left->state == TaskState::Ended && left->code == static_cast<int>(FrameworkCode::TaskStopped)));
        if (!reason.empty() && !stopped) {
            appliance::Log(LOG_ERR, "background task " + id + ": " + reason);
            if (left && left->state == TaskState::Running) {
                appliance::EndSession(left->process, true, kStopPatience);
            }
            impl->Store().Remove(id);
            return POLLING_FAIL(TaskNotStarted, CommandFailed);
        }
        Json::Value data(Json::objectValue);
        data["task_id"] = id;
        response->SetSuccess(data);
        return true;
    });
    if (!started && response != nullptr) {
        response->SetError(impl->error, Json::Value());
    }
    return started;
}

bool APIPolling::List(const std::string& prefix, const Json::Value& groups, Json::Value& tasks) {
    return impl->Do([&] {
        if (!AreNames(groups) || !appliance::IsTaskName(prefix)) {
            return POLLING_FAIL(BadTaskArgument, BadArgument);
        }
        Json::Value found(Json::objectValue);
        for (const Json::Value& group : groups) {
            Json::Value& ids = found[group.asString()] = Json::Value(Json::arrayValue);
            for (const std::string& id : impl->Store().List(prefix, group.asString())) {
                ids.append(id);
            }
        }
        tasks = found;
        return true;
    });
}

bool APIPolling::Status(const std::string& id, Json::Value& status) {
    return impl->Do([&] {
        const std::optional<TaskRecord> record = impl->Store().Find(id);
        if (!record) {
            return POLLING_FAIL(NoSuchTask, NotFound);
        }
        status = record->Status();
        if (record->task.removedWhenRead && record->state == TaskState::Ended) {
            impl->Store().Remove(id);
        }
        return true;
    });
}

bool APIPolling::Stop(const std::string& id, bool force) {
    return impl->Do([&] {
        TaskStore& store = impl->Store();
        if (!store.Find(id)) {
            return POLLING_FAIL(NoSuchTask, NotFound);
        }
        store.MarkStopping(id);
        const std::optional<TaskRecord> record = store.Find(id);
        if (!record || record->state == TaskState::Ended) {
            return true;
        }
        if (!appliance::EndSession(record->process, force, kStopPatience)) {
            appliance::Log(LOG_ERR, "background task " + id + ": its processes don't end");
            return POLLING_FAIL(TaskNotEnded, TimedOut);
        }
        store.MarkStopped(id);
        return true;
    });
}

int APIPolling::GetError() const {
    return impl->error;
}

}  // namespace VORN
