// Tools that outlive the one who started them, and deadlines of all of them.

#include "appliance/domain/join/detached_tool.h"

#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <thread>

#include "appliance/base/text.h"
#include "appliance/domain/join/machine_account.h"
#include "appliance/domain/membership/discovery.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::Command;
using appliance::CommandResult;
using appliance::SecretState;
using std::chrono::milliseconds;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

class DetachedTool : public join_test::JoinTest {
protected:
    Command Shell(const std::string& script, milliseconds deadline = milliseconds(5000)) const {
        Command command;
        command.arguments = {"/bin/sh", "-c", script};
        command.deadline = deadline;
        return command;
    }
};

TEST_F(DetachedTool, AnswersWithBothOutputsAndItsStatus) {
    Command command = Shell("echo \"$PASSWD $USER\"; echo why >&2; exit 7");
    command.environment.emplace_back("USER", "admin");
    command.secretEnvironment.emplace_back("PASSWD", appliance::Secret("pw"));
    const CommandResult result = appliance::RunDetached(command, root);
    EXPECT_EQ(result.end, CommandResult::End::Exited);
    EXPECT_EQ(result.code, 7);
    EXPECT_EQ(result.output, "pw admin\n");
    EXPECT_EQ(result.errors, "why\n");
}

TEST_F(DetachedTool, IsEndedAtItsDeadlineWithAllThatItStarted) {
    const auto began = std::chrono::steady_clock::now();
    const CommandResult result =
        appliance::RunDetached(Shell("sleep 60 & echo $! > " + At("/child") + "; wait", milliseconds(2000)), root);
    EXPECT_EQ(result.end, CommandResult::End::TimedOut);
    EXPECT_LT(std::chrono::steady_clock::now() - began, std::chrono::seconds(20));
    const int child = std::atoi(Content("/child").c_str());
    ASSERT_GT(child, 1);
    EXPECT_TRUE(appliance::AwaitDetached(root, milliseconds(3000)));
}

TEST_F(DetachedTool, GoesOnWhenTheCallerIsKilled) {
    const pid_t caller = fork();
    if (caller == 0) {
        appliance::RunDetached(Shell("echo begun > " + At("/begun") +
                                     "; sleep 0.5; echo words; echo words >&2; "
                                     "echo done > " +
                                     At("/done")),
                               root);
        _exit(0);
    }
    while (!Exists("/begun")) {
        usleep(1000);
    }
    kill(caller, SIGKILL);
    waitpid(caller, nullptr, 0);
    EXPECT_FALSE(appliance::AwaitDetached(root, milliseconds(10)));
    EXPECT_FALSE(Exists("/done"));
    EXPECT_TRUE(appliance::AwaitDetached(root, milliseconds(5000)));
    EXPECT_EQ(Content("/done"), "done\n");
}

TEST_F(DetachedTool, ThatIsLeftAloneStillEndsAtItsDeadline) {
    const pid_t caller = fork();
    if (caller == 0) {
        appliance::RunDetached(Shell("echo begun > " + At("/begun") + "; exec sleep 60", milliseconds(1000)), root);
        _exit(0);
    }
    while (!Exists("/begun")) {
        usleep(500);
    }
    kill(caller, SIGKILL);
    waitpid(caller, nullptr, 0);
    EXPECT_TRUE(appliance::AwaitDetached(root, milliseconds(8000)));
}

TEST_F(DetachedTool, RunsOnceAtATime) {
    const pid_t caller = fork();
    if (caller == 0) {
        appliance::RunDetached(Shell("echo begun > " + At("/begun") + "; sleep 1"), root);
        _exit(0);
    }
    while (!Exists("/begun")) {
        usleep(1000);
    }
    EXPECT_EQ(appliance::RunDetached(Shell("true"), root).end, CommandResult::End::NotStarted);
    waitpid(caller, nullptr, 0);
}

TEST_F(DetachedTool, ThatNeverRanIsNotWaitedFor) {
    EXPECT_TRUE(appliance::AwaitDetached(root, milliseconds(0)));
}

class ToolDeadlines : public join_test::JoinTest {
protected:
    template <typename Work>
    static milliseconds Took(const Work& work) {
        const auto began = std::chrono::steady_clock::now();
        work();
        return std::chrono::duration_cast<milliseconds>(std::chrono::steady_clock::now() - began);
    }
};

