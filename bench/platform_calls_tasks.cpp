// The platform's side of the background tasks, the options and the schedule.

#include <string>

#include "bench/cheap_platform.h"
#include "bench/platform_calls.h"
#include "platform/core.h"
#include "platform/domain.h"
#include "platform/scheduler.h"

namespace platform_calls {

namespace {

const Json::Value kNull;
const std::string kPrefix = "DomainUpdate";
const std::string kGroup = "admin";
const std::string kTaskId = "task_id";
const std::string kDomainName = "domain_name";
const std::string kSyncTime = "enable_sync_time";
const std::string kSigning = "enable_server_signing";
const std::string kEnum = "enable_rpc_enum_usergroup";
const std::string kNested = "domain_nested_group";
const std::string kAdmins = "disable_domain_admins";
const char* const kPath = "/a/path";
const char* const kUserPath = "/a/path/of/users";
const char* const kGroupPath = "/a/path/of/groups";

const Json::Value& Groups() {
    static const Json::Value groups = [] {
        Json::Value names(Json::arrayValue);
        names.append(kGroup);
        return names;
    }();
    return groups;
}

void CheckParam(const VORN::APIRequest* request, const std::string& name) {
    request->HasParam(name);
    request->GetParam(name, kNull);
}

bool IsFetching() {
    return VLIBCReadPidFile(kUserPath) >= 0 || VLIBCReadPidFile(kGroupPath) >= 0;
}

void Fetch(int kind) {
    VLIBSZLIST* domains = VLIBCSzListAlloc(1);
    VORNWinsEnumAllDomains(&domains);
    VLIBCReadPidFile(kPath);
    VORNWinGetDomainUGByDomain(kind, domains);
    VLIBCSzListFree(domains);
}

void ReadKey() {
    char value[256];
    VLIBCFileGetKeyValue(kPath, "key", value, sizeof(value), 0);
}

void NoBody(VORN::APIRequest* /*request*/, VORN::APIResponse* /*response*/, void* /*userData*/) {}

// The scheduler calls back for each of its tasks, and the command is the platform's to tell. The module's answer counts
// as the platform's here only in so far as the list needs one.
int PassEvery(_tag_vorn_sched_task_* task) {
    char command[256];
    VORNSchedCTaskGetCommand(command, sizeof(command), task);
    return 1;
}

int FindTask() {
    _tag_vorn_sched_task_* tasks = nullptr;
    VORNSchedTaskListGet(&tasks, PassEvery);
    const int id = VORNSchedTaskGetID(tasks);
    VORNSchedTaskListFree(&tasks);
    return id;
}

}  // namespace

void UpdateStart(VORN::APIRequest* request, VORN::APIResponse* response) {
    VORN::APIPolling polling;
    VLIBCSupportGet("supporttrustdomain");
    CheckParam(request, kDomainName);
    {
        VORN::APIPolling reader(request);
        Json::Value tasks;
        reader.List(kPrefix, Groups(), tasks);
        const int count = cheap::TheState().sizes.tasks;
        for (int i = 0; i < count; ++i) {
            Json::Value status;
            reader.Status(kTaskId, status);
        }
    }
    polling.SetRequest(request);
    polling.SetGroupAttr(kGroup);
    polling.SetRemoveAttr(false);
    polling.SetPrefixAttr(kPrefix);
    VLIBCFileTouch(kPath);
    IsFetching();
    polling.Start(response, NoBody, nullptr);
}

void UpdateStatus(VORN::APIRequest* request, VORN::APIResponse* response) {
    VORN::APIPolling polling(request);
    CheckParam(request, kTaskId);
    request->GetParam(kTaskId, kNull);
    Json::Value status;
    polling.Status(kTaskId, status);
    response->SetSuccess(kNull);
}

void UpdateStop(VORN::APIRequest* request, VORN::APIResponse* response) {
    VORN::APIPolling polling(request);
    Json::Value tasks;
    polling.List(kPrefix, Groups(), tasks);
    const int count = cheap::TheState().sizes.tasks;
    for (int i = 0; i < count; ++i) {
        polling.Stop(kTaskId, true);
    }
    response->SetSuccess(kNull);
}

void Worker(VORN::APIRequest* request, VORN::APIResponse* response) {
    response->SetSuccess(kNull);
    CheckParam(request, kDomainName);
    VORNWinIsEnableTrustDomain();
    VORNWinUpdateAllDomains();
    Fetch(0);
    Fetch(1);
    response->SetSuccess(kNull);
    VLIBCSysRemove(kPath);
}

void Monitor(VORN::APIRequest* /*request*/, VORN::APIResponse* response) {
    response->SetSuccess(kNull);
    IsFetching();
    response->SetSuccess(kNull);
    VLIBCSysRemove(kPath);
}

void OptionsGet(VORN::APIRequest* /*request*/, VORN::APIResponse* response) {
    ReadKey();
    VLIBSZHASH* hash = VLIBCSzHashAlloc(1);
    VLIBCFileGetSection(kPath, "global", &hash);
    VLIBCSzHashGetValue(hash, "server signing");
    VLIBCSzHashGetValue(hash, "enable nt4 enum");
    VLIBCSzHashGetValue(hash, "disable domain admins");
    VLIBCSzHashGetValue(hash, "winbind expand groups");
    VLIBCSzHashFree(hash);
    response->SetSuccess(kNull);
}

void OptionsSet(VORN::APIRequest* request, VORN::APIResponse* response) {
    CheckParam(request, kSyncTime);
    CheckParam(request, kSigning);
    CheckParam(request, kEnum);
    CheckParam(request, kAdmins);
    CheckParam(request, kNested);
    CheckParam(request, kSyncTime);
    ReadKey();
    VORNWinsSetSectionKey("global", "key", "value");
    VLIBSZHASH* hash = VLIBCSzHashAlloc(1);
    VLIBCFileGetSection(kPath, "global", &hash);
    CheckParam(request, kSigning);
    VLIBCSzHashGetValue(hash, "server signing");
    VLIBCSzHashRemoveKey(hash, "server signing");
    CheckParam(request, kEnum);
    VLIBCSzHashGetValue(hash, "enable nt4 enum");
    VLIBCSzHashSetValue(&hash, "enable nt4 enum", "yes");
    CheckParam(request, kNested);
    VLIBCSzHashGetValue(hash, "winbind expand groups");
    VLIBCSzHashSetValue(&hash, "winbind expand groups", "3");
    CheckParam(request, kAdmins);
    VORNWinsIsJoined();
    VLIBCSzHashGetValue(hash, "disable domain admins");
    VLIBCSzHashSetValue(&hash, "disable domain admins", "yes");
    VLIBCFileExist(kPath);
    VLIBCFileAddSection(kPath, "global", hash, "%s=%s");
    VLIBCSysRename(kPath, kPath);
    VORNGroupAddDomainAdminGroup();
    VLIBServiceTypeReload(8);
    VLIBServiceReload("samba");
    VLIBServiceReload("nmbd");
    VLIBServiceReload("winbindd");
    VLIBCSzHashFree(hash);
    response->SetSuccess(kNull);
}

void ScheduleGet(VORN::APIRequest* /*request*/, VORN::APIResponse* response) {
    _tag_vorn_sched_task_* task = VORNSchedTaskAlloc();
    VORNSchedTaskLoad(FindTask(), task);
    {
        Json::Value value;
        VORNSchedTaskConvertToJson_Schedule(task, value);
    }
    VORNSchedTaskFree(task);
    response->SetSuccess(kNull);
}

void ScheduleSet(VORN::APIRequest* request, VORN::APIResponse* response) {
    static const std::string names[] = {"date_type", "date",   "hour",        "last_work_hour",
                                        "min",       "repeat", "repeat_hour", "week_name"};
    CheckParam(request, names[0]);
    request->GetParam(names[0], kNull);
    CheckParam(request, names[2]);
    CheckParam(request, names[4]);
    CheckParam(request, names[7]);
    request->HasParam(names[6]);
    request->HasParam(names[3]);
    VORNWinsIsJoined();
    for (const std::string& name : names) {
        request->GetParam(name, kNull);
    }
    _tag_vorn_sched_task_* task = VORNSchedTaskAlloc();
    VORNSchedTaskLoad(FindTask(), task);
    VORNSchedTaskConvertFromJson_Schedule(kNull, task);
    VORNSchedCTaskSetListable(task, false);
    VORNSchedCTaskSetCommand(task, "command");
    VORNSchedTaskSave(task);
    VORNSchedTaskFree(task);
    response->SetSuccess(kNull);
}

void ScheduleRemove(VORN::APIRequest* request, VORN::APIResponse* response) {
    static const std::string names[] = {"date_type", "date",   "hour",        "last_work_hour",
                                        "min",       "repeat", "repeat_hour", "week_name"};
    CheckParam(request, names[0]);
    request->GetParam(names[0], kNull);
    request->HasParam(names[6]);
    request->HasParam(names[3]);
    VORNWinsIsJoined();
    for (const std::string& name : names) {
        request->GetParam(name, kNull);
    }
    VORNSchedTaskRemove(FindTask());
    response->SetSuccess(kNull);
}

}  // namespace platform_calls
