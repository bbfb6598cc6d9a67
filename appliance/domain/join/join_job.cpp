#include "appliance/domain/join/join_job.h"

#include <cerrno>
#include <cstdlib>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/join/detached_tool.h"
#include "appliance/domain/join/dns_registration.h"
#include "appliance/domain/join/machine_account.h"
#include "appliance/domain/join/membership_files.h"
#include "appliance/domain/join/provisional.h"
#include "appliance/domain/join/recovery.h"
#include "appliance/domain/join/tool_output.h"
#include "appliance/domain/join/winbind.h"
#include "appliance/domain/membership/idmap.h"
#include "appliance/domain/membership/kerberos.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;
using Phase = Journal::Phase;

constexpr milliseconds kTicketWait{4000};
constexpr milliseconds kLookupWait{3000};
constexpr milliseconds kJoinWait{15000};
constexpr milliseconds kLeastForJoin{6000};  // less is not worth beginning with
constexpr milliseconds kTestWait{5000};
constexpr milliseconds kWinbindWait{5000};
constexpr milliseconds kTrustWait{4000};
constexpr milliseconds kDnsWait{4000};
constexpr milliseconds kRecoveryWait{4000};
constexpr milliseconds kDeleteWait{2500};
constexpr milliseconds kBackWinbindWait{2200};
static_assert(2 * kBackWinbindWait + kDeleteWait < kBackTime, "the launcher would end the way back before its end");
constexpr long kMostClockDifference = 300;  // seconds; Kerberos refuses more

std::string ServerName(const Controller& controller) {
    return controller.name.empty() ? controller.address : controller.name;
}

}  // namespace

JoinJob::JoinJob(const JoinRequest& request, const JobHooks& hooks, StepLog& steps, const TimeBudget& budget)
    : request_(request), hooks_(hooks), steps_(steps), budget_(budget) {}

void JoinJob::Run() {
    steps_.Begin("request");
    CheckRequest(request_);
    if (const std::error_code error = ReadMembership(journal_.before)) {
        Fail(status::kSystem, Path(kSmbConf) + ": " + error.message());
    }
    steps_.Ok();
    const ProbeFolder folder;
    const std::string probe = folder.Configuration();
    target_ = FindTarget(request_, probe, steps_, budget_);
    if (target_.kind == DomainKind::ActiveDirectory) {
        kerberosConfiguration_ = WriteKerberosConfiguration(folder.path(), target_.realm, target_.controller.address);
    }
    CheckAccount(probe);
    LookForComputerAccount(probe);
    try {
        Prepare();
        JoinBesideOldOne();
        ConfirmStaged();
        Activate();
        ConfirmTrustOfNewOne();
        Advance(Phase::Confirmed);
    } catch (const std::exception& error) {
        // Of a step that Fail has ended already nothing changes.
        steps_.Failed(error.what());
        Undo();
        throw;
    }
    KeepProvisionalChanges();
    FinishUp();
    RemoveJournal();
}

// ---- before anything changes ----

void JoinJob::CheckAccount(const std::string& probe) {
    steps_.Begin("credentials", ServerName(target_.controller));
    TicketResult ticket;
    if (target_.kind == DomainKind::ActiveDirectory &&
        KdcKnowsOf(request_.credentials.user, target_.realm, target_.domain)) {
        ticket = AskForTicket(request_.credentials, target_.realm, target_.domain, kerberosConfiguration_,
                              budget_.Left(kTicketWait));
        if (ticket.outcome == TicketResult::Outcome::Granted) {
            const bool skewed = std::labs(ticket.clockDifference) > kMostClockDifference;
            steps_.Ok(skewed ? "the clocks differ" : "");
            if (skewed) {
                steps_.Leftover("the controller's clock differs by " + std::to_string(ticket.clockDifference) +
                                " seconds from the appliance's: clients will be refused until they agree");
            }
            return;
        }
        const std::string message = TicketFailureMessage(ticket, target_.pinned);
        if (ticket.outcome != TicketResult::Outcome::Revoked) {
            Fail(message, ticket.words);
        }
    }
    // Only a session with the controller tells a disabled account from one that is locked or expired.
    SambaCall call;
    call.arguments = {"rpc", "info", "--server=" + target_.controller.address};
    call.configuration = probe;
    call.credentials = &request_.credentials;
    call.deadline = budget_.Left(kLookupWait);
    const CommandResult result = RunNet(call);
    const std::string message = AccountFailureMessage(result, ServerName(target_.controller));
    if (ticket.outcome == TicketResult::Outcome::Revoked) {
        const bool told = message == status::kDisabled || message == status::kWrongNameOrPassword;
        Fail(told ? message : status::kRevoked, ticket.words);
    }
    if (!message.empty()) {
        Fail(message, LastWords(result));
    }
    steps_.Ok();
}

