// Reading of JSON values that may have any shape.

#include "src/support/json_access.h"

#include <string>
#include <vector>

#include "tests/unit/module_test.h"

namespace {

using unit::FromJson;

TEST(JsonMember, IsThereInAnObjectThatHasIt) {
    EXPECT_TRUE(HasMember(FromJson(R"({"key": 1})"), "key"));
    EXPECT_TRUE(HasMember(FromJson(R"({"key": null})"), "key"));
    EXPECT_TRUE(HasMember(FromJson(R"({"": 1})"), ""));
    EXPECT_EQ(MemberOf(FromJson(R"({"key": [1, 2]})"), "key"), FromJson("[1, 2]"));
}

TEST(JsonMember, IsKnownByItsWholeKey) {
    const Json::Value object = FromJson(R"({"key": 1})");
    for (const char* key : {"", "ke", "keys", "Key", " key", "key "}) {
        EXPECT_FALSE(HasMember(object, key)) << key;
        EXPECT_TRUE(MemberOf(object, key).isNull()) << key;
    }
}

TEST(JsonMember, IsNullInWhatIsNoObject) {
    for (const char* text : {"null", "true", "1", "1.5", R"("key")", "[]", R"(["key"])", R"([{"key": 1}])", "{}"}) {
        const Json::Value value = FromJson(text);
        EXPECT_FALSE(HasMember(value, "key")) << text;
        EXPECT_TRUE(MemberOf(value, "key").isNull()) << text;
    }
}

TEST(JsonMember, IsNotMadeByTheLook) {
    Json::Value value;
    MemberOf(value, "key");
    EXPECT_TRUE(value.isNull());
    value = Json::Value(Json::objectValue);
    MemberOf(value, "key");
    EXPECT_TRUE(value.empty());
}

TEST(JsonMember, IsTheObjectsOwnValueAndNoCopy) {
    const Json::Value object = FromJson(R"({"key": "value"})");
    EXPECT_EQ(&MemberOf(object, "key"), &object["key"]);
}

TEST(JsonTruth, IsWhatTheLibraryConvertsToTrue) {
    for (const char* text : {"true", "1", "-1", "1.5"}) {
        EXPECT_TRUE(IsTrue(FromJson(text))) << text;
    }
}

TEST(JsonTruth, IsNothingElseAndNothingThrows) {
    for (const char* text :
         {"false", "0", "0.0", "null", R"("")", R"("true")", R"("yes")", "[]", "[true]", "{}", R"({"a": true})"}) {
        EXPECT_FALSE(IsTrue(FromJson(text))) << text;
    }
}

}  // namespace
