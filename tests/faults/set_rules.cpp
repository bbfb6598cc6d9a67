// The effect of each failure on "set".

#include "src/api_table.h"
#include "tests/faults/operations.h"
#include "tests/faults/set_operation.h"

namespace sweep {

std::vector<Rule> SetRules() {
    return {
        // What the request asks for.
        {"BlVLIBIsIpAddr", "", "", When::kOne, Stops(2601), GoesOn()},
        {"BlVLIBIsv6IpAddrValid", "", "", When::kOne, Stops(2601), GoesOn()},
        {"WINIQuery1", "", "VORNWinJoin1", When::kAny, Ignored()},
        {"WINIQuery1", "", "", When::kNegative, Stops(2622)},
        {"VORNLDAPIsBinded", "", "", When::kOne, Stops(2620), GoesOn()},

        // Ahead of the join. A copy that can't be made is null in the record, which the platform refuses.
        {"strdup", "", "", When::kFails, FailsLater()},
        {"VORNWinIsEnableTrustDomain", "", "", When::kAny, Ignored()},
        {"VORNWinSetTrustDomain", "", "", When::kNegative, Stops(2617)},
        {"VLIBCSzListAlloc", "", "VORNNetDNSListGet", When::kFails, Records(2617)},
        {"VLIBCSzListAlloc", "", "", When::kFails, Stops(2617)},
        {"VORNNetDNSListGet", "", "", When::kNegative, Stops(2617)},
        {"VLIBCSzListGet", "", "", When::kAny, Ignored()},
        {"VLIBCSzListPush", "", "", When::kNegative, Records(2617)},
        {"VORNNetDNSListSet", "", "", When::kNegative, Records(2617)},

        // The advanced options.
        {"VLIBCSzHashAlloc", "", "", When::kFails, Stops(2617)},
        {"VLIBCFileGetSection", "", "", When::kAny, Ignored()},
        {"VLIBCSzHashSetValue", "", "", When::kNegative, Stops(2617)},
        {"VLIBCSzHashRemoveKey", "", "", When::kAny, Ignored()},
        {"VLIBCFileITmpName", "", "", When::kMinusOne, Stops(2617)},
        {"VLIBCFileAddSection", "", "", When::kAny, Ignored()},
        {"VLIBCSysRename", "", "", When::kAny, Ignored()},

        // The join and why it failed.
        {"access", "", "", When::kAny, Ignored()},
        {"unlink", "", "", When::kAny, Ignored()},
        {"VORNWinJoin1", "joinMode 1", "", When::kNotZero, FailsLater()},
        {"system", "", "", When::kNotZero, Stops(2602), GoesOn()},
        {"ErrWINIState1Get", "", "", When::kNegative, Stops(2615)},

        // After the join.
        {"VORNGroupAddDomainAdminGroup", "", "", When::kAny, Ignored()},
        {"VLIBServiceReload", "", "", When::kAny, Ignored()},
        {"VORNLogSet1", "", "", When::kAny, Ignored()},
        {"VORNDomainUserHomeInclude", "", "", When::kAny, Ignored()},
        {"VLIBServiceIsEnabled", "", "", When::kAny, Ignored()},
        {"VLIBServiceRestart", "", "", When::kAny, Ignored()},

        // Leaving. A positive result counts as done.
        {"VORNWinJoin1", "joinMode 0", "", When::kNegative, Stops(2617), GoesOn()},
        {"VLIBCFileLock", "", "", When::kAny, Ignored()},
        {"VLIBCFileRemoveKey", "", "", When::kAny, Ignored()},
        {"VLIBCFileUnlock", "", "", When::kAny, Ignored()},
    };
}

Operation DomainSetOperation() {
    Operation operation = MakeOperation("DomainSet", DomainSet);
    operation.rules = SetRules();
    operation.scenarios = SetScenarios();
    operation.oracles = {CheckTrustSetting, CheckDnsServers, CheckJoinStatus, CheckFilesOfSet, CheckStepsAfterwards};
    return operation;
}

}  // namespace sweep