void JoinJob::LookForComputerAccount(const std::string& probe) {
    const std::string account = journal_.before.Account();
    steps_.Begin("computer account", ServerName(target_.controller));
    if (target_.kind == DomainKind::ActiveDirectory) {
        journal_.accountBefore =
            LookUpAccount(account, target_.realm, kerberosConfiguration_, budget_.Left(kTicketWait));
    } else {
        journal_.accountBefore = LookUpAccountByRpc(account, target_.controller.address, probe, request_.credentials,
                                                    budget_.Left(kLookupWait));
    }
    switch (journal_.accountBefore) {
        case AccountState::Absent:
            return steps_.Ok(account + " does not exist yet");
        case AccountState::Present:
            return steps_.Ok(account + " exists");
        case AccountState::Unknown:
            return steps_.Ok("whether " + account + " exists could not be found out");
    }
}

// ---- the join, beside the old membership ----

void JoinJob::Prepare() {
    steps_.Begin("configuration");
    if (budget_.Left(kJoinWait) < kLeastForJoin) {
        Fail(status::kSystem, "the controller was too slow: no time is left for the join");
    }
    if (const Recovery recovery = RecoverUnderLock(budget_.Left(kRecoveryWait), Wanted::Old);
        recovery.result == Recovery::Result::Running) {
        Fail(status::kSystem, "the tool of an interrupted join still runs");
    }
    journal_.after = journal_.before;
    journal_.after.kind = target_.kind;
    journal_.after.domain = target_.domain;
    journal_.after.realm = target_.realm;
    journal_.after.passwordServer = request_.controller;
    journal_.after.hasSecret = true;
    journal_.controller = target_.controller.address;
    PrepareJoin(journal_, target_.controller.address);
    journalled_ = true;
    steps_.Ok();
}

void JoinJob::JoinBesideOldOne() {
    steps_.Begin("join", ServerName(target_.controller));
    Advance(Phase::Joining);
    SambaCall call;
    if (target_.kind == DomainKind::ActiveDirectory) {
        call.arguments = {"ads", "join", "--no-dns-updates"};
        if (!target_.controller.name.empty()) {
            call.arguments.push_back("--server=" + target_.controller.name);
        }
    } else {
        call.arguments = {"rpc", "join", "--server=" + target_.controller.address};
    }
    call.configuration = journal::StagedConf();
    call.credentials = &request_.credentials;
    call.deadline = budget_.Left(kJoinWait);
    Command command = SambaCommand(kNet, call);
    command.environment.emplace_back("KRB5_KTNAME", "FILE:" + journal::StagedKeytab());
    const CommandResult result = RunDetached(command, journal::Staging());
    if (!result.Succeeded()) {
        Fail(JoinFailureMessage(result), LastWords(result));
    }
    // From here on the account's new password counts, whatever a test says.
    Advance(Phase::Joined);
    steps_.Ok();
}

void JoinJob::ConfirmStaged() {
    steps_.Begin("confirm join", ServerName(target_.controller));
    std::string words;
    const SecretState state =
        TestSecret(journal_.after, journal::StagedConf(), target_.controller.address, budget_.Left(kTestWait), &words);
    if (state == SecretState::Unknown) {
        Fail(std::string(status::kNoConnection) + " " + ServerName(target_.controller), words);
    }
    if (state == SecretState::Refused) {
        Fail(words, words);
    }
    steps_.Ok(words);
}

// ---- the new membership in the old one's place ----

void JoinJob::Activate() {
    steps_.Begin("activate");
    if (const std::string error = StopWinbind(budget_.Left(kWinbindWait)); !error.empty()) {
        Fail(status::kSystem, error);
    }
    RefreshOldSecrets();
    Advance(Phase::Swapping);
    PutInPlace(journal_);
    if (!journal_.EqualDomain()) {
        RemoveDomainCaches();
    }
    Advance(Phase::Swapped);
    steps_.Ok();
}

void JoinJob::ConfirmTrustOfNewOne() {
    steps_.Begin("winbind");
    if (const std::string error = StartWinbind(budget_.Left(kWinbindWait)); !error.empty()) {
        Fail(status::kWinbind, error);
    }
    steps_.Ok();
    steps_.Begin("trust", ServerName(target_.controller));
    std::string words;
    switch (ConfirmTrust(budget_.Left(kTrustWait), words)) {
        case WinbindTrust::Confirmed:
            return steps_.Ok();
        case WinbindTrust::Denied:
            return Fail(status::kWinbind, words);
        case WinbindTrust::Busy:
            break;
    }
    // A trusted domain that is out of reach keeps winbindd busy, and must not fail the join of one that answers.
    if (TestSecret(journal_.after, "", target_.controller.address, budget_.Left(kTestWait), &words) !=
        SecretState::Works) {
        Fail(status::kWinbind, words);
    }
    steps_.Ok("the controller confirms it");
    steps_.Leftover("winbind is still looking for a trusted domain, and does not answer yet");
}

