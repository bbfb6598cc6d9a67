#include "tests/double/failures.h"

#include <cstddef>
#include <unordered_map>

namespace fake {
namespace {

using Faults = std::vector<Fault>;

// Rows are built per origin so that each stays one line.
class Table {
public:
    void Begin(const char* header) {
        origin = header;
    }

    void Add(const char* function, const Faults& declared, const Faults& neighbours = {}) {
        FunctionFailures row{function, origin, {}};
        for (const Fault& fault : declared) {
            row.values.push_back({fault, true});
        }
        for (const Fault& fault : neighbours) {
            row.values.push_back({fault, false});
        }
        rows.push_back(row);
    }

    std::vector<FunctionFailures> rows;

private:
    std::string origin;
};

Faults Results(std::initializer_list<int> results) {
    Faults faults;
    for (const int result : results) {
        faults.push_back(Fault::Result(result));
    }
    return faults;
}

void AddCore(Table& table) {
    table.Begin("core.h");
    table.Add("VLIBCSzListAlloc", {Fault::Null()});
    table.Add("VLIBCSzListPush", Results({-1}), Results({1}));
    table.Add("VLIBCSzListGet", {Fault::Null()});
    table.Add("VLIBCSzListFree", {});
    table.Add("VLIBCSzHashAlloc", {Fault::Null()});
    table.Add("VLIBCSzHashGetValue", {Fault::Null()});
    table.Add("VLIBCSzHashSetValue", Results({-1}), Results({1}));
    table.Add("VLIBCSzHashRemoveKey", Results({-1}), Results({1}));
    table.Add("VLIBCSzHashFree", {});
    table.Add("VLIBCFileGetKeyValue", Results({-1, 0}));
    table.Add("VLIBCFileGetSection", Results({-1}), Results({1}));
    table.Add("VLIBCFileAddSection", Results({0}), Results({-1, 1}));
    table.Add("VLIBCFileRemoveKey", Results({-1}), Results({1}));
    table.Add("VLIBCFileITmpName", Results({-1}), Results({1}));
    table.Add("VLIBCFileExist", {}, Results({0, 1, 2}));
    table.Add("VLIBCFileTouch", Results({-1}), Results({1}));
    table.Add("VLIBCFileLock", Results({-1, 1}));
    table.Add("VLIBCFileUnlock", Results({-1}), Results({1}));
    table.Add("VLIBCSysRename", Results({-1, 1}));
    table.Add("VLIBCSysRemove", Results({-1}), Results({1}));
    table.Add("VLIBCReadPidFile", Results({-1}), Results({0, 1}));
    table.Add("VLIBServiceReload", Results({-1}), Results({1}));
    table.Add("VLIBServiceRestart", Results({-1}), Results({1}));
    table.Add("VLIBServiceTypeReload", Results({-1}), Results({1}));
    table.Add("VLIBServiceIsEnabled", Results({-1, 0}), Results({1, 2}));
    table.Add("VLIBCSupportGet", Results({0}), Results({1, -1}));
    table.Add("VLIBCErrGet", {});
    table.Add("VLIBCErrorGetFile", {});
    table.Add("VLIBCErrorGetLine", {});
    table.Add("VLIBCErrSetEx", {});
    table.Add("BlVLIBIsIpAddr", {}, Results({0, 1}));
    table.Add("BlVLIBIsv6IpAddrValid", {}, Results({0, 1}));
}

void AddDomain(Table& table) {
    table.Begin("domain.h");
    table.Add("WINIQuery1", Results({-1}), Results({1}));
    table.Add("ErrWINIState1Get", Results({-1}), Results({1}));
    table.Add("VORNWinJoin1", Results({-1, 1}));
    table.Add("VORNWinTestJoin", Results({-1}), Results({1}));
    table.Add("VORNWinADSJoined", {}, Results({0, 1, 2}));
    table.Add("VORNWinIsEnableTrustDomain", {}, Results({0, 1, 2}));
    table.Add("VORNWinSetTrustDomain", Results({-1}), Results({1}));
    table.Add("VORNWinsEnumAllDomains", Results({-1}), Results({1}));
    table.Add("VORNWinsEnumOU", Results({-1}), Results({1}));
    table.Add("VORNWinsGetDomainFQDN", Results({-1}), Results({1}));
    table.Add("VORNWinsIsJoined", {}, Results({0, 1, 2}));
    table.Add("VORNWinsIsOwnDomain", {}, Results({0, 1, 2}));
    table.Add("VORNWinsSetSectionKey", Results({-1}), Results({1}));
    table.Add("VORNWinUpdateAllDomains", Results({-1}), Results({1}));
    table.Add("VORNWinUpdateOU", Results({-1}), Results({1}));
    table.Add("VORNWinGetDomainUGByDomain", Results({-1, 1}));
    table.Add("VORNWorkgroupGet", Results({-1}), Results({1}));
    table.Add("VORNLDAPIsBinded", {}, Results({0, 1, 2, -1}));
    table.Add("VORNGroupAddDomainAdminGroup", Results({-1}), Results({1}));
    table.Add("VORNDomainUserHomeInclude", Results({-1}), Results({1, -2}));
}

void AddSystem(Table& table) {
    table.Begin("eventlog.h");
    table.Add("VORNLogSet1", Results({-1}), Results({1}));

    table.Begin("network.h");
    table.Add("VORNNetDNSListGet", Results({-1}), Results({1}));
    table.Add("VORNNetDNSListSet", Results({-1}), Results({1}));

    table.Begin("scheduler.h");
    table.Add("VORNSchedTaskListGet", Results({-1}), Results({1}));
    table.Add("VORNSchedTaskListFree", {});
    table.Add("VORNSchedTaskGetID", Results({-1}), Results({0}));
    table.Add("VORNSchedTaskAlloc", {Fault::Null()});
    table.Add("VORNSchedTaskLoad", Results({-1}), Results({1}));
    table.Add("VORNSchedTaskSave", Results({-1}), Results({1}));
    table.Add("VORNSchedTaskRemove", Results({-1}), Results({1}));
    table.Add("VORNSchedTaskFree", {});
    table.Add("VORNSchedCTaskGetCommand", Results({-1}), Results({1}));
    table.Add("VORNSchedCTaskSetCommand", Results({-1, 1}));
    table.Add("VORNSchedCTaskSetListable", {});
    table.Add("VORNSchedTaskConvertFromJson_Schedule", {Fault::False()});
    table.Add("VORNSchedTaskConvertToJson_Schedule", {Fault::False()});
}

void AddFramework(Table& table) {
    const Faults throws = {Fault::Throw()};
    const Faults falseOrThrows = {Fault::False(), Fault::Throw()};

    table.Begin("settings.h");
    table.Add("VornConf::VornConf", throws);
    table.Add("VornConf::Def", throws);
    table.Add("VornConf::Info", throws);

    table.Begin("webapi.h");
    table.Add("VORN::APIRequest::HasParam", throws);
    table.Add("VORN::APIRequest::GetParam", throws);
    table.Add("VORN::APIResponse::SetSuccess", throws);
    table.Add("VORN::APIResponse::SetError", throws);
    table.Add("VORN::APIPolling::APIPolling", throws);
    table.Add("VORN::APIPolling::SetRequest", {});
    table.Add("VORN::APIPolling::SetGroupAttr", throws);
    table.Add("VORN::APIPolling::SetPrefixAttr", throws);
    table.Add("VORN::APIPolling::SetRemoveAttr", {});
    table.Add("VORN::APIPolling::Start", falseOrThrows);
    table.Add("VORN::APIPolling::List", falseOrThrows);
    table.Add("VORN::APIPolling::Status", falseOrThrows);
    table.Add("VORN::APIPolling::Stop", falseOrThrows);
    table.Add("VORN::APIPolling::GetError", {});

    table.Begin("webutils.h");
    table.Add("WebUtils::StringExplode", throws);
    table.Add("WebUtils::StringImplode", throws);
}

void AddLibc(Table& table) {
    table.Begin("libc");
    table.Add("system", Results({-1, 1, 256}));
    table.Add("sleep", {}, Results({1}));
    table.Add("access", Results({-1}));
    table.Add("unlink", Results({-1}));
    table.Add("syslog", {});
    table.Add("strdup", {Fault::Null()});
    table.Add("free", {});
}

std::unordered_map<std::string, const FunctionFailures*> Index() {
    std::unordered_map<std::string, const FunctionFailures*> index;
    for (const FunctionFailures& row : Failures()) {
        index.emplace(row.function, &row);
    }
    return index;
}

}  // namespace

const std::vector<FunctionFailures>& Failures() {
    static const std::vector<FunctionFailures> rows = [] {
        Table table;
        AddCore(table);
        AddDomain(table);
        AddSystem(table);
        AddFramework(table);
        AddLibc(table);
        return table.rows;
    }();
    return rows;
}

const FunctionFailures* FindFailures(const std::string& function) {
    static const std::unordered_map<std::string, const FunctionFailures*> index = Index();
    const auto found = index.find(function);
    return found == index.end() ? nullptr : found->second;
}

const Fault* DefaultFault(const std::string& function) {
    const FunctionFailures* row = FindFailures(function);
    if (row == nullptr || row->values.empty() || !row->values.front().declared) {
        return nullptr;
    }
    return &row->values.front().fault;
}

}  // namespace fake
