// What both handler classes share: the first error wins, and parameters are checked, never converted.

#include "src/support/handler_rules.h"

#include <string>
#include <vector>

#include "src/domain.h"
#include "src/domain_schedule.h"
#include "tests/double/framework.h"
#include "tests/unit/module_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::FromJson;
using unit::Logs;

template <typename Handler>
constexpr const char* kUnit = nullptr;
template <>
constexpr const char* kUnit<DomainServiceHandler> = "domain.cpp";
template <>
constexpr const char* kUnit<DomainScheduleHandler> = "domain_schedule.cpp";

// The checks of request parameters, with values that have the right type and values that don't.
template <typename Handler>
struct ParamCheck {
    const char* name;
    bool (Handler::*check)(std::string, bool);
    std::vector<std::string> right;
    std::vector<std::string> wrong;
};

const std::vector<std::string> kTexts = {R"("LAB")", R"("")", R"("true")", R"("1")"};
const std::vector<std::string> kNoTexts = {"null", "true", "false", "0", "1", "1.5", "[]", R"(["LAB"])", "{}"};
const std::vector<std::string> kInts = {"0", "1", "-1", "2147483647", "-2147483648"};
const std::vector<std::string> kNoInts = {"null", "true",       "false",       R"("1")", R"("")", "1.5",
                                          "[]",   "2147483648", "-2147483649", "[1]",    "{}"};
const std::vector<std::string> kBools = {"true", "false"};
const std::vector<std::string> kNoBools = {"null", "0", "1", R"("true")", R"("")", "1.0", "[]", "[true]", "{}"};

template <typename Handler>
std::vector<ParamCheck<Handler>> ParamChecks() {
    return {{"string", &Handler::CHECK_PARAM_STRING, kTexts, kNoTexts},
            {"int", &Handler::CHECK_PARAM_INT, kInts, kNoInts},
            {"bool", &Handler::CHECK_PARAM_BOOL, kBools, kNoBools}};
}

template <typename Handler>
class HandlerRules : public unit::ModuleTest {};
using Handlers = ::testing::Types<DomainServiceHandler, DomainScheduleHandler>;
TYPED_TEST_SUITE(HandlerRules, Handlers);

TYPED_TEST(HandlerRules, AHandlerKeepsItsRequestAndResponseAndBeginsWithoutAnError) {
    fake::Exchange exchange;
    const TypeParam handler(&exchange.request, &exchange.response);
    EXPECT_EQ(handler.request, &exchange.request);
    EXPECT_EQ(handler.response, &exchange.response);
    EXPECT_EQ(handler.error, 2600);
    EXPECT_THAT(this->appliance.Calls(), IsEmpty());
}

TYPED_TEST(HandlerRules, TheFirstErrorWinsWhateverItsNumber) {
    fake::Exchange exchange;
    for (const int first : {117, 2599, 2601, -1}) {
        TypeParam handler(&exchange.request, &exchange.response);
        handler.SetError(first);
        handler.SetError(2617);
        EXPECT_EQ(handler.error, first);
    }
}

TYPED_TEST(HandlerRules, TheFirstErrorWins) {
    fake::Exchange exchange;
    TypeParam handler(&exchange.request, &exchange.response);
    handler.SetError(2617);
    EXPECT_EQ(handler.error, 2617);
    for (const int later : {2618, 2600, 2601, 2599, 0, -1}) {
        handler.SetError(later);
        EXPECT_EQ(handler.error, 2617) << later;
    }
    EXPECT_THAT(this->appliance.Calls(), IsEmpty());
}

TYPED_TEST(HandlerRules, AnyCodeIsRecordedAsTheFirst) {
    for (const int code : {2599, 2601, 2626, 117, 0, -1}) {
        fake::Exchange exchange;
        TypeParam handler(&exchange.request, &exchange.response);
        handler.SetError(code);
        EXPECT_EQ(handler.error, code);
    }
}

