// The owners of the platform's handles.

#include <stdexcept>
#include <string>

#include "src/support/handles.h"
#include "tests/unit/handler_step.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;

class PlatformHandles : public unit::ModuleTest {};

int AcceptAll(_tag_vorn_sched_task_* task) {
    return task == nullptr ? 0 : 1;
}

TEST_F(PlatformHandles, AreFreedOnceAtTheEndOfTheirOwner) {
    {
        const StringList list;
        const StringHash hash;
        const ScheduledTask task;
        EXPECT_TRUE(list);
        EXPECT_TRUE(hash);
        EXPECT_TRUE(task);
        EXPECT_EQ(appliance.LiveHandles(), 3);
    }
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VLIBCSzListAlloc(1024)", "VLIBCSzHashAlloc(1024)", "VORNSchedTaskAlloc()",
                            "VORNSchedTaskFree(task)", "VLIBCSzHashFree(hash)", "VLIBCSzListFree(list)"));
}

TEST_F(PlatformHandles, ThatCouldNotBeAllocatedAreFalseAndNotFreed) {
    appliance.FailNth("VLIBCSzListAlloc", 1, Fault::Null());
    appliance.FailNth("VLIBCSzHashAlloc", 1, Fault::Null());
    appliance.FailNth("VORNSchedTaskAlloc", 1, Fault::Null());
    {
        const StringList list;
        const StringHash hash;
        const ScheduledTask task;
        EXPECT_FALSE(list);
        EXPECT_FALSE(hash);
        EXPECT_FALSE(task);
        EXPECT_EQ(list.get(), nullptr);
    }
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VLIBCSzListAlloc(1024)", "VLIBCSzHashAlloc(1024)", "VORNSchedTaskAlloc()"));
}

TEST_F(PlatformHandles, AreFreedWhenAnExceptionPasses) {
    try {
        const StringHash hash;
        throw std::runtime_error("passes");
    } catch (const std::runtime_error&) {
        EXPECT_EQ(appliance.LiveHandles(), 0);
    }
    EXPECT_EQ(appliance.CountOf("VLIBCSzHashFree"), 1);
}

TEST_F(PlatformHandles, ThatThePlatformReplacedAreUsedAndFreedInTheirNewPlace) {
    StringList list;
    const VLIBSZLIST* before = list.get();
    EXPECT_EQ(VLIBCSzListPush(list.address(), "text"), 0);
    EXPECT_NE(list.get(), before);
    EXPECT_EQ(list->count, 1);
    EXPECT_STREQ(VLIBCSzListGet(list.get(), 0), "text");
    StringHash hash;
    EXPECT_EQ(VLIBCSzHashSetValue(hash.address(), "key", "value"), 0);
    EXPECT_STREQ(VLIBCSzHashGetValue(hash.get(), "key"), "value");
}

TEST_F(PlatformHandles, OfTaskListsBeginEmptyAndAreNotFreedThen) {
    {
        ScheduledTaskList tasks;
        EXPECT_EQ(tasks.first(), nullptr);
        EXPECT_EQ(*tasks.address(), nullptr);
        EXPECT_EQ(VORNSchedTaskListGet(tasks.address(), AcceptAll), 0);
        EXPECT_EQ(tasks.first(), nullptr);
    }
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskListFree"), 0);
}

TEST_F(PlatformHandles, OfTaskListsAreFreedOnce) {
    state.scheduledTasks.resize(1);
    state.scheduledTasks[0].id = 7;
    {
        ScheduledTaskList tasks;
        EXPECT_EQ(VORNSchedTaskListGet(tasks.address(), AcceptAll), 0);
        EXPECT_EQ(VORNSchedTaskGetID(tasks.first()), 7);
    }
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskListFree"), 1);
}

TEST_F(PlatformHandles, OfTextsAreCopiesThatAreFreed) {
    std::string original = "text";
    {
        const HeapText copy = CopyText(original.c_str());
        original = "else";
        EXPECT_STREQ(copy.get(), "text");
    }
    EXPECT_THAT(appliance.CallTexts(), ElementsAre(R"(strdup("text"))", R"(free("text"))"));
}

TEST_F(PlatformHandles, OfTextsAreNullWhenNoCopyCouldBeMade) {
    appliance.FailNth("strdup", 1, Fault::Null());
    EXPECT_EQ(CopyText("text"), nullptr);
    EXPECT_EQ(appliance.CountOf("free"), 0);
}

}  // namespace
