// The scheduler's operations as a module calls them.

#include "platform/scheduler.h"

#include <json/value.h>

#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "appliance/base/error_code.h"
#include "appliance/base/paths.h"
#include "appliance/platform/system/task_store.h"
#include "platform/core.h"
#include "tests/appliance/system/system_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

using Task = std::unique_ptr<_tag_vorn_sched_task_, decltype(&VORNSchedTaskFree)>;

constexpr const char* kRefresh = "/usr/vorn/sbin/vornwin -updateDomain";

int All(_tag_vorn_sched_task_* task) {
    return task == nullptr ? 0 : 1;
}

int Refreshes(_tag_vorn_sched_task_* task) {
    char command[1024] = {};
    return VORNSchedCTaskGetCommand(command, sizeof(command), task) == 0 && std::string(command) == kRefresh ? 1 : 0;
}

std::thread::id filterThread;

int RemembersThread(_tag_vorn_sched_task_*) {
    filterThread = std::this_thread::get_id();
    VLIBCErrSetEx(0x0D00, "filter", 7);
    return 0;
}

class Scheduler : public system_test::SystemTest {
protected:
    Scheduler() : task(VORNSchedTaskAlloc(), VORNSchedTaskFree) {}

    static Json::Value Weekly(int hour = 3) {
        Json::Value value;
        value["schedule"]["date_type"] = 0;
        value["schedule"]["week_name"] = "0,6";
        value["schedule"]["hour"] = hour;
        value["schedule"]["min"] = 30;
        return value;
    }

    // A saved task; its id.
    int Add(const std::string& command, bool listable = true) {
        Task added(VORNSchedTaskAlloc(), VORNSchedTaskFree);
        EXPECT_EQ(VORNSchedTaskLoad(-1, added.get()), 0);
        EXPECT_TRUE(VORNSchedTaskConvertFromJson_Schedule(Weekly(), added.get()));
        VORNSchedCTaskSetListable(added.get(), listable);
        EXPECT_EQ(VORNSchedCTaskSetCommand(added.get(), command.c_str()), 0);
        EXPECT_EQ(VORNSchedTaskSave(added.get()), 0);
        return VORNSchedTaskGetID(added.get());
    }

    // The id of the first task that passes, -1 for none.
    static int First(VORNSchedTaskFilter filter) {
        _tag_vorn_sched_task_* list = nullptr;
        EXPECT_EQ(VORNSchedTaskListGet(&list, filter), 0);
        const int id = list == nullptr ? -1 : VORNSchedTaskGetID(list);
        VORNSchedTaskListFree(&list);
        EXPECT_EQ(list, nullptr);
        return id;
    }

    std::string Command() const {
        char command[1024] = {};
        EXPECT_EQ(VORNSchedCTaskGetCommand(command, sizeof(command), task.get()), 0);
        return command;
    }

    static int LastError() {
        return VLIBCErrGet();
    }
    static int Code(appliance::ErrorCode code) {
        return static_cast<int>(code);
    }

    Task task;
};

TEST_F(Scheduler, KeepsATask) {
    EXPECT_EQ(First(All), -1);
    ASSERT_EQ(VORNSchedTaskLoad(-1, task.get()), 0);
    EXPECT_EQ(VORNSchedTaskGetID(task.get()), -1);
    ASSERT_TRUE(VORNSchedTaskConvertFromJson_Schedule(Weekly(), task.get()));
    ASSERT_EQ(VORNSchedCTaskSetCommand(task.get(), kRefresh), 0);
    ASSERT_EQ(VORNSchedTaskSave(task.get()), 0);
    const int id = VORNSchedTaskGetID(task.get());
    EXPECT_GE(id, 0);
    EXPECT_EQ(First(Refreshes), id);

    Task loaded(VORNSchedTaskAlloc(), VORNSchedTaskFree);
    ASSERT_EQ(VORNSchedTaskLoad(id, loaded.get()), 0);
    EXPECT_EQ(VORNSchedTaskGetID(loaded.get()), id);
    Json::Value value;
    ASSERT_TRUE(VORNSchedTaskConvertToJson_Schedule(loaded.get(), value));
    EXPECT_EQ(value["schedule"]["week_name"], "0,6");
    EXPECT_EQ(value["schedule"]["min"], 30);
}

