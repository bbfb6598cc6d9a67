// vornctl status, vornctl test

#include "appliance/base/text.h"
#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

namespace {

using Facts = std::vector<std::pair<std::string, std::string>>;

std::string KindText(const std::string& kind) {
    return kind == "AD" ? "Active Directory" : kind == "NT4" ? "NT4-style" : kind;
}

std::string Joined(const Json::Value& texts) {
    std::string all;
    for (const Json::Value& text : texts) {
        if (text.isString()) {
            all += (all.empty() ? "" : ", ") + text.asString();
        }
    }
    return all;
}

void AddAdvancedOptions(const Json::Value& options, Facts& facts) {
    if (!FlagOf(options, "enable_advance_option")) {
        return;
    }
    facts.emplace_back("Controller given", TextOf(options, "kdc"));
    const std::string nics = Joined(ListOf(options, "register_nics"));
    facts.emplace_back("Addresses in DNS", nics == "all" ? "of every interface" : "of " + nics);
}

// What the local lists hold, if the appliance tells.
void AddLists(Context& context, const std::string& domain, Facts& facts) {
    Json::Value data;
    if (!context.client.TryCall(methods::Domains(), Json::Value(Json::objectValue), data)) {
        return;
    }
    std::string text;
    for (const Json::Value& list : ListOf(data, "domains")) {
        if (!EqualIgnoringCase(TextOf(list, "domain"), domain)) {
            continue;
        }
        const std::string kind = TextOf(list, "kind") == "group" ? " groups" : " users";
        text += (text.empty() ? "" : "; ") + std::to_string(NumberOf(list, "count")) + kind + " of " +
                TimeText(MemberOf(list, "fetched"));
    }
    facts.emplace_back("Local lists", text.empty() ? "none yet; \"vornctl refresh\" fetches them" : text);
}

std::string TestText(const Json::Value& test) {
    if (!test.isObject()) {
        return "none yet; \"vornctl test\" makes one";
    }
    return std::string(FlagOf(test, "success") ? "worked" : "failed") + ", " + TimeText(MemberOf(test, "time")) + ", " +
           DurationText(MemberOf(test, "milliseconds"));
}

// A member's status says how its last test went, too, if the appliance tells.
Json::Value AskOverview(Context& context, const Answer& answer) {
    Json::Value overview;
    if (answer.success && FlagOf(answer.data, "enable_domain")) {
        context.client.TryCall(methods::Overview(), Json::Value(Json::objectValue), overview);
    }
    return overview;
}

int RunStatus(Context& context) {
    Answer answer = context.client.Call(methods::Get());
    const Json::Value overview = AskOverview(context, answer);
    if (context.json) {
        if (overview.isObject()) {
            answer.whole["data"]["last_test"] = MemberOf(overview, "last_test");
        }
        PrintJson(context, answer);
        return answer.success ? kDone : kRefused;
    }
    if (!answer.success) {
        return ReportRefusal(context, answer);
    }
    Output& out = context.out;
    const Json::Value& data = answer.data;
    if (!FlagOf(data, "enable_domain")) {
        out.Line("The appliance is not a member of a domain.");
        out.Line("To join one: vornctl join DOMAIN --user ACCOUNT");
        return kDone;
    }
    const Json::Value& options = MemberOf(data, "advance_domain_conf");
    std::string dns;
    for (const std::string& server : Split(TextOf(data, "dns"), ",")) {
        dns += (dns.empty() ? "" : ", ") + server;
    }
    const std::string domain = TextOf(data, "domain_name");
    Facts facts = {{"Member of", domain}, {"Kind of domain", KindText(TextOf(data, "domain_type"))}};
    if (const std::string fqdn = TextOf(options, "fqdn_name"); !fqdn.empty()) {
        facts.emplace_back("DNS name", fqdn);
    }
    facts.emplace_back("Trusted domains", NumberOf(data, "manage_mode") == 0 ? "used" : "not used");
    facts.emplace_back("DNS servers", dns);
    AddAdvancedOptions(options, facts);
    if (overview.isObject()) {
        facts.emplace_back("Last test", TestText(MemberOf(overview, "last_test")));
    }
    AddLists(context, domain, facts);
    out.Facts(facts);
    return kDone;
}

int RunTest(Context& context) {
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, methods::TestDc(), Json::Value(Json::objectValue), answer, exitCode)) {
        return exitCode;
    }
    Output& out = context.out;
    const bool works = FlagOf(answer.data, "test_join_success");
    if (context.json) {
        return works ? kDone : kNotWorking;
    }
    if (works) {
        out.Line(out.Coloured(Colour::Good, "The membership works") + ": the domain accepts the appliance.");
        return kDone;
    }
    Json::Value data;
    const bool known = context.client.TryCall(methods::Get(), Json::Value(Json::objectValue), data);
    if (known && !FlagOf(data, "enable_domain")) {
        out.Line(out.Coloured(Colour::Bad, "The appliance is not a member of a domain."));
        out.Line("To join one: vornctl join DOMAIN --user ACCOUNT");
        return kNotWorking;
    }
    out.Line(out.Coloured(Colour::Bad, "The membership does not work."));
    out.Paragraph("  Why:", 11,
                  "No domain controller answers, or the domain does not know the appliance's account or its password "
                  "any more.");
    out.Paragraph("  Try:", 11,
                  "Check that a controller runs and can be reached. If it does, join again with \"vornctl join\": the "
                  "shares and their permissions stay.");
    return kNotWorking;
}

}  // namespace

Runner SetUpStatus(Arguments arguments) {
    arguments.Footer(
        "Ends with 0 both for a member and for an appliance that is none. No controller\n"
        "is asked: whether the membership works now tells \"vornctl test\"; what the last\n"
        "test said is shown here.");
    return RunStatus;
}

Runner SetUpTest(Arguments arguments) {
    arguments.Footer("Ends with 0 when the membership works and with 5 when it does not.");
    return RunTest;
}

}  // namespace appliance::ctl
