// How other programs have the join tool do its work.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_LAUNCHER_H
#define VORN_APPLIANCE_DOMAIN_JOIN_LAUNCHER_H

#include <string>

#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/membership_job.h"

namespace appliance {

// Starts the join tool in a session of its own, hands it the request through a pipe, and waits for its end. The tool
// goes on when the caller dies. Its result is the caller's own, also when several callers wait at the same time; a tool
// that could not be started, or died and did not get its work done, has failed with "Error System.". Takes less than 29
// seconds.
JobResult RunJoinTool(const JoinRequest& request);

// How the tool ends after "--recover" when what had been interrupted is in force now. Otherwise it ends with 0 when
// nothing is left to do, and with another status when something is.
inline constexpr int kRecoveredForward = 3;

// What the tool prints for its caller, one line, and how that is read.
std::string FormatJobResult(const JobResult& result);
bool ParseJobResult(const std::string& text, JobResult& result);

}  // namespace appliance

#endif
