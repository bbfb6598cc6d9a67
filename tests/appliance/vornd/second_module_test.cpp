// The second module: users, groups, events, steps of a join, and the leave that removes the account.

#include <dlfcn.h>
#include <gmock/gmock.h>

#include <filesystem>

#include "appliance/base/paths.h"
#include "appliance/domain/directory/list_writer.h"
#include "appliance/domain/join/join_status.h"
#include "appliance/module/directory_api.h"
#include "appliance/module/event_api.h"
#include "appliance/module/leave_api.h"
#include "appliance/module/overview_api.h"
#include "appliance/platform/system/event_log.h"
#include "appliance/platform/webapi/exchange.h"
#include "appliance/vornd/module.h"
#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

namespace fs = std::filesystem;
using appliance::EntryKind;
using ::testing::HasSubstr;
using ::testing::Not;

using Method = Json::Value (*)(const appliance::Parameters&);

class SecondModuleTest : public ::testing::Test {
protected:
    SecondModuleTest() {
        appliance::SetRoot(tree_.root());
        for (const char* folder : {"/usr/vorn/etc/private/directory", "/run/vorn", "/var/lib/vorn"}) {
            fs::create_directories(tree_.At(folder));
        }
        Member();
    }
    ~SecondModuleTest() override {
        appliance::SetRoot("");
    }

    void Member() {
        tree_.Write("/usr/vorn/etc/smb.conf", "[global]\nworkgroup = LAB\nsecurity = ads\nrealm = LAB.TEST\n");
    }
    void NoMember() {
        tree_.Write("/usr/vorn/etc/smb.conf", "[global]\nworkgroup = WORKGROUP\nsecurity = user\n");
    }
    // The error code of a call; 0 for success, and then the data are in `data_`.
    int Call(Method method, const Json::Value& parameters = Json::Value(Json::objectValue)) {
        VORN::APIRequest request;
        VORN::APIResponse response;
        request.impl->parameters = parameters;
        appliance::Answer(request, response, method);
        EXPECT_TRUE(response.impl->answered);
        data_ = response.impl->data;
        return response.impl->success ? 0 : response.impl->code;
    }
    static void Publish(EntryKind kind, const std::string& domain, int count) {
        appliance::ListWriter writer(kind, domain);
        for (int index = 0; index < count; ++index) {
            const std::string name = "name" + std::to_string(1000 + index);
            writer.Add(name, index == 0 ? std::nullopt : std::optional<std::int64_t>(5000000000 + index),
                       "Shown " + name);
        }
        ASSERT_TRUE(writer.Publish("ldap", "dc1"));
    }
    // A join tool that keeps what it is told and answers so.
    void FakeTool(const std::string& answer) const {
        tree_.Write("/usr/vorn/sbin/vornjoin",
                    "#!/bin/sh\ncat > " + tree_.At("/tmp/told") + "\necho '" + answer + "'\n", 0755);
    }

    Tree tree_;
    Json::Value data_;
};

TEST_F(SecondModuleTest, PagesThroughTheUsersOfTheOwnDomain) {
    Publish(EntryKind::User, "LAB", 250);
    ASSERT_EQ(Call(appliance::Users), 0);
    EXPECT_EQ(data_["domain"], Json::Value("LAB"));
    EXPECT_EQ(data_["total"], Json::Value(250));
    EXPECT_EQ(data_["offset"], Json::Value(0));
    EXPECT_EQ(data_["entries"].size(), 100u);
    EXPECT_GT(data_["fetched"].asInt64(), 1700000000);
    EXPECT_EQ(data_["entries"][0], Object({{"name", "name1000"}, {"id", {}}, {"display", "Shown name1000"}}));
    EXPECT_EQ(data_["entries"][1]["id"], Json::Value(Json::Int64{5000000001}));
    ASSERT_EQ(Call(appliance::Users, Object({{"offset", 240}, {"limit", 1000}, {"domain", "lab"}})), 0);
    EXPECT_EQ(data_["entries"].size(), 10u);
    EXPECT_EQ(data_["offset"], Json::Value(240));
    ASSERT_EQ(Call(appliance::Users, Object({{"search", "AME1007"}})), 0);
    EXPECT_EQ(data_["total"], Json::Value(1));
}

