// Operations that change what the appliance is.

#include "tests/double/state.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <iterator>
#include <optional>
#include <string>

#include "platform/core.h"
#include "platform/domain.h"
#include "platform/scheduler.h"
#include "tests/double/appliance.h"

namespace {

using fake::State;
using fake::TheAppliance;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

class StateTest : public testing::Test {
protected:
    StateTest() {
        TheAppliance().Reset();
    }

    void TearDown() override {
        EXPECT_EQ(TheAppliance().LiveHandles(), 0) << TheAppliance().LiveHandleNames();
        TheAppliance().Reset();
    }

    State& state = TheAppliance().state;
};

TEST_F(StateTest, FillsTheWholeBuffer) {
    state.keyValueFiles["/f"]["a"] = {{"key", "value"}};
    char value[8] = {};
    std::fill(std::begin(value), std::end(value), 'x');
    EXPECT_EQ(VLIBCFileGetKeyValue("/f", "KEY", value, sizeof value, 0), 5);
    EXPECT_EQ(std::string(value, sizeof value), std::string("value\0ZZ", 8));
    EXPECT_EQ(VLIBCFileGetKeyValue("/f", "key", value, 4, 0), 3);
    EXPECT_STREQ(value, "val");
    EXPECT_EQ(VLIBCFileGetKeyValue("/f", "none", value, sizeof value, 0), 0);
    EXPECT_STREQ(value, "stale-g");
    EXPECT_EQ(VLIBCFileGetKeyValue("/none", "key", value, sizeof value, 0), -1);
}

TEST_F(StateTest, TakesABufferThatIsNotZeroedForAMisuse) {
    char name[8] = {};
    VORNWorkgroupGet(name, sizeof name);
    EXPECT_TRUE(TheAppliance().Misuses().empty());
    VORNWorkgroupGet(name, sizeof name);
    EXPECT_EQ(TheAppliance().Misuses().size(), 1U);
}

TEST_F(StateTest, WritesASectionAndMovesTheFile) {
    state.keyValueFiles["/f"]["global"] = {{"old", "1"}};
    char name[64] = {};
    ASSERT_EQ(VLIBCFileITmpName("/f", name, sizeof name), 0);
    VLIBSZHASH* hash = VLIBCSzHashAlloc(2);
    VLIBCSzHashSetValue(&hash, "b", "2");
    VLIBCSzHashSetValue(&hash, "a", "3");
    VLIBCSzHashSetValue(&hash, "B", "4");
    EXPECT_NE(VLIBCFileAddSection(name, "global", hash, "\t%s=%s\n"), 0);
    VLIBCSzHashFree(hash);
    EXPECT_EQ(access(name, F_OK), 0);
    EXPECT_EQ(VLIBCSysRename(name, "/f"), 0);
    EXPECT_EQ(access(name, F_OK), -1);
    EXPECT_THAT(state.keyValueFiles["/f"]["global"], ElementsAre(Pair("b", "4"), Pair("a", "3")));
    EXPECT_EQ(state.sectionFormats["/f"], "\t%s=%s\n");
}

TEST_F(StateTest, TellsAFormatThatIsNone) {
    VLIBSZHASH* hash = VLIBCSzHashAlloc(1);
    EXPECT_EQ(VLIBCFileAddSection("/f", "global", hash, "%s=%n"), 0);
    EXPECT_EQ(TheAppliance().Misuses().size(), 1U);
    VLIBCSzHashFree(hash);
}

TEST_F(StateTest, TouchesAndRemovesFiles) {
    EXPECT_EQ(VLIBCFileTouch("/a"), 0);
    EXPECT_NE(VLIBCFileExist("/a"), 0);
    EXPECT_EQ(unlink("/a"), 0);
    EXPECT_EQ(unlink("/a"), -1);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(VLIBCSysRemove("/a"), -1);
    state.pidFiles["/p"] = 7;
    EXPECT_EQ(VLIBCReadPidFile("/p"), 7);
    EXPECT_EQ(VLIBCReadPidFile("/q"), -1);
}

TEST_F(StateTest, HoldsALockOnce) {
    EXPECT_EQ(VLIBCFileLock(0x0301, 1), 0);
    EXPECT_EQ(VLIBCFileLock(0x0302, 1), 1);
    EXPECT_EQ(VLIBCFileLock(0x0401, 1), 0);
    EXPECT_EQ(VLIBCFileUnlock(0x0300), 0);
    EXPECT_EQ(VLIBCFileUnlock(0x0401), 0);
    EXPECT_THAT(state.heldLocks, IsEmpty());
    EXPECT_EQ(VLIBCFileUnlock(0x0401), -1);
    EXPECT_EQ(TheAppliance().Misuses().size(), 1U);
}

TEST_F(StateTest, JoinsAndLeaves) {
    _tag_VORN_WIN2_ record{};
    record.joinMode = 1;
    record.domainName = "example.test";
    record.userName = "admin";
    record.password = "secret";
    std::strcpy(record.netbiosName, "EXAMPLE");
    EXPECT_EQ(VORNWinJoin1(&record), 0);
    char name[32] = {};
    int first = 0;
    EXPECT_EQ(WINIQuery1(name, sizeof name, &first, nullptr), 0);
    EXPECT_STREQ(name, "example.test");
    EXPECT_NE(first, 0);
    EXPECT_NE(VORNWinsIsJoined(), 0);
    EXPECT_NE(VORNWinsIsOwnDomain("example"), 0);
    ASSERT_EQ(state.joins.size(), 1U);
    EXPECT_EQ(state.joins[0].password, "secret");
    state.onJoin = [](const _tag_VORN_WIN2_&) { TheAppliance().state.joinResult = -1; };
    record.joinMode = 0;
    EXPECT_EQ(VORNWinJoin1(&record), -1);
    EXPECT_NE(VORNWinsIsJoined(), 0);
    record.reserved1 = 1;
    EXPECT_EQ(VORNWinJoin1(&record), -1);
    EXPECT_EQ(TheAppliance().Misuses().size(), 1U);
}

TEST_F(StateTest, AppendsNullEntries) {
    state.domains = {std::string("A"), std::nullopt, std::string("B")};
    VLIBSZLIST* list = VLIBCSzListAlloc(0);
    EXPECT_EQ(VORNWinsEnumAllDomains(&list), 0);
    EXPECT_EQ(list->count, 3);
    EXPECT_EQ(VLIBCSzListGet(list, 1), nullptr);
    EXPECT_STREQ(VLIBCSzListGet(list, 2), "B");
    VORNWinGetDomainUGByDomain(1, list);
    EXPECT_EQ(TheAppliance().Calls().back().Text(), "VORNWinGetDomainUGByDomain(1, [\"A\", null, \"B\"])");
    VLIBCSzListFree(list);
}

TEST_F(StateTest, SavesAndFindsScheduledTasks) {
    _tag_vorn_sched_task_* task = VORNSchedTaskAlloc();
    Json::Value value;
    value["schedule"]["hour"] = 3;
    EXPECT_EQ(VORNSchedTaskLoad(-1, task), 0);
    EXPECT_EQ(VORNSchedCTaskSetCommand(task, "refresh"), 0);
    EXPECT_TRUE(VORNSchedTaskConvertFromJson_Schedule(value, task));
    EXPECT_EQ(VORNSchedTaskGetID(task), -1);
    EXPECT_EQ(VORNSchedTaskSave(task), 0);
    EXPECT_EQ(VORNSchedTaskGetID(task), 1);
    value["schedule"]["hour"] = 24;
    EXPECT_FALSE(VORNSchedTaskConvertFromJson_Schedule(value, task));
    VORNSchedTaskFree(task);

    _tag_vorn_sched_task_* list = nullptr;
    const auto refresh = [](_tag_vorn_sched_task_* candidate) {
        char command[16] = {};
        const bool read = candidate != nullptr && VORNSchedCTaskGetCommand(command, sizeof command, candidate) == 0;
        return read && std::strcmp(command, "refresh") == 0 ? 1 : 0;
    };
    EXPECT_EQ(VORNSchedTaskListGet(&list, refresh), 0);
    ASSERT_NE(list, nullptr);
    EXPECT_EQ(VORNSchedTaskGetID(list), 1);
    Json::Value shown;
    EXPECT_TRUE(VORNSchedTaskConvertToJson_Schedule(list, shown));
    EXPECT_EQ(shown["schedule"]["hour"].asInt(), 3);
    VORNSchedTaskListFree(&list);
    EXPECT_EQ(VORNSchedTaskRemove(1), 0);
    EXPECT_THAT(TheAppliance().Misuses(), IsEmpty());
}

void Body(VORN::APIRequest*, VORN::APIResponse*, void*) {}

TEST_F(StateTest, StartsListsAndStopsBackgroundTasks) {
    Json::Value parameters;
    parameters["a"] = 1;
    fake::Exchange exchange(parameters);
    VORN::APIPolling polling(&exchange.request);
    polling.SetGroupAttr("admin");
    polling.SetPrefixAttr("Update_");
    EXPECT_TRUE(polling.Start(&exchange.response, Body, nullptr));
    EXPECT_EQ(TheAppliance().Answers().back().data["task_id"].asString(), "Update_1");
    EXPECT_EQ(state.startedBody, &Body);
    EXPECT_EQ(state.startedParameters, parameters);
    Json::Value groups(Json::arrayValue);
    groups.append("admin");
    groups.append("other");
    Json::Value tasks;
    EXPECT_TRUE(polling.List("Update_", groups, tasks));
    EXPECT_EQ(tasks["admin"][0].asString(), "Update_1");
    EXPECT_TRUE(tasks["other"].isArray());
    EXPECT_TRUE(polling.Stop("Update_1", true));
    EXPECT_TRUE(polling.Status("Update_1", tasks));
    EXPECT_TRUE(tasks["finish"].asBool());
    EXPECT_FALSE(polling.Status("none", tasks));
    EXPECT_EQ(polling.GetError(), state.pollingError);
    TheAppliance().FailNth("VORN::APIPolling::Start", 2, fake::Fault::False());
    EXPECT_FALSE(polling.Start(&exchange.response, Body, nullptr));
    EXPECT_EQ(TheAppliance().Answers().back().code, state.pollingError);
}

}  // namespace
