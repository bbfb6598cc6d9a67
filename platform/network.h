// The network library: the DNS servers of the appliance.
// See conventions.h for the rules that hold for every declaration.

#ifndef VORN_PLATFORM_NETWORK_H
#define VORN_PLATFORM_NETWORK_H

#include "platform/core.h"

extern "C" {

// Appends the addresses of the DNS servers in use, in their order; may replace the list.
// Failure: -1.
int VORNNetDNSListGet(struct VLIBSZLIST** servers);

// Makes the listed addresses the DNS servers of the appliance, in their order. The list stays the caller's.
// Failure: -1.
int VORNNetDNSListSet(struct VLIBSZLIST* servers);

}  // extern "C"

#endif
