// The files that a join leaves for others: its status, its steps, its request and its result.

#include "appliance/domain/join/join_status.h"

#include <json/json.h>
#include <sys/stat.h>

#include <sstream>

#include "appliance/base/paths.h"
#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/launcher.h"
#include "appliance/domain/join/step_log.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::JoinRequest;
using appliance::JoinStatus;
using join_test::JoinTest;
using testing::HasSubstr;
using testing::Not;

using StatusFile = JoinTest;
using StepsFile = JoinTest;

TEST_F(StatusFile, IsReadBackAsItWasWritten) {
    ASSERT_FALSE(appliance::WriteJoinStatus({"credentials", "The account was disabled."}));
    JoinStatus status;
    ASSERT_FALSE(appliance::ReadJoinStatus(status));
    EXPECT_EQ(status.key, "credentials");
    EXPECT_EQ(status.message, "The account was disabled.");
    struct stat file {};
    ASSERT_EQ(stat(At(appliance::kJoinStatus).c_str(), &file), 0);
    EXPECT_EQ(file.st_mode & 0777, 0600U);
}

TEST_F(StatusFile, HoldsOneShortLine) {
    ASSERT_FALSE(appliance::WriteJoinStatus({std::string(40, 'k'), "a\nb\tc\x01" + std::string(600, 'x')}));
    JoinStatus status;
    ASSERT_FALSE(appliance::ReadJoinStatus(status));
    EXPECT_EQ(status.key, std::string(23, 'k'));
    EXPECT_EQ(status.message.size(), 511U);
    EXPECT_EQ(status.message.substr(0, 7), "a b c x");
}

TEST_F(StatusFile, IsNeverCutWithinACharacter) {
    const JoinStatus status = appliance::CleanStatus({"key", std::string(510, 'x') + "\xC3\xA4"});
    EXPECT_EQ(status.message, std::string(510, 'x'));
}

TEST_F(StatusFile, MissingOrDamagedIsAFailure) {
    JoinStatus status;
    EXPECT_EQ(appliance::ReadJoinStatus(status), std::errc::no_such_file_or_directory);
    Put(appliance::kJoinStatus, "no tab in it\n");
    EXPECT_TRUE(appliance::ReadJoinStatus(status));
}

Json::Value Steps(const std::string& text) {
    Json::Value record;
    std::istringstream(text) >> record;
    return record;
}

TEST_F(StepsFile, ShowsEachStepWhileItRuns) {
    appliance::StepLog steps("join", "lab.test");
    steps.Begin("discover");
    Json::Value record = Steps(Content(appliance::kJoinSteps));
    EXPECT_EQ(record["action"], "join");
    EXPECT_EQ(record["domain"], "lab.test");
    EXPECT_TRUE(record["finished"].isNull());
    EXPECT_TRUE(record["success"].isNull());
    EXPECT_EQ(record["steps"][0]["name"], "discover");
    EXPECT_EQ(record["steps"][0]["outcome"], "running");

    steps.Server("dc1.lab.test");
    steps.Ok("found");
    steps.Begin("join", "dc1.lab.test");
    steps.Failed("refused");
    steps.Leftover("the account NAS1$");
    steps.Finish(false, "ads_join_realm: Insufficient access");
    record = Steps(Content(appliance::kJoinSteps));
    EXPECT_EQ(record["steps"][0]["outcome"], "ok");
    EXPECT_EQ(record["steps"][0]["server"], "dc1.lab.test");
    EXPECT_EQ(record["steps"][0]["detail"], "found");
    EXPECT_TRUE(record["steps"][0]["milliseconds"].isInt());
    EXPECT_EQ(record["steps"][1]["outcome"], "failed");
    EXPECT_EQ(record["leftovers"][0], "the account NAS1$");
    EXPECT_EQ(record["success"], false);
    EXPECT_EQ(record["message"], "ads_join_realm: Insufficient access");
    EXPECT_GE(record["finished"].asInt64(), record["started"].asInt64());
    EXPECT_EQ(steps.FailedStep(), "join");
    struct stat file {};
    ASSERT_EQ(stat(At(appliance::kJoinSteps).c_str(), &file), 0);
    EXPECT_EQ(file.st_mode & 0777, 0600U);
}

TEST(Request, ComesThroughThePipeAsItWasGiven) {
    JoinRequest request;
    request.domain = "lab.test";
    request.credentials = {"Administrator", appliance::Secret("p\"w\n\xFF\\ end ")};
    request.controller = "10.0.0.1";
    request.realm = "LAB.TEST";
    request.netbiosName = "LAB";
    request.deleteAccount = true;
    const appliance::Secret text = appliance::FormatJoinRequest(request);
    JoinRequest read;
    std::string error;
    ASSERT_TRUE(appliance::ParseJoinRequest(text.view(), read, error)) << error;
    EXPECT_EQ(read.action, JoinRequest::Action::Join);
    EXPECT_EQ(read.domain, "lab.test");
    EXPECT_EQ(read.credentials.user, "Administrator");
    EXPECT_EQ(read.credentials.password.view(), "p\"w\n\xFF\\ end ");
    EXPECT_EQ(read.controller, "10.0.0.1");
    EXPECT_EQ(read.realm, "LAB.TEST");
    EXPECT_EQ(read.netbiosName, "LAB");
    EXPECT_TRUE(read.deleteAccount);
    EXPECT_FALSE(read.resetOptions);
}

TEST(Request, ThatIsNoneIsRefusedWithoutItsSecret) {
    for (const char* text : {"", "{\"action\":\"join\"}", "{}\nsecret", "[]\nsecret", "{\"action\":\"dance\"}\nsecret",
                             "{\"action\":\"join\",\"domain\":5}\nsecret", "{\"action\":5}\nsecret",
                             "{\"action\":\"join\",\"delete_account\":\"yes\"}\nsecret", "nonsense\nsecret",
                             "{\"action\":\"join\",\"domain\":\"a\\u0000b\"}\nsecret"}) {
        JoinRequest request;
        std::string error;
        EXPECT_FALSE(appliance::ParseJoinRequest(text, request, error)) << text;
        EXPECT_NE(error, "") << text;
        EXPECT_THAT(error, Not(HasSubstr("secret")));
        EXPECT_THAT(error, Not(HasSubstr("\n")));
    }
}

TEST(Result, IsReadBack) {
    appliance::JobResult result;
    EXPECT_TRUE(
        appliance::ParseJobResult(appliance::FormatJobResult({false, {"join", "Invalid workgroup name."}}), result));
    EXPECT_FALSE(result.success);
    EXPECT_EQ(result.status.key, "join");
    EXPECT_EQ(result.status.message, "Invalid workgroup name.");
    EXPECT_TRUE(appliance::ParseJobResult(appliance::FormatJobResult({true, {}}), result));
    EXPECT_TRUE(result.success);
    EXPECT_FALSE(appliance::ParseJobResult("", result));
    EXPECT_FALSE(appliance::ParseJobResult("{\"success\":1,\"key\":\"\",\"message\":\"\"}", result));
    EXPECT_FALSE(appliance::ParseJobResult("[true]", result));
}

}  // namespace
