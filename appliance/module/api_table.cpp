#include "appliance/module/api_table.h"

#include "appliance/module/directory_api.h"
#include "appliance/module/event_api.h"
#include "appliance/module/leave_api.h"
#include "appliance/module/overview_api.h"
#include "appliance/module/parameters.h"

namespace {

constexpr const char* kDirectoryApi = "VORN.Appliance.Directory";
constexpr const char* kEventApi = "VORN.Appliance.EventLog";

// Runs a method with its parameters and answers with what it returns, or with the code that it throws.
template <Json::Value (*method)(const appliance::Parameters&)>
void Serve(VORN::APIRequest* request, VORN::APIResponse* response) {
    appliance::Answer(*request, *response, method);
}

}  // namespace

const VORN::APIEntry gTable[] = {
    {kDirectoryApi, 1, "users", Serve<appliance::Users>},
    {kDirectoryApi, 1, "groups", Serve<appliance::Groups>},
    {kDirectoryApi, 1, "domains", Serve<appliance::Domains>},
    {kDirectoryApi, 1, "overview", Serve<appliance::Overview>},
    {kDirectoryApi, 1, "refresh_progress", Serve<appliance::RefreshProgress>},
    {kDirectoryApi, 1, "join_steps", Serve<appliance::JoinSteps>},
    {kDirectoryApi, 1, "leave", Serve<appliance::Leave>},
    {kEventApi, 1, "list", Serve<appliance::Events>},
    {nullptr, 0, nullptr, nullptr},
};

const VORN::APIEntry* GetAPITable() {
    return gTable;
}
