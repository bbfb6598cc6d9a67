// "get": is the appliance a member of a domain, and of which?
//
// Request  {}
// Answer   {"enable_domain": false}, or for a member
//          {"enable_domain": true, "domain_name": "LAB", "domain_type": "AD", "manage_mode": 0,
//           "dns": "10.0.0.1,10.0.0.2", "advance_domain_conf": {...}}

#include <cstring>

#include "platform/webutils.h"
#include "src/domain.h"
#include "src/domain/internal.h"
#include "src/support/log.h"
#include "src/support/paths.h"

void DomainServiceHandler::Get() {
    Json::Value result;
    if (LoadDomainData(result)) {
        response->SetSuccess(result);
    } else {
        ReportError();
    }
}

bool DomainServiceHandler::LoadDomainData(Json::Value& result) {
    result["enable_domain"] = false;
    if (!SupportsDomain()) {
        return true;
    }
    bool isMember = false;
    char name[kNameSize];
    if (!LoadMembership(isMember, name)) {
        return false;
    }
    if (!isMember) {
        return true;
    }
    result["enable_domain"] = true;
    result["domain_name"] = name;

    char security[128] = {};
    if (VLIBCFileGetKeyValue(kSmbConf, "security", security, sizeof(security), 0) <= 0) {
        syslog(LOG_ERR, "%s:%d Unknown domain type", kDomainUnit, LOG_NUMBER(kStatus));
        SetError(2621);
        return false;
    }
    if (std::strcmp(security, "ads") == 0) {
        result["domain_type"] = "AD";
    } else if (std::strcmp(security, "domain") == 0) {
        result["domain_type"] = "NT4";
    } else {
        syslog(LOG_ERR, "%s:%d Unknown domain type %s", kDomainUnit, LOG_NUMBER(kStatus), security);
        SetError(2621);
        return false;
    }

    // The sense is inverted on purpose, here and in "set": 0 means that trusted domains are enabled.
    result["manage_mode"] = VORNWinIsEnableTrustDomain() != 0 ? 0 : 1;

    std::vector<std::string> dnsServers;
    if (!GetDNSList(dnsServers)) {
        syslog(LOG_ERR, "%s:%d Cannnot get DNSList", kDomainUnit, LOG_NUMBER(kStatus));
        SetError(kSystemError);
        return false;
    }
    result["dns"] = WebUtils::StringImplode(dnsServers, ",");

    Json::Value advanced;
    if (!LoadDomainAdvData(advanced)) {
        return false;
    }
    result["advance_domain_conf"] = advanced;
    return true;
}
