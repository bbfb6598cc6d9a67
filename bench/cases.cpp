#include "bench/cases.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "bench/platform_calls.h"
#include "src/api_table.h"

namespace bench {

namespace {

constexpr const char* kDomain = "VORN.Core.Directory.Domain";
constexpr const char* kOptions = "VORN.Core.Directory.Domain.Conf";
constexpr const char* kSchedule = "VORN.Core.Directory.Domain.Schedule";

[[noreturn]] void Fail(const char* what, const char* name) {
    std::fprintf(stderr, "no %s \"%s\"\n", what, name);
    std::exit(2);
}

VORN::APIFunction Entry(const char* api, int version, const char* method) {
    for (const VORN::APIEntry* row = GetAPITable(); row->api != nullptr; ++row) {
        if (std::strcmp(row->api, api) == 0 && row->version == version && std::strcmp(row->method, method) == 0) {
            return row->function;
        }
    }
    Fail("entry", method);
}

void RunWorker(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainUpdateStartFork(request, response, nullptr);
}

void RunMonitor(VORN::APIRequest* request, VORN::APIResponse* response) {
    DomainMonitorUpdating(request, response, nullptr);
}

Json::Value NoParams(const cheap::Sizes& /*sizes*/) {
    Json::Value none(Json::objectValue);
    return none;
}

Json::Value JoinParams(const cheap::Sizes& sizes) {
    Json::Value params;
    params["enable_domain"] = true;
    params["domain_name"] = "lab.test";
    params["username"] = "Administrator";
    params["password"] = "a password";
    params["dns"] = cheap::DnsText(sizes.dnsServers);
    params["manage_mode"] = 1;
    Json::Value& options = params["advance_domain_conf"];
    options["enable_advance_option"] = true;
    options["kdc"] = "10.0.0.1";
    options["netbios_name"] = "LAB";
    options["fqdn_name"] = "lab.test";
    options["register_nics"] = cheap::NicNames(sizes.nics);
    return params;
}

Json::Value LeaveParams(const cheap::Sizes& /*sizes*/) {
    Json::Value params;
    params["enable_domain"] = false;
    return params;
}

Json::Value IncompleteParams(const cheap::Sizes& /*sizes*/) {
    Json::Value params;
    params["enable_domain"] = true;
    return params;
}

Json::Value AllDomainsParams(const cheap::Sizes& /*sizes*/) {
    Json::Value params;
    params["domain_name"] = "@all";
    return params;
}

Json::Value TaskParams(const cheap::Sizes& /*sizes*/) {
    Json::Value params;
    params["task_id"] = "DomainUpdate_0";
    return params;
}

// Each of them differs from what is stored.
Json::Value OptionsParams(const cheap::Sizes& /*sizes*/) {
    Json::Value params;
    params["enable_sync_time"] = true;
    params["enable_server_signing"] = false;
    params["enable_rpc_enum_usergroup"] = true;
    params["domain_nested_group"] = 3;
    params["disable_domain_admins"] = true;
    return params;
}

Json::Value WeekdaysParams(const cheap::Sizes& /*sizes*/) {
    Json::Value params;
    params["date_type"] = 0;
    params["week_name"] = "0,6";
    params["hour"] = 3;
    params["min"] = 30;
    return params;
}

Json::Value NoScheduleParams(const cheap::Sizes& /*sizes*/) {
    Json::Value params;
    params["date_type"] = 2;
    return params;
}

constexpr cheap::Answers kMember = {true, true, 0};
constexpr cheap::Answers kMemberWithoutTrusts = {true, false, 0};
constexpr cheap::Answers kWorkgroup = {false, true, 0};
constexpr cheap::Answers kJoinFails = {false, true, 1};

std::vector<Case> MakeCases() {
    namespace p = platform_calls;
    const auto get = Entry(kDomain, 1, "get");
    const auto set = Entry(kDomain, 1, "set");
    const auto list2 = Entry(kDomain, 2, "get_domain_list");
    const auto scheduleSet = Entry(kSchedule, 1, "set");
    return {
        {"get, member", get, p::Get, NoParams, kMember, 0},
        {"get, no member", get, p::GetInWorkgroup, NoParams, kWorkgroup, 0},
        {"set, joins", set, p::SetJoin, JoinParams, kWorkgroup, 0},
        {"set, join fails", set, p::SetJoinThatFails, JoinParams, kJoinFails, 2610},
        {"set, leaves", set, p::SetLeave, LeaveParams, kMember, 0},
        {"set, refused", set, p::SetRefused, IncompleteParams, kMember, 2618},
        {"test_dc", Entry(kDomain, 1, "test_dc"), p::TestDc, NoParams, kMember, 0},
        {"get_domain_list 1", Entry(kDomain, 1, "get_domain_list"), p::DomainList1, NoParams, kMember, 0},
        {"get_domain_list 2, trusts", list2, p::DomainList2Trusts, NoParams, kMember, 0},
        {"get_domain_list 2, units", list2, p::DomainList2Units, NoParams, kMemberWithoutTrusts, 0},
        {"update_start", Entry(kDomain, 1, "update_start"), p::UpdateStart, AllDomainsParams, kMember, 0},
        {"update_status", Entry(kDomain, 1, "update_status"), p::UpdateStatus, TaskParams, kMember, 0},
        {"update_stop", Entry(kDomain, 1, "update_stop"), p::UpdateStop, NoParams, kMember, 0},
        {"task body, worker", RunWorker, p::Worker, AllDomainsParams, kMember, 0},
        {"task body, monitor", RunMonitor, p::Monitor, NoParams, kMember, 0},
        {"options get", Entry(kOptions, 1, "get"), p::OptionsGet, NoParams, kMember, 0},
        {"options set", Entry(kOptions, 1, "set"), p::OptionsSet, OptionsParams, kMember, 0},
        {"schedule get", Entry(kSchedule, 1, "get"), p::ScheduleGet, NoParams, kMember, 0},
        {"schedule set, weekdays", scheduleSet, p::ScheduleSet, WeekdaysParams, kMember, 0},
        {"schedule set, none", scheduleSet, p::ScheduleRemove, NoScheduleParams, kMember, 0},
    };
}

}  // namespace

const std::vector<Case>& Cases() {
    static const std::vector<Case> cases = MakeCases();
    return cases;
}

const std::vector<ListCase>& ListCases() {
    using S = cheap::Sizes;
    static const std::vector<ListCase> cases = {
        {"DNS servers read, get", "get, member", &S::dnsServers},
        {"DNS servers written, set", "set, joins", &S::dnsServers},
        {"DNS servers put back, set", "set, join fails", &S::dnsServers},
        {"domain list 1", "get_domain_list 1", &S::domains},
        {"domain list 2, trusts", "get_domain_list 2, trusts", &S::domains},
        {"domain list 2, units", "get_domain_list 2, units", &S::units},
        {"nics from the file, get", "get, member", &S::nics},
        {"nics to the file, set", "set, joins", &S::nics},
        {"task list, update_start", "update_start", &S::tasks},
        {"task list, update_stop", "update_stop", &S::tasks},
        {"keys of a section, options get", "options get", &S::keys},
        {"keys of a section, options set", "options set", &S::keys},
        {"scheduled tasks, schedule get", "schedule get", &S::scheduled},
    };
    return cases;
}

const Case& FindCase(const char* name) {
    for (const Case& one : Cases()) {
        if (std::strcmp(one.name, name) == 0) {
            return one;
        }
    }
    Fail("case", name);
}

Fixture::Fixture(const Case& aCase, const cheap::Sizes& sizes)
    : call_(aCase.call), platformCalls_(aCase.platformCalls) {
    cheap::Configure(sizes, aCase.answers);
    cheap::SetParams(request_, aCase.params(sizes));
}

}  // namespace bench
