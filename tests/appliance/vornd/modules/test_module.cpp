// A module for tests: methods that do one thing each, and bodies of background tasks.

#include <signal.h>
#include <stdlib.h>
#include <sys/syscall.h>
#include <syslog.h>
#include <unistd.h>

#include <chrono>
#include <fstream>
#include <stdexcept>
#include <string>
#include <thread>

#include "platform/webapi.h"

#define TEST_EXPORT extern "C" __attribute__((visibility("default")))

namespace {

constexpr const char* kApi = "Test.Plain";
constexpr const char* kVersions = "Test.Versions";

void Pause(int milliseconds) {
    std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
}

Json::Value Number(const char* name, int number) {
    Json::Value value(Json::objectValue);
    value[name] = number;
    return value;
}

void AppendPid(const std::string& file, int pid) {
    std::ofstream(file, std::ios::app) << pid << "\n";
}

// Forks a process that waits for ever; with `ownGroup` in a process group of its own.
void ForkSleeper(const std::string& file, bool ownGroup) {
    const pid_t pid = fork();
    if (pid == 0) {
        if (ownGroup) {
            setpgid(0, 0);
        }
        for (;;) {
            pause();
        }
    }
    AppendPid(file, pid);
}

// ---- methods ----

void Nothing(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(Json::Value());
}

void Echo(VORN::APIRequest* request, VORN::APIResponse* response) {
    Json::Value data(Json::objectValue);
    data["has"] = request->HasParam("value");
    data["value"] = request->GetParam("value", "fallback");
    response->SetSuccess(data);
}

void Sleep(VORN::APIRequest* request, VORN::APIResponse* response) {
    const std::string file = request->GetParam("file", "").asString();
    if (!file.empty()) {
        AppendPid(file, getpid());
    }
    Pause(request->GetParam("milliseconds", 0).asInt());
    response->SetSuccess(Json::Value("slept"));
}

void Throw(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(Json::Value("never seen"));
    throw std::runtime_error("thrown on purpose");
}

void ThrowNumber(VORN::APIRequest*, VORN::APIResponse*) {
    throw 42;
}

void Silent(VORN::APIRequest*, VORN::APIResponse*) {}

void Fail(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(Json::Value("replaced"));
    response->SetError(2607, Number("detail", 7));
}

// As the module of the appliance logs.
void LogLine(VORN::APIRequest* request, VORN::APIResponse* response) {
    syslog(LOG_ERR, "%s", request->GetParam("line", "").asString().c_str());
    response->SetSuccess(Json::Value());
}

// The descriptors that a program would inherit that this process starts.
void Inherited(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(Json::Value(system("test $(ls /proc/self/fd | wc -l) -le 4")));
}

template <int version>
void Version(VORN::APIRequest*, VORN::APIResponse* response) {
    response->SetSuccess(Json::Value(version));
}

}  // namespace

// ---- bodies of tasks ----

TEST_EXPORT void TaskSteps(VORN::APIRequest* request, VORN::APIResponse* response, void*) {
    const int steps = request->GetParam("steps", 1).asInt();
    Pause(request->GetParam("delay", 0).asInt());
    for (int step = 1; step <= steps; ++step) {
        response->SetSuccess(Number("step", step));
        Pause(request->GetParam("pause", 0).asInt());
    }
}

TEST_EXPORT void TaskShowRequest(VORN::APIRequest* request, VORN::APIResponse* response, void* userData) {
    Json::Value data(Json::objectValue);
    for (const char* name : {"kept", "password", "nested"}) {
        data["has"][name] = request->HasParam(name);
        data["value"][name] = request->GetParam(name, Json::Value());
    }
    data["null_user_data"] = userData == nullptr;
    data["leads_group"] = getpgrp() == getpid();
    data["leads_session"] = getsid(0) == getpid();
    data["descriptors"] = static_cast<int>(syscall(SYS_close_range, 100, ~0U, 0));
    response->SetSuccess(data);
}

TEST_EXPORT void TaskWait(VORN::APIRequest*, VORN::APIResponse* response, void*) {
    response->SetSuccess(Number("pid", getpid()));
    for (;;) {
        pause();
    }
}

// As TaskWait, but it takes SIGKILL to end it, and it has children in its group and in a group of their own.
TEST_EXPORT void TaskFamily(VORN::APIRequest* request, VORN::APIResponse* response, void*) {
    signal(SIGTERM, SIG_IGN);
    const std::string file = request->GetParam("file", "").asString();
    ForkSleeper(file, false);
    ForkSleeper(file, true);
    response->SetSuccess(Number("pid", getpid()));
    for (;;) {
        pause();
    }
}

TEST_EXPORT void TaskThrow(VORN::APIRequest*, VORN::APIResponse* response, void*) {
    response->SetSuccess(Number("step", 1));
    throw std::runtime_error("thrown on purpose");
}

TEST_EXPORT void TaskError(VORN::APIRequest*, VORN::APIResponse* response, void*) {
    response->SetSuccess(Number("step", 1));
    response->SetError(2623, Json::Value("why"));
}

TEST_EXPORT void TaskErrorThenSuccess(VORN::APIRequest*, VORN::APIResponse* response, void*) {
    response->SetError(2623, Json::Value());
    response->SetSuccess(Json::Value());
}

TEST_EXPORT void TaskSilent(VORN::APIRequest*, VORN::APIResponse*, void*) {}

TEST_EXPORT void TaskExit(VORN::APIRequest*, VORN::APIResponse* response, void*) {
    response->SetSuccess(Number("step", 1));
    _exit(0);
}

namespace {

VORN::APITaskFunction BodyOf(const std::string& name) {
    if (name == "steps") {
        return TaskSteps;
    }
    if (name == "family") {
        return TaskFamily;
    }
    return name == "wait" ? TaskWait : nullptr;
}

void Start(VORN::APIRequest* request, VORN::APIResponse* response) {
    VORN::APIPolling polling(request);
    polling.SetGroupAttr("admin");
    polling.SetPrefixAttr("Test");
    polling.Start(response, BodyOf(request->GetParam("body", "").asString()), nullptr);
}

void Status(VORN::APIRequest* request, VORN::APIResponse* response) {
    VORN::APIPolling polling(request);
    Json::Value status;
    if (polling.Status(request->GetParam("id", "").asString(), status)) {
        response->SetSuccess(status);
    } else {
        response->SetError(117, polling.GetError());
    }
}

void Stop(VORN::APIRequest* request, VORN::APIResponse* response) {
    VORN::APIPolling polling(request);
    response->SetSuccess(polling.Stop(request->GetParam("id", "").asString(), true));
}

}  // namespace

extern __attribute__((visibility("default"))) const VORN::APIEntry gTable[];
const VORN::APIEntry gTable[] = {
    {kApi, 1, "nothing", Nothing},
    {kApi, 1, "echo", Echo},
    {kApi, 1, "sleep", Sleep},
    {kApi, 1, "throw", Throw},
    {kApi, 1, "throw_number", ThrowNumber},
    {kApi, 1, "silent", Silent},
    {kApi, 1, "fail", Fail},
    {kApi, 1, "inherited", Inherited},
    {kApi, 1, "log", LogLine},
    {kApi, 1, "start", Start},
    {kApi, 1, "status", Status},
    {kApi, 1, "stop", Stop},
    {kVersions, 2, "method", Version<2>},
    {kVersions, 4, "method", Version<4>},
    {nullptr, 0, nullptr, nullptr},
};

__attribute__((visibility("default"))) const VORN::APIEntry* GetAPITable();
const VORN::APIEntry* GetAPITable() {
    return gTable;
}
