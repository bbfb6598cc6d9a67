// Programs that are run: how they end, what they get, and what they leave behind.

#include "appliance/base/command.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <set>
#include <thread>

#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "appliance/base/text.h"
#include "tests/appliance/base/temporary_folder.h"

using appliance::Command;
using appliance::CommandResult;
using appliance::Secret;
using appliance_test::Eventually;
using appliance_test::Fork;
using testing::HasSubstr;
using testing::UnorderedElementsAre;
using End = appliance::CommandResult::End;

namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

Command Shell(const std::string& script) {
    Command command;
    command.arguments = {"/bin/sh", "-c", script};
    return command;
}

std::set<std::string> OpenDescriptors() {
    std::set<std::string> open;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        std::error_code gone;
        const auto target = std::filesystem::read_symlink(entry.path(), gone);
        if (!gone && target.string().find("/fd") == std::string::npos) {
            open.insert(entry.path().filename().string() + " " + target.string());
        }
    }
    return open;
}

bool IsAlive(int pid) {
    return appliance::ProcessStart(pid).has_value();
}

// The number that a file holds; 0 while there is none.
int NumberIn(const std::string& path) {
    int number = 0;
    std::ifstream(path) >> number;
    return number;
}

class CommandTest : public appliance_test::FolderTest {
protected:
    CommandTest() {
        appliance::SetRoot("");  // so that the environment is the one of every day
    }
};

TEST_F(CommandTest, StatusAndBothOutputs) {
    const CommandResult result = appliance::Run(Shell("echo out; echo err >&2; exit 3"));
    EXPECT_EQ(result.end, End::Exited);
    EXPECT_EQ(result.code, 3);
    EXPECT_EQ(result.output, "out\n");
    EXPECT_EQ(result.errors, "err\n");
    EXPECT_FALSE(result.Succeeded());
    EXPECT_EQ(result.Describe(), "exited with 3");
    EXPECT_TRUE(appliance::Run(Shell("exit 0")).Succeeded());
}

TEST_F(CommandTest, Signal) {
    const CommandResult result = appliance::Run(Shell("kill -TERM $$"));
    EXPECT_EQ(result.end, End::Signalled);
    EXPECT_EQ(result.code, SIGTERM);
    EXPECT_EQ(result.Describe(), "killed by signal 15");
}

TEST_F(CommandTest, MissingProgram) {
    Command command;
    command.arguments = {folder / "none"};
    const CommandResult result = appliance::Run(command);
    EXPECT_EQ(result.end, End::NotStarted);
    EXPECT_EQ(result.code, ENOENT);
    EXPECT_EQ(result.Describe(), "cannot be started: No such file or directory");
    Put(folder / "plain", "no program");
    command.arguments = {folder / "plain"};
    EXPECT_EQ(appliance::Run(command).code, EACCES);
}

TEST_F(CommandTest, WhatCannotBeHandedOver) {
    Command command;
    EXPECT_EQ(appliance::Run(command).code, EINVAL);
    command.arguments = {"sh"};
    EXPECT_EQ(appliance::Run(command).code, EINVAL);
    command = Shell("exit 0");
    command.arguments.push_back(std::string("a\0b", 3));
    EXPECT_EQ(appliance::Run(command).end, End::NotStarted);
    command = Shell("exit 0");
    command.environment.emplace_back("A=B", "c");
    EXPECT_EQ(appliance::Run(command).end, End::NotStarted);
    command = Shell("exit 0");
    command.secretEnvironment.emplace_back("A", Secret(std::string_view("a\0b", 3)));
    EXPECT_EQ(appliance::Run(command).end, End::NotStarted);
}

