#include "appliance/domain/directory/line_command.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <stdexcept>

#include "appliance/base/process.h"
#include "tests/appliance/base/temporary_folder.h"

namespace appliance {
namespace {

using std::chrono::milliseconds;

Command Shell(const std::string& script, milliseconds deadline = milliseconds(10000)) {
    Command command;
    command.arguments = {"/bin/sh", "-c", script};
    command.deadline = deadline;
    return command;
}

struct Taken {
    std::vector<std::string> lines;
    CommandResult result;
};

Taken Take(const Command& command) {
    Taken taken;
    taken.result = RunLines(command, [&taken](const std::string& line) { taken.lines.push_back(line); });
    return taken;
}

TEST(LineCommandTest, HandsOutEachLine) {
    const Taken taken = Take(Shell("echo one; echo; printf 'two\\nthree'; echo wrong >&2; exit 3"));
    EXPECT_EQ(taken.lines, (std::vector<std::string>{"one", "", "two", "three"}));
    EXPECT_EQ(taken.result.end, CommandResult::End::Exited);
    EXPECT_EQ(taken.result.code, 3);
    EXPECT_EQ(taken.result.errors, "wrong\n");
    EXPECT_FALSE(taken.result.Succeeded());
    EXPECT_TRUE(Take(Shell("true")).result.Succeeded());
}

TEST(LineCommandTest, HasAGroupOfItsOwnAndACleanEnvironment) {
    setenv("LEAK", "secret", 1);
    const Taken taken = Take(Shell("echo \"$LEAK-$LC_ALL\"; echo $$; cut -d' ' -f5 /proc/$$/stat; wc -c"));
    unsetenv("LEAK");
    ASSERT_EQ(taken.lines.size(), 4u);
    EXPECT_EQ(taken.lines[0], "-C");
    EXPECT_EQ(taken.lines[1], taken.lines[2]) << "it leads its group";
    EXPECT_EQ(taken.lines[3], "0");
}

TEST(LineCommandTest, TakesAnyAmount) {
    std::size_t lines = 0;
    const CommandResult result =
        RunLines(Shell("seq 1 300000"), [&lines](const std::string& line) { lines += line.empty() ? 0u : 1u; });
    EXPECT_TRUE(result.Succeeded());
    EXPECT_EQ(lines, 300000u);
    EXPECT_TRUE(result.output.empty());
}

TEST(LineCommandTest, CutsALineWithoutEnd) {
    const Taken taken = Take(Shell("head -c 300000 /dev/zero | tr '\\0' x"));
    ASSERT_EQ(taken.lines.size(), 1u);
    EXPECT_EQ(taken.lines[0].size(), 65536u);
}

TEST(LineCommandTest, CountsItsDeadlineFromTheLastLine) {
    const Taken slow = Take(Shell("for i in 1 2 3 4 5; do sleep 0.6; echo $i; done", milliseconds(2500)));
    EXPECT_EQ(slow.lines.size(), 5u);
    EXPECT_TRUE(slow.result.Succeeded());
    const Taken stalled = Take(Shell("echo one; exec sleep 60", milliseconds(2000)));
    EXPECT_EQ(stalled.lines, std::vector<std::string>{"one"});
    EXPECT_EQ(stalled.result.end, CommandResult::End::TimedOut);
    EXPECT_LT(stalled.result.took, milliseconds(20000));
}

TEST(LineCommandTest, TellsWhatCannotBeStarted) {
    Command command;
    command.arguments = {"/nonexistent/program"};
    const Taken taken = Take(command);
    EXPECT_EQ(taken.result.end, CommandResult::End::NotStarted);
    EXPECT_EQ(taken.result.code, ENOENT);
}

TEST(LineCommandTest, TellsOfASignal) {
    const Taken taken = Take(Shell("kill -9 $$"));
    EXPECT_EQ(taken.result.end, CommandResult::End::Signalled);
    EXPECT_EQ(taken.result.code, 9);
}

TEST(LineCommandTest, EndsTheProgramWhenItsLinesAreRefused) {
    const auto started = std::chrono::steady_clock::now();
    EXPECT_THROW(
        RunLines(Shell("echo one; exec sleep 60"), [](const std::string&) { throw std::runtime_error("refused"); }),
        std::runtime_error);
    EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(5));
}

// The pid that the script prints first.
pid_t FirstOf(const std::vector<std::string>& lines) {
    return lines.empty() ? 0 : std::stoi(lines[0]);
}

// A moment may pass until a process ends that was killed.
bool IsGone(pid_t pid) {
    return appliance_test::Eventually([pid] { return !ProcessStart(pid); });
}

TEST(LineCommandTest, ItsDeadlineEndsWhatItStarted) {
    const Taken taken = Take(Shell("sleep 60 & echo $!; wait", milliseconds(2000)));
    EXPECT_EQ(taken.result.end, CommandResult::End::TimedOut);
    ASSERT_GT(FirstOf(taken.lines), 0);
    EXPECT_TRUE(IsGone(FirstOf(taken.lines)));
}

TEST(LineCommandTest, RefusedLinesEndWhatItStarted) {
    pid_t child = 0;
    EXPECT_THROW(RunLines(Shell("sleep 60 & echo $!; wait"),
                          [&child](const std::string& line) {
                              child = std::stoi(line);
                              throw std::runtime_error("refused");
                          }),
                 std::runtime_error);
    ASSERT_GT(child, 0);
    EXPECT_TRUE(IsGone(child));
}

TEST(LineCommandTest, ItsDeadlineCountsWithoutOutputsToo) {
    const Taken taken = Take(Shell("echo $$; exec sleep 60 >&- 2>&-", milliseconds(2000)));
    EXPECT_EQ(taken.result.end, CommandResult::End::TimedOut);
    EXPECT_GE(taken.result.took, milliseconds(2000));
    EXPECT_LT(taken.result.took, milliseconds(20000));
    ASSERT_GT(FirstOf(taken.lines), 0);
    EXPECT_TRUE(IsGone(FirstOf(taken.lines)));
    const Taken late = Take(Shell("exec >&- 2>&-; sleep 0.3; exit 4"));
    EXPECT_EQ(late.result.end, CommandResult::End::Exited);
    EXPECT_EQ(late.result.code, 4);
    EXPECT_GE(late.result.took, milliseconds(300));
}

}  // namespace
}  // namespace appliance
