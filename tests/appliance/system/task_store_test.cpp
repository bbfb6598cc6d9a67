// The file of tasks and cron's table: together after every change, whatever happens in between.

#include "appliance/platform/system/task_store.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "appliance/base/paths.h"
#include "tests/appliance/system/system_test.h"

namespace {

using appliance::ErrorCode;
using appliance::ScheduledTask;
using appliance::TaskFile;
using ::testing::HasSubstr;

class TaskStore : public system_test::SystemTest {
protected:
    static ScheduledTask Task(const std::string& command, int hour = 3) {
        ScheduledTask task;
        task.command = command;
        task.schedule.dateType = appliance::kOnWeekdays;
        task.schedule.weekName = "1";
        task.schedule.hour = hour;
        return task;
    }

    static std::vector<ScheduledTask> Tasks() {
        std::vector<ScheduledTask> tasks;
        EXPECT_FALSE(appliance::LoadTasks(tasks));
        return tasks;
    }

    // Says the table what the tasks say?
    void ExpectTogether() const {
        TaskFile file;
        ASSERT_EQ(appliance::ParseTasks(Content(appliance::kSchedule).value_or(""), file), "");
        EXPECT_EQ(Content(appliance::kCronTable).value_or(""), appliance::CronTable(file, appliance::Today()));
    }

