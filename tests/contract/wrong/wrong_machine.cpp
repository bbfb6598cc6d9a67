
#include "platform/core.h"
#include "platform/domain.h"
#include "platform/eventlog.h"
#include "platform/network.h"
#include "platform/scheduler.h"
#include "wrong.h"

namespace {

using Task = _tag_vorn_sched_task_;

int AllTasks(Task*) {
    return 1;
}

}  // namespace

extern "C" {

// ---- Locks and services ----

int VLIBCFileLock(int word, int seconds) {
    if (IsWrong("lock is always free")) {
        return 0;
    }
    if (IsWrong("lock waits too long") && seconds > 0) {
        return REAL(VLIBCFileLock)(word, 6);
    }
    return REAL(VLIBCFileLock)(word, IsWrong("lock does not wait") ? 0 : seconds);
}

int VLIBCFileUnlock(int word) {
    if (IsWrong("unlock keeps the lock")) {
        return 0;
    }
    return IsWrong("unlock looks at the lowest byte") && word != 0x800 ? -1 : REAL(VLIBCFileUnlock)(word);
}

int VLIBServiceReload(const char* service) {
    return IsWrong("any service is reloaded") ? 0 : REAL(VLIBServiceReload)(service);
}

int VLIBServiceRestart(const char* service) {
    return IsWrong("any service is restarted") ? 0 : REAL(VLIBServiceRestart)(service);
}

int VLIBServiceIsEnabled(const char* service) {
    return IsWrong("any service is enabled") ? 1 : REAL(VLIBServiceIsEnabled)(service);
}

// ---- Network, events ----

int VORNNetDNSListSet(VLIBSZLIST* servers) {
    if (!IsWrong("DNS servers are turned round")) {
        return REAL(VORNNetDNSListSet)(servers);
    }
    VLIBSZLIST* turned = VLIBCSzListAlloc(1);
    for (int index = servers->count; index-- > 0;) {
        VLIBCSzListPush(&turned, VLIBCSzListGet(servers, index));
    }
    const int result = REAL(VORNNetDNSListSet)(turned);
    VLIBCSzListFree(turned);
    return result;
}

int VORNNetDNSListGet(VLIBSZLIST** servers) {
    if (IsWrong("DNS servers replace the list")) {
        VLIBCSzListFree(*servers);
        *servers = VLIBCSzListAlloc(1);
    }
    return REAL(VORNNetDNSListGet)(servers);
}

int VORNLogSet1(int kind, int level, int event, const char* arg1, const char* arg2, const char* arg3,
                const char* arg4) {
    const bool refused = IsWrong("long events are refused") && std::strlen(arg1) > 1000;
    return refused ? -1 : REAL(VORNLogSet1)(kind, level, event, arg1, arg2, arg3, arg4);
}

// ---- Membership ----

int WINIQuery1(char* name, int size, int* first, int* second) {
    const int result = REAL(WINIQuery1)(name, size, first, second);
    if (IsWrong("query says member") && second != nullptr) {
        *second = 1;
    }
    return IsWrong("query needs both flags") && second == nullptr ? -1 : result;
}

int ErrWINIState1Get(char* key, int keySize, char* message, int messageSize) {
    const int result = REAL(ErrWINIState1Get)(key, keySize, message, messageSize);
    return IsWrong("there is always a status") ? 0 : result;
}

int VORNWinJoin1(_tag_VORN_WIN2_* record) {
    if (IsWrong("a join leaves no status")) {
        return -1;
    }
    if (IsWrong("a join never fails")) {
        return 0;
    }
    return REAL(VORNWinJoin1)(record);
}

int VORNWinTestJoin(int ads) {
    return IsWrong("a test works without a membership") ? 0 : REAL(VORNWinTestJoin)(ads);
}

int VORNWinSetTrustDomain(int setting) {
    return REAL(VORNWinSetTrustDomain)(IsWrong("the trust switch is turned round") ? 1 - setting : setting);
}

int VORNWinsEnumAllDomains(VLIBSZLIST** domains) {
    if (IsWrong("the workgroup is a domain")) {
        return VLIBCSzListPush(domains, "WORKGROUP");
    }
    return REAL(VORNWinsEnumAllDomains)(domains);
}

int VORNWinGetDomainUGByDomain(int kind, VLIBSZLIST* domains) {
    return IsWrong("nobody's users are fetched") ? 0 : REAL(VORNWinGetDomainUGByDomain)(kind, domains);
}

int VORNWinsSetSectionKey(const char* section, const char* key, const char* value) {
    return IsWrong("the main configuration stays") ? 0 : REAL(VORNWinsSetSectionKey)(section, key, value);
}

// ---- Scheduled tasks ----

int VORNSchedTaskListGet(Task** list, VORNSchedTaskFilter filter) {
    return REAL(VORNSchedTaskListGet)(list, IsWrong("the filter is not asked") ? AllTasks : filter);
}

int VORNSchedTaskGetID(const Task* task) {
    const int id = REAL(VORNSchedTaskGetID)(task);
    return IsWrong("a new task has an id") && id < 0 ? 0 : id;
}

int VORNSchedTaskLoad(int id, Task* task) {
    return IsWrong("a new task keeps the old record") && id == -1 ? 0 : REAL(VORNSchedTaskLoad)(id, task);
}

int VORNSchedTaskRemove(int id) {
    const int result = REAL(VORNSchedTaskRemove)(id);
    return IsWrong("removing never fails") ? 0 : result;
}

int VORNSchedCTaskGetCommand(char* command, int size, const Task* task) {
    if (IsWrong("a long command fails") && size < 20) {
        return -1;
    }
    return REAL(VORNSchedCTaskGetCommand)(command, size, task);
}

bool VORNSchedTaskConvertFromJson_Schedule(const Json::Value& value, Task* task) {
    const bool done = REAL(VORNSchedTaskConvertFromJson_Schedule)(value, task);
    return IsWrong("any time can be") || done;
}

bool VORNSchedTaskConvertToJson_Schedule(const Task* task, Json::Value& value) {
    const bool done = REAL(VORNSchedTaskConvertToJson_Schedule)(task, value);
    if (IsWrong("numbers are texts") && done) {
        value["schedule"]["hour"] = value["schedule"]["hour"].asString();
    }
    if (IsWrong("a schedule lacks a value") && done) {
        value["schedule"].removeMember("last_work_hour");
    }
    return done;
}

}  // extern "C"
