// What becomes of an interrupted join or leave, for every phase of its journal.

#include "appliance/domain/join/recovery.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "appliance/base/file_lock.h"
#include "appliance/base/paths.h"
#include "appliance/domain/join/detached_tool.h"
#include "appliance/domain/join/journal.h"
#include "appliance/domain/join/membership_files.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::AccountState;
using appliance::Journal;
using appliance::Recovery;
using appliance::Wanted;
using join_test::AdMembership;
using join_test::kWorkgroupConf;
using join_test::SecretsOf;
using std::chrono::milliseconds;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using Phase = Journal::Phase;
using Result = Recovery::Result;

constexpr char kLive[] = "/var/lib/samba/private/secrets.tdb";
constexpr char kStaged[] = "/usr/vorn/etc/private/join/staging/secrets.tdb";
constexpr milliseconds kPatience{5000};

class RecoveryTest : public join_test::JoinTest {
protected:
    RecoveryTest() {
        Tool("/usr/bin/wbinfo", "exit 0");
        Tool(appliance::kVornjoin, "exit 0");
    }

    // A join of LAB by an appliance in its workgroup, or by a member of `before`, as far as `phase`.
    void Interrupt(Phase phase, const std::string& before, bool stagedSecret = true) {
        if (!before.empty()) {
            MakeMember("ads", before, before + ".TEST");
        } else {
            PutSecrets(kLive, {{"SECRETS/SID/NAS1", "machine sid"}});
        }
        Put("/etc/krb5.keytab", before.empty() ? "" : "old keytab");
        if (before.empty()) {
            unlink(At("/etc/krb5.keytab").c_str());
        }
        conf_ = Content(appliance::kSmbConf);
        ASSERT_FALSE(appliance::ReadMembership(journal_.before));
        journal_.after = AdMembership("LAB", "LAB.TEST");
        journal_.controller = "192.0.2.9";
        journal_.accountBefore = account_;
        appliance::PrepareJoin(journal_, "192.0.2.9");
        if (stagedSecret) {
            std::map<std::string, std::string> records = SecretsOf("LAB", "LAB.TEST", "new");
            records["SECRETS/SID/NAS1"] = "machine sid";
            PutSecrets(kStaged, records);
            std::ofstream(appliance::journal::StagedKeytab()) << "new keytab";
        }
        journal_.phase = phase;
        appliance::WriteJournal(journal_);
    }

    // What `net ads testjoin` answers with the old configuration and with the staged one.
    void Answers(const std::string& old, const std::string& staged) {
        Tool("/usr/bin/net", "case \"$*\" in *testjoin*) case \"$*\" in *staging*) " + staged + ";; *) " + old +
                                 ";; esac;; *) exit 0;; esac");
    }

    std::string Password(const std::string& domain) const {
        const auto records = Secrets(kLive);
        const auto found = records.find("SECRETS/MACHINE_PASSWORD/" + domain);
        return found == records.end() ? "<none>" : found->second;
    }

    void ExpectNothingLeft() {
        EXPECT_TRUE(std::filesystem::is_empty(At(appliance::kJoinJournal)));
        EXPECT_EQ(Secrets(kLive)["SECRETS/SID/NAS1"], "machine sid");
    }

    void ExpectOldOne() {
        EXPECT_EQ(Content(appliance::kSmbConf), conf_);
        ExpectNothingLeft();
    }

    void ExpectNewOne() {
        appliance::Membership membership;
        ASSERT_FALSE(appliance::ReadMembership(membership));
        EXPECT_EQ(membership.domain, "LAB");
        EXPECT_EQ(membership.realm, "LAB.TEST");
        EXPECT_TRUE(membership.Joined());
        EXPECT_EQ(Password("LAB"), "new");
        EXPECT_EQ(Content("/etc/krb5.keytab"), "new keytab");
        ExpectNothingLeft();
    }

    Journal journal_;
    std::string conf_;
    AccountState account_ = AccountState::Unknown;
};

constexpr char kOk[] = "echo Join is OK";
constexpr char kRefused[] = "echo Preauthentication failed >&2; exit 255";
constexpr char kDead[] = "exit 255";

TEST_F(RecoveryTest, WithoutAJournalThereIsNothingToDo) {
    const Recovery recovery = appliance::RecoverInterruptedJoin();
    EXPECT_EQ(recovery.result, Result::Nothing);
    EXPECT_THAT(recovery.notes, IsEmpty());
    EXPECT_THAT(Calls(), IsEmpty());
}

