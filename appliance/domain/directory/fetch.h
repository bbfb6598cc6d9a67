// The fetch: the users or groups of domains, from their controllers into the lists.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_FETCH_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_FETCH_H

#include <string>
#include <vector>

#include "appliance/base/error_code.h"
#include "appliance/domain/directory/progress.h"

namespace appliance {

struct FetchResult {
    bool started = false;                  // false: another fetch of this kind runs, or `code` says why not
    int stored = 0;                        // domains whose lists are new
    std::vector<FetchFailure> failures;    // the other domains; their old lists stay in use
    ErrorCode code = ErrorCode::Internal;  // of the last failure
    bool newRanges = false;                // smb.conf has ranges of ids for more domains: winbind has to read it again
};

// Fetches one domain after the other, each in a child process that is ended when it makes no progress for 45 seconds or
// takes longer than 30 minutes. One that is silent for 10 seconds while others wait comes again behind them. The caller's pid stands in the kind's pid file meanwhile; a second fetch of a kind does
// not start. Each failure is logged and stands in the progress file. A domain is named by its NetBIOS or DNS name.
// Active Directory is asked by LDAP, or by RPC with "enable nt4 enum"; NT4-style domains by RPC.
// For a process of its own: it forks.
FetchResult FetchDirectory(EntryKind kind, const std::vector<std::string>& domains);

// The pid file of a kind's fetch.
std::string FetchPidFile(EntryKind kind);

}  // namespace appliance

#endif
