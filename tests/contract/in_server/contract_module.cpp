// A module for the appliance's server: each method does one thing with the server's requests, responses and background
// tasks, and answers what came of it. in_server_check.py calls them and judges.

#include <json/value.h>
#include <unistd.h>

#include <chrono>
#include <stdexcept>
#include <string>
#include <thread>

#include "platform/webapi.h"

#define CONTRACT_EXPORT __attribute__((visibility("default")))

// Bodies of tasks are found by their symbols, so they are exported as the module's own are.
CONTRACT_EXPORT void ContractSteps(VORN::APIRequest* request, VORN::APIResponse* response, void* userData);
CONTRACT_EXPORT void ContractFails(VORN::APIRequest* request, VORN::APIResponse* response, void* userData);
CONTRACT_EXPORT void ContractThrows(VORN::APIRequest* request, VORN::APIResponse* response, void* userData);
CONTRACT_EXPORT void ContractStays(VORN::APIRequest* request, VORN::APIResponse* response, void* userData);
CONTRACT_EXPORT const VORN::APIEntry* GetAPITable();

namespace {

constexpr const char* kApi = "Contract.Test";
constexpr int kForever = 600;  // seconds; longer than anybody waits

void Pause(int milliseconds) {
    std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
}

Json::Value Param(const VORN::APIRequest* request, const std::string& name) {
    return request->GetParam(name, Json::Value());
}

std::string Text(const VORN::APIRequest* request, const std::string& name) {
    const Json::Value value = Param(request, name);
    return value.isString() ? value.asString() : "";
}

// What a call of the framework came to.
Json::Value Outcome(bool done, const VORN::APIPolling& polling) {
    Json::Value outcome(Json::objectValue);
    outcome["done"] = done;
    outcome["error"] = polling.GetError();
    return outcome;
}

// {"names": [...]}: what the request says of parameters of these names.
void ShowRequest(VORN::APIRequest* request, VORN::APIResponse* response) {
    Json::Value shown(Json::objectValue);
    for (const Json::Value& name : Param(request, "names")) {
        Json::Value& seen = shown[name.asString()];
        seen["has"] = request->HasParam(name.asString());
        seen["value"] = request->GetParam(name.asString(), "fallback");
    }
    response->SetSuccess(shown);
}

// {"answers": [{"data": ...} or {"code": N, "errors": ...}, ...]}: answers all of them in this order.
void Answer(VORN::APIRequest* request, VORN::APIResponse* response) {
    for (const Json::Value& answer : Param(request, "answers")) {
        if (answer.isMember("code")) {
            response->SetError(answer["code"].asInt(), answer["errors"]);
        } else {
            // A copy is to be taken: this one changes at once.
            Json::Value data = answer["data"];
            response->SetSuccess(data);
            data = "changed afterwards";
        }
    }
}

void Throw(VORN::APIRequest*, VORN::APIResponse*) {
    throw std::runtime_error("thrown by the contract's module");
}

VORN::APITaskFunction BodyOf(const std::string& name) {
    return name == "steps"    ? ContractSteps
           : name == "fails"  ? ContractFails
           : name == "throws" ? ContractThrows
                              : ContractStays;
}

// {"body": ..., "group": ..., "prefix": ..., "remove": ..., "late": bool}: the framework answers.
void Start(VORN::APIRequest* request, VORN::APIResponse* response) {
    const bool late = Param(request, "late").asBool();
    VORN::APIPolling withRequest(request);
    VORN::APIPolling without;
    if (late) {
        without.SetRequest(request);
    }
    VORN::APIPolling& polling = late ? without : withRequest;
    polling.SetGroupAttr(Text(request, "group"));
    polling.SetPrefixAttr(Text(request, "prefix"));
    polling.SetRemoveAttr(Param(request, "remove").asBool());
    polling.Start(response, BodyOf(Text(request, "body")), nullptr);
}

void List(VORN::APIRequest* request, VORN::APIResponse* response) {
    VORN::APIPolling polling(request);
    Json::Value tasks("untouched");
    Json::Value outcome = Outcome(polling.List(Text(request, "prefix"), Param(request, "groups"), tasks), polling);
    outcome["tasks"] = tasks;
    response->SetSuccess(outcome);
}

void Status(VORN::APIRequest* request, VORN::APIResponse* response) {
    VORN::APIPolling polling(request);
    Json::Value status;
    Json::Value outcome = Outcome(polling.Status(Text(request, "id"), status), polling);
    outcome["status"] = status;
    response->SetSuccess(outcome);
}

void Stop(VORN::APIRequest* request, VORN::APIResponse* response) {
    VORN::APIPolling polling(request);
    response->SetSuccess(Outcome(polling.Stop(Text(request, "id"), Param(request, "force").asBool()), polling));
}

void VersionOne(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(1);
}
void VersionTwo(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(2);
}

constexpr VORN::APIEntry kTable[] = {
    {kApi, 1, "show_request", ShowRequest},
    {kApi, 1, "answer", Answer},
    {kApi, 1, "throw", Throw},
    {kApi, 1, "start", Start},
    {kApi, 1, "list", List},
    {kApi, 1, "status", Status},
    {kApi, 1, "stop", Stop},
    {kApi, 1, "version", VersionOne},
    {kApi, 2, "version", VersionTwo},
    {nullptr, 0, nullptr, nullptr},
};

Json::Value Progress(const char* name, const Json::Value& value) {
    Json::Value progress(Json::objectValue);
    progress[name] = value;
    return progress;
}

}  // namespace

const VORN::APIEntry* GetAPITable() {
    return kTable;
}

// Publishes {"step": 1} up to {"step": "steps"}, with a pause of "pause" milliseconds after each.
void ContractSteps(VORN::APIRequest* request, VORN::APIResponse* response, void* userData) {
    const int steps = Param(request, "steps").asInt();
    for (int step = 1; step <= steps; ++step) {
        Json::Value progress = Progress("step", step);
        progress["seen"] = request->HasParam("seen") ? request->GetParam("seen", Json::Value()) : "(none)";
        progress["user_data_is_null"] = userData == nullptr;
        response->SetSuccess(progress);
        Pause(Param(request, "pause").asInt());
    }
}

void ContractFails(VORN::APIRequest*, VORN::APIResponse* response, void*) {
    response->SetSuccess(Progress("status", "updating"));
    response->SetError(2623, Progress("why", "asked to"));
}

void ContractThrows(VORN::APIRequest*, VORN::APIResponse* response, void*) {
    response->SetSuccess(Progress("status", "updating"));
    throw std::runtime_error("thrown by a task of the contract's module");
}

// Stays until it is stopped, with a child that does the same; tells both processes.
void ContractStays(VORN::APIRequest*, VORN::APIResponse* response, void*) {
    const pid_t child = fork();
    if (child == 0) {
        sleep(kForever);
        _exit(0);
    }
    Json::Value progress = Progress("pid", getpid());
    progress["child"] = child;
    response->SetSuccess(progress);
    Pause(kForever * 1000);
}
