// "update_status" and "update_stop", which follow and stop the tasks of "update_start", and the monitor, which a task
// runs in place of the worker while the appliance is fetching by itself.
//
// update_status  {"task_id": "..."} answers {"status": "updating"} or {"status": "finish"}, or the task's own error
// update_stop    {} answers null

#include <unistd.h>

#include "src/domain.h"
#include "src/domain/internal.h"
#include "src/support/json_access.h"
#include "src/support/paths.h"

namespace {

constexpr unsigned kMonitorPause = 3;  // seconds

}  // namespace

Json::Value TaskGroups() {
    Json::Value groups(Json::arrayValue);
    groups.append(kTaskGroup);
    return groups;
}

std::vector<std::string> TaskIds(const Json::Value& tasks) {
    std::vector<std::string> ids;
    for (const Json::Value& group : tasks) {
        if (!group.isArray()) {
            continue;
        }
        for (const Json::Value& id : group) {
            if (id.isString()) {
                ids.push_back(id.asString());
            }
        }
    }
    return ids;
}

Json::Value Progress(const char* status) {
    Json::Value progress;
    progress["status"] = status;
    return progress;
}

UpdatingMarker::~UpdatingMarker() {
    VLIBCSysRemove(kUpdatingMarker);
}

void DomainServiceHandler::UpdateStatus() {
    VORN::APIPolling polling(request);
    if (!CHECK_PARAM_STRING("task_id", true)) {
        ReportError();
        return;
    }
    const std::string id = request->GetParam("task_id", "").asString();
    Json::Value status;
    if (!polling.Status(id, status)) {
        response->SetError(kPollingError, polling.GetError());
        return;
    }
    if (!IsTrue(MemberOf(status, "success"))) {
        const Json::Value& failure = MemberOf(status, "error");
        response->SetError(MemberOf(failure, "code").asInt(), MemberOf(failure, "errors"));
        return;
    }
    response->SetSuccess(MemberOf(status, "data"));
}

void DomainServiceHandler::UpdateStop() {
    VORN::APIPolling polling(request);
    Json::Value tasks;
    if (!polling.List(kTaskPrefix, TaskGroups(), tasks)) {
        response->SetError(kPollingError, Json::Value());
        return;
    }
    for (const std::string& id : TaskIds(tasks)) {
        polling.Stop(id, true);  // one that has ended as well; the framework lets it be
    }
    response->SetSuccess(Json::Value());
}

void DomainServiceHandler::MonitorUpdate() {
    const UpdatingMarker marker;
    response->SetSuccess(Progress("updating"));
    // No limit of its own: a fetch that is watched here has one.
    do {
        sleep(kMonitorPause);
    } while (CheckDomainDBUpdating());
    response->SetSuccess(Progress("finish"));
}
