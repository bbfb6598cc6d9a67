// The steps of the schedule's "set" by themselves: what each answers and which code it records.

#include <string>
#include <vector>

#include "tests/unit/schedule_test.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FromJson;
using unit::kNever;
using unit::kOnWeekdays;

class ScheduleSteps : public unit::ScheduleTest {
protected:
    // A composed value of this kind.
    static Json::Value Value(int dateType) {
        Json::Value value;
        value["schedule"]["date_type"] = dateType;
        return value;
    }

    int Save(const Json::Value& value, int earlierError = 2600) {
        Step step;
        step.handler.error = earlierError;
        const int result = step.handler.SetUpdatePeriod(value);
        error = step.handler.error;
        return result;
    }

    int error = 0;
};

TEST_F(ScheduleSteps, SaveAnswers0ForATaskThatWasSaved) {
    EXPECT_EQ(Save(Value(0)), 0);
    EXPECT_EQ(error, 2600);
    EXPECT_EQ(state.scheduledTasks.size(), 1U);
}

TEST_F(ScheduleSteps, SaveAnswersMinus1And2617ForEveryStepThatFails) {
    const std::vector<std::pair<const char*, Fault>> failures = {
        {"VORNSchedTaskAlloc", Fault::Null()},           {"VORNSchedTaskListGet", Fault::Result(-1)},
        {"VORNSchedTaskLoad", Fault::Result(-1)},        {"VORNSchedTaskConvertFromJson_Schedule", Fault::False()},
        {"VORNSchedCTaskSetCommand", Fault::Result(-1)}, {"VORNSchedCTaskSetCommand", Fault::Result(1)},
        {"VORNSchedTaskSave", Fault::Result(-1)},
    };
    for (const auto& failure : failures) {
        Restart();
        appliance.FailNth(failure.first, 1, failure.second);
        EXPECT_EQ(Save(Value(0)), -1) << failure.first;
        EXPECT_EQ(error, 2617) << failure.first;
        EXPECT_THAT(state.scheduledTasks, IsEmpty());
    }
}

TEST_F(ScheduleSteps, SaveRemovesTheTaskForTheKindThatNeverRunsOnly) {
    for (const int dateType : {1, 3, -1, 0}) {
        Restart();
        AddTask(9);
        EXPECT_EQ(Save(Value(dateType)), 0);
        EXPECT_THAT(TaskIds(), ElementsAre(9)) << dateType;
        EXPECT_EQ(appliance.CountOf("VORNSchedTaskSave"), 1) << dateType;
    }
    EXPECT_EQ(Save(Value(2)), 0);
    EXPECT_THAT(TaskIds(), IsEmpty());
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskSave"), 1);
}

TEST_F(ScheduleSteps, SaveAnswers0WhateverBecomesOfTheRemoval) {
    AddTask(9);
    appliance.FailNth("VORNSchedTaskRemove", 1, Fault::Result(-1));
    EXPECT_EQ(Save(Value(2)), 0);
    EXPECT_EQ(error, 2617);
    appliance.FailNth("VORNSchedTaskListGet", 2, Fault::Result(-1));
    EXPECT_EQ(Save(Value(2)), 0);
    EXPECT_EQ(error, 2617);
}

TEST_F(ScheduleSteps, SaveRewritesTheTaskOfTheIdZeroWhateverWasRecordedBefore) {
    AddTask(0);
    EXPECT_EQ(Save(Value(0), 2618), 0);
    EXPECT_THAT(TaskIds(), ElementsAre(0));
    EXPECT_EQ(appliance.CountOf("VORNSchedTaskSave"), 1);
}

TEST_F(ScheduleSteps, SaveMakesNoSecondTaskWhateverWasRecordedBefore) {
    for (const int earlier : {117, 2600, 2624}) {
        Restart();
        appliance.FailNth("VORNSchedTaskListGet", 1, Fault::Result(-1));
        EXPECT_EQ(Save(Value(0), earlier), -1) << earlier;
        EXPECT_EQ(appliance.CountOf("VORNSchedTaskLoad"), 0) << earlier;
        EXPECT_EQ(appliance.CountOf("VORNSchedTaskSave"), 0) << earlier;
    }
}

TEST_F(ScheduleSteps, SaveKeepsAnEarlierError) {
    appliance.FailNth("VORNSchedTaskAlloc", 1, Fault::Null());
    EXPECT_EQ(Save(Value(0), 2618), -1);
    EXPECT_EQ(error, 2618);
}

TEST_F(ScheduleSteps, MembershipIsWhateverIsNotZero) {
    for (const int joined : {1, 2, -1}) {
        state.joinedFlag = joined;
        Step step;
        EXPECT_TRUE(step.handler.IsAllowSetSchedule()) << joined;
        EXPECT_EQ(step.handler.error, 2600);
    }
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    state.joinedFlag = 0;
    Step step;
    EXPECT_FALSE(step.handler.IsAllowSetSchedule());
    EXPECT_EQ(step.handler.error, 2624);
    EXPECT_THAT(appliance.Logs(), ElementsAre(Line("Domain not enable", "Domain not enable")));
}

TEST_F(ScheduleSteps, WholeSettingAnswersNothingByItself) {
    Step good(kOnWeekdays);
    EXPECT_TRUE(good.handler.SaveSchedule());
    EXPECT_EQ(good.handler.error, 2600);
    Step bad("{}");
    EXPECT_FALSE(bad.handler.SaveSchedule());
    EXPECT_EQ(bad.handler.error, 2618);
    state.joinedFlag = 0;
    Step outside(kNever);
    EXPECT_FALSE(outside.handler.SaveSchedule());
    EXPECT_EQ(outside.handler.error, 2624);
    EXPECT_THAT(appliance.Answers(), IsEmpty());
}

}  // namespace
