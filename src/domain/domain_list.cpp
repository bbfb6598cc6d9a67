// "get_domain_list": the domains whose users and groups the appliance can see.
//
// Request    {}
// Version 1  {"domain_list": ["LAB", "OTHER"]}
// Version 2  {"domain_list": [["LAB", "LAB", "lab.test"], ["OTHER", "OTHER", ""]]}: name, name, DNS name
//            {"domain_list": [["--", "", "LAB"], ["Sales", "ou=Sales", "ou=Sales"]]} with trusted domains disabled:
//            the workgroup, then the organisational units

#include <utility>

#include "src/domain.h"
#include "src/domain/internal.h"
#include "src/support/handles.h"
#include "src/support/log.h"

namespace {

constexpr int kTextSize = 4095;  // of a workgroup or DNS name

Json::Value Row(const char* first, const char* second, const char* third) {
    Json::Value row(Json::arrayValue);
    row.append(first);
    row.append(second);
    row.append(third);
    return row;
}

bool IsAllocated(DomainServiceHandler& handler, const StringList& list) {
    if (!list) {
        syslog(LOG_ERR, "%s:%d Error: cannot alloc memory", kDomainUnit, LOG_NUMBER(kDomainList));
        handler.SetError(kSystemError);
        return false;
    }
    return true;
}

bool EnumDomains(DomainServiceHandler& handler, StringList& domains) {
    if (VORNWinsEnumAllDomains(domains.address()) < 0) {
        syslog(LOG_ERR, "%s:%d Cannot: get the domain", kDomainUnit, LOG_NUMBER(kDomainList));
        handler.SetError(kSystemError);
        return false;
    }
    return true;
}

bool ListTrustedDomains(DomainServiceHandler& handler, StringList& domains, Json::Value& rows) {
    if (!EnumDomains(handler, domains)) {
        return false;
    }
    for (int i = 0; i < domains->count; ++i) {
        if (const char* domain = VLIBCSzListGet(domains.get(), i)) {
            char fqdn[kTextSize] = {};
            const bool known = VORNWinsGetDomainFQDN(domain, fqdn, sizeof(fqdn)) >= 0;
            rows.append(Row(domain, domain, known ? fqdn : ""));
        }
    }
    return true;
}

bool ListOrganisationalUnits(DomainServiceHandler& handler, StringList& names, Json::Value& rows) {
    StringList values;
    if (!IsAllocated(handler, values)) {
        return false;
    }
    if (VORNWinsEnumOU(names.address(), values.address()) < 0) {
        syslog(LOG_ERR, "%s:%d Cannot: get the domain", kDomainUnit, LOG_NUMBER(kDomainList));
        handler.SetError(kSystemError);
        return false;
    }
    char workgroup[kTextSize] = {};
    if (VORNWorkgroupGet(workgroup, sizeof(workgroup)) < 0) {
        return false;  // silently: the client receives the code of a failure that has none
    }
    rows.append(Row("--", "", workgroup));
    for (int i = 0; i < names->count; ++i) {
        const char* name = VLIBCSzListGet(names.get(), i);
        const char* value = VLIBCSzListGet(values.get(), i);
        if (name != nullptr && value != nullptr) {
            rows.append(Row(name, value, value));
        }
    }
    return true;
}

}  // namespace

void DomainServiceHandler::GetDomainList() {
    Json::Value result;
    if (GetDomainListData(result)) {
        response->SetSuccess(result);
    } else {
        ReportError();
    }
}

void DomainServiceHandler::GetDomainList_V2() {
    Json::Value result;
    if (GetDomainListData_V2(result)) {
        response->SetSuccess(result);
    } else {
        ReportError();
    }
}

bool DomainServiceHandler::BeginDomainList(bool& isMember) {
    // Unlike "get" and "test_dc", which answer a model without domain support that it is no member.
    if (!SupportsDomain()) {
        syslog(LOG_ERR, "%s:%d Doesn't support domain", kDomainUnit, LOG_NUMBER(kDomainList));
        SetError(2619);
        return false;
    }
    char name[kNameSize];
    return LoadMembership(isMember, name);
}

bool DomainServiceHandler::GetDomainListData(Json::Value& result) {
    bool isMember = false;
    if (!BeginDomainList(isMember)) {
        return false;
    }
    Json::Value names(Json::arrayValue);
    if (isMember) {
        StringList domains;
        if (!IsAllocated(*this, domains) || !EnumDomains(*this, domains)) {
            return false;
        }
        for (int i = 0; i < domains->count; ++i) {
            if (const char* domain = VLIBCSzListGet(domains.get(), i)) {
                names.append(domain);
            }
        }
    }
    result["domain_list"] = std::move(names);
    return true;
}

bool DomainServiceHandler::GetDomainListData_V2(Json::Value& result) {
    bool isMember = false;
    if (!BeginDomainList(isMember)) {
        return false;
    }
    Json::Value rows(Json::arrayValue);
    if (isMember) {
        StringList first;
        if (!IsAllocated(*this, first)) {
            return false;
        }
        const bool listed = VORNWinIsEnableTrustDomain() != 0 ? ListTrustedDomains(*this, first, rows)
                                                              : ListOrganisationalUnits(*this, first, rows);
        if (!listed) {
            return false;
        }
    }
    result["domain_list"] = std::move(rows);
    return true;
}