TEST_F(SecondModuleTest, GroupsHaveAListOfTheirOwn) {
    Publish(EntryKind::User, "LAB", 3);
    Publish(EntryKind::Group, "LAB", 2);
    Publish(EntryKind::Group, "OTHER", 5);
    ASSERT_EQ(Call(appliance::Groups), 0);
    EXPECT_EQ(data_["total"], Json::Value(2));
    ASSERT_EQ(Call(appliance::Groups, Object({{"domain", "OTHER"}})), 0);
    EXPECT_EQ(data_["total"], Json::Value(5));
    ASSERT_EQ(Call(appliance::Domains), 0);
    ASSERT_EQ(data_["domains"].size(), 3u);
    EXPECT_EQ(data_["domains"][0]["kind"], Json::Value("user"));
    EXPECT_EQ(data_["domains"][2]["domain"], Json::Value("OTHER"));
    EXPECT_EQ(data_["domains"][2]["count"], Json::Value(5));
}

TEST_F(SecondModuleTest, AListThatWasNeverFetchedSaysSo) {
    ASSERT_EQ(Call(appliance::Users), 0);
    EXPECT_EQ(data_["total"], Json::Value(0));
    EXPECT_TRUE(data_["fetched"].isNull());
    EXPECT_EQ(data_["entries"], Json::Value(Json::arrayValue));
}

TEST_F(SecondModuleTest, WithoutADomainThereIsNoOwnOne) {
    NoMember();
    EXPECT_EQ(Call(appliance::Users), 2624);
    EXPECT_EQ(Call(appliance::Users, Object({{"domain", "LAB"}})), 0);
}

TEST_F(SecondModuleTest, ChecksParametersAndConvertsNone) {
    for (const Json::Value& wrong :
         {Object({{"offset", -1}}), Object({{"offset", "0"}}), Object({{"offset", 1.5}}), Object({{"offset", {}}}),
          Object({{"limit", 0}}), Object({{"limit", 1001}}), Object({{"limit", true}}), Object({{"search", 7}}),
          Object({{"search", "a\nb"}}), Object({{"search", std::string(257, 'x')}}), Object({{"domain", 7}}),
          Object({{"domain", ""}}), Object({{"domain", "../../etc/passwd"}}), Object({{"domain", "a/b"}})}) {
        EXPECT_EQ(Call(appliance::Users, wrong), 2618) << wrong;
    }
    EXPECT_EQ(Call(appliance::Events, Object({{"limit", "10"}})), 2618);
}

TEST_F(SecondModuleTest, ADamagedListIsASystemError) {
    tree_.Write("/usr/vorn/etc/private/directory/user_LAB.db", std::string(5000, 'x'));
    EXPECT_EQ(Call(appliance::Users), 2617);
}

TEST_F(SecondModuleTest, HandsOnStepsAndProgress) {
    ASSERT_EQ(Call(appliance::JoinSteps), 0);
    EXPECT_TRUE(data_.isNull());
    ASSERT_EQ(Call(appliance::RefreshProgress), 0);
    EXPECT_TRUE(data_.isNull());
    tree_.Write("/run/vorn/join_steps.json", R"({"action": "join", "steps": [{"name": "discover"}]})");
    tree_.Write("/run/vorn/refresh.json", R"({"kind": "user", "count": 7})");
    ASSERT_EQ(Call(appliance::JoinSteps), 0);
    EXPECT_EQ(data_["steps"][0]["name"], Json::Value("discover"));
    ASSERT_EQ(Call(appliance::RefreshProgress), 0);
    EXPECT_EQ(data_["count"], Json::Value(7));
    for (const std::string& text :
         {std::string("{"), std::string("[1]"), std::string("null"), std::string(100000, '[')}) {
        tree_.Write("/run/vorn/refresh.json", text);
        EXPECT_EQ(Call(appliance::RefreshProgress), 2617) << text.substr(0, 10);
    }
}

TEST_F(SecondModuleTest, ListsEventsNewestFirst) {
    ASSERT_EQ(Call(appliance::Events), 0);
    EXPECT_EQ(data_, Object({{"total", 0}, {"events", Json::Value(Json::arrayValue)}}));
    for (const char* name : {"first", "second", "third"}) {
        appliance::AddEvent(2, 1, 0x11800506, {name, "", "", ""});
    }
    ASSERT_EQ(Call(appliance::Events, Object({{"offset", 1}, {"limit", 1}})), 0);
    EXPECT_EQ(data_["total"], Json::Value(3));
    ASSERT_EQ(data_["events"].size(), 1u);
    EXPECT_THAT(data_["events"][0]["text"].asString(), HasSubstr("second"));
    EXPECT_EQ(data_["events"][0]["code"], Json::Value(0x11800506));
    EXPECT_EQ(data_["events"][0]["kind"], Json::Value(2));
    EXPECT_EQ(data_["events"][0]["level"], Json::Value(1));
    EXPECT_GT(data_["events"][0]["time"].asInt64(), 1700000000);
}

