// The file of tasks as text, and commands as cron and the shell take them.

#include "appliance/platform/system/task_file.h"

#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "appliance/platform/system/cron_line.h"
#include "tests/appliance/system/cron_model.h"
#include "tests/appliance/system/system_test.h"

namespace {

using appliance::ScheduledTask;
using appliance::TaskFile;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StartsWith;

const std::vector<std::string> kCommands = {
    "/usr/vorn/sbin/vornwin -updateDomain",
    " blanks at both ends  ",
    "\"quoted\"",
    "\"",
    "\"quoted in front\" only",
    "ends with a backslash \\",
    "date +%Y%m%d",
    "printf '%s\\n' a%b\\%c\\\\%d%%",
    "printf %s '\\%' \"\\\\%\" % \\%",
    "it's 'single' and \"double\"",
    "[section]",
    "# no comment",
    "; echo x; echo y & wait",
    "echo $HOME `id -u` $((1 + 1)) *",
    "key=value",
    "-x starts like an option",
    "umlauts äöü and \xFF\xFE",
};

ScheduledTask TaskOf(const std::string& command) {
    ScheduledTask task;
    task.id = 1;
    task.command = command;
    task.schedule.dateType = appliance::kOnWeekdays;
    task.schedule.weekName = "1";
    return task;
}

TEST(TaskText, ComesBackAsItWas) {
    TaskFile file;
    for (const std::string& command : kCommands) {
        file.tasks.push_back(TaskOf(command));
        file.tasks.back().id = file.nextId++;
        file.tasks.back().listable = file.nextId % 2 == 0;
        file.tasks.back().schedule.date = " \"x\" ";
        file.tasks.back().schedule.repeat = -12;
    }
    TaskFile read;
    ASSERT_EQ(appliance::ParseTasks(appliance::FormatTasks(file), read), "");
    EXPECT_EQ(read.nextId, file.nextId);
    ASSERT_EQ(read.tasks.size(), file.tasks.size());
    for (std::size_t index = 0; index < read.tasks.size(); ++index) {
        EXPECT_EQ(read.tasks[index].id, file.tasks[index].id);
        EXPECT_EQ(read.tasks[index].command, file.tasks[index].command);
        EXPECT_EQ(read.tasks[index].listable, file.tasks[index].listable);
        EXPECT_EQ(read.tasks[index].schedule.date, file.tasks[index].schedule.date);
        EXPECT_EQ(read.tasks[index].schedule.repeat, -12);
    }
    EXPECT_EQ(appliance::FormatTasks(read), appliance::FormatTasks(file));
}

TEST(TaskText, MayBeWrittenByHand) {
    TaskFile file;
    ASSERT_EQ(appliance::ParseTasks("\r\n# note\r\n  [7]\r\n command = /bin/a b \r\n\tdate_type=0\nweek_name=3\n\n"
                                    "[2]\ncommand=/bin/c\ndate_type=1\ndate=2026/1/1",
                                    file),
              "");
    ASSERT_EQ(file.tasks.size(), 2U);
    EXPECT_EQ(file.tasks[0].id, 2);
    EXPECT_EQ(file.tasks[1].command, "/bin/a b");
    EXPECT_EQ(file.nextId, 8);
}

TEST(TaskText, ThatIsBrokenIsNamedByItsLine) {
    const std::string good = "[1]\ncommand=/bin/a\ndate_type=0\nweek_name=1\n";
    const std::vector<std::pair<std::string, std::string>> table = {
        {"hour=3\n", "line 1: "},
        {"next=x\n", "line 1: "},
        {"next=-1\n", "line 1: "},
        {"[x]\n", "line 1: "},
        {"[-1]\n", "line 1: "},
        {"[]\n", "line 1: "},
        {"[1\n", "line 1: "},
        {"[2147483647]\n", "line 1: "},
        {"[99999999999]\n", "line 1: "},
        {good + "colour=red\n", "line 5: "},
        {good + "hour\n", "line 5: "},
        {good + "hour=\n", "line 5: "},
        {good + "hour=3x\n", "line 5: "},
        {good + "hour=24\n", "line 5: "},
        {good + "min=99999999999\n", "line 5: "},
        {good + "listable=maybe\n", "line 5: "},
        {good + "week_name=2\n", "line 5: "},
        {good + good, "line 5: "},
        {"[1]\n[2]\n", "line 2: "},
        {"[1]\ncommand=/bin/a\n", "line 2: "},
        {"[1]\ndate_type=0\nweek_name=1\n", "line 3: "},
        {good + "date=a\x01\n", "line 5: "},
    };
    for (const auto& [text, line] : table) {
        TaskFile file;
        file.nextId = 77;
        EXPECT_THAT(appliance::ParseTasks(text, file), StartsWith(line)) << text;
        EXPECT_EQ(file.nextId, 77);
    }
}

// Through the model of cron's own reading, and the shell itself.
TEST(CronCommand, ReachesTheShellAsItWasSet) {
    for (const std::string& command : kCommands) {
        std::string table = appliance::CronTableHead();
        table += appliance::CronLines(TaskOf(command).schedule, command).at(0);
        const std::vector<cron_model::Line> lines = cron_model::Lines(table);
        ASSERT_EQ(lines.size(), 1U);
        EXPECT_THAT(lines[0].command, StartsWith("exec env -i "));
        // With a shell of the test's own, which shows its arguments, in place of the real one.
        std::string shown = lines[0].command;
        shown.replace(0, shown.find(" sh -c -- "), "printf '[%s]'");
        ASSERT_EQ(setenv("COMMAND", shown.c_str(), 1), 0);
        FILE* shell = popen("sh -c \"$COMMAND\"", "r");
        ASSERT_NE(shell, nullptr);
        char output[2048] = {};
        const std::size_t length = fread(output, 1, sizeof(output) - 1, shell);
        ASSERT_EQ(pclose(shell), 0) << shown;
        EXPECT_EQ(std::string(output, length), "[sh][-c][--][" + command + "]");
    }
    ASSERT_EQ(unsetenv("COMMAND"), 0);
}

TEST(CronCommand, RunsWithACleanEnvironment) {
    const std::string line = appliance::CronLines(TaskOf("env").schedule, "env").at(0);
    const std::string run = cron_model::Lines(line).at(0).command;
    ASSERT_EQ(setenv("LD_PRELOAD_OF_ANOTHER", "x", 1), 0);
    ASSERT_EQ(setenv("COMMAND", run.c_str(), 1), 0);
    FILE* shell = popen("sh -c \"$COMMAND\" | grep -v -e ^PWD= -e ^_= -e ^OLDPWD= -e ^SHLVL= | sort", "r");
    ASSERT_NE(shell, nullptr);
    char output[2048] = {};
    const std::size_t length = fread(output, 1, sizeof(output) - 1, shell);
    ASSERT_EQ(pclose(shell), 0);
    EXPECT_EQ(std::string(output, length), "HOME=/\nLC_ALL=C\nPATH=/usr/sbin:/usr/bin:/sbin:/bin\n");
    ASSERT_EQ(unsetenv("COMMAND"), 0);
    ASSERT_EQ(unsetenv("LD_PRELOAD_OF_ANOTHER"), 0);
}

TEST(CronTable, LeavesOutWhatIsOver) {
    TaskFile file;
    file.tasks = {TaskOf("/bin/once"), TaskOf("/bin/daily")};
    for (ScheduledTask& task : file.tasks) {
        task.schedule.dateType = appliance::kFromDate;
        task.schedule.date = "2026/11/29";
    }
    file.tasks[1].schedule.repeat = appliance::kDaily;
    EXPECT_THAT(appliance::CronTable(file, {2026, 11, 28}), HasSubstr("/bin/once"));
    EXPECT_THAT(appliance::CronTable(file, {2026, 11, 29}), HasSubstr("/bin/once"));
    for (const appliance::Date& later : {appliance::Date{2026, 11, 30}, {2026, 12, 1}, {2027, 1, 1}}) {
        EXPECT_THAT(appliance::CronTable(file, later), Not(HasSubstr("/bin/once")));
        EXPECT_THAT(appliance::CronTable(file, later), HasSubstr("/bin/daily"));
    }
    file.tasks.pop_back();
    EXPECT_EQ(appliance::CronTable(file, {2026, 11, 30}), "");
}

}  // namespace
