#include "appliance/domain/join/recovery.h"

#include <algorithm>
#include <cerrno>
#include <exception>
#include <system_error>
#include <thread>

#include "appliance/base/command.h"
#include "appliance/base/file_lock.h"
#include "appliance/base/file_time.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/domain/join/detached_tool.h"
#include "appliance/domain/join/journal.h"
#include "appliance/domain/join/machine_account.h"
#include "appliance/domain/join/membership_files.h"
#include "appliance/domain/join/provisional.h"
#include "appliance/domain/join/step_log.h"
#include "appliance/domain/join/time_budget.h"
#include "appliance/domain/join/winbind.h"
#include "appliance/domain/membership/last_test.h"
#include "appliance/domain/membership/secrets.h"
#include "appliance/platform/system/services.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;
using Result = Recovery::Result;
using Phase = Journal::Phase;

constexpr milliseconds kTestWait{2500};
constexpr milliseconds kToolWait{2000};
constexpr milliseconds kLongestToolWait{20000};
constexpr milliseconds kWinbindWait{4000};
constexpr milliseconds kReloadWait{2000};
constexpr milliseconds kStartWait{2000};
constexpr milliseconds kBackgroundTime{600000};
constexpr milliseconds kBackgroundPatience{8000};
constexpr milliseconds kFirstPause{500};
constexpr milliseconds kLongestPause{15000};
constexpr char kWorkgroup[] = "WORKGROUP";  // the one that a leave leads to
constexpr char kRecoveryLock[] = "/run/vorn/join_recovery.lock";

class Recoverer {
public:
    Recoverer(milliseconds patience, Wanted wanted) : budget_(patience), wanted_(wanted) {}

    Recovery Run() {
        const std::optional<Journal> journal = ReadJournal();
        if (!journal) {
            RemoveJournal();  // what a join leaves that was killed before its journal was there
            return recovery_;
        }
        if (!AwaitDetached(journal::Staging(), ToolWait())) {
            Log(LOG_NOTICE, "the join tool of an interrupted join of " + journal->after.domain + " still runs");
            recovery_.result = Result::Running;
            return recovery_;
        }
        recovery_.result = Result::Done;
        Decide(*journal);
        if (recovery_.result == Result::Done) {
            RemoveJournal();
        }
        return recovery_;
    }

private:
    void Decide(const Journal& journal) {
        switch (journal.phase) {
            case Phase::Prepared:
                Note(Unfinished(journal) + "nothing had been changed");
                return;
            case Phase::Joining:
            case Phase::Joined:
                return journal.SameAccount() ? SettleSecret(journal) : Forget(journal);
            case Phase::Swapping:
            case Phase::Swapped:
                return Finish(journal);
            case Phase::Confirmed:
                return Close(journal);
            case Phase::PuttingBack:
                return GoBack(journal);
            case Phase::Leaving:
                return Leave(journal);
        }
    }

    // The appliance's own account was joined again. Until its new password was stored here, the controller may have
    // either: only a test tells. Also where none was stored: the tool may have been killed between the two.
    void SettleSecret(const Journal& journal) {
        const bool stored = !SameMachineSecret(Path(kSecrets), journal::StagedSecrets(), journal.after.domain);
        if (!stored || journal.phase != Phase::Joined) {
            const SecretState old = TestSecret(journal.before, "", "", budget_.Left(kTestWait));
            if (old == SecretState::Works) {
                Note(Unfinished(journal) + "the membership is the old one");
                return;
            }
            const SecretState staged =
                stored && old == SecretState::Refused
                    ? TestSecret(journal.after, journal::StagedConf(), journal.controller, budget_.Left(kTestWait))
                    : old;
            if (staged == SecretState::Unknown) {
                Note(Unfinished(journal) +
                     "no controller answers, so that it can't be found out yet whether the "
                     "membership needs its new secret");
                recovery_.result = Result::Pending;
                return;
            }
            if (staged == SecretState::Refused) {
                return GiveUpSecrets(journal);
            }
        }
        AdoptStagedSecret(journal);
        RestartWinbind(journal.before);
        Note(Unfinished(journal) + "its new secret was put in place under the old configuration");
    }

