// vornctl options

#include <memory>

#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

namespace {

// A switch of the file-sharing service: its option here and its member in requests and answers.
struct Switch {
    const char* option;
    const char* member;
    bool inverted;  // the option says the opposite of the member
    const char* title;
    const char* help;
};

constexpr Switch kSwitches[] = {
    {"--server-signing", "enable_server_signing", false, "Server signing",
     "sign SMB connections with clients that ask for it"},
    {"--sync-time", "enable_sync_time", false, "Time synchronisation",
     "keep the clock at the domain controller's time"},
    {"--rpc-enum", "enable_rpc_enum_usergroup", false, "Users and groups by RPC",
     "fetch users and groups by RPC, also from Active Directory"},
    {"--domain-admins", "disable_domain_admins", true, "Domain administrators",
     "make the domain's administrators administrators of the appliance"},
};
constexpr std::size_t kSwitchCount = sizeof(kSwitches) / sizeof(kSwitches[0]);

struct Wanted {
    std::string switches[kSwitchCount];  // "on", "off", or empty: as it is
    int nestedGroups = 0;                // 0: as it is
};

Json::Value Request(const Wanted& wanted) {
    Json::Value request(Json::objectValue);
    for (std::size_t i = 0; i < kSwitchCount; ++i) {
        if (!wanted.switches[i].empty()) {
            request[kSwitches[i].member] = (wanted.switches[i] == "on") != kSwitches[i].inverted;
        }
    }
    if (wanted.nestedGroups > 0) {
        request["domain_nested_group"] = wanted.nestedGroups;
    }
    return request;
}

int ShowOptions(Context& context) {
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, methods::OptionsGet(), Json::Value(Json::objectValue), answer, exitCode) ||
        context.json) {
        return exitCode;
    }
    std::vector<std::vector<std::string>> rows;
    for (const Switch& one : kSwitches) {
        const bool on = FlagOf(answer.data, one.member) != one.inverted;
        rows.push_back({one.title, on ? "on" : "off", one.option});
    }
    rows.push_back(
        {"Depth of nested groups", std::to_string(NumberOf(answer.data, "domain_nested_group")), "--nested-groups"});
    context.out.Table({"OPTION", "NOW", "CHANGE WITH"}, rows);
    return kDone;
}

int RunOptions(Context& context, const Wanted& wanted) {
    const Json::Value request = Request(wanted);
    if (request.empty()) {
        return ShowOptions(context);
    }
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, methods::OptionsSet(), request, answer, exitCode) || context.json) {
        return exitCode;
    }
    return ShowOptions(context);
}

}  // namespace

Runner SetUpOptions(Arguments arguments) {
    const auto wanted = std::make_shared<Wanted>();
    for (std::size_t i = 0; i < kSwitchCount; ++i) {
        arguments.Text(kSwitches[i].option, wanted->switches[i], kSwitches[i].help)
            .OneOf({"on", "off"})
            .TypeName("on|off");
    }
    arguments.Number("--nested-groups", wanted->nestedGroups, "how deep groups within groups are followed, 1 to 99")
        .Between(1, 99)
        .TypeName("N");
    arguments.Footer(
        "Without an option the present values are shown. Options that are not named stay\n"
        "as they are.\n\n"
        "Example:\n"
        "  vornctl options --server-signing on --nested-groups 3");
    return [wanted](Context& context) { return RunOptions(context, *wanted); };
}

}  // namespace appliance::ctl