TEST_F(ToolDeadlines, EveryToolThatHangsIsGivenUp) {
    for (const char* tool : {"/usr/bin/net", "/usr/bin/nmblookup", "/usr/bin/rpcclient"}) {
        Tool(tool, "sleep 60");
    }
    const appliance::Membership ad = join_test::AdMembership("LAB", "LAB.TEST");
    appliance::Membership nt4 = ad;
    nt4.kind = appliance::DomainKind::Nt4;
    const appliance::Credentials nobody;
    const milliseconds wait(300);
    EXPECT_LT(Took([&] { EXPECT_EQ(appliance::TestSecret(ad, "", "", wait), SecretState::Unknown); }).count(), 20000);
    EXPECT_LT(Took([&] { EXPECT_EQ(appliance::TestSecret(nt4, "", "", wait), SecretState::Unknown); }).count(), 20000);
    EXPECT_LT(Took([&] { EXPECT_TRUE(appliance::FindPrimaryController("LAB", wait).empty()); }).count(), 20000);
    EXPECT_LT(Took([&] {
                  EXPECT_EQ(appliance::LookUpAccountByRpc("NAS1$", "192.0.2.1", "", nobody, wait),
                            appliance::AccountState::Unknown);
              }).count(),
              20000);
    EXPECT_LT(
        Took([&] { EXPECT_NE(appliance::DeleteMachineAccount("NAS1$", "192.0.2.1", "", nobody, wait), ""); }).count(),
        20000);
    // An address that is reserved for documentation: nobody answers, or the network says so at once.
    std::string reason;
    EXPECT_LT(Took([&] { EXPECT_FALSE(appliance::CanConnect("192.0.2.1", 445, wait, reason)); }).count(), 20000);
    EXPECT_NE(reason, "");
    EXPECT_FALSE(appliance::CanConnect("no address", 445, wait, reason));
}

TEST_F(ToolDeadlines, WhatTestsSayIsTakenAtItsWord) {
    const appliance::Membership ad = join_test::AdMembership("LAB", "LAB.TEST");
    struct Row {
        const char* answer;
        SecretState state;
    };
    for (const Row& row : {
             Row{"echo Join is OK", SecretState::Works},
             Row{"exit 0", SecretState::Unknown},
             Row{"echo 'kerberos_kinit_password NAS1$@LAB.TEST failed: Preauthentication failed' >&2; exit 255",
                 SecretState::Refused},
             Row{"echo 'failed: Client not found in Kerberos database' >&2; exit 255", SecretState::Refused},
             Row{"echo 'failed: Clients credentials have been revoked' >&2; exit 255", SecretState::Refused},
             Row{"echo 'Join to domain is not valid: NT_STATUS_NO_LOGON_SERVERS'; exit 255", SecretState::Unknown},
             Row{"exit 255", SecretState::Unknown},
         }) {
        Tool("/usr/bin/net", row.answer);
        EXPECT_EQ(appliance::TestSecret(ad, "", "", milliseconds(5000)), row.state) << row.answer;
    }
    EXPECT_THAT(Calls()[0], HasSubstr("--configfile=" + At("/usr/vorn/etc/smb.conf") + " ads testjoin"));
}

TEST_F(ToolDeadlines, AnNt4DomainIsTestedAtThePrimaryController) {
    Tool("/usr/bin/nmblookup", "echo '10.0.0.4 NT4DOM<1b>'");
    Tool("/usr/bin/net", "echo \"Join to 'NT4DOM' is OK\"");
    appliance::Membership nt4;
    nt4.kind = appliance::DomainKind::Nt4;
    nt4.domain = "NT4DOM";
    EXPECT_EQ(appliance::TestSecret(nt4, "", "", milliseconds(5000)), SecretState::Works);
    EXPECT_THAT(Calls("net ").front(), HasSubstr("rpc testjoin --server=10.0.0.4"));
}

TEST_F(ToolDeadlines, NamesNeverBecomeOptions) {
    EXPECT_TRUE(appliance::FindPrimaryController("-NT4", milliseconds(300)).empty());
    EXPECT_TRUE(appliance::FindPrimaryController("A\nB", milliseconds(300)).empty());
    EXPECT_TRUE(appliance::AddressesOf("-host", milliseconds(300)).empty());
    EXPECT_TRUE(appliance::FindControllers("lab..test", milliseconds(300)).empty());
    EXPECT_THAT(Calls(), ElementsAre());
    EXPECT_THAT(appliance::AddressesOf("2001:db8::1", milliseconds(300)), ElementsAre("2001:db8::1"));
    for (const char* user : {"", "-x", "a%b", "a\nb", "a\x7F"}) {
        EXPECT_FALSE(appliance::IsToolAccountName(user)) << user;
    }
    EXPECT_TRUE(appliance::IsToolAccountName("LAB\\Administrator"));
    EXPECT_TRUE(appliance::IsToolAccountName("admin@lab.test"));
}

TEST_F(ToolDeadlines, PasswordsNeverBecomeArguments) {
    Tool("/usr/bin/net", "echo \"$USER:$PASSWD\" > $R/seen; exit 0");
    appliance::Credentials admin{"admin", appliance::Secret("canary-7431")};
    EXPECT_EQ(appliance::DeleteMachineAccount("NAS1$", "dc1", "", admin, milliseconds(5000)), "");
    EXPECT_EQ(Content("/seen"), "admin:canary-7431\n");
    EXPECT_THAT(Content("/calls"), Not(HasSubstr("canary")));
    EXPECT_THAT(Calls()[0], HasSubstr("rpc user delete --server=dc1 -- NAS1$"));
}

}  // namespace
