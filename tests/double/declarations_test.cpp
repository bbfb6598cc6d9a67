// Each declared operation is there, is recorded under its name, and shows each fault of the table.

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <functional>
#include <map>
#include <set>
#include <string>

#include "platform/core.h"
#include "platform/domain.h"
#include "platform/eventlog.h"
#include "platform/network.h"
#include "platform/scheduler.h"
#include "platform/settings.h"
#include "platform/webapi.h"
#include "platform/webutils.h"
#include "tests/double/appliance.h"

namespace {

using fake::TheAppliance;

std::string Text(int result) {
    return std::to_string(result);
}

std::string Text(bool result) {
    return result ? "true" : "false";
}

std::string Text(const void* result) {
    return result == nullptr ? "null" : "pointer";
}

// What the operations are tried on. Its own calls precede the one under test and carry other names, or are undone.
struct Bench {
    Bench() : record() {
        record.domainName = "D";
        record.userName = "u";
        record.password = "p";
        request.SetRequest(&exchange.request);
    }
    ~Bench() {
        VLIBCSzListFree(list);
        VLIBCSzListFree(second);
        VLIBCSzHashFree(hash);
        VORNSchedTaskFree(task);
    }
    Bench(const Bench&) = delete;
    Bench& operator=(const Bench&) = delete;

