// VORN.Appliance.Directory "leave": leave the domain, and on request remove the computer account on the controller,
// too, which takes an account that may do so.
//
// leave  {"delete_account": true, "username": "admin", "password": "..."} answers null

#ifndef VORN_APPLIANCE_MODULE_LEAVE_API_H
#define VORN_APPLIANCE_MODULE_LEAVE_API_H

#include <json/value.h>

#include <string>

#include "appliance/module/parameters.h"

namespace appliance {

// An account that the controller refuses answers the code that a join with it would answer; the appliance then still is
// a member.
Json::Value Leave(const Parameters& parameters);

// The code for the status that the join tool leaves behind; 2615 for one that has none of its own.
int CodeOfStatus(const std::string& message);

}  // namespace appliance

#endif
