// The cheap platform: membership, domains, the network, the scheduler, the event log, capabilities and settings.

#include "bench/cheap_platform.h"
#include "platform/domain.h"
#include "platform/eventlog.h"
#include "platform/network.h"
#include "platform/scheduler.h"
#include "platform/settings.h"

using cheap::Fill;
using cheap::TheState;

struct _tag_vorn_sched_task_ {
    int id;
};

namespace cheap {

// In cheap_platform_core.cpp.
void ShareEntries(VLIBSZLIST* list, const std::vector<const char*>& entries);

}  // namespace cheap

namespace {

_tag_vorn_sched_task_ shownTask{};   // the one that a filter looks at, then the list's
_tag_vorn_sched_task_ loadedTask{};  // the one record that an operation allocates

}  // namespace

extern "C" {

int WINIQuery1(char* name, int /*size*/, int* first, int* second) {
    NOTE_CALL("WINIQuery1");
    const int member = TheState().answers.member ? 1 : 0;
    Fill(name, "LAB");
    *first = member;
    if (second != nullptr) {
        *second = member;
    }
    return 0;
}

int ErrWINIState1Get(char* key, int /*keySize*/, char* message, int /*messageSize*/) {
    NOTE_CALL("ErrWINIState1Get");
    Fill(key, "join");
    Fill(message, "The username or password was not correct.");
    return 0;
}

int VORNWinJoin1(_tag_VORN_WIN2_* record) {
    NOTE_CALL("VORNWinJoin1");
    return record->joinMode == 0 ? 0 : TheState().answers.joinResult;
}

int VORNWinTestJoin(int /*ads*/) {
    NOTE_CALL("VORNWinTestJoin");
    return 0;
}

int VORNWinADSJoined() {
    NOTE_CALL("VORNWinADSJoined");
    return 1;
}

int VORNWinIsEnableTrustDomain() {
    NOTE_CALL("VORNWinIsEnableTrustDomain");
    return TheState().answers.trusts ? 1 : 0;
}

int VORNWinSetTrustDomain(int /*setting*/) {
    NOTE_CALL("VORNWinSetTrustDomain");
    return 0;
}

int VORNWinsEnumAllDomains(VLIBSZLIST** domains) {
    NOTE_CALL("VORNWinsEnumAllDomains");
    cheap::ShareEntries(*domains, TheState().domains);
    return 0;
}

int VORNWinsEnumOU(VLIBSZLIST** names, VLIBSZLIST** values) {
    NOTE_CALL("VORNWinsEnumOU");
    cheap::ShareEntries(*names, TheState().units);
    cheap::ShareEntries(*values, TheState().unitValues);
    return 0;
}

int VORNWinsGetDomainFQDN(const char* /*domain*/, char* fqdn, int /*size*/) {
    NOTE_CALL("VORNWinsGetDomainFQDN");
    Fill(fqdn, "domain.example.test");
    return 0;
}

int VORNWinsIsJoined() {
    NOTE_CALL("VORNWinsIsJoined");
    return TheState().answers.member ? 1 : 0;
}

int VORNWinsIsOwnDomain(const char* /*domain*/) {
    NOTE_CALL("VORNWinsIsOwnDomain");
    return 1;
}

int VORNWinsSetSectionKey(const char* /*section*/, const char* /*key*/, const char* /*value*/) {
    NOTE_CALL("VORNWinsSetSectionKey");
    return 0;
}

int VORNWinUpdateAllDomains() {
    NOTE_CALL("VORNWinUpdateAllDomains");
    return 0;
}

int VORNWinUpdateOU() {
    NOTE_CALL("VORNWinUpdateOU");
    return 0;
}

int VORNWinGetDomainUGByDomain(int /*kind*/, VLIBSZLIST* /*domains*/) {
    NOTE_CALL("VORNWinGetDomainUGByDomain");
    return 0;
}

int VORNWorkgroupGet(char* workgroup, int /*size*/) {
    NOTE_CALL("VORNWorkgroupGet");
    Fill(workgroup, "LAB");
    return 0;
}

int VORNLDAPIsBinded(int /*flags*/) {
    NOTE_CALL("VORNLDAPIsBinded");
    return 0;
}

int VORNGroupAddDomainAdminGroup() {
    NOTE_CALL("VORNGroupAddDomainAdminGroup");
    return 0;
}

int VORNDomainUserHomeInclude(int /*include*/) {
    NOTE_CALL("VORNDomainUserHomeInclude");
    return 0;
}

int VORNLogSet1(int /*kind*/, int /*level*/, int /*event*/, const char* /*arg1*/, const char* /*arg2*/,
                const char* /*arg3*/, const char* /*arg4*/) {
    NOTE_CALL("VORNLogSet1");
    return 0;
}

int VORNNetDNSListGet(VLIBSZLIST** servers) {
    NOTE_CALL("VORNNetDNSListGet");
    cheap::ShareEntries(*servers, TheState().dnsServers);
    return 0;
}

int VORNNetDNSListSet(VLIBSZLIST* /*servers*/) {
    NOTE_CALL("VORNNetDNSListSet");
    return 0;
}

int VORNSchedTaskListGet(_tag_vorn_sched_task_** list, VORNSchedTaskFilter filter) {
    NOTE_CALL("VORNSchedTaskListGet");
    const int count = TheState().sizes.scheduled;
    for (int id = 0; id < count; ++id) {
        shownTask.id = id;
        if (filter(&shownTask) != 0) {
            *list = &shownTask;
        }
    }
    return 0;
}

void VORNSchedTaskListFree(_tag_vorn_sched_task_** list) {
    NOTE_CALL("VORNSchedTaskListFree");
    *list = nullptr;
}

int VORNSchedTaskGetID(const _tag_vorn_sched_task_* task) {
    NOTE_CALL("VORNSchedTaskGetID");
    return task->id;
}

_tag_vorn_sched_task_* VORNSchedTaskAlloc() {
    NOTE_CALL("VORNSchedTaskAlloc");
    return &loadedTask;
}

int VORNSchedTaskLoad(int id, _tag_vorn_sched_task_* task) {
    NOTE_CALL("VORNSchedTaskLoad");
    task->id = id;
    return 0;
}

int VORNSchedTaskSave(_tag_vorn_sched_task_* /*task*/) {
    NOTE_CALL("VORNSchedTaskSave");
    return 0;
}

int VORNSchedTaskRemove(int /*id*/) {
    NOTE_CALL("VORNSchedTaskRemove");
    return 0;
}

void VORNSchedTaskFree(_tag_vorn_sched_task_* /*task*/) {
    NOTE_CALL("VORNSchedTaskFree");
}

int VORNSchedCTaskGetCommand(char* command, int /*size*/, const _tag_vorn_sched_task_* task) {
    NOTE_CALL("VORNSchedCTaskGetCommand");
    const bool own = task->id == TheState().sizes.scheduled - 1;
    Fill(command, own ? "/usr/vorn/sbin/vornwin -updateDomain" : "/usr/vorn/sbin/vornwin -somethingElse");
    return 0;
}

int VORNSchedCTaskSetCommand(_tag_vorn_sched_task_* /*task*/, const char* /*command*/) {
    NOTE_CALL("VORNSchedCTaskSetCommand");
    return 0;
}

void VORNSchedCTaskSetListable(_tag_vorn_sched_task_* /*task*/, bool /*listable*/) {
    NOTE_CALL("VORNSchedCTaskSetListable");
}

bool VORNSchedTaskConvertFromJson_Schedule(const Json::Value& /*value*/, _tag_vorn_sched_task_* /*task*/) {
    NOTE_CALL("VORNSchedTaskConvertFromJson_Schedule");
    return true;
}

bool VORNSchedTaskConvertToJson_Schedule(const _tag_vorn_sched_task_* /*task*/, Json::Value& value) {
    NOTE_CALL("VORNSchedTaskConvertToJson_Schedule");
    value = TheState().schedule;
    return true;
}

}  // extern "C"

class VornConf::Impl {};

VornConf::VornConf() {
    NOTE_CALL("VornConf::VornConf");
}

VornConf::~VornConf() {
    NOTE_CALL("VornConf::~VornConf");
}

const char* VornConf::Def(const char* /*key*/, const char* /*fallback*/) {
    NOTE_CALL("VornConf::Def");
    return "yes";
}

const char* VornConf::Info(const char* /*key*/, const char* /*fallback*/) {
    NOTE_CALL("VornConf::Info");
    return "yes";
}
