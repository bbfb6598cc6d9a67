#include "tests/library/scenario.h"

#include <json/reader.h>
#include <json/writer.h>

#include <chrono>
#include <memory>
#include <stdexcept>

#include "tests/library/libc_stand_ins.h"

namespace {

constexpr const char* kDomain = "VORN.Core.Directory.Domain";
constexpr const char* kOptions = "VORN.Core.Directory.Domain.Conf";
constexpr const char* kSchedule = "VORN.Core.Directory.Domain.Schedule";
constexpr const char* kSmbConf = "/usr/vorn/etc/smb.conf";
constexpr const char* kUserFetchPid = "/tmp/domain_user.pid";

// What the join leaves in the file-sharing service's configuration.
void FollowJoin(const _tag_VORN_WIN2_& record) {
    fake::State& state = fake::TheAppliance().state;
    if (record.joinMode == 0) {
        state.keyValueFiles.erase(kSmbConf);
        return;
    }
    state.adsJoined = 1;
    state.keyValueFiles[kSmbConf]["global"] = {{"security", "ads"}, {"workgroup", "LAB"}, {"realm", "LAB.TEST"}};
}

// The framework keeps what a task published, and how it ended, for those who ask about the task.
void KeepTaskRecord(const std::vector<fake::Answer>& answers) {
    fake::BackgroundTask& task = fake::TheAppliance().state.tasks.back();
    task.record["finish"] = true;
    task.record["success"] = !answers.empty() && answers.back().success;
    task.record["data"] = answers.empty() ? Json::Value() : answers.back().data;
}

template <typename Call>
double Microseconds(const Call& call) {
    const auto begin = std::chrono::steady_clock::now();
    call();
    return std::chrono::duration<double, std::micro>(std::chrono::steady_clock::now() - begin).count();
}

}  // namespace

void PrepareAppliance() {
    fake::TheAppliance().Reset();
    fake::State& state = fake::TheAppliance().state;
    state.dnsServers = {"10.0.0.1"};
    state.domains = {"LAB", "OTHER"};
    state.fqdns = {{"LAB", "lab.test"}, {"OTHER", "other.test"}};
    state.onJoin = FollowJoin;
    whileAsleep = nullptr;
}