TYPED_TEST(HandlerRules, TheInitialCodeCountsAsNothingRecorded) {
    fake::Exchange exchange;
    TypeParam handler(&exchange.request, &exchange.response);
    handler.SetError(2600);
    handler.SetError(2617);
    EXPECT_EQ(handler.error, 2617);
}

TYPED_TEST(HandlerRules, ReportsTheRecordedCodeWithNullData) {
    fake::Exchange exchange;
    TypeParam handler(&exchange.request, &exchange.response);
    handler.SetError(2622);
    handler.ReportError();
    EXPECT_THAT(this->appliance.Answers(), ElementsAre(FailsWith(2622)));
    EXPECT_THAT(this->appliance.CallTexts(), ElementsAre("VORN::APIResponse::SetError(2622, null)"));
}

TYPED_TEST(HandlerRules, Reports2600WhenNothingWasRecorded) {
    fake::Exchange exchange;
    TypeParam handler(&exchange.request, &exchange.response);
    handler.ReportError();
    EXPECT_THAT(this->appliance.Answers(), ElementsAre(FailsWith(2600)));
}

TYPED_TEST(HandlerRules, ShowsAValueAsOneLineUnderItsTitle) {
    fake::Exchange exchange;
    TypeParam handler(&exchange.request, &exchange.response);
    handler.ShowJson("Shown", FromJson(R"({"b": [1, true, null], "a": "x y"})"));
    handler.ShowJson("%s%n", FromJson(R"("%d")"));
    handler.ShowJson("", Json::Value());
    EXPECT_THAT(this->appliance.Logs(),
                ElementsAre(Logs(kUnit<TypeParam>, "%s:%d %s: %s", "Shown: {\"a\":\"x y\",\"b\":[1,true,null]}\n"),
                            Logs(kUnit<TypeParam>, "%s:%d %s: %s", "%s%n: \"%d\"\n"),
                            Logs(kUnit<TypeParam>, "%s:%d %s: %s", ": null\n")));
    EXPECT_EQ(handler.error, 2600);
}

TYPED_TEST(HandlerRules, AParameterOfTheRightTypePasses) {
    for (const auto& check : ParamChecks<TypeParam>()) {
        for (const std::string& value : check.right) {
            for (const bool required : {true, false}) {
                fake::Exchange exchange(FromJson(R"({"asked": )" + value + "}"));
                TypeParam handler(&exchange.request, &exchange.response);
                EXPECT_TRUE((handler.*check.check)("asked", required)) << check.name << " " << value;
                EXPECT_EQ(handler.error, 2600) << check.name << " " << value;
            }
        }
    }
    EXPECT_THAT(this->appliance.Logs(), IsEmpty());
    EXPECT_THAT(this->appliance.Answers(), IsEmpty());
}

// Null is one of the wrong values: a parameter that is null is there.
TYPED_TEST(HandlerRules, AParameterOfAnotherTypeFails) {
    for (const auto& check : ParamChecks<TypeParam>()) {
        for (const std::string& value : check.wrong) {
            for (const bool required : {true, false}) {
                this->Restart();
                fake::Exchange exchange(FromJson(R"({"asked": )" + value + "}"));
                TypeParam handler(&exchange.request, &exchange.response);
                EXPECT_FALSE((handler.*check.check)("asked", required)) << check.name << " " << value;
                EXPECT_EQ(handler.error, 2618) << check.name << " " << value;
                EXPECT_THAT(this->appliance.Logs(), ElementsAre(Logs(kUnit<TypeParam>, "%s:%d wrong the paramter: %s",
                                                                     "wrong the paramter: asked")))
                    << check.name << " " << value;
                EXPECT_THAT(this->appliance.Answers(), IsEmpty());
            }
        }
    }
}

