// Counting of what is handed out, and misuse.

#include "tests/double/handles.h"

#include <gmock/gmock.h>

#include <cstdlib>
#include <cstring>
#include <string>

#include "platform/core.h"
#include "platform/domain.h"
#include "platform/network.h"
#include "platform/scheduler.h"
#include "platform/settings.h"
#include "tests/double/appliance.h"

namespace {

using fake::TheAppliance;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

class HandlesTest : public testing::Test {
protected:
    HandlesTest() {
        TheAppliance().Reset();
    }
    ~HandlesTest() override {
        TheAppliance().Reset();
    }
};

int All(_tag_vorn_sched_task_* task) {
    return task != nullptr ? 1 : 0;
}

TEST_F(HandlesTest, CountsWhatIsNotGivenBack) {
    TheAppliance().state.scheduledTasks.resize(2);
    VLIBSZLIST* list = VLIBCSzListAlloc(4);
    VLIBSZHASH* hash = VLIBCSzHashAlloc(4);
    _tag_vorn_sched_task_* task = VORNSchedTaskAlloc();
    _tag_vorn_sched_task_* tasks = nullptr;
    ASSERT_EQ(VORNSchedTaskListGet(&tasks, All), 0);
    char* copy = strdup("text");
    {
        VornConf conf;
        VORN::APIPolling polling;
        EXPECT_EQ(TheAppliance().LiveHandles(), 7);
        EXPECT_THAT(TheAppliance().LiveHandleNames(), HasSubstr("copy from strdup(\"text\")"));
    }
    EXPECT_EQ(TheAppliance().LiveHandles(), 5);
    VLIBCSzListFree(list);
    VLIBCSzHashFree(hash);
    VORNSchedTaskFree(task);
    VORNSchedTaskListFree(&tasks);
    EXPECT_EQ(tasks, nullptr);
    free(copy);
    EXPECT_EQ(TheAppliance().LiveHandles(), 0) << TheAppliance().LiveHandleNames();
    EXPECT_THAT(TheAppliance().Misuses(), IsEmpty());
}

TEST_F(HandlesTest, FindsDoubleFree) {
    VLIBSZLIST* list = VLIBCSzListAlloc(1);
    VLIBCSzListFree(list);
    VLIBCSzListFree(list);
    VLIBCSzListFree(nullptr);
    EXPECT_THAT(TheAppliance().Misuses(), ElementsAre("VLIBCSzListFree(list): not a live list"));
}

TEST_F(HandlesTest, FindsTheWrongFree) {
    TheAppliance().state.scheduledTasks.resize(1);
    _tag_vorn_sched_task_* tasks = nullptr;
    VORNSchedTaskListGet(&tasks, All);
    VORNSchedTaskFree(tasks);
    EXPECT_THAT(TheAppliance().Misuses(), ElementsAre("VORNSchedTaskFree(task): not a live task"));
    VORNSchedTaskListFree(&tasks);
}

TEST_F(HandlesTest, ReplacesAListThatGrows) {
    VLIBSZLIST* list = VLIBCSzListAlloc(1);
    VLIBSZLIST* old = list;
    EXPECT_EQ(VLIBCSzListPush(&list, "a"), 0);
    EXPECT_NE(list, old);
    EXPECT_EQ(list->count, 1);
    EXPECT_EQ(VLIBCSzListGet(old, 0), nullptr);
    EXPECT_THAT(TheAppliance().Misuses(), ElementsAre("VLIBCSzListGet(list, 0): not a live list"));
    TheAppliance().state.listGrowthReplacesList = false;
    old = list;
    EXPECT_EQ(VLIBCSzListPush(&list, "b"), 0);
    EXPECT_EQ(list, old);
    VLIBCSzListFree(list);
    EXPECT_EQ(TheAppliance().LiveHandles(), 0);
}

TEST_F(HandlesTest, ReplacesAHashThatIsLoadedOrSet) {
    TheAppliance().state.keyValueFiles["/f"]["global"] = {{"Key", "value"}};
    VLIBSZHASH* hash = VLIBCSzHashAlloc(1);
    const VLIBSZHASH* old = hash;
    EXPECT_EQ(VLIBCFileGetSection("/f", "global", &hash), 0);
    EXPECT_NE(hash, old);
    EXPECT_STREQ(VLIBCSzHashGetValue(hash, "KEY"), "value");
    old = hash;
    EXPECT_EQ(VLIBCSzHashSetValue(&hash, "other", "1"), 0);
    EXPECT_NE(hash, old);
    TheAppliance().FailNth("VLIBCFileGetSection", 2, fake::Fault::Result(-1));
    old = hash;
    EXPECT_EQ(VLIBCFileGetSection("/f", "global", &hash), -1);
    EXPECT_NE(hash, old);
    EXPECT_STREQ(VLIBCSzHashGetValue(hash, "other"), "1");
    VLIBCSzHashFree(hash);
    EXPECT_EQ(TheAppliance().LiveHandles(), 0);
    EXPECT_THAT(TheAppliance().Misuses(), IsEmpty());
}

TEST_F(HandlesTest, FindsNullWhereNoneIsAllowed) {
    const char* none = nullptr;
    EXPECT_EQ(VLIBCFileTouch(none), -1);
    EXPECT_EQ(VORNNetDNSListSet(nullptr), -1);
    EXPECT_EQ(VORNWinJoin1(nullptr), -1);
    EXPECT_THAT(TheAppliance().Misuses(),
                ElementsAre("VLIBCFileTouch(null): null argument", "VORNNetDNSListSet(null): null argument",
                            "VORNWinJoin1(null): null argument"));
}

TEST_F(HandlesTest, TellsWipedCopies) {
    char* plain = strdup("secret");
    char* wiped = strdup("secret");
    explicit_bzero(wiped, 6);
    free(plain);
    free(wiped);
    EXPECT_THAT(TheAppliance().CallTexts(),
                ElementsAre("strdup(\"secret\")", "strdup(\"secret\")", "free(\"secret\")", "free(wiped)"));
}

}  // namespace
