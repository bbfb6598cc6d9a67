#include "src/api_table.h"

#include "src/domain.h"
#include "src/domain_schedule.h"

namespace {

constexpr const char* kDomainApi = "VORN.Core.Directory.Domain";
constexpr const char* kOptionsApi = "VORN.Core.Directory.Domain.Conf";
constexpr const char* kScheduleApi = "VORN.Core.Directory.Domain.Schedule";

}  // namespace

const VORN::APIEntry gTable[] = {
    {kDomainApi, 1, "get", DomainGet},
    {kDomainApi, 1, "set", DomainSet},
    {kDomainApi, 1, "test_dc", DomainTestDC},
    {kDomainApi, 1, "get_domain_list", DomainGetDomainList},
    {kDomainApi, 2, "get_domain_list", DomainGetDomainList_V2},
    {kDomainApi, 1, "update_start", DomainUpdateStart},
    {kDomainApi, 1, "update_status", DomainUpdateStatus},
    {kDomainApi, 1, "update_stop", DomainUpdateStop},
    {kOptionsApi, 1, "set", DomainSetOption},
    {kOptionsApi, 1, "get", DomainGetOption},
    {kScheduleApi, 1, "get", DomainScheduleGet},
    {kScheduleApi, 1, "set", DomainScheduleSet},
    {nullptr, 0, nullptr, nullptr},
};

const VORN::APIEntry* GetAPITable() {
    return gTable;
}

void DomainGet(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.Get();
}

void DomainSet(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.Set();
}

void DomainTestDC(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.TestDC();
}

void DomainGetDomainList(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.GetDomainList();
}

void DomainGetDomainList_V2(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.GetDomainList_V2();
}

void DomainUpdateStart(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.UpdateStart();
}

void DomainUpdateStatus(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.UpdateStatus();
}

void DomainUpdateStop(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.UpdateStop();
}

void DomainSetOption(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.SetOption();
}

void DomainGetOption(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainServiceHandler handler(request, response);
    handler.GetOption();
}

void DomainScheduleGet(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainScheduleHandler handler(request, response);
    handler.Get();
}

void DomainScheduleSet(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainScheduleHandler handler(request, response);
    handler.Set();
}

void DomainUpdateStartFork(VORN::APIRequest* request, VORN::APIResponse* response, void* /*userData*/) {
    DomainServiceHandler handler(request, response);
    handler.UpdateStartFork();
}

void DomainMonitorUpdating(VORN::APIRequest* request, VORN::APIResponse* response, void* /*userData*/) {
    DomainServiceHandler handler(request, response);
    handler.MonitorUpdate();
}