TYPED_TEST(HandlerRules, ARequiredParameterThatIsAbsentFails) {
    for (const auto& check : ParamChecks<TypeParam>()) {
        this->Restart();
        fake::Exchange exchange(FromJson(R"({"Asked": "LAB", "asked ": 1})"));
        TypeParam handler(&exchange.request, &exchange.response);
        EXPECT_FALSE((handler.*check.check)("asked", true)) << check.name;
        EXPECT_EQ(handler.error, 2618) << check.name;
        EXPECT_THAT(this->appliance.Logs(), ElementsAre(Logs(kUnit<TypeParam>, "%s:%d cannot get the paramter: %s",
                                                             "cannot get the paramter: asked")))
            << check.name;
        EXPECT_THAT(this->appliance.Answers(), IsEmpty());
    }
}

TYPED_TEST(HandlerRules, AnOptionalParameterThatIsAbsentPasses) {
    for (const auto& check : ParamChecks<TypeParam>()) {
        this->Restart();
        fake::Exchange exchange;
        TypeParam handler(&exchange.request, &exchange.response);
        EXPECT_TRUE((handler.*check.check)("asked", false)) << check.name;
        EXPECT_EQ(handler.error, 2600) << check.name;
        EXPECT_THAT(this->appliance.CallTexts(), ElementsAre(R"(VORN::APIRequest::HasParam("asked"))")) << check.name;
    }
}

TYPED_TEST(HandlerRules, AParameterIsReadWithNullAsFallbackAndNeverChanged) {
    for (const auto& check : ParamChecks<TypeParam>()) {
        this->Restart();
        const Json::Value parameters = FromJson(R"({"asked": 1.5, "other": "LAB"})");
        fake::Exchange exchange(parameters);
        TypeParam handler(&exchange.request, &exchange.response);
        (handler.*check.check)("asked", true);
        EXPECT_THAT(this->appliance.CallTexts(fake::kLogs), ElementsAre(R"(VORN::APIRequest::HasParam("asked"))",
                                                                        R"(VORN::APIRequest::GetParam("asked", null))"))
            << check.name;
        EXPECT_EQ(exchange.request.impl->parameters, parameters) << check.name;
    }
}

TYPED_TEST(HandlerRules, ACheckThatFailsKeepsAnEarlierCodeAndItsOwnIsKept) {
    for (const auto& check : ParamChecks<TypeParam>()) {
        fake::Exchange exchange(FromJson(R"({"wrong": {}})"));
        TypeParam early(&exchange.request, &exchange.response);
        early.SetError(2617);
        EXPECT_FALSE((early.*check.check)("absent", true)) << check.name;
        EXPECT_FALSE((early.*check.check)("wrong", true)) << check.name;
        EXPECT_EQ(early.error, 2617) << check.name;
        for (const char* parameter : {"absent", "wrong"}) {
            TypeParam late(&exchange.request, &exchange.response);
            EXPECT_FALSE((late.*check.check)(parameter, true)) << check.name;
            late.SetError(2617);
            EXPECT_EQ(late.error, 2618) << check.name;
        }
    }
}

TYPED_TEST(HandlerRules, TheNameOfAParameterIsNoFormat) {
    fake::Exchange exchange(FromJson(R"({"%s%n": 1})"));
    TypeParam handler(&exchange.request, &exchange.response);
    handler.CHECK_PARAM_STRING("%s%n", true);
    handler.CHECK_PARAM_STRING("%n%s", true);
    EXPECT_THAT(
        this->appliance.Logs(),
        ElementsAre(Logs(kUnit<TypeParam>, "%s:%d wrong the paramter: %s", "wrong the paramter: %s%n"),
                    Logs(kUnit<TypeParam>, "%s:%d cannot get the paramter: %s", "cannot get the paramter: %n%s")));
}

// The checks of members of an object, which one of the two classes has.
struct MemberCheck {
    const char* name;
    bool (DomainServiceHandler::*check)(const Json::Value&, std::string, bool);
    std::vector<std::string> right;
    std::vector<std::string> wrong;
};

