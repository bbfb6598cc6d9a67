#include "appliance/domain/join/leave_job.h"

#include <system_error>

#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/join/account_check.h"
#include "appliance/domain/join/dns_registration.h"
#include "appliance/domain/join/join_status.h"
#include "appliance/domain/join/join_target.h"
#include "appliance/domain/join/journal.h"
#include "appliance/domain/join/machine_account.h"
#include "appliance/domain/join/membership_files.h"
#include "appliance/domain/join/provisional.h"
#include "appliance/domain/join/tool_output.h"
#include "appliance/domain/join/winbind.h"
#include "appliance/domain/membership/kerberos.h"
#include "appliance/domain/membership/secrets.h"
#include "appliance/platform/system/services.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;

constexpr milliseconds kDnsWait{5000};
constexpr milliseconds kFindWait{3000};
constexpr milliseconds kTicketWait{4000};
constexpr milliseconds kDeleteWait{5000};
constexpr milliseconds kWinbindWait{3000};
constexpr milliseconds kReloadWait{2000};

}  // namespace

LeaveJob::LeaveJob(const JoinRequest& request, StepLog& steps, const TimeBudget& budget)
    : request_(request), steps_(steps), budget_(budget) {}

void LeaveJob::Run() {
    steps_.Begin("request");
    if (!IsNetbiosName(request_.domain)) {
        Fail(status::kWorkgroup, "the workgroup's name holds what no such name holds");
    }
    if (const std::error_code error = ReadMembership(membership_)) {
        Fail(status::kSystem, Path(kSmbConf) + ": " + error.message());
    }
    steps_.Ok();
    if (!membership_.DomainMode()) {
        return Clear();
    }
    if (request_.deleteAccount) {
        DeleteAccount();
    }
    Unregister();
    Clear();
    if (!deleted_ && !accountGone_) {
        steps_.Leftover("the computer account " + membership_.Account() + " stays in the domain " + membership_.domain);
    }
}

Controller LeaveJob::FindController() {
    std::vector<Controller> controllers;
    const std::string& server = membership_.passwordServer;
    if (IsAddress(server) || IsDnsName(server)) {
        for (const std::string& address : AddressesOf(server, budget_.Left(kFindWait))) {
            controllers.push_back({IsAddress(server) ? "" : server, address});
        }
    } else if (membership_.kind == DomainKind::ActiveDirectory) {
        controllers = FindControllers(Lower(membership_.realm), budget_.Left(kFindWait));
    } else {
        controllers = FindPrimaryController(membership_.domain, budget_.Left(kFindWait));
    }
    for (const Controller& controller : controllers) {
        std::string reason;
        if (CanConnect(controller.address, 445, budget_.Left(milliseconds(1500)), reason)) {
            return controller;
        }
    }
    Fail(controllers.empty() ? status::kNoController : status::kPort445);
}

void LeaveJob::CheckCredentials(const Controller& controller) {
    const Credentials& credentials = request_.credentials;
    if (!IsToolAccountName(credentials.user)) {
        Fail(R"(The user name is empty, begins with "-", or holds "%" or a control character.)");
    }
    TicketResult ticket;
    if (membership_.kind == DomainKind::ActiveDirectory &&
        KdcKnowsOf(credentials.user, membership_.realm, membership_.domain)) {
        const ProbeFolder folder;
        const std::string configuration =
            WriteKerberosConfiguration(folder.path(), membership_.realm, controller.address);
        ticket =
            AskForTicket(credentials, membership_.realm, membership_.domain, configuration, budget_.Left(kTicketWait));
        const std::string message = TicketFailureMessage(ticket, false);
        if (!message.empty() && ticket.outcome != TicketResult::Outcome::Revoked) {
            Fail(message, ticket.words);
        }
        if (message.empty()) {
            return;
        }
    }
    SambaCall call;
    call.arguments = {"rpc", "info", "--server=" + controller.address};
    call.credentials = &credentials;
    call.deadline = budget_.Left(kTicketWait);
    const CommandResult result = RunNet(call);
    const std::string message = AccountFailureMessage(result, controller.address);
    if (!message.empty()) {
        Fail(message, LastWords(result));
    }
    if (ticket.outcome == TicketResult::Outcome::Revoked) {
        Fail(status::kRevoked, ticket.words);
    }
}

