// VORN.Appliance.Directory: the lists of domain users and groups.
//
// users, groups     {"domain": "LAB", "offset": 0, "limit": 100, "search": "an"}
//                   answers {"total", "offset", "domain", "fetched", "entries": [{"name", "id", "display"}]}
// domains           answers {"domains": [{"domain", "kind", "count", "fetched"}]}: which lists there are

#ifndef VORN_APPLIANCE_MODULE_DIRECTORY_API_H
#define VORN_APPLIANCE_MODULE_DIRECTORY_API_H

#include <json/value.h>

#include "appliance/module/parameters.h"

namespace appliance {

// Without a domain the own one is meant. One whose list has never been fetched answers "fetched": null.
Json::Value Users(const Parameters& parameters);
Json::Value Groups(const Parameters& parameters);

Json::Value Domains(const Parameters& parameters);

}  // namespace appliance

#endif