const std::vector<Step>& Scenario() {
    static const std::vector<Step> steps = {
        {"Is the appliance a member of a domain?", kDomain, 1, "get", "{}", {R"({"enable_domain":false})"}},
        {"Join one, with its DNS server and an advanced option",
         kDomain,
         1,
         "set",
         R"({"enable_domain":true,"domain_name":"lab.test","username":"Administrator","password":"imitated",)"
         R"("dns":"10.0.0.53","manage_mode":0,)"
         R"("advance_domain_conf":{"enable_advance_option":true,"netbios_name":"LAB","register_nics":["eth0"]}})",
         {"null"}},
        {"Is it a member now?",
         kDomain,
         1,
         "get",
         "{}",
         {R"({"advance_domain_conf":{"enable_advance_option":true,"fqdn_name":"LAB.TEST","kdc":"",)"
          R"("netbios_name":"LAB","register_nics":["eth0"]},"dns":"10.0.0.53","domain_name":"lab.test",)"
          R"("domain_type":"AD","enable_domain":true,"manage_mode":0})"}},
        {"Does the domain controller still accept it?", kDomain, 1, "test_dc", "{}", {R"({"test_join_success":true})"}},
        {"Which domains are in sight?", kDomain, 1, "get_domain_list", "{}", {R"({"domain_list":["LAB","OTHER"]})"}},
        {"Which, with their DNS names?",
         kDomain,
         2,
         "get_domain_list",
         "{}",
         {R"({"domain_list":[["LAB","LAB","lab.test"],["OTHER","OTHER","other.test"]]})"}},
        {"Change options of the file-sharing service",
         kOptions,
         1,
         "set",
         R"({"enable_server_signing":true,"domain_nested_group":3})",
         {"null"}},
        {"Read them back",
         kOptions,
         1,
         "get",
         "{}",
         {R"({"disable_domain_admins":false,"domain_nested_group":3,"enable_rpc_enum_usergroup":false,)"
          R"("enable_server_signing":true,"enable_sync_time":false})"}},
        {"Refresh users and groups every Sunday at half past three",
         kSchedule,
         1,
         "set",
         R"({"date_type":0,"week_name":"0","hour":3,"min":30})",
         {"null"}},
        {"Read the schedule back",
         kSchedule,
         1,
         "get",
         "{}",
         {R"({"date":"","date_type":0,"hour":3,"last_work_hour":0,"min":30,"repeat":0,"repeat_hour":0,)"
          R"("week_name":"0"})"}},
        {"Refresh users and groups now", kDomain, 1, "update_start", "{}", {R"({"task_id":"DomainUpdate1"})"}},
        {"The worker runs in the background", "", 0, "", "", {R"({"status":"updating"})", R"({"status":"finish"})"}},
        {"How far is the refresh?",
         kDomain,
         1,
         "update_status",
         R"({"task_id":"DomainUpdate1"})",
         {R"({"status":"finish"})"}},
        {"Refresh once more, while the appliance does so by itself",
         kDomain,
         1,
         "update_start",
         R"({"domain_name":"LAB"})",
         {R"({"task_id":"DomainUpdate2"})"}},
        {"The monitor runs in the background", "", 0, "", "", {R"({"status":"updating"})", R"({"status":"finish"})"}},
        {"Stop all refreshes", kDomain, 1, "update_stop", "{}", {"null"}},
        {"Leave the domain", kDomain, 1, "set", R"({"enable_domain":false})", {"null"}},
        {"Is it still a member?", kDomain, 1, "get", "{}", {R"({"enable_domain":false})"}},
    };
    return steps;
}

Outcome RunStep(const ModuleLibrary& module, const Step& step) {
    fake::Appliance& appliance = fake::TheAppliance();
    fake::State& state = appliance.state;
    const std::size_t answersBefore = appliance.Answers().size();
    const std::size_t logsBefore = appliance.Logs().size();
    const std::size_t commandsBefore = state.commands.size();

    Outcome outcome{};
    if (!step.api.empty()) {
        if (step.method == "update_start" && state.startedTasks == 1) {
            // The second refresh finds the appliance at it; it is done when the monitor looks again.
            state.pidFiles[kUserFetchPid] = 4711;
            whileAsleep = [] { fake::TheAppliance().state.pidFiles.clear(); };
        }
        fake::Exchange exchange(ParseJson(step.parameters));
        const VORN::APIFunction function = module.Function(step.api, step.version, step.method);
        outcome.microseconds = Microseconds([&] { function(&exchange.request, &exchange.response); });
    } else {
        fake::Exchange exchange(state.startedParameters);
        outcome.microseconds =
            Microseconds([&] { state.startedBody(&exchange.request, &exchange.response, state.startedUserData); });
    }

    outcome.answers.assign(appliance.Answers().begin() + static_cast<std::ptrdiff_t>(answersBefore),
                           appliance.Answers().end());
    outcome.logs.assign(appliance.Logs().begin() + static_cast<std::ptrdiff_t>(logsBefore), appliance.Logs().end());
    outcome.commands.assign(state.commands.begin() + static_cast<std::ptrdiff_t>(commandsBefore), state.commands.end());
    if (step.api.empty()) {
        KeepTaskRecord(outcome.answers);
    }
    return outcome;
}

Json::Value ParseJson(const std::string& text) {
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    Json::Value value;
    std::string errors;
    if (!reader->parse(text.data(), text.data() + text.size(), &value, &errors)) {
        throw std::invalid_argument(errors);
    }
    return value;
}

std::string CompactJson(const Json::Value& value) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return Json::writeString(builder, value);
}