void LeaveJob::DeleteAccount() {
    steps_.Begin("delete account");
    const Controller controller = FindController();
    const std::string server = controller.name.empty() ? controller.address : controller.name;
    steps_.Server(server);
    CheckCredentials(controller);
    if (membership_.kind == DomainKind::ActiveDirectory) {
        // Before the account goes: afterwards nobody but an administrator could remove its records.
        if (const std::string error = UnregisterInDns(membership_, request_.credentials, budget_.Left(kDnsWait));
            !error.empty()) {
            steps_.Leftover("the addresses of " + RegisteredName(membership_) + " stay in DNS: " + error);
        }
    }
    const std::string error = DeleteMachineAccount(membership_.Account(), controller.address, "", request_.credentials,
                                                   budget_.Left(kDeleteWait));
    if (!error.empty()) {
        if (membership_.kind == DomainKind::ActiveDirectory) {
            RegisterAgain();
        }
        const bool forbidden = Contains(error, "Access") || Contains(error, "ACCESS_DENIED");
        Fail(forbidden ? status::kNoRight : "The computer account could not be removed: " + error, error);
    }
    deleted_ = true;
    steps_.Ok(membership_.Account());
}

// The account stays, and so does the membership.
void LeaveJob::RegisterAgain() {
    std::vector<std::string> addresses;
    std::string error = AddressesToRegister(addresses);
    if (error.empty()) {
        error = RegisterInDns(membership_, addresses, request_.credentials, budget_.Left(kDnsWait));
    }
    if (!error.empty()) {
        steps_.Leftover("the addresses of " + RegisteredName(membership_) + " are no longer in DNS: " + error);
    }
}

void LeaveJob::Unregister() {
    if (membership_.kind != DomainKind::ActiveDirectory || deleted_) {
        return;
    }
    steps_.Begin("dns");
    // There are no credentials; and Samba's tool would make a damaged database of secrets anew.
    KeepDamagedSecrets(Path(kSecrets));
    if (const std::string error = UnregisterInDns(membership_, {}, budget_.Left(kDnsWait)); !error.empty()) {
        accountGone_ = Contains(error, "Client not found");
        steps_.Failed(error);
        steps_.Leftover("the addresses of " + RegisteredName(membership_) + " stay in DNS: " + error);
        return;
    }
    steps_.Ok(RegisteredName(membership_));
}

void LeaveJob::Clear() {
    steps_.Begin("local state");
    Journal journal;
    journal.phase = Journal::Phase::Leaving;
    journal.before = membership_;
    journal.after = membership_;
    journal.after.kind = DomainKind::Workgroup;
    journal.after.domain = request_.domain;
    journal.resetOptions = request_.resetOptions;
    PrepareLeave(journal, request_.domain);
    if (const std::string error = StopWinbind(kWinbindWait); !error.empty()) {
        steps_.Leftover(error);
    }
    try {
        for (const std::string& failure : ClearMembership(journal)) {
            steps_.Leftover("could not be removed: " + failure);
        }
    } catch (const std::system_error& error) {
        RemoveJournal();
        if (membership_.Joined()) {
            if (const std::string complaint = StartWinbind(kWinbindWait); !complaint.empty()) {
                steps_.Leftover("winbind does not run again: " + complaint);
            }
        }
        Fail(status::kSystem, error.what());
    }
    RemoveJournal();
    KeepProvisionalChanges();
    steps_.Ok();
    steps_.Begin("services");
    std::string complaints;
    for (const char* service : {"samba", "nmbd"}) {
        const ServiceResult result = ReloadService(service, budget_.Left(kReloadWait));
        complaints += result ? "" : (complaints.empty() ? "" : "; ") + result.error;
    }
    if (complaints.empty()) {
        steps_.Ok();
    } else {
        steps_.Failed(complaints);
    }
}

void LeaveJob::Fail(const std::string& message, const std::string& detail) {
    steps_.Failed(detail.empty() ? message : detail);
    throw JoinError(message, detail);
}

}  // namespace appliance