TEST_F(SecondModuleTest, LeaveTellsTheJoinTool) {
    FakeTool(R"({"success": true, "key": "", "message": ""})");
    ASSERT_EQ(
        Call(appliance::Leave, Object({{"delete_account", true}, {"username", "admin"}, {"password", "p\xC3\xA4ss"}})),
        0);
    EXPECT_TRUE(data_.isNull());
    const std::string told = tree_.Read("/tmp/told");
    EXPECT_THAT(told, HasSubstr("\"delete_account\":true"));
    EXPECT_THAT(told, HasSubstr("admin"));
    EXPECT_THAT(told, HasSubstr("p\xC3\xA4ss"));
    ASSERT_EQ(Call(appliance::Leave, Object({{"delete_account", false}, {"password", "unused"}})), 0);
    EXPECT_THAT(tree_.Read("/tmp/told"), Not(HasSubstr("unused")));
}

TEST_F(SecondModuleTest, LeaveChecksItsParametersFirst) {
    FakeTool(R"({"success": true, "key": "", "message": ""})");
    Json::Value good = Object({{"delete_account", true}, {"username", "admin"}, {"password", "secret"}});
    for (const auto& [name, value] : std::initializer_list<std::pair<const char*, Json::Value>>{{"delete_account", 1},
                                                                                                {"delete_account", {}},
                                                                                                {"username", 7},
                                                                                                {"username", ""},
                                                                                                {"username", "-x"},
                                                                                                {"username", "a\tb"},
                                                                                                {"password", ""},
                                                                                                {"password", 7},
                                                                                                {"password", "a\nb"}}) {
        Json::Value wrong = good;
        wrong[name] = value;
        EXPECT_EQ(Call(appliance::Leave, wrong), 2618) << wrong;
    }
    EXPECT_EQ(Call(appliance::Leave), 2618);
    EXPECT_EQ(Call(appliance::Leave, Object({{"delete_account", true}})), 2618);
    NoMember();
    EXPECT_EQ(Call(appliance::Leave, good), 2624);
    EXPECT_FALSE(fs::exists(tree_.At("/tmp/told")));
}

TEST_F(SecondModuleTest, LeaveAnswersWhyTheControllerRefuses) {
    namespace status = appliance::status;
    for (const auto& [message, code] :
         std::initializer_list<std::pair<const char*, int>>{{status::kSystem, 2617},
                                                            {status::kWrongPassword, 2607},
                                                            {status::kUnknownAccount, 2607},
                                                            {status::kRevoked, 2608},
                                                            {status::kDisabled, 2609},
                                                            {status::kWrongNameOrPassword, 2610},
                                                            {status::kNoRight, 2611},
                                                            {status::kExpired, 2612},
                                                            {"Could not connect to server DC1", 2614},
                                                            {status::kNoController, 2605},
                                                            {status::kPort445, 2606},
                                                            {"something else", 2615}}) {
        FakeTool(std::string(R"({"success": false, "key": "step", "message": ")") + message + "\"}");
        EXPECT_EQ(
            Call(appliance::Leave, Object({{"delete_account", true}, {"username", "admin"}, {"password", "secret"}})),
            code)
            << message;
    }
}

TEST(SecondModuleFileTest, LoadsBesideTheFirstAndExportsItsTableOnly) {
    std::string reason;
    const auto first = appliance::Module::Load(VORN_FIRST_MODULE, reason);
    EXPECT_TRUE(first) << reason;
    const auto second = appliance::Module::Load(VORN_SECOND_MODULE, reason);
    ASSERT_TRUE(second) << reason;
    EXPECT_EQ(second->entries().size(), 8u);
    EXPECT_EQ(second->FindTask("_ZN9appliance5UsersERKNS_10ParametersE"), nullptr);
    // Each answers its own table, though both have the same name.
    EXPECT_STREQ(first->entries()[0].api, "VORN.Core.Directory.Domain");
    EXPECT_STREQ(second->entries()[0].api, "VORN.Appliance.Directory");
}

}  // namespace
}  // namespace vornd_test