    // Without a secret that works there is no membership any more, and one that says so is better than one that pretends.
    // A job that has failed, though, leaves the configuration as it was.
    void GiveUpSecrets(const Journal& journal) {
        Note(Unfinished(journal) + "the controller accepts no stored secret of " + journal.after.Account() +
             ": join again");
        if (wanted_ == Wanted::Old) {
            return;
        }
        Complain(StopWinbind(kWinbindWait));
        for (const std::string& failure : ClearMembership(TurnIntoLeave(journal, kWorkgroup))) {
            Note("could not be removed: " + failure);
        }
        ReloadServices();
        Note("the appliance is in its workgroup " + std::string(kWorkgroup));
    }

    // Another account than the appliance's own was joined, or that one was gone: the old membership, if any, is as it
    // was.
    void Forget(const Journal& journal) {
        const bool nothingToKeep = !journal.before.DomainMode() || journal.AccountWasLost();
        if (wanted_ == Wanted::Either && nothingToKeep &&
            HasMachineSecret(journal::StagedSecrets(), journal.after.domain) &&
            TestSecret(journal.after, journal::StagedConf(), journal.controller, budget_.Left(kTestWait)) ==
                SecretState::Works) {
            return Finish(journal);
        }
        Note(Unfinished(journal) + (journal.before.DomainMode()
                                        ? "the membership of " + journal.before.domain + " is the old one"
                                        : "the appliance is in its workgroup " + journal.before.domain));
        if (journal.before.Joined()) {
            // It may have been stopped already.
            Complain(StartWinbind(budget_.Left(kWinbindWait)));
        }
        NameAccount(journal);
    }

    // Nobody has the credentials any more to remove an account that the join may have created.
    void NameAccount(const Journal& journal) {
        if (journal.accountBefore != AccountState::Present) {
            Note("the computer account " + journal.after.Account() + " may have been created in " +
                 journal.after.domain + " and stays there");
        }
    }

    // The new membership is known to work, and part of it is in place.
    void Finish(const Journal& journal) {
        Complain(StopWinbind(kWinbindWait));
        PutInPlace(journal);
        if (!journal.EqualDomain()) {
            RemoveDomainCaches();
        }
        Complain(StartWinbind(budget_.Left(kWinbindWait)));
        Complain(RecordDnsServers());
        KeepProvisionalChanges();
        ReloadServices();
        recovery_.completed = true;
        Note(Unfinished(journal) + "it was completed");
    }

    void Close(const Journal& journal) {
        Complain(RecordDnsServers());
        KeepProvisionalChanges();
        ReloadServices();
        recovery_.completed = true;
        Note(Unfinished(journal) + "the new membership is in place; its addresses may not be registered in DNS");
    }

    void GoBack(const Journal& journal) {
        Complain(StopWinbind(kWinbindWait));
        for (const std::string& failure : PutBack(journal)) {
            Note("could not be put back: " + failure);
        }
        RestartWinbind(journal.before);
        Note(Unfinished(journal) + "it had failed and was put back");
        if (!journal.SameAccount()) {
            NameAccount(journal);
        }
    }

    void Leave(const Journal& journal) {
        Complain(StopWinbind(kWinbindWait));
        for (const std::string& failure : ClearMembership(journal)) {
            Note("could not be removed: " + failure);
        }
        ReloadServices();
        recovery_.completed = true;
        Note("an interrupted leave of " + journal.before.domain + " was completed; the computer account " +
             journal.before.Account() + " may still be there");
    }

    // Whoever asked for the change is not there to do it.
    void ReloadServices() {
        for (const char* service : {"samba", "nmbd"}) {
            Complain(ReloadService(service, kReloadWait).error);
        }
    }

    void RestartWinbind(const Membership& membership) {
        if (membership.Joined()) {
            Complain(StopWinbind(kWinbindWait));
            Complain(StartWinbind(budget_.Left(kWinbindWait)));
        }
    }

    static std::string Unfinished(const Journal& journal) {
        return "unfinished join of " + journal.after.domain + ": ";
    }