    VLIBSZLIST* list = VLIBCSzListAlloc(1);
    VLIBSZLIST* second = VLIBCSzListAlloc(1);
    VLIBSZHASH* hash = VLIBCSzHashAlloc(1);
    _tag_vorn_sched_task_* task = VORNSchedTaskAlloc();
    _tag_vorn_sched_task_* tasks = nullptr;
    _tag_VORN_WIN2_ record;
    fake::Exchange exchange;
    VORN::APIPolling request;
    VornConf conf;
    Json::Value json = Json::Value(Json::objectValue);
    char buffer[32] = {};
    int number = 0;
};

int Filter(_tag_vorn_sched_task_*) {
    return 0;
}

void Body(VORN::APIRequest*, VORN::APIResponse*, void*) {}

using Operation = std::function<std::string(Bench&)>;

const std::map<std::string, Operation>& CoreOperations() {
    static const std::map<std::string, Operation> operations = {
        {"VLIBCSzListPush", [](Bench& b) { return Text(VLIBCSzListPush(&b.list, "x")); }},
        {"VLIBCSzListGet", [](Bench& b) { return Text(VLIBCSzListGet(b.list, 0)); }},
        {"VLIBCSzHashGetValue", [](Bench& b) { return Text(VLIBCSzHashGetValue(b.hash, "k")); }},
        {"VLIBCSzHashSetValue", [](Bench& b) { return Text(VLIBCSzHashSetValue(&b.hash, "k", "v")); }},
        {"VLIBCSzHashRemoveKey", [](Bench& b) { return Text(VLIBCSzHashRemoveKey(b.hash, "k")); }},
        {"VLIBCFileGetKeyValue",
         [](Bench& b) { return Text(VLIBCFileGetKeyValue("/kv", "k", b.buffer, sizeof b.buffer, 0)); }},
        {"VLIBCFileGetSection", [](Bench& b) { return Text(VLIBCFileGetSection("/kv", "global", &b.hash)); }},
        {"VLIBCFileAddSection", [](Bench& b) { return Text(VLIBCFileAddSection("/kv", "global", b.hash, "%s=%s\n")); }},
        {"VLIBCFileRemoveKey", [](Bench&) { return Text(VLIBCFileRemoveKey("/kv", "k")); }},
        {"VLIBCFileITmpName", [](Bench& b) { return Text(VLIBCFileITmpName("/kv", b.buffer, sizeof b.buffer)); }},
        {"VLIBCFileExist", [](Bench&) { return Text(VLIBCFileExist("/file")); }},
        {"VLIBCFileTouch", [](Bench&) { return Text(VLIBCFileTouch("/file")); }},
        {"VLIBCFileLock", [](Bench&) { return Text(VLIBCFileLock(0x101, 1)); }},
        {"VLIBCFileUnlock", [](Bench&) { return Text(VLIBCFileUnlock(0x202)); }},
        {"VLIBCSysRename", [](Bench&) { return Text(VLIBCSysRename("/file", "/other")); }},
        {"VLIBCSysRemove", [](Bench&) { return Text(VLIBCSysRemove("/file")); }},
        {"VLIBCReadPidFile", [](Bench&) { return Text(VLIBCReadPidFile("/pid")); }},
        {"VLIBServiceReload", [](Bench&) { return Text(VLIBServiceReload("s")); }},
        {"VLIBServiceRestart", [](Bench&) { return Text(VLIBServiceRestart("s")); }},
        {"VLIBServiceTypeReload", [](Bench&) { return Text(VLIBServiceTypeReload(1)); }},
        {"VLIBServiceIsEnabled", [](Bench&) { return Text(VLIBServiceIsEnabled("s")); }},
        {"VLIBCSupportGet", [](Bench&) { return Text(VLIBCSupportGet("supporttrustdomain")); }},
        {"BlVLIBIsIpAddr", [](Bench&) { return Text(BlVLIBIsIpAddr("10.0.0.1")); }},
        {"BlVLIBIsv6IpAddrValid", [](Bench&) { return Text(BlVLIBIsv6IpAddrValid("::1")); }},
        {"VORNLogSet1", [](Bench&) { return Text(VORNLogSet1(1, 1, 1, "", "", "", "")); }},
        {"VORNNetDNSListGet", [](Bench& b) { return Text(VORNNetDNSListGet(&b.list)); }},
        {"VORNNetDNSListSet", [](Bench& b) { return Text(VORNNetDNSListSet(b.list)); }},
        {"system", [](Bench&) { return Text(system("true")); }},
        {"sleep", [](Bench&) { return Text(static_cast<int>(sleep(1))); }},
        {"access", [](Bench&) { return Text(access("/file", F_OK)); }},
        {"unlink", [](Bench&) { return Text(unlink("/file")); }},
    };
    return operations;
}

const std::map<std::string, Operation>& DomainOperations() {
    static const std::map<std::string, Operation> operations = {
        {"WINIQuery1", [](Bench& b) { return Text(WINIQuery1(b.buffer, sizeof b.buffer, &b.number, nullptr)); }},
        {"ErrWINIState1Get", [](Bench& b) { return Text(ErrWINIState1Get(b.buffer, 8, b.buffer + 8, 8)); }},
        {"VORNWinJoin1", [](Bench& b) { return Text(VORNWinJoin1(&b.record)); }},
        {"VORNWinTestJoin", [](Bench&) { return Text(VORNWinTestJoin(1)); }},
        {"VORNWinADSJoined", [](Bench&) { return Text(VORNWinADSJoined()); }},
        {"VORNWinIsEnableTrustDomain", [](Bench&) { return Text(VORNWinIsEnableTrustDomain()); }},
        {"VORNWinSetTrustDomain", [](Bench&) { return Text(VORNWinSetTrustDomain(1)); }},
        {"VORNWinsEnumAllDomains", [](Bench& b) { return Text(VORNWinsEnumAllDomains(&b.list)); }},
        {"VORNWinsEnumOU", [](Bench& b) { return Text(VORNWinsEnumOU(&b.list, &b.second)); }},
        {"VORNWinsGetDomainFQDN", [](Bench& b) { return Text(VORNWinsGetDomainFQDN("D", b.buffer, sizeof b.buffer)); }},
        {"VORNWinsIsJoined", [](Bench&) { return Text(VORNWinsIsJoined()); }},
        {"VORNWinsIsOwnDomain", [](Bench&) { return Text(VORNWinsIsOwnDomain("D")); }},
        {"VORNWinsSetSectionKey", [](Bench&) { return Text(VORNWinsSetSectionKey("global", "k", "v")); }},
        {"VORNWinUpdateAllDomains", [](Bench&) { return Text(VORNWinUpdateAllDomains()); }},
        {"VORNWinUpdateOU", [](Bench&) { return Text(VORNWinUpdateOU()); }},
        {"VORNWinGetDomainUGByDomain", [](Bench& b) { return Text(VORNWinGetDomainUGByDomain(0, b.list)); }},
        {"VORNWorkgroupGet", [](Bench& b) { return Text(VORNWorkgroupGet(b.buffer, sizeof b.buffer)); }},
        {"VORNLDAPIsBinded", [](Bench&) { return Text(VORNLDAPIsBinded(0)); }},
        {"VORNGroupAddDomainAdminGroup", [](Bench&) { return Text(VORNGroupAddDomainAdminGroup()); }},
        {"VORNDomainUserHomeInclude", [](Bench&) { return Text(VORNDomainUserHomeInclude(1)); }},
        {"VORNSchedTaskListGet", [](Bench& b) { return Text(VORNSchedTaskListGet(&b.tasks, Filter)); }},
        {"VORNSchedTaskGetID", [](Bench& b) { return Text(VORNSchedTaskGetID(b.task)); }},
        {"VORNSchedTaskLoad", [](Bench& b) { return Text(VORNSchedTaskLoad(-1, b.task)); }},
        {"VORNSchedTaskSave",
         [](Bench& b) {
             VORNSchedTaskLoad(-1, b.task);
             return Text(VORNSchedTaskSave(b.task));
         }},
        {"VORNSchedTaskRemove", [](Bench&) { return Text(VORNSchedTaskRemove(1)); }},
        {"VORNSchedCTaskGetCommand",
         [](Bench& b) { return Text(VORNSchedCTaskGetCommand(b.buffer, sizeof b.buffer, b.task)); }},
        {"VORNSchedCTaskSetCommand", [](Bench& b) { return Text(VORNSchedCTaskSetCommand(b.task, "c")); }},
        {"VORNSchedTaskConvertFromJson_Schedule",
         [](Bench& b) {
             b.json["schedule"] = Json::Value(Json::objectValue);
             return Text(VORNSchedTaskConvertFromJson_Schedule(b.json, b.task));
         }},
        {"VORNSchedTaskConvertToJson_Schedule",
         [](Bench& b) { return Text(VORNSchedTaskConvertToJson_Schedule(b.task, b.json)); }},
    };
    return operations;
}

// Calls whose objects have to be given back, and those of classes.
const std::map<std::string, Operation>& ObjectOperations() {
    static const std::map<std::string, Operation> operations = {
        {"VornConf::Def", [](Bench& b) { return Text(*b.conf.Def("k", "1") == '1'); }},
        {"VornConf::Info", [](Bench& b) { return Text(*b.conf.Info("k", "1") == '1'); }},
        {"VORN::APIRequest::HasParam", [](Bench& b) { return Text(b.exchange.request.HasParam("x")); }},
        {"VORN::APIRequest::GetParam", [](Bench& b) { return Text(b.exchange.request.GetParam("x", 1).asInt()); }},
        {"VORN::APIResponse::SetSuccess", [](Bench& b) { return b.exchange.response.SetSuccess(b.json), ""; }},
        {"VORN::APIResponse::SetError", [](Bench& b) { return b.exchange.response.SetError(1, b.json), ""; }},
        {"VORN::APIPolling::SetGroupAttr", [](Bench& b) { return b.request.SetGroupAttr("g"), ""; }},
        {"VORN::APIPolling::SetPrefixAttr", [](Bench& b) { return b.request.SetPrefixAttr("p"), ""; }},
        {"VORN::APIPolling::Start",
         [](Bench& b) { return Text(b.request.Start(&b.exchange.response, Body, nullptr)); }},
        {"VORN::APIPolling::List",
         [](Bench& b) { return Text(b.request.List("p", Json::Value(Json::arrayValue), b.json)); }},
        {"VORN::APIPolling::Status", [](Bench& b) { return Text(b.request.Status("task", b.json)); }},
        {"VORN::APIPolling::Stop", [](Bench& b) { return Text(b.request.Stop("task", true)); }},
        {"WebUtils::StringExplode", [](Bench&) { return Text(WebUtils::StringExplode("a b", " ").size() == 2); }},
        {"WebUtils::StringImplode",
         [](Bench&) {
             return WebUtils::StringImplode({"a", "b"}, " ");
         }},
    };
    return operations;
}

const Operation* FindOperation(const std::string& function) {
    for (const auto* operations : {&CoreOperations(), &DomainOperations(), &ObjectOperations()}) {
        const auto found = operations->find(function);
        if (found != operations->end()) {
            return &found->second;
        }
    }
    return nullptr;
}

class Declarations : public testing::Test {
protected:
    void Prepare() {
        TheAppliance().Reset();
        fake::State& state = TheAppliance().state;
        state.files = {"/file"};
        state.keyValueFiles["/kv"]["global"] = {{"k", "v"}};
        state.pidFiles["/pid"] = 4711;
        state.heldLocks = {0x200};
        state.scheduledTasks.push_back({1, "c", true, Json::Value(Json::objectValue)});
        state.tasks.push_back({"task", "g", "t", Json::Value(Json::objectValue), false});
    }

