// vornctl leave

#include <memory>

#include "appliance/tools/vornctl/steps.h"
#include "appliance/tools/vornctl/terminal.h"

namespace appliance::ctl {

namespace {

constexpr std::size_t kIndent = 11;

struct LeaveOptions {
    bool deleteAccount = false;
    std::string user;
    bool passwordFromInput = false;
    bool yes = false;
};

// The domain that the appliance is a working member of; empty when it is none, or does not tell. Throws Failure, so
// that nobody is asked for anything when the server does not answer.
std::string DomainToLeave(const Context& context) {
    return TextOf(context.client.Call(methods::Get()).data, "domain_name");
}

// "The appliance's computer account NAS1$"; without the name when the appliance does not tell it. After the leave it
// would not know it any more.
std::string AccountText(const Context& context) {
    Json::Value overview;
    context.client.TryCall(methods::Overview(), Json::Value(Json::objectValue), overview);
    const std::string account = TextOf(overview, "computer_account");
    return "The appliance's computer account" + (account.empty() ? "" : " " + account);
}

// True when the administrator wants it.
bool Confirm(Context& context, const LeaveOptions& options, const std::string& domain, const std::string& account) {
    if (options.yes) {
        return true;
    }
    if (!CanAsk()) {
        throw Failure(kUsage, "There is no terminal to confirm this on: use --yes.");
    }
    Output& err = context.err;
    if (domain.empty()) {
        err.Line("The appliance is not a working member of a domain. What is left of a membership");
        err.Line("is cleared.");
    } else {
        err.Paragraph(
            "", 0,
            "The appliance leaves the domain " + Escape(domain) + ". Its users lose their access to the shares.");
    }
    err.Paragraph("", 0,
                  Escape(account) + (options.deleteAccount ? " is deleted on the domain controller."
                                                           : " stays on the domain controller."));
    const std::string answer = Ask("Leave? [y/N] ");
    return answer == "y" || answer == "yes";
}

Answer RunCall(LiveSteps& steps, const LeaveOptions& options, const Secret& password) {
    Json::Value request;
    if (!options.deleteAccount) {
        request["enable_domain"] = false;
        return steps.Run(methods::Set(), request, nullptr);
    }
    request["delete_account"] = true;
    request["username"] = options.user;
    return steps.Run(methods::Leave(), request, &password);
}

// What stays behind, as the appliance names it. The record of a leave that is over names the computer account unless it
// is gone; without such a record it is taken to stay.
std::vector<std::string> WhatStays(const LeaveOptions& options, const std::string& domain, const std::string& account,
                                   const LiveSteps& steps) {
    std::vector<std::string> notes;
    for (const Json::Value& leftover : ListOf(steps.record(), "leftovers")) {
        if (leftover.isString()) {
            notes.push_back(leftover.asString());
        }
    }
    const bool recorded = !notes.empty() || !MemberOf(steps.record(), "finished").isNull();
    if (!recorded && !options.deleteAccount && !domain.empty()) {
        notes.push_back(account + " stays in the domain " + domain + ".");
    }
    return notes;
}

// The answer, whose data are null, with what stays behind in their place.
void PrintAsJson(Context& context, Answer answer, const std::vector<std::string>& notes) {
    if (!notes.empty() && answer.data.isNull()) {
        for (const std::string& note : notes) {
            answer.whole["data"]["leftovers"].append(note);
        }
    }
    PrintJson(context, answer);
}

int RunLeave(Context& context, const LeaveOptions& options) {
    if (options.deleteAccount && options.user.empty()) {
        throw Failure(kUsage, "--delete-account needs --user: an account that may delete the computer account.");
    }
    if (!options.deleteAccount && (!options.user.empty() || options.passwordFromInput)) {
        throw Failure(kUsage, "--user and --password-stdin go with --delete-account: leaving alone needs no account.");
    }
    const std::string domain = DomainToLeave(context);
    const std::string account = AccountText(context);
    if (!Confirm(context, options, domain, account)) {
        throw Failure(kInterrupted, "Nothing was changed.");
    }
    Secret password;
    if (options.deleteAccount) {
        password = options.passwordFromInput ? ReadPasswordFromInput()
                                             : AskPassword("Password of " + Escape(options.user) + ": ");
    }
    LiveSteps steps(context, true);
    if (!context.json) {
        context.out.Line("Leaving the domain.");
    }
    const Answer answer = RunCall(steps, options, password);
    const std::vector<std::string> notes =
        answer.success ? WhatStays(options, domain, account, steps) : std::vector<std::string>();
    if (context.json) {
        PrintAsJson(context, answer, notes);
        return answer.success ? kDone : kRefused;
    }
    if (!answer.success) {
        return ReportRefusal(context, answer, steps.Details());
    }
    if (domain.empty() && steps.record().isNull()) {
        context.out.Line("The appliance is not a member of a domain.");
        return kDone;
    }
    context.out.Line(context.out.Coloured(Colour::Good, "The appliance is no member of a domain any more."));
    for (const std::string& note : notes) {
        context.out.Paragraph("  Note:", kIndent, Escape(note));
    }
    return kDone;
}

}  // namespace

Runner SetUpLeave(Arguments arguments) {
    const auto options = std::make_shared<LeaveOptions>();
    arguments.Flag("--delete-account", options->deleteAccount,
                   "delete the appliance's computer account on the domain controller, too");
    arguments.Text("-u,--user", options->user, "account of the domain that may delete it, with --delete-account")
        .TypeName("ACCOUNT");
    arguments.Flag("--password-stdin", options->passwordFromInput,
                   "read that account's password from standard input instead of asking for it");
    arguments.Flag("-y,--yes", options->yes, "leave without asking");
    arguments.Footer(
        "Leaving needs no password and works also when no controller answers. The\n"
        "computer account then stays on the controller; its name is printed.\n\n"
        "Examples:\n"
        "  vornctl leave\n"
        "  vornctl leave --delete-account --user Administrator");
    return [options](Context& context) { return RunLeave(context, *options); };
}

}  // namespace appliance::ctl