constexpr char kOpenRecord[] =
    R"({"id":"1-2","action":"join","domain":"LAB","started":1,"finished":null,"success":null,"message":"",)"
    R"("steps":[{"name":"request","outcome":"ok"},{"name":"join","outcome":"running"}],"leftovers":[]})";

TEST_F(RecoveryTest, TheRecordOfAKilledJoinGetsItsEnd) {
    Put(appliance::kJoinSteps, kOpenRecord);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Nothing);
    const std::string record = Content(appliance::kJoinSteps);
    EXPECT_THAT(record, HasSubstr("\"success\":false"));
    EXPECT_THAT(record, HasSubstr("The join was interrupted."));
    EXPECT_THAT(record, HasSubstr("\"outcome\":\"ok\""));
    EXPECT_THAT(record, HasSubstr("\"outcome\":\"failed\""));
    EXPECT_THAT(record, Not(HasSubstr("null")));
    EXPECT_THAT(record, Not(HasSubstr("running")));
}

TEST_F(RecoveryTest, TheRecordOfACompletedJoinSaysSo) {
    Interrupt(Phase::Swapping, "");
    Put(appliance::kJoinSteps, kOpenRecord);
    Answers(kOk, kOk);
    ASSERT_TRUE(appliance::RecoverInterruptedJoin().completed);
    const std::string record = Content(appliance::kJoinSteps);
    EXPECT_THAT(record, HasSubstr("\"success\":true"));
    EXPECT_THAT(record, HasSubstr("it was completed"));
}

TEST_F(RecoveryTest, ARecordWithAnEndIsLeftAlone) {
    const std::string record = R"({"action":"join","finished":2,"success":true,"steps":[],"leftovers":[]})";
    for (const std::string& text : {record, std::string("no JSON"), std::string()}) {
        Put(appliance::kJoinSteps, text);
        appliance::RecoverInterruptedJoin();
        EXPECT_EQ(Content(appliance::kJoinSteps), text);
    }
}

TEST_F(RecoveryTest, WhatAJoinLeftBeforeItsJournalGoes) {
    Put("/usr/vorn/etc/private/join/old.secrets.tdb", "secret");
    Put("/usr/vorn/etc/private/join/staging/secrets.tdb", "secret");
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Nothing);
    EXPECT_TRUE(std::filesystem::is_empty(At(appliance::kJoinJournal)));
}

TEST_F(RecoveryTest, ADamagedJournalCountsAsNone) {
    Put("/usr/vorn/etc/private/join/journal.json", "{\"phase\": \"swap");
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Nothing);
    EXPECT_TRUE(std::filesystem::is_empty(At(appliance::kJoinJournal)));
}

TEST_F(RecoveryTest, APreparedJoinIsForgotten) {
    Interrupt(Phase::Prepared, "LAB", false);
    Answers(kDead, kDead);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Done);
    EXPECT_EQ(Password("LAB"), "old");
    EXPECT_EQ(Content("/etc/krb5.keytab"), "old keytab");
    ExpectOldOne();
}

TEST_F(RecoveryTest, TheOwnAccountJoinedAgainAndNothingStored) {
    Interrupt(Phase::Joining, "LAB", false);
    Answers(kOk, kDead);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Done);
    EXPECT_EQ(Password("LAB"), "old");
    ExpectOldOne();
}

// The controller may have been told a new password that never came here: while it does not answer, nobody knows.
TEST_F(RecoveryTest, NothingStoredAndNobodyToAskIsNoSuccess) {
    Interrupt(Phase::Joining, "LAB", false);
    Answers(kDead, kDead);
    EXPECT_EQ(appliance::RecoverOnce(kPatience, Wanted::Old).result, Result::Pending);
    EXPECT_EQ(Password("LAB"), "old");
    EXPECT_EQ(Content(appliance::kSmbConf), conf_);
    Answers(kRefused, kDead);
    EXPECT_EQ(appliance::RecoverOnce(kPatience, Wanted::OldOrNone).result, Result::Done);
    EXPECT_EQ(Password("LAB"), "<none>");
    ExpectNothingLeft();
}

TEST_F(RecoveryTest, TheOwnAccountJoinedAgainAndTheOldSecretWorks) {
    Interrupt(Phase::Joining, "LAB");
    Answers(kOk, kRefused);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Done);
    EXPECT_EQ(Password("LAB"), "old");
    EXPECT_EQ(Content("/etc/krb5.keytab"), "old keytab");
    ExpectOldOne();
}

