// Which platform functions each operation may call. With the values by which each can fail (tests/double/failures.cpp)
// these are the edges that the sweep has to exercise. A call of any other function is an error, and so is a function
// that no scenario reaches.

#include <map>

#include "tests/faults/operations.h"

namespace sweep {

namespace {

using Functions = std::vector<std::string>;

Functions Join(const std::vector<Functions>& groups) {
    Functions all;
    for (const Functions& group : groups) {
        all.insert(all.end(), group.begin(), group.end());
    }
    return all;
}

std::map<std::string, Functions> Table() {
    const Functions parameters = {"VORN::APIRequest::HasParam", "VORN::APIRequest::GetParam"};
    const Functions answers = {"VORN::APIResponse::SetSuccess", "VORN::APIResponse::SetError"};
    const Functions success = {"VORN::APIResponse::SetSuccess"};
    const Functions lastError = {"VLIBCErrGet", "VLIBCErrorGetFile", "VLIBCErrorGetLine"};
    const Functions conf = {"VornConf::VornConf", "VornConf::~VornConf", "VornConf::Def"};
    const Functions hash = {"VLIBCSzHashAlloc", "VLIBCSzHashFree", "VLIBCFileGetSection", "VLIBCSzHashGetValue"};
    const Functions list = {"VLIBCSzListAlloc", "VLIBCSzListFree"};
    const Functions polling = {"VORN::APIPolling::APIPolling", "VORN::APIPolling::~APIPolling"};

    const Functions membership = Join({conf, {"WINIQuery1", "syslog"}, lastError});
    const Functions domainList = Join({membership, answers, list, {"VORNWinsEnumAllDomains", "VLIBCSzListGet"}});
    const Functions findTask = Join({{"VORNSchedTaskListGet", "VORNSchedTaskListFree", "VORNSchedTaskGetID",
                                      "VORNSchedCTaskGetCommand", "VLIBCErrSetEx", "syslog"},
                                     lastError});
    const Functions taskRecord = {"VORNSchedTaskAlloc", "VORNSchedTaskFree", "VORNSchedTaskLoad"};

    return {
        {"DomainGet", Join({membership,
                            answers,
                            hash,
                            list,
                            {"VLIBCFileGetKeyValue", "VORNWinIsEnableTrustDomain", "VORNNetDNSListGet",
                             "VLIBCSzListGet", "WebUtils::StringImplode"}})},
        {"DomainSet", Join({parameters,
                            answers,
                            conf,
                            lastError,
                            list,
                            {"syslog",
                             "strdup",
                             "free",
                             "access",
                             "unlink",
                             "system",
                             "VornConf::Info",
                             "WINIQuery1",
                             "BlVLIBIsIpAddr",
                             "BlVLIBIsv6IpAddrValid",
                             "VORNLDAPIsBinded",
                             "VORNWinIsEnableTrustDomain",
                             "VORNWinSetTrustDomain",
                             "VORNNetDNSListGet",
                             "VORNNetDNSListSet",
                             "VLIBCSzListGet",
                             "VLIBCSzListPush",
                             "WebUtils::StringExplode",
                             "WebUtils::StringImplode",
                             "VLIBCSzHashAlloc",
                             "VLIBCSzHashFree",
                             "VLIBCFileGetSection",
                             "VLIBCSzHashSetValue",
                             "VLIBCSzHashRemoveKey",
                             "VLIBCFileITmpName",
                             "VLIBCFileAddSection",
                             "VLIBCSysRename",
                             "VORNWinJoin1",
                             "ErrWINIState1Get",
                             "VORNGroupAddDomainAdminGroup",
                             "VLIBServiceReload",
                             "VORNLogSet1",
                             "VORNDomainUserHomeInclude",
                             "VLIBServiceIsEnabled",
                             "VLIBServiceRestart",
                             "VLIBCFileLock",
                             "VLIBCFileRemoveKey",
                             "VLIBCFileUnlock"}})},
        {"DomainTestDC", Join({membership, answers, {"VORNWinADSJoined", "VORNWinTestJoin"}})},
        {"DomainGetDomainList", domainList},
        {"DomainGetDomainList_V2",
         Join({domainList,
               {"VORNWinIsEnableTrustDomain", "VORNWinsGetDomainFQDN", "VORNWinsEnumOU", "VORNWorkgroupGet"}})},
        {"DomainUpdateStart",
         Join({parameters,
               polling,
               {"VORN::APIResponse::SetError", "syslog", "VLIBCSupportGet", "VORN::APIPolling::List",
                "VORN::APIPolling::Status", "VORN::APIPolling::SetRequest", "VORN::APIPolling::SetGroupAttr",
                "VORN::APIPolling::SetRemoveAttr", "VORN::APIPolling::SetPrefixAttr", "VORN::APIPolling::Start",
                "VLIBCFileTouch", "VLIBCReadPidFile"}})},
        {"DomainUpdateStatus",
         Join({parameters, polling, answers, {"syslog", "VORN::APIPolling::Status", "VORN::APIPolling::GetError"}})},
        {"DomainUpdateStop", Join({polling, answers, {"VORN::APIPolling::List", "VORN::APIPolling::Stop"}})},
        {"DomainSetOption",
         Join({parameters,
               answers,
               hash,
               {"syslog", "VLIBCFileGetKeyValue", "VORNWinsSetSectionKey", "VLIBCSzHashSetValue",
                "VLIBCSzHashRemoveKey", "VORNWinsIsJoined", "VLIBCFileExist", "VLIBCSysRemove", "VLIBCFileAddSection",
                "VLIBCSysRename", "VORNGroupAddDomainAdminGroup", "VLIBServiceTypeReload", "VLIBServiceReload"}})},
        {"DomainGetOption", Join({answers, hash, {"syslog", "VLIBCFileGetKeyValue"}})},
        {"DomainScheduleGet", Join({findTask, taskRecord, success, {"VORNSchedTaskConvertToJson_Schedule"}})},
        {"DomainScheduleSet",
         Join({parameters,
               answers,
               findTask,
               taskRecord,
               {"VORNWinsIsJoined", "VORNSchedTaskConvertFromJson_Schedule", "VORNSchedCTaskSetListable",
                "VORNSchedCTaskSetCommand", "VORNSchedTaskSave", "VORNSchedTaskRemove"}})},
        {"DomainUpdateStartFork",
         Join({parameters,
               answers,
               list,
               {"VORNWinIsEnableTrustDomain", "VORNWinUpdateAllDomains", "VORNWinUpdateOU", "VORNWinsIsOwnDomain",
                "VLIBCSzListPush", "VORNWinsEnumAllDomains", "VLIBCReadPidFile", "system", "VORNWinGetDomainUGByDomain",
                "syslog", "VLIBCSysRemove"}})},
        {"DomainMonitorUpdating", Join({success, {"sleep", "VLIBCReadPidFile", "VLIBCSysRemove"}})},
    };
}

}  // namespace

const std::vector<std::string>& FunctionsOf(const std::string& operation) {
    static const std::map<std::string, Functions> table = Table();
    return table.at(operation);
}

}  // namespace sweep
