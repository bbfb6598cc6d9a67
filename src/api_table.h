// What the module exports: the API table, the entry functions that it names, and the bodies of its background tasks.
// The server finds GetAPITable by its symbol and reaches the rest through the table. module.map lists the exports.

#ifndef VORN_SRC_API_TABLE_H
#define VORN_SRC_API_TABLE_H

#include "platform/webapi.h"

#define VORN_EXPORT __attribute__((visibility("default")))

// The methods that the module serves, ended by a row of zeros; constant for the life of the process.
VORN_EXPORT extern const VORN::APIEntry gTable[];

// The first row of gTable. Never fails.
VORN_EXPORT const VORN::APIEntry* GetAPITable();

// One entry function for each row. Each builds a handler for this request, calls one operation of it, which answers
// through `response`, and destroys the handler, also when an exception passes on its way to the server.
VORN_EXPORT void DomainGet(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainSet(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainTestDC(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainGetDomainList(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainGetDomainList_V2(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainUpdateStart(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainUpdateStatus(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainUpdateStop(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainSetOption(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainGetOption(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainScheduleGet(VORN::APIRequest* request, VORN::APIResponse* response);
VORN_EXPORT void DomainScheduleSet(VORN::APIRequest* request, VORN::APIResponse* response);

// Bodies of background tasks, handed to VORN::APIPolling::Start; `userData` is not used.
VORN_EXPORT void DomainUpdateStartFork(VORN::APIRequest* request, VORN::APIResponse* response, void* userData);
VORN_EXPORT void DomainMonitorUpdating(VORN::APIRequest* request, VORN::APIResponse* response, void* userData);

#endif