TEST_F(RecoveryTest, TheOwnAccountJoinedAgainAndTheNewSecretWorks) {
    Interrupt(Phase::Joining, "LAB");
    Answers(kRefused, kOk);
    const Recovery recovery = appliance::RecoverInterruptedJoin();
    EXPECT_EQ(recovery.result, Result::Done);
    EXPECT_FALSE(recovery.completed);
    EXPECT_EQ(Password("LAB"), "new");
    EXPECT_EQ(Content("/etc/krb5.keytab"), "new keytab");
    ExpectOldOne();
}

// Killed between the change of the password on the controller and its storage here.
TEST_F(RecoveryTest, TheOwnAccountJoinedAgainAndNeitherWorks) {
    for (const bool stored : {true, false}) {
        Interrupt(Phase::Joining, "LAB", stored);
        Answers(kRefused, kRefused);
        const Recovery recovery =
            stored ? appliance::RecoverInterruptedJoin() : appliance::RecoverOnce(kPatience, Wanted::OldOrNone);
        EXPECT_EQ(recovery.result, Result::Done);
        EXPECT_FALSE(recovery.completed);
        EXPECT_THAT(recovery.notes, testing::Contains(HasSubstr("accepts no stored secret")));
        appliance::Membership membership;
        ASSERT_FALSE(appliance::ReadMembership(membership));
        EXPECT_FALSE(membership.DomainMode());
        EXPECT_EQ(membership.domain, "WORKGROUP");
        EXPECT_EQ(Password("LAB"), "<none>");
        EXPECT_THAT(Content(appliance::kSmbConf), Not(HasSubstr("LAB")));
        ExpectNothingLeft();
    }
}

TEST_F(RecoveryTest, AFailedJoinLeavesTheConfigurationAlsoWhenNeitherSecretWorks) {
    Interrupt(Phase::Joining, "LAB");
    Answers(kRefused, kRefused);
    const Recovery recovery = appliance::RecoverOnce(kPatience, Wanted::Old);
    EXPECT_EQ(recovery.result, Result::Done);
    EXPECT_THAT(recovery.notes, ElementsAre(HasSubstr("accepts no stored secret")));
    EXPECT_EQ(Password("LAB"), "old");
    ExpectOldOne();
}

TEST_F(RecoveryTest, WhileNoControllerAnswersNothingIsThrownAway) {
    Interrupt(Phase::Joining, "LAB");
    Answers(kDead, kDead);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Pending);
    EXPECT_EQ(Password("LAB"), "old");
    EXPECT_EQ(Content(appliance::kSmbConf), conf_);
    EXPECT_THAT(Calls("vornjoin --recover-later"), testing::SizeIs(1));
    // Later a controller answers.
    Answers(kRefused, kOk);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Done);
    EXPECT_EQ(Password("LAB"), "new");
    ExpectOldOne();
}

TEST_F(RecoveryTest, ControllersThatHangDoNotHoldUpTheStart) {
    Interrupt(Phase::Joining, "LAB");
    Answers("sleep 60", "sleep 60");
    const auto began = std::chrono::steady_clock::now();
    EXPECT_EQ(appliance::RecoverInterruptedJoin(milliseconds(2000)).result, Result::Pending);
    EXPECT_LT(std::chrono::steady_clock::now() - began, std::chrono::seconds(6));
}

TEST_F(RecoveryTest, TheOwnAccountsNewSecretCountsOnceTheControllerHasIt) {
    Interrupt(Phase::Joined, "LAB");
    Answers(kDead, kDead);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Done);
    EXPECT_EQ(Password("LAB"), "new");
    ExpectOldOne();
}

TEST_F(RecoveryTest, AMemberOfAnotherDomainStaysIt) {
    for (const Phase phase : {Phase::Joining, Phase::Joined}) {
        Interrupt(phase, "CORP");
        Answers(kOk, kOk);
        const Recovery recovery = appliance::RecoverInterruptedJoin();
        EXPECT_EQ(recovery.result, Result::Done);
        EXPECT_THAT(recovery.notes, testing::Contains(HasSubstr("NAS1$")));
        // The join may have stopped it.
        EXPECT_TRUE(Exists("/run/samba/winbindd.pid"));
        EXPECT_EQ(Password("CORP"), "old");
        EXPECT_EQ(Password("LAB"), "<none>");
        EXPECT_EQ(Content("/etc/krb5.keytab"), "old keytab");
        ExpectOldOne();
    }
}