    void Complain(const std::string& error) {
        if (!error.empty()) {
            Note(error);
        }
    }

    void Note(const std::string& text) {
        Log(LOG_WARNING, text);
        recovery_.notes.push_back(text);
    }

    // Leaves time for the tests.
    milliseconds ToolWait() const {
        const milliseconds all = budget_.Left(kLongestToolWait);
        return std::max(all - 2 * kTestWait, std::min(all, kToolWait));
    }

    TimeBudget budget_;
    Wanted wanted_;
    Recovery recovery_;
};

}  // namespace

Recovery RecoverUnderLock(milliseconds patience, Wanted wanted) {
    try {
        return Recoverer(patience, wanted).Run();
    } catch (const std::exception& error) {
        const std::string text = std::string("an interrupted join could not be put right: ") + error.what();
        Log(LOG_ERR, text);
        return {Result::Pending, false, {text}};
    }
}

namespace {

// What was changed ahead of the join before `before` is named in the log.
Recovery RecoverAndName(milliseconds patience, Wanted wanted, Moment before) {
    try {
        const std::optional<FileLock> lock = FileLock::Take(Path(kJoinLock), milliseconds(0));
        if (!lock && errno == EAGAIN) {
            Log(LOG_NOTICE, "a join or leave is running");
            return {Result::Running, false, {}};
        }
        if (!lock) {
            throw std::system_error(errno, std::generic_category(), Path(kJoinLock));
        }
        Recovery recovery = RecoverUnderLock(patience, wanted);
        if (recovery.result != Result::Running) {
            for (const std::string& change : TakeProvisionalChanges(before)) {
                Log(LOG_WARNING, "an interrupted join left something changed: " + change);
                recovery.notes.push_back(change);
            }
        }
        if (recovery.result == Result::Done) {
            ForgetLastTest();
        }
        if (recovery.result == Result::Nothing || recovery.result == Result::Done) {
            EndInterruptedSteps(recovery.completed, recovery.notes);
        }
        return recovery;
    } catch (const std::exception& error) {
        Log(LOG_ERR, std::string("an interrupted join could not be put right: ") + error.what());
        return {Result::Pending, false, {error.what()}};
    }
}

}  // namespace

Recovery RecoverOnce(milliseconds patience, Wanted wanted) {
    return RecoverAndName(patience, wanted, Moment());
}

void RecoverInBackground(Wanted wanted) {
    Command command;
    command.arguments = {Path(kVornjoin), wanted == Wanted::Either ? "--recover-later" : "--recover-old-later"};
    command.deadline = kStartWait;
    command.ownSession = true;
    command.endsWithCaller = false;
    const CommandResult result = Run(command);
    if (!result.Succeeded()) {
        Log(LOG_ERR, Path(kVornjoin) + " " + result.Describe());
    }
}

Recovery RecoverInterruptedJoin(milliseconds patience) {
    Recovery recovery = RecoverAndName(patience, Wanted::Either, std::chrono::system_clock::now());
    if (recovery.result == Result::Running || recovery.result == Result::Pending) {
        RecoverInBackground(Wanted::Either);
    }
    return recovery;
}

void RecoverWhenPossible(Wanted wanted) {
    const std::optional<FileLock> only = FileLock::Take(Path(kRecoveryLock), milliseconds(0));
    if (!only) {
        return;
    }
    const Moment began = std::chrono::system_clock::now();
    const TimeBudget all(kBackgroundTime);
    milliseconds pause = kFirstPause;
    while (!all.Over()) {
        const Result result = RecoverAndName(kBackgroundPatience, wanted, began).result;
        if (result == Result::Nothing || result == Result::Done) {
            return;
        }
        std::this_thread::sleep_for(all.Left(pause));
        pause = std::min(pause * 2, kLongestPause);
    }
    const std::string text = "an interrupted join could not be put right yet; the next start or join tries again";
    Log(LOG_ERR, text);
    if (const std::optional<FileLock> lock = FileLock::Take(Path(kJoinLock), milliseconds(0))) {
        EndInterruptedSteps(false, {text});
    }
}

}  // namespace appliance