std::vector<MemberCheck> MemberChecks() {
    return {{"string", &DomainServiceHandler::CHECK_JSON_STRING, kTexts, kNoTexts},
            {"int", &DomainServiceHandler::CHECK_JSON_INT, kInts, kNoInts},
            {"bool", &DomainServiceHandler::CHECK_JSON_BOOL, kBools, kNoBools},
            {"array",
             &DomainServiceHandler::CHECK_JSON_JSONARRAY,
             {"[]", R"(["eth0"])", "[1, {}]", "[null]"},
             {"true", "0", "1", "1.5", R"("all")", R"("[]")", "{}", R"({"0": "all"})"}}};
}

class MemberRules : public unit::ModuleTest {
protected:
    // Whether the check of `key` passes, with its handler's code in `error`.
    bool Passes(const MemberCheck& check, const Json::Value& object, bool required) {
        Restart();
        fake::Exchange exchange;
        DomainServiceHandler handler(&exchange.request, &exchange.response);
        const bool passed = (handler.*check.check)(object, "key", required);
        error = handler.error;
        EXPECT_THAT(appliance.CallTexts(fake::kLogs), IsEmpty()) << "the request is not looked at";
        return passed;
    }

    int error = 0;
};

TEST_F(MemberRules, AMemberOfTheRightTypePasses) {
    for (const MemberCheck& check : MemberChecks()) {
        for (const std::string& value : check.right) {
            for (const bool required : {true, false}) {
                EXPECT_TRUE(Passes(check, FromJson(R"({"key": )" + value + "}"), required)) << check.name << value;
                EXPECT_EQ(error, 2600) << check.name << value;
                EXPECT_THAT(appliance.Logs(), IsEmpty()) << check.name << value;
            }
        }
    }
}

TEST_F(MemberRules, AMemberOfAnotherTypeFails) {
    for (const MemberCheck& check : MemberChecks()) {
        for (const std::string& value : check.wrong) {
            for (const bool required : {true, false}) {
                EXPECT_FALSE(Passes(check, FromJson(R"({"key": )" + value + "}"), required)) << check.name << value;
                EXPECT_EQ(error, 2618) << check.name << value;
                EXPECT_THAT(appliance.Logs(),
                            ElementsAre(Logs("domain.cpp", "%s:%d wrong the paramter: %s", "wrong the paramter: key")))
                    << check.name << value;
            }
        }
    }
}

// A value that is no object has no members, whatever it is.
TEST_F(MemberRules, AMemberThatIsAbsentFailsOnlyWhenItIsRequired) {
    for (const MemberCheck& check : MemberChecks()) {
        for (const char* object : {"{}", R"({"Key": 1, "key ": "x"})", "null", "true", "0", "1.5", R"("key")", "[]",
                                   R"(["key"])", R"([{"key": 1}])"}) {
            const std::string place = std::string(check.name) + " in " + object;
            EXPECT_TRUE(Passes(check, FromJson(object), false)) << place;
            EXPECT_EQ(error, 2600) << place;
            EXPECT_THAT(appliance.Logs(), IsEmpty()) << place;
            EXPECT_FALSE(Passes(check, FromJson(object), true)) << place;
            EXPECT_EQ(error, 2618) << place;
            EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d cannot get the paramter: %s",
                                                           "cannot get the paramter: key")))
                << place;
        }
    }
}

TEST_F(MemberRules, AnEarlierCodeIsKept) {
    fake::Exchange exchange;
    for (const MemberCheck& check : MemberChecks()) {
        DomainServiceHandler handler(&exchange.request, &exchange.response);
        handler.SetError(2617);
        EXPECT_FALSE((handler.*check.check)(FromJson("{}"), "key", true)) << check.name;
        EXPECT_EQ(handler.error, 2617) << check.name;
    }
}

}  // namespace