TEST_F(CommandTest, EnvironmentIsClean) {
    setenv("CALLERS_OWN", "1", 1);
    Command command;
    command.arguments = {"/usr/bin/env"};
    command.environment.emplace_back("ADDED", "a=b c");
    command.environment.emplace_back("HOME", "/root");
    command.secretEnvironment.emplace_back("PASSWD", Secret("s3cret"));
    EXPECT_THAT(appliance::Lines(appliance::Run(command).output),
                UnorderedElementsAre("PATH=/usr/sbin:/usr/bin:/sbin:/bin", "LC_ALL=C", "HOME=/root", "ADDED=a=b c",
                                     "PASSWD=s3cret"));
    unsetenv("CALLERS_OWN");
}

TEST_F(CommandTest, RootOfATestIsHandedOn) {
    appliance::SetRoot(folder.path());
    Command command;
    command.arguments = {"/usr/bin/env"};
    EXPECT_THAT(appliance::Run(command).output, HasSubstr("VORN_TEST_ROOT=" + folder.path()));
}

TEST_F(CommandTest, InputIsNothingUnlessGiven) {
    EXPECT_EQ(appliance::Run(Shell("wc -c; readlink /proc/self/fd/0")).output, "0\n/dev/null\n");
}

TEST_F(CommandTest, InputArrives) {
    Command command = Shell("cat");
    command.input = Secret("one\ntwo");
    EXPECT_EQ(appliance::Run(command).output, "one\ntwo");
    const std::string big(300000, 'x');
    command.input = Secret(big);
    EXPECT_EQ(appliance::Run(command).output, big);
    // A program that never reads it disturbs nobody.
    command = Shell("exit 4");
    command.input = Secret(big);
    EXPECT_EQ(appliance::Run(command).code, 4);
}

TEST_F(CommandTest, BigOutputIsReadAndCut) {
    Command command =
        Shell("head -c 9000000 /dev/zero | tr '\\0' o; head -c 9000000 /dev/zero | tr '\\0' e >&2; exit 5");
    const CommandResult result = appliance::Run(command);
    EXPECT_EQ(result.code, 5);
    EXPECT_EQ(result.output, std::string(1 << 20, 'o'));
    EXPECT_EQ(result.errors, std::string(1 << 20, 'e'));
    command.outputLimit = 10;
    EXPECT_EQ(appliance::Run(command).output, "oooooooooo");
    command.outputLimit = 0;
    EXPECT_EQ(appliance::Run(command).output, "");
}

TEST_F(CommandTest, AllOfALargeOutputWithinTheLimit) {
    Command command = Shell("seq 1 200000");
    command.outputLimit = 4 << 20;
    const CommandResult result = appliance::Run(command);
    EXPECT_EQ(appliance::Lines(result.output).size(), 200000U);
    EXPECT_EQ(appliance::Lines(result.output).back(), "200000");
}

TEST_F(CommandTest, ClosedOutputsAreNoEnd) {
    const CommandResult result = appliance::Run(Shell("echo before; exec >&- 2>&-; sleep 0.2; exit 6"));
    EXPECT_EQ(result.code, 6);
    EXPECT_EQ(result.output, "before\n");
    EXPECT_GE(result.took, milliseconds(200));
}

TEST_F(CommandTest, WordsAfterTheEndAreNotWaitedFor) {
    // The child in the background holds both pipes open.
    Command command = Shell("(sleep 20; echo late) & echo $! > " + folder / "pid" + "; echo early");
    const CommandResult result = appliance::Run(command);
    EXPECT_EQ(result.output, "early\n");
    EXPECT_LT(result.took, seconds(5));
    EXPECT_TRUE(IsAlive(NumberIn(folder / "pid")));
    kill(NumberIn(folder / "pid"), SIGKILL);
}

TEST_F(CommandTest, ChatterAfterTheEndIsBounded) {
    Command command = Shell("for i in 1 2 3 4; do timeout 10 yes & done; echo $$ > " + folder / "pid");
    command.deadline = seconds(8);
    const CommandResult result = appliance::Run(command);
    kill(-NumberIn(folder / "pid"), SIGKILL);
    EXPECT_EQ(result.end, End::Exited);
    EXPECT_LT(result.took, seconds(5));
}

