// Whether the appliance is a member of a domain.

#include <strings.h>

#include <cstring>

#include "platform/settings.h"
#include "src/domain.h"
#include "src/domain/internal.h"
#include "src/support/log.h"

bool SupportsDomain() {
    VornConf conf;
    return strcasecmp(conf.Def("supportdomain", ""), "yes") == 0;
}

bool DomainServiceHandler::LoadMembership(bool& isMember, char (&name)[kNameSize]) {
    std::memset(name, 0, sizeof(name));
    int first = 0;
    int second = 0;
    if (WINIQuery1(name, sizeof(name), &first, &second) < 0) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d Failed to get domain info.[0x%04X %s:%d]", kDomainUnit, LOG_NUMBER(kMembershipState),
               last.Code(), last.file, last.line);
        SetError(2622);
        return false;
    }
    isMember = first != 0 && second != 0;
    return true;
}