    mode_t ModeOf(const std::string& path) const {
        struct stat status = {};
        EXPECT_EQ(lstat(At(path).c_str(), &status), 0);
        EXPECT_EQ(status.st_uid, 0U);
        return status.st_mode;
    }
};

TEST_F(TaskStore, WritesATableThatCronTakes) {
    ScheduledTask task = Task("/bin/true");
    ASSERT_FALSE(appliance::SaveTask(task));
    ExpectTogether();
    EXPECT_EQ(ModeOf(appliance::kCronTable), S_IFREG | 0644U);
    EXPECT_EQ(Content(appliance::kCronTable)->back(), '\n');
    EXPECT_EQ(std::string(appliance::kCronTable).find('.', sizeof("/etc/cron.d")), std::string::npos);
}

TEST_F(TaskStore, MakesAnImproperTableProper) {
    Put("/etc/elsewhere", "untouched\n");
    ScheduledTask task = Task("/bin/true");
    ASSERT_FALSE(appliance::SaveTask(task));

    ASSERT_EQ(chmod(At(appliance::kCronTable).c_str(), 0666), 0);
    ASSERT_FALSE(appliance::RepairCronTable());
    EXPECT_EQ(ModeOf(appliance::kCronTable), S_IFREG | 0644U);

    ASSERT_EQ(chown(At(appliance::kCronTable).c_str(), 1, 1), 0);
    ASSERT_FALSE(appliance::SaveTask(task));
    EXPECT_EQ(ModeOf(appliance::kCronTable), S_IFREG | 0644U);

    ASSERT_EQ(unlink(At(appliance::kCronTable).c_str()), 0);
    ASSERT_EQ(symlink(At("/etc/elsewhere").c_str(), At(appliance::kCronTable).c_str()), 0);
    ASSERT_FALSE(appliance::SaveTask(task));
    EXPECT_EQ(ModeOf(appliance::kCronTable), S_IFREG | 0644U);
    EXPECT_EQ(*Content("/etc/elsewhere"), "untouched\n");
    ExpectTogether();
}

TEST_F(TaskStore, ShowsCronEveryChangeWithinASecond) {
    ScheduledTask task = Task("/bin/true");
    std::set<time_t> tables;
    std::set<time_t> folders;
    for (int hour = 0; hour < 5; ++hour) {
        task.schedule.hour = hour;
        ASSERT_FALSE(appliance::SaveTask(task));
        struct stat status = {};
        ASSERT_EQ(stat(At(appliance::kCronTable).c_str(), &status), 0);
        EXPECT_TRUE(tables.insert(status.st_mtim.tv_sec).second);
        ASSERT_EQ(stat(At("/etc/cron.d").c_str(), &status), 0);
        EXPECT_TRUE(folders.insert(status.st_mtim.tv_sec).second);
    }
}

TEST_F(TaskStore, LeavesATableAloneThatSaysTheSame) {
    ScheduledTask task = Task("/bin/true");
    ASSERT_FALSE(appliance::SaveTask(task));
    struct stat before = {};
    ASSERT_EQ(stat(At(appliance::kCronTable).c_str(), &before), 0);
    ASSERT_FALSE(appliance::RepairCronTable());
    struct stat after = {};
    ASSERT_EQ(stat(At(appliance::kCronTable).c_str(), &after), 0);
    EXPECT_EQ(before.st_ino, after.st_ino);
    EXPECT_EQ(before.st_mtim.tv_sec, after.st_mtim.tv_sec);
}

TEST_F(TaskStore, RepairsWhatAKillBetweenTheTwoWritesLeft) {
    ScheduledTask task = Task("/bin/true");
    ASSERT_FALSE(appliance::SaveTask(task));
    // The first of the two writes of another save.
    TaskFile file;
    ASSERT_EQ(appliance::ParseTasks(*Content(appliance::kSchedule), file), "");
    file.tasks[0].schedule.hour = 17;
    Put(appliance::kSchedule, appliance::FormatTasks(file));
    ASSERT_FALSE(appliance::RepairCronTable());
    ExpectTogether();
    EXPECT_THAT(*Content(appliance::kCronTable), HasSubstr("\n0 17 * * 1 root "));
    // The same, and another save comes first.
    file.tasks[0].schedule.hour = 18;
    Put(appliance::kSchedule, appliance::FormatTasks(file));
    ScheduledTask other = Task("/bin/other");
    ASSERT_FALSE(appliance::SaveTask(other));
    ExpectTogether();
    EXPECT_THAT(*Content(appliance::kCronTable), HasSubstr("\n0 18 * * 1 root "));
}

TEST_F(TaskStore, RepairsATableThatSomebodyRemovedOrChanged) {
    ScheduledTask task = Task("/bin/true");
    ASSERT_FALSE(appliance::SaveTask(task));
    ASSERT_EQ(unlink(At(appliance::kCronTable).c_str()), 0);
    ASSERT_FALSE(appliance::RepairCronTable());
    ExpectTogether();
    Put(appliance::kCronTable, "* * * * * root /bin/evil\n");
    ASSERT_FALSE(appliance::RepairCronTable());
    ExpectTogether();
}

TEST_F(TaskStore, MakesNoTableWithoutTasks) {
    ASSERT_FALSE(appliance::RepairCronTable());
    EXPECT_FALSE(Content(appliance::kCronTable));
    EXPECT_FALSE(Content(appliance::kSchedule));
    Put(appliance::kCronTable, "* * * * * root /bin/left\n");
    ASSERT_FALSE(appliance::RepairCronTable());
    EXPECT_FALSE(Content(appliance::kCronTable));
}

TEST_F(TaskStore, LosesNothingWhenManySaveAtOnce) {
    constexpr int kProcesses = 3;
    constexpr int kThreads = 3;
    constexpr int kTasks = 8;
    std::vector<pid_t> children;
    for (int process = 0; process < kProcesses; ++process) {
        children.push_back(system_test::StartChild([process] {
            std::vector<std::thread> threads;
            for (int thread = 0; thread < kThreads; ++thread) {
                threads.emplace_back([process, thread] {
                    for (int number = 0; number < kTasks; ++number) {
                        ScheduledTask task = Task("/bin/task " + std::to_string(process) + " " +
                                                  std::to_string(thread) + " " + std::to_string(number));
                        if (appliance::SaveTask(task) || (task.schedule.hour = 4, appliance::SaveTask(task))) {
                            _exit(1);
                        }
                    }
                });
            }
            for (std::thread& thread : threads) {
                thread.join();
            }
        }));
    }
    for (const pid_t child : children) {
        EXPECT_EQ(system_test::EndOf(child), 0);
    }
    std::set<int> ids;
    std::set<std::string> commands;
    for (const ScheduledTask& task : Tasks()) {
        ids.insert(task.id);
        commands.insert(task.command);
        EXPECT_EQ(task.schedule.hour, 4);
    }
    EXPECT_EQ(ids.size(), std::size_t{kProcesses * kThreads * kTasks});
    EXPECT_EQ(commands.size(), ids.size());
    ExpectTogether();
}

TEST_F(TaskStore, KeepsTheTasksWhenTheTableCantBeWritten) {
    ScheduledTask task = Task("/bin/true");
    ASSERT_FALSE(appliance::SaveTask(task));
    const std::string before = *Content(appliance::kSchedule);
    std::filesystem::rename(At("/etc/cron.d"), At("/etc/cron.gone"));
    ScheduledTask other = Task("/bin/other");
    EXPECT_EQ(appliance::SaveTask(other), ErrorCode::FileWrite);
    EXPECT_EQ(other.id, -1);
    EXPECT_EQ(*Content(appliance::kSchedule), before);
    EXPECT_EQ(appliance::RepairCronTable(), ErrorCode::FileWrite);
    std::filesystem::rename(At("/etc/cron.gone"), At("/etc/cron.d"));
    ASSERT_FALSE(appliance::SaveTask(other));
    ExpectTogether();
}

TEST_F(TaskStore, KeepsNoFirstTaskWhoseTableCantBeWritten) {
    std::filesystem::remove(At("/etc/cron.d"));
    ScheduledTask task = Task("/bin/true");
    EXPECT_EQ(appliance::SaveTask(task), ErrorCode::FileWrite);
    EXPECT_FALSE(Content(appliance::kSchedule));
}

TEST_F(TaskStore, RefusesMoreTasksThanCronReads) {
    TaskFile file;
    for (std::size_t number = 0; number < appliance::kMostTasks; ++number) {
        file.tasks.push_back(Task("/bin/task"));
        file.tasks.back().id = file.nextId++;
        file.tasks.back().schedule.dateType = appliance::kFromDate;
        file.tasks.back().schedule.repeat = appliance::kMonthly;
        file.tasks.back().schedule.date = "2026/1/31";
    }
    Put(appliance::kSchedule, appliance::FormatTasks(file));
    ScheduledTask task = Task("/bin/one too many");
    EXPECT_EQ(appliance::SaveTask(task), ErrorCode::BadArgument);
    ASSERT_FALSE(appliance::RepairCronTable());
    const std::string table = *Content(appliance::kCronTable);
    EXPECT_LT(std::count(table.begin(), table.end(), '\n'), 10000);
}

TEST_F(TaskStore, KeepsATaskThatIsOver) {
    ScheduledTask task = Task("/bin/once");
    task.schedule.dateType = appliance::kFromDate;
    task.schedule.date = "2000/1/1";
    ASSERT_FALSE(appliance::SaveTask(task));
    ASSERT_EQ(Tasks().size(), 1U);
    EXPECT_EQ(Tasks()[0].schedule.date, "2000/1/1");
    EXPECT_FALSE(Content(appliance::kCronTable));
}

}  // namespace