TEST_F(CommandTest, DeadlineEndsGrandchildrenToo) {
    Command command = Shell("sleep 60 & echo $! > " + folder / "first" + "; (sleep 60 & echo $! > " +
                            folder / "second" + "; wait) & echo begun; wait");
    command.deadline = milliseconds(2000);
    const CommandResult result = appliance::Run(command);
    EXPECT_EQ(result.end, End::TimedOut);
    EXPECT_EQ(result.output, "begun\n");
    EXPECT_GE(result.took, milliseconds(2000));
    EXPECT_LT(result.took, seconds(15));
    EXPECT_THAT(result.Describe(), testing::MatchesRegex("did not end within [0-9]+ ms"));
    for (const char* name : {"first", "second"}) {
        const int pid = NumberIn(folder / name);
        ASSERT_GT(pid, 0);
        EXPECT_TRUE(Eventually([&] { return !IsAlive(pid); })) << name;
    }
}

TEST_F(CommandTest, WhatIsCalledOffEndsAsAtItsDeadline) {
    std::array<int, 2> ends{};
    ASSERT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
    const appliance::FileDescriptor reading(ends[0]);
    appliance::FileDescriptor writing(ends[1]);
    Command command = Shell("sleep 60 & echo $! > " + folder / "child" + "; wait");
    command.deadline = seconds(60);
    command.cancel = reading.get();
    std::thread caller([&writing, this] {
        EXPECT_TRUE(Eventually([this] { return NumberIn(folder / "child") > 0; }));
        writing.Reset();
    });
    const CommandResult result = appliance::Run(command);
    caller.join();
    EXPECT_EQ(result.end, End::TimedOut);
    EXPECT_LT(result.took, seconds(30));
    EXPECT_TRUE(Eventually([this] { return !IsAlive(NumberIn(folder / "child")); }));

    command = Shell("echo done");
    command.cancel = -1;
    EXPECT_EQ(appliance::Run(command).output, "done\n");
}

TEST_F(CommandTest, DeadlineEndsWhatIgnoresSignals) {
    Command command = Shell("trap '' TERM INT HUP; while :; do sleep 0.05; done");
    command.deadline = milliseconds(300);
    EXPECT_EQ(appliance::Run(command).end, End::TimedOut);
}

TEST_F(CommandTest, DeadlineReapsTheProgram) {
    Command command = Shell("sleep 60");
    command.deadline = milliseconds(100);
    EXPECT_EQ(appliance::Run(command).end, End::TimedOut);
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
    EXPECT_EQ(errno, ECHILD);
}

TEST_F(CommandTest, DeadlineOutsideAGroupEndsTheProgramAlone) {
    Command command = Shell("sleep 60 & echo $! > " + folder / "pid" + "; wait");
    command.ownGroup = false;
    command.deadline = milliseconds(2000);
    EXPECT_EQ(appliance::Run(command).end, End::TimedOut);
    const int pid = NumberIn(folder / "pid");
    ASSERT_GT(pid, 0);
    EXPECT_TRUE(IsAlive(pid));
    kill(pid, SIGKILL);
}

TEST_F(CommandTest, GroupAndSession) {
    // Fields of /proc/self/stat: 5 is the group, 6 the session; $$ is the pid.
    const std::string script = "set -- $(cat /proc/$$/stat); echo $$ $5 $6";
    std::string own = std::to_string(getpgrp());
    std::string session = std::to_string(getsid(0));
    const auto fields = [&](bool ownGroup, bool ownSession) {
        Command command = Shell(script);
        command.ownGroup = ownGroup;
        command.ownSession = ownSession;
        return appliance::Split(appliance::Trim(appliance::Run(command).output), " ");
    };
    const auto group = fields(true, false);
    EXPECT_EQ(group.at(1), group.at(0));
    EXPECT_EQ(group.at(2), session);
    const auto none = fields(false, false);
    EXPECT_EQ(none.at(1), own);
    EXPECT_EQ(none.at(2), session);
    const auto both = fields(true, true);
    EXPECT_EQ(both.at(1), both.at(0));
    EXPECT_EQ(both.at(2), both.at(0));
}

