// VORN.Appliance.EventLog: what happened, for administrators.
//
// list  {"offset": 0, "limit": 100}
//       answers {"total", "events": [{"time", "kind", "level", "code", "text"}]}, newest first

#ifndef VORN_APPLIANCE_MODULE_EVENT_API_H
#define VORN_APPLIANCE_MODULE_EVENT_API_H

#include <json/value.h>

#include "appliance/module/parameters.h"

namespace appliance {

Json::Value Events(const Parameters& parameters);

}  // namespace appliance

#endif
