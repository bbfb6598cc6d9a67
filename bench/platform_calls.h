// The platform's side of each operation: the same calls in the same order as the module makes them, with arguments that
// are ready beforehand and nothing in between. What an operation takes beyond this is the module's own time: "beside
// its platform calls". check_cases.cpp holds each of these functions against the module's calls.

#ifndef VORN_BENCH_PLATFORM_CALLS_H
#define VORN_BENCH_PLATFORM_CALLS_H

#include "platform/webapi.h"

namespace platform_calls {

void Get(VORN::APIRequest* request, VORN::APIResponse* response);
void GetInWorkgroup(VORN::APIRequest* request, VORN::APIResponse* response);
void SetJoin(VORN::APIRequest* request, VORN::APIResponse* response);
void SetJoinThatFails(VORN::APIRequest* request, VORN::APIResponse* response);
void SetLeave(VORN::APIRequest* request, VORN::APIResponse* response);
void SetRefused(VORN::APIRequest* request, VORN::APIResponse* response);
void TestDc(VORN::APIRequest* request, VORN::APIResponse* response);
void DomainList1(VORN::APIRequest* request, VORN::APIResponse* response);
void DomainList2Trusts(VORN::APIRequest* request, VORN::APIResponse* response);
void DomainList2Units(VORN::APIRequest* request, VORN::APIResponse* response);

void UpdateStart(VORN::APIRequest* request, VORN::APIResponse* response);
void UpdateStatus(VORN::APIRequest* request, VORN::APIResponse* response);
void UpdateStop(VORN::APIRequest* request, VORN::APIResponse* response);
void Worker(VORN::APIRequest* request, VORN::APIResponse* response);
void Monitor(VORN::APIRequest* request, VORN::APIResponse* response);
void OptionsGet(VORN::APIRequest* request, VORN::APIResponse* response);
void OptionsSet(VORN::APIRequest* request, VORN::APIResponse* response);
void ScheduleGet(VORN::APIRequest* request, VORN::APIResponse* response);
void ScheduleSet(VORN::APIRequest* request, VORN::APIResponse* response);
void ScheduleRemove(VORN::APIRequest* request, VORN::APIResponse* response);

}  // namespace platform_calls

#endif