// Nothing of this can fail the join.
void JoinJob::FinishUp() {
    if (target_.kind == DomainKind::ActiveDirectory) {
        steps_.Begin("dns", ServerName(target_.controller));
        std::vector<std::string> addresses;
        std::string error = AddressesToRegister(addresses);
        if (error.empty()) {
            error = RegisterInDns(journal_.after, addresses, request_.credentials, budget_.Left(kDnsWait));
        }
        if (error.empty()) {
            steps_.Ok(RegisteredName(journal_.after) + ": " + std::to_string(addresses.size()) + " addresses");
        } else {
            steps_.Failed(error);
            steps_.Leftover("the addresses of " + RegisteredName(journal_.after) +
                            " are not registered in DNS: " + error);
        }
    }
    steps_.Begin("settings");
    const std::string error = RecordDnsServers();
    if (error.empty()) {
        steps_.Ok();
    } else {
        steps_.Failed(error);
        steps_.Leftover("the DNS servers of the join are not recorded: " + error);
    }
    if (hooks_.refreshDomains) {
        steps_.Begin("domains");
        hooks_.refreshDomains();
        steps_.Ok();
    }
}

// ---- the way back ----

void JoinJob::Undo() {
    if (!journalled_) {
        RemoveJournal();
        return;
    }
    steps_.Begin("put back");
    try {
        switch (journal_.phase) {
            case Phase::Prepared:
                RemoveJournal();
                break;
            case Phase::Joining:
            case Phase::Joined:
                UndoStaged();
                break;
            default:
                UndoActivated();
                break;
        }
        steps_.Ok(undone_);
    } catch (const std::exception& error) {
        // The journal stays: the next start or join tries again.
        steps_.Failed(error.what());
        steps_.Leftover(std::string("could not be put back: ") + error.what());
        return;
    }
}

void JoinJob::UndoStaged() {
    if (journal_.SameAccount()) {
        // The old password may be dead by now: the same decision as after an interruption.
        const Recovery recovery = RecoverUnderLock(kRecoveryWait, Wanted::Old);
        const bool done = recovery.result == Recovery::Result::Done;
        for (const std::string& note : recovery.notes) {
            if (done) {
                undone_ += (undone_.empty() ? "" : "; ") + note;
            } else {
                steps_.Leftover(note);
            }
        }
        StartOldWinbind();
        if (!done) {
            return;
        }
    } else {
        RemoveCreatedAccount();
        StartOldWinbind();
    }
    RemoveJournal();
}

void JoinJob::UndoActivated() {
    journal_.keepNewSecret = journal_.SameAccount();
    Advance(Phase::PuttingBack);
    if (const std::string error = StopWinbind(kBackWinbindWait); !error.empty()) {
        steps_.Leftover(error);
    }
    for (const std::string& failure : PutBack(journal_)) {
        steps_.Leftover("could not be put back: " + failure);
    }
    if (!journal_.EqualDomain()) {
        RemoveDomainCaches();
    }
    StartOldWinbind();
    if (!journal_.SameAccount()) {
        RemoveCreatedAccount();
    }
    RemoveJournal();
}

// It may have been stopped, or have gone away while there was no configuration for it.
void JoinJob::StartOldWinbind() {
    if (!journal_.before.Joined()) {
        return;
    }
    if (const std::string error = StartWinbind(kBackWinbindWait); !error.empty()) {
        steps_.Leftover("winbind does not run again: " + error);
    }
}

void JoinJob::RemoveCreatedAccount() {
    const std::string account = journal_.after.Account();
    if (journal_.accountBefore == AccountState::Present) {
        return;
    }
    if (journal_.accountBefore == AccountState::Unknown) {
        steps_.Leftover("the computer account " + account + " may have been created in " + target_.domain);
        return;
    }
    const std::string error = DeleteMachineAccount(account, target_.controller.address, journal::StagedConf(),
                                                   request_.credentials, kDeleteWait);
    if (!error.empty()) {
        const bool known = journal_.phase != Phase::Joining;
        steps_.Leftover("the computer account " + account + " of " + target_.domain +
                        (known ? " was created" : " may have been created") + " and could not be removed: " + error);
    }
}

void JoinJob::Advance(Phase phase) {
    // What fails from here on belongs to the new phase, also when the journal can't be written.
    Journal next = journal_;
    next.phase = phase;
    WriteJournal(next);
    journal_ = next;
}

void JoinJob::Fail(const std::string& message, const std::string& detail) {
    steps_.Failed(detail.empty() ? message : detail);
    throw JoinError(message, detail);
}

}  // namespace appliance
