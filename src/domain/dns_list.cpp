// The DNS servers of the appliance: a list of addresses in the platform's order. Entries are not checked here.

#include "platform/network.h"
#include "src/domain.h"
#include "src/domain/internal.h"
#include "src/support/handles.h"
#include "src/support/log.h"

bool GetDNSList(std::vector<std::string>& out) {
    StringList servers;
    if (!servers) {
        syslog(LOG_ERR, "%s:%d Cannot alloc memory", kDomainUnit, LOG_NUMBER(kDnsList));
        return false;
    }
    if (VORNNetDNSListGet(servers.address()) < 0) {
        syslog(LOG_ERR, "%s:%d Cannot get dns list", kDomainUnit, LOG_NUMBER(kDnsList));
        return false;
    }
    out.clear();
    for (int i = 0; i < servers->count; ++i) {
        if (const char* server = VLIBCSzListGet(servers.get(), i)) {
            out.emplace_back(server);
        }
    }
    return true;
}

bool DomainServiceHandler::SetDNSList(const std::vector<std::string>& list) {
    StringList servers;
    if (!servers) {
        syslog(LOG_ERR, "%s:%d Cannot alloc memory", kDomainUnit, LOG_NUMBER(kDnsList));
        SetError(kSystemError);
        return false;
    }
    for (const std::string& server : list) {
        if (VLIBCSzListPush(servers.address(), server.c_str()) < 0) {
            syslog(LOG_ERR, "%s:%d Cannot push the list", kDomainUnit, LOG_NUMBER(kDnsList));
            SetError(kSystemError);
            return false;
        }
    }
    if (VORNNetDNSListSet(servers.get()) < 0) {
        syslog(LOG_ERR, "%s:%d Cannot set the list", kDomainUnit, LOG_NUMBER(kDnsList));
        SetError(kSystemError);
        return false;
    }
    return true;
}