// Its own account was gone from the controller, so that there is nothing to go back to.
TEST_F(RecoveryTest, ALostMembershipIsReplacedByANewOneThatWorks) {
    account_ = AccountState::Absent;
    for (const Phase phase : {Phase::Joining, Phase::Joined}) {
        Interrupt(phase, "LAB");
        Answers(kRefused, kOk);
        const Recovery recovery = appliance::RecoverInterruptedJoin();
        EXPECT_EQ(recovery.result, Result::Done);
        EXPECT_TRUE(recovery.completed);
        ExpectNewOne();
    }
    Interrupt(Phase::Joined, "LAB");
    Answers(kRefused, kRefused);
    const Recovery recovery = appliance::RecoverInterruptedJoin();
    EXPECT_EQ(recovery.result, Result::Done);
    EXPECT_THAT(recovery.notes, testing::Contains(HasSubstr("NAS1$")));
    EXPECT_EQ(Password("LAB"), "old");
    ExpectOldOne();
}

TEST_F(RecoveryTest, AFirstMembershipThatWorksIsPutInPlace) {
    Interrupt(Phase::Joining, "");
    Answers(kDead, kOk);
    const Recovery recovery = appliance::RecoverInterruptedJoin();
    EXPECT_EQ(recovery.result, Result::Done);
    EXPECT_TRUE(recovery.completed);
    ExpectNewOne();
    EXPECT_THAT(Content(appliance::kSettings), HasSubstr("domain_dns=192.0.2.1,192.0.2.2"));
}

TEST_F(RecoveryTest, AFirstMembershipIsGivenUpWhenItDoesNotWorkOrIsNotWanted) {
    Interrupt(Phase::Joined, "");
    Answers(kDead, kDead);
    Recovery recovery = appliance::RecoverInterruptedJoin();
    EXPECT_EQ(recovery.result, Result::Done);
    EXPECT_THAT(recovery.notes, ElementsAre(HasSubstr("in its workgroup WORKGROUP"), HasSubstr("NAS1$")));
    EXPECT_EQ(Password("LAB"), "<none>");
    EXPECT_FALSE(Exists("/etc/krb5.keytab"));
    ExpectOldOne();

    Interrupt(Phase::Joined, "");
    Answers(kDead, kOk);
    recovery = appliance::RecoverOnce(kPatience, Wanted::Old);
    EXPECT_EQ(recovery.result, Result::Done);
    EXPECT_FALSE(recovery.completed);
    ExpectOldOne();
}

TEST_F(RecoveryTest, WhatIsHalfInPlaceIsFinished) {
    for (const char* before : {"", "LAB", "CORP"}) {
        for (const Phase phase : {Phase::Swapping, Phase::Swapped}) {
            Put(appliance::kSmbConf, kWorkgroupConf, 0640);
            Interrupt(phase, before);
            if (phase == Phase::Swapped) {
                appliance::PutInPlace(journal_);
            }
            const Recovery recovery = appliance::RecoverInterruptedJoin();
            EXPECT_EQ(recovery.result, Result::Done) << before;
            EXPECT_TRUE(recovery.completed);
            ExpectNewOne();
            EXPECT_EQ(Password("CORP"), "<none>");
            EXPECT_TRUE(Exists("/run/samba/winbindd.pid"));
            struct stat file {};
            ASSERT_EQ(stat(At(appliance::kSmbConf).c_str(), &file), 0);
            EXPECT_EQ(file.st_mode & 0777, 0640U);
        }
    }
}

TEST_F(RecoveryTest, AConfirmedJoinOnlyNeedsItsRecords) {
    Interrupt(Phase::Confirmed, "");
    appliance::PutInPlace(journal_);
    const Recovery recovery = appliance::RecoverInterruptedJoin();
    EXPECT_TRUE(recovery.completed);
    ExpectNewOne();
}

TEST_F(RecoveryTest, AJoinThatFailedLateIsPutBack) {
    Interrupt(Phase::PuttingBack, "CORP");
    appliance::PutInPlace(journal_);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Done);
    EXPECT_EQ(Password("CORP"), "old");
    EXPECT_EQ(Password("LAB"), "<none>");
    EXPECT_EQ(Content("/etc/krb5.keytab"), "old keytab");
    EXPECT_FALSE(Exists("/usr/vorn/etc/private/former_keys.json"));
    ExpectOldOne();
}

TEST_F(RecoveryTest, AJoinOfTheOwnAccountThatFailedLateKeepsTheNewSecret) {
    Interrupt(Phase::Prepared, "LAB");
    appliance::PutInPlace(journal_);
    journal_.phase = Phase::PuttingBack;
    journal_.keepNewSecret = true;
    appliance::WriteJournal(journal_);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Done);
    EXPECT_EQ(Password("LAB"), "new");
    EXPECT_EQ(Content("/etc/krb5.keytab"), "new keytab");
    ExpectOldOne();
}

