// VORN.Appliance.Directory: what is going on with the membership.
//
// overview          answers {"host_name", "computer_account", "last_test", "interfaces", "refresh", "busy", "clock"}
// refresh_progress  answers how far the refresh that runs is, or how the last one ended; null when there was none since
//                   the machine's start
// join_steps        answers the steps of the last join or leave, or null when there was none since the machine's start

#ifndef VORN_APPLIANCE_MODULE_OVERVIEW_API_H
#define VORN_APPLIANCE_MODULE_OVERVIEW_API_H

#include <json/value.h>

#include "appliance/module/parameters.h"

namespace appliance {

Json::Value Overview(const Parameters& parameters);
Json::Value RefreshProgress(const Parameters& parameters);
Json::Value JoinSteps(const Parameters& parameters);

}  // namespace appliance

#endif
