// "set": join a domain or go back to the workgroup. Here is what the request may hold; nothing is changed yet.
//
// Request  {"enable_domain": true, "domain_name": "lab.test", "username": "Administrator", "password": "...",
//           "dns": "10.0.0.1,10.0.0.2", "manage_mode": 0,
//           "advance_domain_conf": {"enable_advance_option": true, "kdc": "10.0.0.1", "netbios_name": "LAB",
//                                   "fqdn_name": "lab.test", "register_nics": ["eth0"]}}
//          {"enable_domain": false}
// Answer   null

#include "src/domain.h"
#include "src/support/log.h"

void DomainServiceHandler::Set() {
    if (CheckDomainParam() && ApplyDomainConfig()) {
        response->SetSuccess(Json::Value());
    } else {
        ReportError();
    }
}

bool DomainServiceHandler::CheckDomainParam() {
    return CheckBaseParam() && CheckAdvanceParam();
}

bool DomainServiceHandler::CheckBaseParam() {
    if (!CHECK_PARAM_BOOL("enable_domain", true)) {
        return false;
    }
    if (!request->GetParam("enable_domain", Json::Value()).asBool()) {
        return true;  // leaving needs nothing else, so nothing else is refused
    }
    if (!CHECK_PARAM_STRING("domain_name", true)) {
        return false;
    }
    const std::string domain = request->GetParam("domain_name", Json::Value()).asString();
    if (BlVLIBIsIpAddr(domain.c_str()) == 1 || BlVLIBIsv6IpAddrValid(domain.c_str()) == 1) {
        syslog(LOG_ERR, "%s:%d Invalid domain name [%s], it seems a IP address.", kDomainUnit, LOG_NUMBER(kSet),
               domain.c_str());
        SetError(2601);
        return false;
    }
    for (const char* name : {"username", "password"}) {
        if (!CHECK_PARAM_STRING(name, true)) {
            return false;
        }
    }
    return CHECK_PARAM_STRING("dns", false);
}

bool DomainServiceHandler::CheckAdvanceParam() {
    if (!request->HasParam("advance_domain_conf")) {
        return true;
    }
    const Json::Value options = request->GetParam("advance_domain_conf", Json::Value());
    if (!CHECK_JSON_BOOL(options, "enable_advance_option", true)) {
        return false;
    }
    for (const char* key : {"kdc", "netbios_name", "fqdn_name"}) {
        if (!CHECK_JSON_STRING(options, key, false)) {
            return false;
        }
    }
    return CHECK_JSON_JSONARRAY(options, "register_nics", false);
}
