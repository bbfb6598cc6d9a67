// The framework of background tasks. A task is recorded, its body is left to the test.

#include <algorithm>

#include "tests/double/framework.h"
#include "tests/double/recording.h"

using fake::BackgroundTask;
using fake::Compact;
using fake::Flag;
using fake::Named;
using fake::Quoted;
using fake::Recording;
using fake::State;
using fake::TheAppliance;

namespace VORN {

class APIPolling::Impl {
public:
    bool Fail(Recording& call) {
        error = TheAppliance().state.pollingError;
        return call.FailureFalse();
    }

    APIRequest* request = nullptr;
    std::string group;
    std::string prefix;
    bool removedWhenRead = false;
    int error = 0;
};

namespace {

bool StartsWith(const std::string& text, const std::string& prefix) {
    return text.compare(0, prefix.size(), prefix) == 0;
}

Json::Value UnfinishedRecord() {
    Json::Value record(Json::objectValue);
    record["finish"] = false;
    record["success"] = true;
    record["data"] = Json::Value();
    return record;
}

std::vector<BackgroundTask>::iterator FindTask(State& state, const std::string& id) {
    return std::find_if(state.tasks.begin(), state.tasks.end(),
                        [&](const BackgroundTask& task) { return task.id == id; });
}

bool HasEnded(const BackgroundTask& task) {
    return task.record.isObject() && task.record["finish"].isBool() && task.record["finish"].asBool();
}

std::string FreeId(State& state, const std::string& prefix) {
    std::size_t number = state.tasks.size() + 1;
    while (FindTask(state, prefix + std::to_string(number)) != state.tasks.end()) {
        ++number;
    }
    return prefix + std::to_string(number);
}

bool AreNames(const Json::Value& groups) {
    return groups.isArray() &&
           std::all_of(groups.begin(), groups.end(), [](const Json::Value& group) { return group.isString(); });
}

}  // namespace

APIPolling::APIPolling() {
    Recording call("VORN::APIPolling::APIPolling", {});
    impl = std::make_unique<Impl>();
    TheAppliance().AddHandle(this, fake::HandleKind::kPolling, call.Text());
}

APIPolling::APIPolling(APIRequest* request) {
    Recording call("VORN::APIPolling::APIPolling", {Named(request, "request")});
    call.Null(request);
    impl = std::make_unique<Impl>();
    impl->request = request;
    TheAppliance().AddHandle(this, fake::HandleKind::kPolling, call.Text());
}

APIPolling::~APIPolling() {
    const Recording call("VORN::APIPolling::~APIPolling", {});
    TheAppliance().RemoveHandle(this);
}

void APIPolling::SetRequest(APIRequest* request) {
    Recording call("VORN::APIPolling::SetRequest", {Named(request, "request")});
    call.Null(request);
    impl->request = request;
}

void APIPolling::SetGroupAttr(const std::string& group) {
    const Recording call("VORN::APIPolling::SetGroupAttr", {Quoted(group)});
    impl->group = group;
}

void APIPolling::SetPrefixAttr(const std::string& prefix) {
    const Recording call("VORN::APIPolling::SetPrefixAttr", {Quoted(prefix)});
    impl->prefix = prefix;
}

void APIPolling::SetRemoveAttr(bool remove) {
    const Recording call("VORN::APIPolling::SetRemoveAttr", {Flag(remove)});
    impl->removedWhenRead = remove;
}

bool APIPolling::Start(APIResponse* response, APITaskFunction body, void* userData) {
    Recording call("VORN::APIPolling::Start",
                   {Named(response, "response"), body == nullptr ? "null" : "body", Named(userData, "userData")});
    State& state = TheAppliance().state;
    const bool complete = response != nullptr && body != nullptr && impl->request != nullptr;
    if (!complete) {
        call.Misuse("no response, body or request");
    }
    if (!complete || call.Fails()) {
        TheAppliance().RecordAnswer(false, state.pollingError, Json::Value());
        return impl->Fail(call);
    }
    const std::string id = FreeId(state, impl->prefix);
    state.tasks.push_back({id, impl->group, impl->prefix, UnfinishedRecord(), impl->removedWhenRead});
    state.startedBody = body;
    state.startedUserData = userData;
    state.startedParameters = impl->request->impl->parameters;
    ++state.startedTasks;
    Json::Value data(Json::objectValue);
    data["task_id"] = id;
    TheAppliance().RecordAnswer(true, 0, data);
    return true;
}

bool APIPolling::List(const std::string& prefix, const Json::Value& groups, Json::Value& tasks) {
    Recording call("VORN::APIPolling::List", {Quoted(prefix), Compact(groups), "tasks"});
    const State& state = TheAppliance().state;
    if (call.Fails() || !AreNames(groups)) {
        // Nobody may look at what a failed call leaves: here an unfinished task.
        tasks = Json::Value(Json::objectValue);
        tasks["stale"].append("stale-task");
        return impl->Fail(call);
    }
    if (state.taskList) {
        tasks = *state.taskList;
        return true;
    }
    Json::Value found(Json::objectValue);
    for (const Json::Value& group : groups) {
        Json::Value& ids = found[group.asString()] = Json::Value(Json::arrayValue);
        for (const BackgroundTask& task : state.tasks) {
            if (task.group == group.asString() && StartsWith(task.id, prefix)) {
                ids.append(task.id);
            }
        }
    }
    tasks = found;
    return true;
}

bool APIPolling::Status(const std::string& id, Json::Value& status) {
    Recording call("VORN::APIPolling::Status", {Quoted(id), "status"});
    State& state = TheAppliance().state;
    const auto found = FindTask(state, id);
    if (call.Fails() || found == state.tasks.end()) {
        return impl->Fail(call);
    }
    status = found->record;
    if (found->removedWhenRead && HasEnded(*found)) {
        state.tasks.erase(found);
    }
    return true;
}

bool APIPolling::Stop(const std::string& id, bool force) {
    Recording call("VORN::APIPolling::Stop", {Quoted(id), Flag(force)});
    State& state = TheAppliance().state;
    const auto found = FindTask(state, id);
    if (call.Fails() || found == state.tasks.end()) {
        return impl->Fail(call);
    }
    state.stoppedTasks.emplace_back(id, force);
    if (!HasEnded(*found)) {
        found->record["finish"] = true;
        found->record["success"] = false;
    }
    return true;
}

int APIPolling::GetError() const {
    const Recording call("VORN::APIPolling::GetError", {});
    return impl->error;
}

}  // namespace VORN
