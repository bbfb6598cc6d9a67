// What a join is aimed at: the domain, its kind and a controller that answers. Found by asking only; nothing is
// changed.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_JOIN_TARGET_H
#define VORN_APPLIANCE_DOMAIN_JOIN_JOIN_TARGET_H

#include <string>
#include <utility>
#include <vector>

#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/step_log.h"
#include "appliance/domain/join/time_budget.h"
#include "appliance/domain/membership/discovery.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

struct JoinTarget {
    DomainKind kind = DomainKind::ActiveDirectory;
    std::string realm;      // in capitals; empty for an NT4-style domain
    std::string domain;     // NetBIOS name in capitals
    Controller controller;  // the one to ask
    bool pinned = false;    // the request named the controller
};

// A folder for asking (0700), gone with all that is in it when its owner goes. It holds a configuration for Samba's
// tools made from the appliance's own: no domain of its own, nothing of its state touched; what they store goes into
// the folder. Throws std::system_error.
class ProbeFolder {
public:
    ProbeFolder();
    ~ProbeFolder();
    ProbeFolder(const ProbeFolder&) = delete;
    ProbeFolder& operator=(const ProbeFolder&) = delete;

    const std::string& path() const {
        return path_;
    }
    std::string Configuration() const {
        return path_ + "/smb.conf";
    }

private:
    std::string path_;
};

// Keys and values of [global] that keep everything that the tools store within `folder`, for a configuration of their
// own. Makes the folders that they need. Throws std::system_error.
std::vector<std::pair<std::string, std::string>> PrivateWorld(const std::string& folder);

// Finds the target, with steps "discover", "ports" and "workgroup". Throws JoinError.
JoinTarget FindTarget(const JoinRequest& request, const std::string& probe, StepLog& steps, const TimeBudget& budget);

// What a request may hold, checked before anything else. Throws JoinError.
void CheckRequest(const JoinRequest& request);

}  // namespace appliance

#endif