TEST_F(RecoveryTest, AnInterruptedLeaveIsFinished) {
    MakeMember("ads", "LAB", "LAB.TEST");
    Journal journal;
    ASSERT_FALSE(appliance::ReadMembership(journal.before));
    journal.after = journal.before;
    journal.after.kind = appliance::DomainKind::Workgroup;
    journal.phase = Phase::Leaving;
    appliance::PrepareLeave(journal, "HOME");
    const Recovery recovery = appliance::RecoverInterruptedJoin();
    EXPECT_TRUE(recovery.completed);
    EXPECT_THAT(recovery.notes, testing::Contains(HasSubstr("NAS1$")));
    appliance::Membership membership;
    ASSERT_FALSE(appliance::ReadMembership(membership));
    EXPECT_FALSE(membership.DomainMode());
    EXPECT_EQ(membership.domain, "HOME");
    EXPECT_EQ(Password("LAB"), "<none>");
    ExpectNothingLeft();
}

TEST_F(RecoveryTest, ARunningJoinIsLeftAlone) {
    Interrupt(Phase::Swapping, "");
    const pid_t child = fork();
    if (child == 0) {
        const auto lock = appliance::FileLock::Take(At(appliance::kJoinLock), milliseconds(1000));
        std::ofstream(At("/locked")) << "x";
        sleep(60);
        _exit(lock ? 0 : 1);
    }
    while (!Exists("/locked")) {
        usleep(1000);
    }
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Running);
    EXPECT_EQ(Content(appliance::kSmbConf), conf_);
    EXPECT_TRUE(appliance::ReadJournal());
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
    EXPECT_EQ(appliance::RecoverInterruptedJoin().result, Result::Done);
}

TEST_F(RecoveryTest, AToolThatStillRunsIsWaitedForAWhile) {
    Interrupt(Phase::Joining, "LAB");
    Answers(kRefused, kOk);
    const pid_t caller = fork();
    if (caller == 0) {
        appliance::Command command;
        command.arguments = {"/bin/sh", "-c", "echo > " + At("/begun") + "; sleep 3"};
        appliance::RunDetached(command, appliance::journal::Staging());
        _exit(0);
    }
    while (!Exists("/begun")) {
        usleep(1000);
    }
    kill(caller, SIGKILL);
    waitpid(caller, nullptr, 0);
    EXPECT_EQ(appliance::RecoverOnce(milliseconds(300), Wanted::Either).result, Result::Running);
    EXPECT_EQ(Password("LAB"), "old");
    EXPECT_EQ(appliance::RecoverOnce(milliseconds(12000), Wanted::Either).result, Result::Done);
    EXPECT_EQ(Password("LAB"), "new");
}

TEST_F(RecoveryTest, AJournalIsReadBackAndLeavesNoSecret) {
    account_ = AccountState::Absent;
    Interrupt(Phase::Swapped, "CORP");
    journal_.keepNewSecret = true;
    journal_.resetOptions = true;
    appliance::WriteJournal(journal_);
    const auto read = appliance::ReadJournal();
    ASSERT_TRUE(read);
    EXPECT_EQ(read->phase, Phase::Swapped);
    EXPECT_EQ(read->before.domain, "CORP");
    EXPECT_TRUE(read->before.hasSecret);
    EXPECT_EQ(read->after.realm, "LAB.TEST");
    EXPECT_EQ(read->controller, "192.0.2.9");
    EXPECT_EQ(read->accountBefore, AccountState::Absent);
    EXPECT_TRUE(read->keepNewSecret);
    EXPECT_TRUE(read->resetOptions);
    EXPECT_FALSE(read->SameAccount());
    EXPECT_THAT(Content("/usr/vorn/etc/private/join/journal.json"), Not(HasSubstr("old")));
    // Secrets are overwritten before they go: another name of the same file shows that.
    std::filesystem::create_hard_link(At(kStaged), At("/kept-by-a-link"));
    appliance::RemoveJournal();
    EXPECT_EQ(Content("/kept-by-a-link").find_first_not_of('\0'), std::string::npos);
    struct stat folder {};
    ASSERT_EQ(stat(At(appliance::kJoinJournal).c_str(), &folder), 0);
    EXPECT_EQ(folder.st_mode & 0777, 0700U);
}

}  // namespace
