// Scheduled tasks: records alone, then tasks that are saved, listed, loaded, replaced and removed.

#include <json/writer.h>

#include <set>

#include "contract_test.h"
#include "platform/scheduler.h"

namespace {

using Task = _tag_vorn_sched_task_;

constexpr const char* kCommand = "/usr/vorn/sbin/vornwin -contractTest";
constexpr int kNoTask = 2147483646;

// A record, freed at its end.
struct Record {
    Record() : task(VORNSchedTaskAlloc()) {
        EXPECT_NE(task, nullptr);
    }
    ~Record() {
        VORNSchedTaskFree(task);
    }
    Record(const Record&) = delete;
    Record& operator=(const Record&) = delete;

    Task* task;
};

Json::Value Weekly(int hour, int minute) {
    Json::Value schedule(Json::objectValue);
    schedule["date_type"] = 0;
    schedule["date"] = "";
    schedule["hour"] = hour;
    schedule["last_work_hour"] = 20;
    schedule["min"] = minute;
    schedule["repeat"] = 0;
    schedule["repeat_hour"] = 4;
    schedule["week_name"] = "1,3,5";
    Json::Value value(Json::objectValue);
    value["schedule"] = schedule;
    return value;
}

Json::Value FromADate(const std::string& date, int repeat) {
    Json::Value value = Weekly(23, 15);
    value["schedule"]["date_type"] = 1;
    value["schedule"]["date"] = date;
    value["schedule"]["repeat"] = repeat;
    value["schedule"]["repeat_hour"] = 0;
    value["schedule"]["last_work_hour"] = 0;
    value["schedule"]["week_name"] = "";
    return value;
}

Json::Value ScheduleOf(const Task* task) {
    Json::Value value;
    return VORNSchedTaskConvertToJson_Schedule(task, value) ? value : Json::Value();
}

std::string CommandOf(const Task* task) {
    char command[1024] = {};
    return VORNSchedCTaskGetCommand(command, sizeof command, task) < 0 ? "(none)" : command;
}

int all(Task*) {
    return 1;
}
int none(Task*) {
    return 0;
}
int ofTheTests(Task* task) {
    return task != nullptr && CommandOf(task).rfind(kCommand, 0) == 0 ? 1 : 0;
}

// The id of the first task that passes; -1 when none does.
int First(VORNSchedTaskFilter filter) {
    Task* list = nullptr;
    EXPECT_GE(VORNSchedTaskListGet(&list, filter), 0);
    const int id = list == nullptr ? -1 : VORNSchedTaskGetID(list);
    VORNSchedTaskListFree(&list);
    EXPECT_EQ(list, nullptr);
    return id;
}

class ScheduledTasks : public testing::Test {
protected:
    ScheduledTasks() {
        RemoveOwn();
    }
    ~ScheduledTasks() override {
        RemoveOwn();
        EXPECT_EQ(First(ofTheTests), -1);
    }
    static void RemoveOwn() {
        for (int id = First(ofTheTests); id >= 0; id = First(ofTheTests)) {
            ASSERT_GE(VORNSchedTaskRemove(id), 0);
        }
    }
    static void Prepare(Task* task, const std::string& command, const Json::Value& schedule) {
        ASSERT_GE(VORNSchedTaskLoad(-1, task), 0);
        ASSERT_TRUE(VORNSchedTaskConvertFromJson_Schedule(schedule, task));
        VORNSchedCTaskSetListable(task, false);
        ASSERT_EQ(VORNSchedCTaskSetCommand(task, command.c_str()), 0);
    }
    static int Save(const std::string& command, const Json::Value& schedule) {
        const Record record;
        Prepare(record.task, command, schedule);
        EXPECT_GE(SUCCEEDING(VORNSchedTaskSave(record.task)), 0);
        return VORNSchedTaskGetID(record.task);
    }
};

// ---- Records alone ----

TEST_F(ScheduledTasks, ANewRecordHasNoId) {
    const Record record;
    ASSERT_GE(SUCCEEDING(VORNSchedTaskLoad(-1, record.task)), 0);
    EXPECT_EQ(VORNSchedTaskGetID(record.task), -1);
}

TEST_F(ScheduledTasks, ARecordKeepsItsSchedule) {
    const Record record;
    for (const Json::Value& value :
         {Weekly(8, 30), Weekly(0, 0), FromADate("2037/1/31", 3), FromADate("2036/2/29", 4)}) {
        ASSERT_GE(VORNSchedTaskLoad(-1, record.task), 0);
        ASSERT_TRUE(SUCCEEDING(VORNSchedTaskConvertFromJson_Schedule(value, record.task)));
        Json::Value found("no object yet");
        ASSERT_TRUE(VORNSchedTaskConvertToJson_Schedule(record.task, found));
        ASSERT_TRUE(found.isObject());
        ASSERT_EQ(found["schedule"].getMemberNames(), value["schedule"].getMemberNames());
        for (const char* name : {"date_type", "hour", "last_work_hour", "min", "repeat", "repeat_hour"}) {
            EXPECT_TRUE(found["schedule"][name].isInt()) << name;
            EXPECT_EQ(found["schedule"][name].asInt(), value["schedule"][name].asInt()) << name;
        }
        const bool weekly = value["schedule"]["date_type"].asInt() == 0;
        const char* named = weekly ? "week_name" : "date";
        EXPECT_EQ(found["schedule"][named], value["schedule"][named]);
    }
}

TEST_F(ScheduledTasks, TimesThatCannotBeAreRefusedAndChangeNothing) {
    const Record record;
    ASSERT_GE(VORNSchedTaskLoad(-1, record.task), 0);
    ASSERT_TRUE(VORNSchedTaskConvertFromJson_Schedule(Weekly(8, 30), record.task));
    const Json::Value before = ScheduleOf(record.task);
    for (const auto& [name, wrong] : std::vector<std::pair<const char*, Json::Value>>{{"hour", 24},
                                                                                      {"hour", 99},
                                                                                      {"hour", -1},
                                                                                      {"min", 60},
                                                                                      {"min", -1},
                                                                                      {"date_type", 9},
                                                                                      {"week_name", "7"}}) {
        Json::Value value = Weekly(9, 45);
        value["schedule"][name] = wrong;
        EXPECT_FALSE(FAILING(VORNSchedTaskConvertFromJson_Schedule(value, record.task))) << name << " " << wrong;
        EXPECT_EQ(ScheduleOf(record.task), before) << name << " " << wrong;
    }
    EXPECT_FALSE(VORNSchedTaskConvertFromJson_Schedule(FromADate("2037/2/30", 0), record.task));
}

TEST_F(ScheduledTasks, WhatIsNoScheduleIsRefused) {
    const Record record;
    ASSERT_GE(VORNSchedTaskLoad(-1, record.task), 0);
    Json::Value text(Json::objectValue);
    text["schedule"] = "8:30";
    for (const Json::Value& value :
         {Json::Value(), Json::Value(Json::objectValue), Json::Value("text"), Json::Value(Json::arrayValue), text}) {
        EXPECT_FALSE(VORNSchedTaskConvertFromJson_Schedule(value, record.task)) << value;
    }
}

TEST_F(ScheduledTasks, ACommandIsKeptAndCutToTheBuffer) {
    const Record record;
    ASSERT_GE(VORNSchedTaskLoad(-1, record.task), 0);
    ASSERT_EQ(SUCCEEDING(VORNSchedCTaskSetCommand(record.task, kCommand)), 0);
    EXPECT_EQ(CommandOf(record.task), kCommand);
    contract::GuardedBuffer buffer(10);
    ASSERT_GE(VORNSchedCTaskGetCommand(buffer.data(), buffer.size(), record.task), 0);
    EXPECT_TRUE(buffer.GuardsStand());
    ASSERT_TRUE(buffer.IsTerminated());
    EXPECT_EQ(buffer.Text(), std::string(kCommand).substr(0, 9));
}

TEST_F(ScheduledTasks, FreeingNothingDoesNothing) {
    VORNSchedTaskFree(nullptr);
    Task* list = nullptr;
    VORNSchedTaskListFree(&list);
    EXPECT_EQ(list, nullptr);
}

// ---- Saved tasks ----

TEST_F(ScheduledTasks, ASavedTaskIsListedAndLoaded) {
    const int id = Save(kCommand, Weekly(8, 30));
    ASSERT_GE(id, 0);
    EXPECT_EQ(First(ofTheTests), id);
    const Record loaded;
    ASSERT_GE(SUCCEEDING(VORNSchedTaskLoad(id, loaded.task)), 0);
    EXPECT_EQ(VORNSchedTaskGetID(loaded.task), id);
    EXPECT_EQ(CommandOf(loaded.task), kCommand);
    const Json::Value schedule = ScheduleOf(loaded.task)["schedule"];
    for (const char* name : {"date_type", "hour", "last_work_hour", "min", "repeat_hour", "week_name"}) {
        EXPECT_EQ(schedule[name], Weekly(8, 30)["schedule"][name]) << name;
    }
}

TEST_F(ScheduledTasks, EachHasAnIdOfItsOwn) {
    std::set<int> ids;
    for (int number = 0; number < 5; ++number) {
        const int id = Save(kCommand + std::to_string(number), Weekly(8, number));
        ASSERT_GE(id, 0);
        EXPECT_TRUE(ids.insert(id).second) << id << " twice";
    }
}

TEST_F(ScheduledTasks, AreListedWhenTheyPassTheFilter) {
    EXPECT_EQ(First(none), -1);
    const int id = Save(kCommand, Weekly(8, 30));
    EXPECT_EQ(First(none), -1);
    EXPECT_GE(First(all), 0);
    EXPECT_EQ(First(ofTheTests), id);
    EXPECT_EQ(First([](Task* task) { return CommandOf(task) == std::string(kCommand) + "2" ? 1 : 0; }), -1);
    const int second = Save(std::string(kCommand) + "2", Weekly(9, 30));
    EXPECT_EQ(First([](Task* task) { return CommandOf(task) == std::string(kCommand) + "2" ? 1 : 0; }), second);
}

TEST_F(ScheduledTasks, AKnownOneIsReplaced) {
    const int id = Save(kCommand, Weekly(8, 30));
    const Record record;
    ASSERT_GE(VORNSchedTaskLoad(id, record.task), 0);
    ASSERT_TRUE(VORNSchedTaskConvertFromJson_Schedule(FromADate("2037/1/31", 3), record.task));
    ASSERT_GE(SUCCEEDING(VORNSchedTaskSave(record.task)), 0);
    EXPECT_EQ(VORNSchedTaskGetID(record.task), id);
    const Record loaded;
    ASSERT_GE(VORNSchedTaskLoad(id, loaded.task), 0);
    EXPECT_EQ(ScheduleOf(loaded.task)["schedule"]["date"], "2037/1/31");
    EXPECT_EQ(CommandOf(loaded.task), kCommand) << "what was not changed stays";
    ASSERT_GE(VORNSchedTaskRemove(id), 0);
    EXPECT_EQ(First(ofTheTests), -1) << "it was one task, not two";
}

TEST_F(ScheduledTasks, ARecordIsPreparedForANewTaskWhateverItHeld) {
    const int id = Save(kCommand, Weekly(8, 30));
    const Record record;
    ASSERT_GE(VORNSchedTaskLoad(id, record.task), 0);
    Prepare(record.task, std::string(kCommand) + "2", Weekly(9, 0));
    ASSERT_GE(VORNSchedTaskSave(record.task), 0);
    EXPECT_NE(VORNSchedTaskGetID(record.task), id);
    EXPECT_EQ(First(ofTheTests) >= 0, true);
    const Record first;
    ASSERT_GE(VORNSchedTaskLoad(id, first.task), 0);
    EXPECT_EQ(CommandOf(first.task), kCommand);
}

TEST_F(ScheduledTasks, ARemovedOneIsGone) {
    const int id = Save(kCommand, Weekly(8, 30));
    ASSERT_GE(SUCCEEDING(VORNSchedTaskRemove(id)), 0);
    EXPECT_EQ(First(ofTheTests), -1);
    const Record record;
    EXPECT_EQ(FAILING(VORNSchedTaskLoad(id, record.task)), -1);
    EXPECT_EQ(FAILING(VORNSchedTaskRemove(id)), -1) << "a second time";
}

TEST_F(ScheduledTasks, AnUnknownIdIsNone) {
    const Record record;
    EXPECT_EQ(FAILING(VORNSchedTaskLoad(kNoTask, record.task)), -1);
    EXPECT_EQ(FAILING(VORNSchedTaskRemove(kNoTask)), -1);
    EXPECT_EQ(FAILING(VORNSchedTaskRemove(-1)), -1);
}

TEST_F(ScheduledTasks, AreSavedByAnotherProcess) {
    const pid_t child = contract::Fork([] { return Save(kCommand, Weekly(8, 30)) >= 0; });
    ASSERT_EQ(contract::Await(child), 0);
    EXPECT_GE(First(ofTheTests), 0);
}

}  // namespace