TEST_F(CommandTest, NoDescriptorReachesTheProgram) {
    const int open = ::open("/dev/null", O_RDONLY);  // without O_CLOEXEC
    const int high = fcntl(open, F_DUPFD, 900);
    Command command;
    command.arguments = {"/bin/ls", "/proc/self/fd"};
    // 3 is the folder that ls reads.
    EXPECT_EQ(appliance::Run(command).output, "0\n1\n2\n3\n");
    close(open);
    close(high);
}

TEST_F(CommandTest, NoDescriptorStaysWithTheCaller) {
    const auto before = OpenDescriptors();
    for (int turn = 0; turn < 5; ++turn) {
        Command command = Shell("echo a; sleep 60");
        command.input = Secret("text");
        command.deadline = milliseconds(30);
        appliance::Run(command);
        appliance::Run(Shell("exit 1"));
        command.arguments = {folder / "none"};
        appliance::Run(command);
    }
    EXPECT_EQ(OpenDescriptors(), before);
}

TEST_F(CommandTest, StandardDescriptorsOfTheCallerMayBeClosed) {
    const int done = appliance_test::WaitFor(Fork([] {
        close(0);
        close(1);
        close(2);
        Command command = Shell("cat; echo err >&2");
        command.input = Secret("in");
        const CommandResult result = appliance::Run(command);
        return result.Succeeded() && result.output == "in" && result.errors == "err\n";
    }));
    EXPECT_EQ(done, 0);
}

TEST_F(CommandTest, SignalsAreAsAtFirst) {
    const int done = appliance_test::WaitFor(Fork([] {
        signal(SIGPIPE, SIG_IGN);
        signal(SIGTERM, SIG_IGN);
        sigset_t all;
        sigfillset(&all);
        sigprocmask(SIG_BLOCK, &all, nullptr);
        const CommandResult result = appliance::Run(Shell("grep -E 'Sig(Blk|Ign)' /proc/self/status"));
        sigset_t after;
        sigprocmask(SIG_BLOCK, nullptr, &after);
        return result.output == "SigBlk:\t0000000000000000\nSigIgn:\t0000000000000000\n" &&
               sigismember(&after, SIGUSR1) == 1;
    }));
    EXPECT_EQ(done, 0);
}

TEST_F(CommandTest, TheCallersSignalsStayAsTheyAre) {
    sigset_t before;
    sigset_t one;
    sigemptyset(&one);
    sigaddset(&one, SIGUSR1);
    pthread_sigmask(SIG_BLOCK, &one, &before);
    appliance::Run(Shell("exit 0"));
    sigset_t after;
    pthread_sigmask(SIG_SETMASK, &before, &after);
    EXPECT_EQ(sigismember(&after, SIGUSR1), 1);
    EXPECT_EQ(sigismember(&after, SIGUSR2), 0);
    EXPECT_EQ(sigismember(&after, SIGTERM), 0);
}

// Every process' arguments, as anybody may read them.
bool AnyArgumentHolds(const std::string& text) {
    for (const auto& entry : std::filesystem::directory_iterator("/proc")) {
        // A process that ends meanwhile has no arguments any more, and reading them fails.
        std::string arguments;
        if (!appliance::ReadFile(entry.path() / "cmdline", arguments) && arguments.find(text) != std::string::npos) {
            return true;
        }
    }
    return false;
}

