// The JSON text of a request's body.

#include "appliance/web/json_text.h"

#include <gtest/gtest.h>

namespace appliance {
namespace {

std::optional<ServerCode> Read(const std::string& text) {
    Json::Value parameters;
    return ReadParameters(text, parameters);
}

TEST(JsonTextTest, TakesEveryKindOfValue) {
    Json::Value parameters;
    const std::string text =
        " { \"a\" : [ 1 , -0.5e+3 , true , false , null , \"\\\"\\\\\\/\\b\\f\\n\\r\\t\\u00e9\\ud83d\\ude00\" ] , "
        "\"b\" : { } , \"\" : [ ] } \r\n";
    ASSERT_EQ(ReadParameters(text, parameters), std::nullopt);
    EXPECT_EQ(parameters["a"][1], Json::Value(-500.0));
    EXPECT_EQ(parameters["a"][5].asString(), "\"\\/\b\f\n\r\t\xC3\xA9\xF0\x9F\x98\x80");
    EXPECT_TRUE(parameters.isMember(""));
}

TEST(JsonTextTest, TakesAnEmptyTextForAnEmptyObject) {
    Json::Value parameters("before");
    ASSERT_EQ(ReadParameters("", parameters), std::nullopt);
    EXPECT_EQ(parameters, Json::Value(Json::objectValue));
}

TEST(JsonTextTest, RefusesWhatTheGrammarDoesNotHave) {
    for (const char* text : {"{",
                             "}",
                             "{]",
                             "{\"a\"}",
                             "{\"a\":}",
                             "{\"a\":1,}",
                             "{,}",
                             "{\"a\":1 \"b\":2}",
                             "{a:1}",
                             "{'a':1}",
                             "{\"a\":[1,]}",
                             "{\"a\":01}",
                             "{\"a\":1.}",
                             "{\"a\":.5}",
                             "{\"a\":+1}",
                             "{\"a\":1e}",
                             "{\"a\":-}",
                             "{\"a\":0x1}",
                             "{\"a\":NaN}",
                             "{\"a\":Infinity}",
                             "{\"a\":nul}",
                             "{\"a\":True}",
                             "{}{}",
                             "{} 1",
                             "/* x */{}",
                             "{}// x",
                             " ",
                             "{\"a\":\"b}",
                             "{\"a\":\"\\x41\"}",
                             "{\"a\":\"\\u12g4\"}",
                             "{\"a\":\"\\",
                             "{\"a\":\"\n\"}",
                             "{\"a\":\"\x1F\"}",
                             "\xEF\xBB\xBF{}",
                             "{\"a\":1e999}",
                             "{\"a\":\"\\ud83d\"}",
                             "{\"a\":\"\\ude00\"}",
                             "{\"a\":\"\\ud83d\\u0041\"}"}) {
        EXPECT_EQ(Read(text), ServerCode::BadJson) << text;
    }
    EXPECT_EQ(Read(std::string("{}\0", 3)), ServerCode::BadJson);
    EXPECT_EQ(Read(std::string("{\"a\":\"\0\"}", 9)), ServerCode::BadJson);
}

TEST(JsonTextTest, RefusesWhatIsNoUtf8) {
    for (const char* bytes :
         {"\x80", "\xC3", "\xC3(", "\xC0\xAF", "\xC1\xBF", "\xE0\x80\xAF", "\xED\xA0\x80", "\xED\xBF\xBF",
          "\xF0\x80\x80\xAF", "\xF4\x90\x80\x80", "\xF5\x80\x80\x80", "\xFF", "\xE2\x82"}) {
        EXPECT_EQ(Read("{\"a\":\"" + std::string(bytes) + "\"}"), ServerCode::BadJson);
    }
    for (const char* bytes : {"\xC2\x80", "\xDF\xBF", "\xE0\xA0\x80", "\xED\x9F\xBF", "\xEE\x80\x80", "\xEF\xBF\xBF",
                              "\xF0\x90\x80\x80", "\xF4\x8F\xBF\xBF"}) {
        EXPECT_EQ(Read("{\"a\":\"" + std::string(bytes) + "\"}"), std::nullopt);
    }
}

TEST(JsonTextTest, TakesTenLevelsAndNoMore) {
    const auto nested = [](int levels) {
        const auto brackets = static_cast<std::size_t>(levels - 1);
        return "{\"a\":" + std::string(brackets, '[') + std::string(brackets, ']') + "}";
    };
    EXPECT_EQ(Read(nested(10)), std::nullopt);
    EXPECT_EQ(Read(nested(11)), ServerCode::JsonTooDeep);
    EXPECT_EQ(Read("{\"a\":" + std::string(60000, '[')), ServerCode::JsonTooDeep);
    EXPECT_EQ(Read("{\"a\":\"[[[[[[[[[[[[[[[[\"}"), std::nullopt);
}

TEST(JsonTextTest, RefusesAKeyThatStandsTwice) {
    EXPECT_EQ(Read(R"({"a":1,"b":2,"a":1})"), ServerCode::DuplicateKey);
    EXPECT_EQ(Read(R"({"a":1,"\u0061":1})"), ServerCode::DuplicateKey);
    EXPECT_EQ(Read(R"({"x":[{"a":1,"a":2}]})"), ServerCode::DuplicateKey);
    EXPECT_EQ(Read(R"({"a":{"b":1},"b":{"a":1}})"), std::nullopt);
}

TEST(JsonTextTest, RefusesWhatIsNoObject) {
    for (const char* text : {"[]", "1", "\"a\"", "null", "true", "[{}]"}) {
        EXPECT_EQ(Read(text), ServerCode::NoObject) << text;
    }
}

TEST(JsonTextTest, WritesOneLineOfAscii) {
    Json::Value value(Json::objectValue);
    value["text"] = "a\n\xC3\xA9\xFF\x7F";
    value["\x7F"] = 1;
    const std::string text = WriteJson(value);
    EXPECT_EQ(text, R"({"text":"a\n\u00e9\ufffd\u007f","\u007f":1})");
    for (const char letter : text) {
        EXPECT_TRUE(letter >= ' ' && letter < '\x7F');
    }
}

}  // namespace
}  // namespace appliance
