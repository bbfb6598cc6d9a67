// "update_status": what a client learns of a task.

#include "tests/unit/update_fixture.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::FromJson;
using unit::Logs;
using unit::Succeeds;

class UpdateStatus : public unit::UpdateTest {
protected:
    fake::Answer Ask(const std::string& parameters = R"({"task_id": "DomainUpdate1"})") {
        return Call(DomainUpdateStatus, FromJson(parameters));
    }
};

TEST_F(UpdateStatus, ShowsTheProgressOfATask) {
    AddTask("DomainUpdate1", R"({"finish": false, "success": true, "data": {"status": "updating"}})");
    EXPECT_THAT(Ask(), Succeeds(R"({"status": "updating"})"));
    state.tasks[0].record = FromJson(R"({"finish": true, "success": true, "data": {"status": "finish"}})");
    EXPECT_THAT(Ask(), Succeeds(R"({"status": "finish"})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(UpdateStatus, ReadsTheIdAndThenTheTask) {
    AddTask("DomainUpdate1", R"({"success": true, "data": {"status": "finish"}})");
    Ask();
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre("VORN::APIPolling::APIPolling(request)", R"(VORN::APIRequest::HasParam("task_id"))",
                    R"(VORN::APIRequest::GetParam("task_id", null))", R"(VORN::APIRequest::GetParam("task_id", ""))",
                    R"(VORN::APIPolling::Status("DomainUpdate1", status))",
                    R"(VORN::APIResponse::SetSuccess({"status":"finish"}))", "VORN::APIPolling::~APIPolling()"));
}

TEST_F(UpdateStatus, PassesTheDataOnAsItIs) {
    for (const char* data : {"null", "[]", "5", R"("x")", R"({"status": "other", "more": [1, {}]})"}) {
        state.tasks.clear();
        AddTask("DomainUpdate1", std::string(R"({"success": true, "data": )") + data + "}");
        EXPECT_THAT(Ask(), Succeeds(data));
    }
    state.tasks.clear();
    AddTask("DomainUpdate1", R"({"success": true, "error": {"code": 2623}})");
    EXPECT_THAT(Ask(), Succeeds("null"));
}

TEST_F(UpdateStatus, Answers2618WithoutAnId) {
    AddTask("", R"({"success": true})");
    EXPECT_THAT(Ask("{}"), FailsWith(2618));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d cannot get the paramter: %s",
                                                   "cannot get the paramter: task_id")));
    EXPECT_EQ(appliance.CountOf("VORN::APIPolling::Status"), 0);
}

TEST_F(UpdateStatus, Answers2618ForAnIdThatIsNoString) {
    for (const char* id : {"1", "null", "true", "1.5", "[]", "{}"}) {
        Restart();
        EXPECT_THAT(Ask(std::string(R"({"task_id": )") + id + "}"), FailsWith(2618)) << id;
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d wrong the paramter: %s", "wrong the paramter: task_id")));
        EXPECT_EQ(appliance.CountOf("VORN::APIPolling::Status"), 0);
    }
}

TEST_F(UpdateStatus, AnUnknownIdAnswers117WithTheFrameworksCode) {
    AddTask("DomainUpdate1", R"({"success": true})");
    for (const int code : {1001, 0, -5}) {
        state.pollingError = code;
        EXPECT_THAT(Ask(R"({"task_id": "DomainUpdate2"})"), FailsWith(117, std::to_string(code)));
    }
    EXPECT_THAT(Ask(R"({"task_id": ""})"), FailsWith(117, "-5"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(UpdateStatus, AnUnreadableTaskAnswersAfterTheReadHasFailed) {
    AddTask("DomainUpdate1", R"({"success": true})");
    appliance.FailNth("VORN::APIPolling::Status", 1, fake::Fault::False());
    EXPECT_THAT(Ask(), FailsWith(117, "1001"));
    EXPECT_THAT(appliance.CallTexts(fake::kRequestReads),
                ElementsAre("VORN::APIPolling::APIPolling(request)",
                            R"(VORN::APIPolling::Status("DomainUpdate1", status))", "VORN::APIPolling::GetError()",
                            "VORN::APIResponse::SetError(117, 1001)", "VORN::APIPolling::~APIPolling()"));
}

TEST_F(UpdateStatus, AFailedTaskAnswersItsOwnCodeAndErrors) {
    for (const char* errors : {"null", R"({"why": ["x"]})", R"("text")", "[1]"}) {
        state.tasks.clear();
        AddTask("DomainUpdate1", std::string(R"({"finish": true, "success": false, "data": {"status": "updating"},
                                                 "error": {"code": 2623, "errors": )") +
                                     errors + "}}");
        EXPECT_THAT(Ask(), FailsWith(2623, errors));
    }
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_EQ(appliance.CountOf("VORN::APIPolling::GetError"), 0);
}

TEST_F(UpdateStatus, SuccessIsReadAsABool) {
    for (const char* success : {"false", "0", "null", R"("true")", "[true]", "{}"}) {
        state.tasks.clear();
        AddTask("DomainUpdate1", std::string(R"({"success": )") + success + R"(, "error": {"code": 7}, "data": 1})");
        EXPECT_THAT(Ask(), FailsWith(7)) << success;
    }
    for (const char* success : {"true", "1", "-1"}) {
        state.tasks.clear();
        AddTask("DomainUpdate1", std::string(R"({"success": )") + success + R"(, "error": {"code": 7}, "data": 1})");
        EXPECT_THAT(Ask(), Succeeds("1")) << success;
    }
}

TEST_F(UpdateStatus, WhatARecordLacksCountsAsNull) {
    for (const char* record : {"{}", R"({"success": false})", R"({"error": 5})", R"({"error": "x"})",
                               R"({"error": {"code": null}})", "null", "true", R"("x")", R"(["success"])"}) {
        state.tasks.clear();
        AddTask("DomainUpdate1", record);
        EXPECT_THAT(Ask(), FailsWith(0)) << record;
    }
}

TEST_F(UpdateStatus, ACodeThatIsNoNumberGoesToTheCallerAsTheException) {
    AddTask("DomainUpdate1", R"({"success": false, "error": {"code": "2623"}})");
    EXPECT_THROW(CallFreely(DomainUpdateStatus, R"({"task_id": "DomainUpdate1"})"), Json::LogicError);
    EXPECT_THAT(appliance.Answers(), IsEmpty());
}

}  // namespace