TEST_F(CommandTest, SecretsAreNoArguments) {
    const std::string secret = "canary-" + std::to_string(getpid());
    Command command = Shell("read line; test \"$line\" = \"$PASSWD\" && : > " + folder / "got" + "; sleep 0.3");
    command.input = Secret(secret + "\n");
    command.secretEnvironment.emplace_back("PASSWD", Secret(secret));
    std::atomic<bool> seen{false};
    std::atomic<bool> over{false};
    std::thread watch([&] {
        while (!over) {
            seen = seen || AnyArgumentHolds(secret);
        }
    });
    EXPECT_TRUE(appliance::Run(command).Succeeded());
    over = true;
    watch.join();
    EXPECT_FALSE(seen);
    EXPECT_EQ(Got(folder / "got"), "");
}

TEST_F(CommandTest, EightThreadsAtOnce) {
    const auto before = OpenDescriptors();
    std::atomic<int> wrong{0};
    std::vector<std::thread> threads;
    for (int number = 0; number < 8; ++number) {
        threads.emplace_back([&, number] {
            for (int turn = 0; turn < 25; ++turn) {
                const std::string text = std::to_string(number) + "." + std::to_string(turn);
                const int code = (number * 25 + turn) % 200;
                Command command = Shell("cat; echo " + text + " >&2; exit " + std::to_string(code));
                command.input = Secret(text);
                if (turn % 5 == 4) {
                    command = Shell("echo " + text + "; sleep 60");
                    command.deadline = milliseconds(150);
                }
                const CommandResult result = appliance::Run(command);
                const bool right = turn % 5 == 4 ? result.end == End::TimedOut
                                                 : result.end == End::Exited && result.code == code &&
                                                       result.output == text && result.errors == text + "\n";
                wrong += right ? 0 : 1;
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(wrong, 0);
    EXPECT_EQ(OpenDescriptors(), before);
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
}

TEST_F(CommandTest, OtherChildrenAreLeftAlone) {
    const pid_t other = Fork([] { return false; });
    siginfo_t ended = {};
    ASSERT_EQ(waitid(P_PID, static_cast<id_t>(other), &ended, WEXITED | WNOWAIT), 0);
    EXPECT_TRUE(appliance::Run(Shell("sleep 0.05")).Succeeded());
    EXPECT_EQ(appliance_test::WaitFor(other), 1);
}

// A caller that runs a program and is killed meanwhile; the program's pid, which may still live.
int PidAfterCallersDeath(const std::string& file, bool endsWithCaller) {
    const pid_t caller = Fork([&] {
        Command command = Shell("echo $$ > " + file + "; exec sleep 60");
        command.endsWithCaller = endsWithCaller;
        appliance::Run(command);
        return true;
    });
    EXPECT_TRUE(Eventually([&] { return NumberIn(file) > 0; }));
    kill(caller, SIGKILL);
    EXPECT_EQ(appliance_test::WaitFor(caller), 1000 + SIGKILL);
    return NumberIn(file);
}

TEST_F(CommandTest, EndsWithItsCaller) {
    const int pid = PidAfterCallersDeath(folder / "pid", true);
    EXPECT_TRUE(Eventually([&] { return !IsAlive(pid); }));
}

TEST_F(CommandTest, OutlivesItsCallerWhereAsked) {
    const int pid = PidAfterCallersDeath(folder / "pid", false);
    std::this_thread::sleep_for(milliseconds(100));
    EXPECT_TRUE(IsAlive(pid));
    kill(pid, SIGKILL);
}

TEST_F(CommandTest, NoDescriptorLeftToWorkWith) {
    const int done = appliance_test::WaitFor(Fork([] {
        rlimit few = {};
        getrlimit(RLIMIT_NOFILE, &few);
        for (rlim_t count = 4; count < 16; ++count) {
            few.rlim_cur = count;
            setrlimit(RLIMIT_NOFILE, &few);
            const CommandResult result = appliance::Run(Shell("exit 7"));
            const bool ran = result.end == End::Exited && result.code == 7;
            const bool refused = result.end == End::NotStarted && (result.code == EMFILE || result.code == EINVAL);
            if (!ran && !refused) {
                return false;
            }
        }
        return true;
    }));
    EXPECT_EQ(done, 0);
}

}  // namespace