    ~Declarations() override {
        TheAppliance().Reset();
    }
};

TEST_F(Declarations, ShowEachFault) {
    int tried = 0;
    for (const fake::FunctionFailures& row : fake::Failures()) {
        const Operation* operation = FindOperation(row.function);
        for (const fake::FailureValue& value : row.values) {
            SCOPED_TRACE(row.function + " " + value.fault.Text());
            if (operation == nullptr) {
                continue;
            }
            Prepare();
            TheAppliance().FailNth(row.function, 1, value.fault);
            {
                Bench bench;
                std::string result;
                try {
                    result = (*operation)(bench);
                } catch (const fake::InjectedException&) {
                    result = "throws";
                }
                EXPECT_EQ(result, value.fault.Text());
            }
            EXPECT_EQ(TheAppliance().CountOf(row.function), 1);
            EXPECT_TRUE(TheAppliance().Misuses().empty()) << TheAppliance().Misuses().front();
            EXPECT_EQ(TheAppliance().LiveHandles(), 0) << TheAppliance().LiveHandleNames();
            ++tried;
        }
    }
    EXPECT_GT(tried, 120);
}

TEST_F(Declarations, EachOneThatCanFailIsTried) {
    const std::set<std::string> apart = {"VLIBCSzListAlloc",   "VLIBCSzHashAlloc", "VORNSchedTaskAlloc",
                                         "VornConf::VornConf", "strdup",           "VORN::APIPolling::APIPolling"};
    for (const fake::FunctionFailures& row : fake::Failures()) {
        const bool tried = row.values.empty() || apart.count(row.function) != 0;
        EXPECT_TRUE(tried || FindOperation(row.function) != nullptr) << row.function;
    }
}

TEST_F(Declarations, NothingIsMadeByAFailingConstruction) {
    Prepare();
    fake::Appliance& appliance = TheAppliance();
    fake::Exchange exchange;
    appliance.FailFrom(0);
    EXPECT_EQ(VLIBCSzListAlloc(1), nullptr);
    EXPECT_EQ(VLIBCSzHashAlloc(1), nullptr);
    EXPECT_EQ(VORNSchedTaskAlloc(), nullptr);
    EXPECT_EQ(strdup("x"), nullptr);
    EXPECT_THROW(VornConf(), fake::InjectedException);
    EXPECT_THROW(VORN::APIPolling(), fake::InjectedException);
    EXPECT_THROW(VORN::APIPolling(&exchange.request), fake::InjectedException);
    EXPECT_EQ(appliance.LiveHandles(), 0) << appliance.LiveHandleNames();
    EXPECT_EQ(appliance.Calls().size(), 7U);
}

TEST_F(Declarations, ThoseWithoutFailureAreThereToo) {
    Prepare();
    fake::Exchange exchange;
    {
        VORN::APIPolling polling(&exchange.request);
        polling.SetRemoveAttr(true);
        EXPECT_EQ(polling.GetError(), 0);
    }
    VLIBCErrSetEx(5, "module.cpp", 9);
    EXPECT_EQ(VLIBCErrGet(), 5);
    EXPECT_STREQ(VLIBCErrorGetFile(), "module.cpp");
    EXPECT_EQ(VLIBCErrorGetLine(), 9);
    _tag_vorn_sched_task_* task = VORNSchedTaskAlloc();
    VORNSchedCTaskSetListable(task, false);
    VORNSchedTaskFree(task);
    EXPECT_TRUE(TheAppliance().Misuses().empty());
    EXPECT_EQ(TheAppliance().LiveHandles(), 0) << TheAppliance().LiveHandleNames();
}

}  // namespace
