// The second module: what the appliance's page and command line need beyond the domain module. The server finds
// GetAPITable by its symbol and reaches the rest through the table. module.map lists the exports.

#ifndef VORN_APPLIANCE_MODULE_API_TABLE_H
#define VORN_APPLIANCE_MODULE_API_TABLE_H

#include "platform/webapi.h"

#define VORN_EXPORT __attribute__((visibility("default")))

// The methods that the module serves, ended by a row of zeros; constant for the life of the process.
VORN_EXPORT extern const VORN::APIEntry gTable[];

// The first row of gTable. Never fails.
VORN_EXPORT const VORN::APIEntry* GetAPITable();

#endif