TEST_F(Scheduler, ReplacesATaskOfTheSameId) {
    const int id = Add(kRefresh);
    ASSERT_EQ(VORNSchedTaskLoad(id, task.get()), 0);
    ASSERT_TRUE(VORNSchedTaskConvertFromJson_Schedule(Weekly(5), task.get()));
    ASSERT_EQ(VORNSchedTaskSave(task.get()), 0);
    EXPECT_EQ(VORNSchedTaskGetID(task.get()), id);
    std::vector<appliance::ScheduledTask> tasks;
    ASSERT_FALSE(appliance::LoadTasks(tasks));
    ASSERT_EQ(tasks.size(), 1U);
    EXPECT_EQ(tasks[0].schedule.hour, 5);
    EXPECT_THAT(*Content(appliance::kCronTable), HasSubstr("\n30 5 * * 0,6 root exec env -i "));
}

TEST_F(Scheduler, RemovesATaskAndItsLine) {
    const int first = Add("/bin/first");
    const int second = Add("/bin/second");
    ASSERT_EQ(VORNSchedTaskRemove(first), 0);
    EXPECT_EQ(First(All), second);
    EXPECT_THAT(*Content(appliance::kCronTable), Not(HasSubstr("/bin/first")));
    ASSERT_EQ(VORNSchedTaskRemove(second), 0);
    EXPECT_FALSE(Content(appliance::kCronTable));
    EXPECT_EQ(VORNSchedTaskRemove(second), -1);
    EXPECT_EQ(LastError(), Code(appliance::ErrorCode::NotFound));
}

TEST_F(Scheduler, DoesNotUseAnIdAgain) {
    const int first = Add("/bin/first");
    ASSERT_EQ(VORNSchedTaskRemove(first), 0);
    EXPECT_NE(Add("/bin/second"), first);
}

TEST_F(Scheduler, ListsAllThatPassInTheirOrder) {
    const int first = Add(kRefresh);
    Add("/bin/other");
    const int third = Add(kRefresh);
    EXPECT_EQ(First(Refreshes), first);
    ASSERT_EQ(VORNSchedTaskRemove(first), 0);
    EXPECT_EQ(First(Refreshes), third);
    EXPECT_EQ(First([](_tag_vorn_sched_task_*) { return 0; }), -1);
}

TEST_F(Scheduler, HidesATaskFromAdministratorsButNotFromAFilter) {
    const int hidden = Add(kRefresh, false);
    const int shown = Add("/bin/other");
    EXPECT_EQ(First(Refreshes), hidden);
    std::vector<appliance::ScheduledTask> tasks;
    ASSERT_FALSE(appliance::LoadListableTasks(tasks));
    ASSERT_EQ(tasks.size(), 1U);
    EXPECT_EQ(tasks[0].id, shown);
    EXPECT_THAT(*Content(appliance::kCronTable), HasSubstr(kRefresh));
}

TEST_F(Scheduler, RunsTheFilterOnTheCallersThread) {
    Add(kRefresh);
    VLIBCErrSetEx(0, "", 0);
    std::thread caller([] {
        EXPECT_EQ(First(RemembersThread), -1);
        EXPECT_EQ(filterThread, std::this_thread::get_id());
        EXPECT_EQ(VLIBCErrGet(), 0x0D00);
        EXPECT_STREQ(VLIBCErrorGetFile(), "filter");
        EXPECT_EQ(VLIBCErrorGetLine(), 7);
    });
    caller.join();
    EXPECT_EQ(LastError(), 0);
}

TEST_F(Scheduler, RefusesCommandsThatCronCantRun) {
    const std::string longest(748, 'x');
    EXPECT_EQ(VORNSchedCTaskSetCommand(task.get(), longest.c_str()), 0);
    for (const std::string& command :
         {std::string(), std::string("  "), std::string("/bin/a\n* * * * * root /bin/b"), std::string("/bin/a\r"),
          std::string("/bin/a\t-b"), std::string("/bin/\x1B"), std::string("/bin/\x7F"), longest + "x",
          std::string(400, '%'), std::string(200, '\'')}) {
        VLIBCErrSetEx(0, "", 0);
        EXPECT_NE(VORNSchedCTaskSetCommand(task.get(), command.c_str()), 0) << command;
        EXPECT_EQ(LastError(), Code(appliance::ErrorCode::BadArgument));
        EXPECT_EQ(Command(), longest);
    }
    EXPECT_NE(VORNSchedCTaskSetCommand(task.get(), nullptr), 0);
    EXPECT_NE(VORNSchedCTaskSetCommand(nullptr, "/bin/a"), 0);
}

