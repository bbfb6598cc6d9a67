// "test_dc": does the membership still work, that is, does the domain controller accept the appliance's account?
//
// Request  {}
// Answer   {"test_join_success": true}

#include "src/domain.h"
#include "src/domain/internal.h"

void DomainServiceHandler::TestDC() {
    Json::Value result;
    if (TestDCData(result)) {
        response->SetSuccess(result);
    } else {
        ReportError();
    }
}

bool DomainServiceHandler::TestDCData(Json::Value& result) {
    result["test_join_success"] = false;
    if (!SupportsDomain()) {
        return true;
    }
    bool isMember = false;
    char name[kNameSize];
    if (!LoadMembership(isMember, name)) {
        return false;
    }
    if (isMember) {
        result["test_join_success"] = VORNWinTestJoin(VORNWinADSJoined()) >= 0;
    }
    return true;
}
