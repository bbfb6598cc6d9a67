// vornctl join

#include <memory>

#include "appliance/base/text.h"
#include "appliance/tools/vornctl/steps.h"
#include "appliance/tools/vornctl/terminal.h"

namespace appliance::ctl {

namespace {

struct JoinOptions {
    std::string domain;
    std::string user;
    bool passwordFromInput = false;
    std::vector<std::string> dns;
    bool noTrustedDomains = false;
    std::string kdc;
    std::string netbiosName;
    std::string fqdn;
    std::vector<std::string> interfaces;
};

Json::Value AdvancedOptions(const JoinOptions& options) {
    Json::Value advanced;
    advanced["enable_advance_option"] = true;
    if (!options.kdc.empty()) {
        advanced["kdc"] = options.kdc;
    }
    if (!options.netbiosName.empty()) {
        advanced["netbios_name"] = options.netbiosName;
    }
    if (!options.fqdn.empty()) {
        advanced["fqdn_name"] = options.fqdn;
    }
    for (const std::string& name : options.interfaces) {
        advanced["register_nics"].append(name);
    }
    return advanced;
}

// The request but for the password.
Json::Value Request(const JoinOptions& options) {
    Json::Value request;
    request["enable_domain"] = true;
    request["domain_name"] = options.domain;
    request["username"] = options.user;
    request["manage_mode"] = options.noTrustedDomains ? 1 : 0;
    std::string servers;
    for (const std::string& server : options.dns) {
        servers += (servers.empty() ? "" : ",") + Trim(server);
    }
    if (!servers.empty()) {
        request["dns"] = servers;
    }
    const bool isAdvanced =
        !options.kdc.empty() || !options.netbiosName.empty() || !options.fqdn.empty() || !options.interfaces.empty();
    if (isAdvanced) {
        request["advance_domain_conf"] = AdvancedOptions(options);
    }
    return request;
}

int RunJoin(Context& context, const JoinOptions& options) {
    // Nobody is asked for a password that can't be used: this throws when the server does not answer.
    const std::string old = TextOf(context.client.Call(methods::Get()).data, "domain_name");
    const Secret password =
        options.passwordFromInput
            ? ReadPasswordFromInput()
            : AskPassword("Password of " + Escape(options.user) + " in " + Escape(options.domain) + ": ");
    LiveSteps steps(context);
    if (!context.json) {
        if (!old.empty()) {
            context.out.Line("The appliance is a member of " + Escape(old) + " at present.");
        }
        context.out.Line("Joining " + Escape(options.domain) + " as " + Escape(options.user) + ".");
        context.out.Transient("  ...");
    }
    const Answer answer = steps.Run(methods::Set(), Request(options), &password);
    if (context.json) {
        PrintJson(context, answer);
        return answer.success ? kDone : kRefused;
    }
    if (!answer.success) {
        return ReportRefusal(context, answer, steps.Details());
    }
    Json::Value state;
    std::string name;
    if (context.client.TryCall(methods::Get(), Json::Value(Json::objectValue), state)) {
        name = TextOf(state, "domain_name");
    }
    Output& out = context.out;
    out.Line(out.Coloured(Colour::Good,
                          "The appliance is now a member of " + Escape(name.empty() ? options.domain : name) + "."));
    for (const auto& [title, text] : steps.Details()) {
        if (title == "Left") {
            out.Paragraph("  Note:", 11, Escape(text));
        }
    }
    out.Line("To fetch its users and groups: vornctl refresh");
    return kDone;
}

}  // namespace

Runner SetUpJoin(Arguments arguments) {
    const auto options = std::make_shared<JoinOptions>();
    arguments.Text("DOMAIN", options->domain, "DNS or NetBIOS name of the domain, no address").TypeName("").Required();
    arguments.Text("-u,--user", options->user, "account of the domain that may join computers")
        .TypeName("ACCOUNT")
        .Required();
    arguments.Flag("--password-stdin", options->passwordFromInput,
                   "read the password from standard input, up to the first end of line, instead of asking for it");
    arguments.List("--dns", options->dns, "DNS servers to use from now on, as a rule the domain's controllers")
        .TypeName("A,B");
    arguments.Flag("--no-trusted-domains", options->noTrustedDomains, "use the users of this domain only");
    arguments.Text("--kdc", options->kdc, "name or address of the domain controller to use")
        .TypeName("HOST")
        .Group("Advanced options");
    arguments.Text("--netbios-name", options->netbiosName, "NetBIOS name of the domain, when it can't be found out")
        .TypeName("NAME")
        .Group("Advanced options");
    arguments.Text("--fqdn", options->fqdn, "DNS name of the domain, when it can't be found out")
        .TypeName("NAME")
        .Group("Advanced options");
    arguments
        .List("--interface", options->interfaces,
              "network interface whose addresses are registered in DNS; may be given several times")
        .TypeName("NAME")
        .Group("Advanced options");
    arguments.Footer(
        "The password is asked for without an echo. It is no option: other users could\n"
        "read it. A join that fails leaves everything as it was.\n\n"
        "Examples:\n"
        "  vornctl join lab.example.com --user Administrator --dns 10.0.0.1,10.0.0.2\n"
        "  vornctl join LAB --user joiner --password-stdin < password-file");
    return [options](Context& context) { return RunJoin(context, *options); };
}

}  // namespace appliance::ctl