TEST_F(Scheduler, CutsACommandToTheBuffer) {
    ASSERT_EQ(VORNSchedCTaskSetCommand(task.get(), "/bin/command"), 0);
    char buffer[6] = {};
    ASSERT_EQ(VORNSchedCTaskGetCommand(buffer, sizeof(buffer), task.get()), 0);
    EXPECT_STREQ(buffer, "/bin/");
    EXPECT_EQ(VORNSchedCTaskGetCommand(buffer, 0, task.get()), -1);
    EXPECT_EQ(VORNSchedCTaskGetCommand(nullptr, 6, task.get()), -1);
    EXPECT_EQ(VORNSchedCTaskGetCommand(buffer, 6, nullptr), -1);
}

TEST_F(Scheduler, SavesNothingWithoutACommandOrASchedule) {
    EXPECT_EQ(VORNSchedTaskSave(task.get()), -1);
    EXPECT_EQ(LastError(), Code(appliance::ErrorCode::BadArgument));
    ASSERT_EQ(VORNSchedCTaskSetCommand(task.get(), kRefresh), 0);
    EXPECT_EQ(VORNSchedTaskSave(task.get()), -1);
    EXPECT_FALSE(Content(appliance::kSchedule));
}

TEST_F(Scheduler, DoesNotReviveATaskThatWasRemoved) {
    const int id = Add(kRefresh);
    ASSERT_EQ(VORNSchedTaskLoad(id, task.get()), 0);
    ASSERT_EQ(VORNSchedTaskRemove(id), 0);
    EXPECT_EQ(VORNSchedTaskSave(task.get()), -1);
    EXPECT_EQ(LastError(), Code(appliance::ErrorCode::NotFound));
    EXPECT_EQ(First(All), -1);
    EXPECT_EQ(VORNSchedTaskLoad(id, task.get()), -1);
    EXPECT_EQ(LastError(), Code(appliance::ErrorCode::NotFound));
    EXPECT_EQ(VORNSchedTaskLoad(-2, task.get()), -1);
    EXPECT_EQ(LastError(), Code(appliance::ErrorCode::BadArgument));
}

TEST_F(Scheduler, TakesNoNull) {
    _tag_vorn_sched_task_* list = task.get();
    EXPECT_EQ(VORNSchedTaskListGet(nullptr, All), -1);
    EXPECT_EQ(VORNSchedTaskListGet(&list, All), -1);
    list = nullptr;
    EXPECT_EQ(VORNSchedTaskListGet(&list, nullptr), -1);
    EXPECT_EQ(VORNSchedTaskLoad(-1, nullptr), -1);
    EXPECT_EQ(VORNSchedTaskSave(nullptr), -1);
    EXPECT_EQ(VORNSchedTaskGetID(nullptr), -1);
    VORNSchedCTaskSetListable(nullptr, true);
    VORNSchedTaskListFree(nullptr);
    VORNSchedTaskListFree(&list);
    VORNSchedTaskFree(nullptr);
}

TEST_F(Scheduler, FailsWithABrokenFileAndLeavesItAlone) {
    const std::string broken = "[1]\ncommand=/bin/a\nhour=99\n";
    Put(appliance::kSchedule, broken);
    _tag_vorn_sched_task_* list = nullptr;
    EXPECT_EQ(VORNSchedTaskListGet(&list, All), -1);
    EXPECT_EQ(LastError(), Code(appliance::ErrorCode::FileRead));
    EXPECT_EQ(list, nullptr);
    EXPECT_EQ(VORNSchedTaskRemove(1), -1);
    EXPECT_EQ(*Content(appliance::kSchedule), broken);
}

}  // namespace
