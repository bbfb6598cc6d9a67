// The parameters of the schedule's "set": which are needed, and how they are handed on.

#include <string>
#include <vector>

#include "tests/unit/schedule_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::FromJson;
using unit::kFromDate;
using unit::kNever;
using unit::kOnWeekdays;

class ScheduleParameters : public unit::ScheduleTest {
protected:
    void ExpectAccepted(const Json::Value& parameters) {
        Restart();
        Step step(parameters);
        EXPECT_TRUE(step.handler.CheckScheduleParam()) << parameters;
        EXPECT_EQ(step.handler.error, 2600);
        EXPECT_THAT(appliance.Logs(), IsEmpty());
    }

    // Refused with this line alone, and nothing was asked of the platform.
    void ExpectRefused(const Json::Value& parameters, const std::string& format, const std::string& message) {
        Restart();
        EXPECT_THAT(Call(DomainScheduleSet, parameters), FailsWith(2618)) << parameters;
        EXPECT_THAT(appliance.Logs(), ElementsAre(Line(format, message))) << parameters;
        EXPECT_THAT(appliance.CallTexts(fake::kBookkeeping | fake::kLogs), IsEmpty()) << parameters;
    }

    void ExpectMissing(const Json::Value& parameters, const std::string& name) {
        ExpectRefused(parameters, "cannot get the paramter: %s", "cannot get the paramter: " + name);
    }

    void ExpectWrong(const Json::Value& parameters, const std::string& name) {
        ExpectRefused(parameters, "wrong the paramter: %s", "wrong the paramter: " + name);
    }

    static Json::Value With(const std::string& json, const std::string& name, const Json::Value& value) {
        Json::Value parameters = FromJson(json);
        parameters[name] = value;
        return parameters;
    }

    static Json::Value Compose(const std::string& parameters) {
        Json::Value out;
        EXPECT_TRUE(Step(FromJson(parameters)).handler.ComposeScheduleValue(out));
        return out;
    }
};

struct Kind {
    const char* request;
    std::vector<std::string> needed;  // in the order in which they are checked
    std::vector<std::string> unused;
};

const std::vector<Kind> kKinds = {
    {kOnWeekdays, {"date_type", "hour", "min", "week_name"}, {"date", "repeat"}},
    {kFromDate, {"date_type", "hour", "min", "date", "repeat"}, {"week_name"}},
    {kNever, {"date_type"}, {"hour", "min", "week_name", "date", "repeat"}},
};

bool IsText(const std::string& name) {
    return name == "date" || name == "week_name";
}

// Values of a type that the parameter must not have.
std::vector<Json::Value> WrongValues(const std::string& name) {
    std::vector<Json::Value> values = {Json::Value(), true, 1.5, Json::Value(Json::arrayValue),
                                       Json::Value(Json::objectValue)};
    if (IsText(name)) {
        values.emplace_back(3);
    } else {
        values.emplace_back("3");
        values.emplace_back(Json::Value::Int64{99999999999});
    }
    return values;
}

TEST_F(ScheduleParameters, OfEachKindAreEnough) {
    for (const Kind& kind : kKinds) {
        ExpectAccepted(FromJson(kind.request));
    }
}

TEST_F(ScheduleParameters, ThatAKindNeedsHaveToBeThere) {
    for (const Kind& kind : kKinds) {
        for (const std::string& name : kind.needed) {
            Json::Value parameters = FromJson(kind.request);
            parameters.removeMember(name);
            ExpectMissing(parameters, name);
        }
    }
}

TEST_F(ScheduleParameters, ThatAKindNeedsHaveToBeOfTheRightType) {
    for (const Kind& kind : kKinds) {
        for (const std::string& name : kind.needed) {
            for (const Json::Value& value : WrongValues(name)) {
                ExpectWrong(With(kind.request, name, value), name);
            }
        }
    }
}

TEST_F(ScheduleParameters, AreCheckedInTheirOrder) {
    for (const Kind& kind : kKinds) {
        // From the first missing one on all are missing, and what is optional is wrong.
        for (std::size_t first = 1; first < kind.needed.size(); ++first) {
            Json::Value parameters = With(kind.request, "repeat_hour", "wrong");
            for (std::size_t at = first; at < kind.needed.size(); ++at) {
                parameters.removeMember(kind.needed[at]);
            }
            ExpectMissing(parameters, kind.needed[first]);
        }
    }
    ExpectMissing(FromJson(R"({"hour": "wrong", "repeat_hour": "wrong"})"), "date_type");
}

TEST_F(ScheduleParameters, ThatAKindDoesNotUseAreNotChecked) {
    for (const Kind& kind : kKinds) {
        for (const std::string& name : kind.unused) {
            for (const Json::Value& value : WrongValues(name)) {
                ExpectAccepted(With(kind.request, name, value));
            }
        }
    }
}

TEST_F(ScheduleParameters, ThatAreOptionalHaveToBeNumbersWhenTheyAreThere) {
    for (const Kind& kind : kKinds) {
        for (const char* name : {"repeat_hour", "last_work_hour"}) {
            ExpectAccepted(With(kind.request, name, 4));
            for (const Json::Value& value : WrongValues(name)) {
                ExpectWrong(With(kind.request, name, value), name);
            }
        }
        Json::Value both = With(kind.request, "last_work_hour", "wrong");
        both["repeat_hour"] = "wrong";
        ExpectWrong(both, "repeat_hour");
    }
}

TEST_F(ScheduleParameters, OfAnUnknownKindAreRefused) {
    for (const int kind : {-1, 3, 4, 10, 2147483647, -2147483647 - 1}) {
        Json::Value parameters = FromJson(R"({"hour": 3, "min": 30, "repeat_hour": "wrong"})");
        parameters["date_type"] = kind;
        ExpectRefused(parameters, "cannot get the paramter: date_type: %i",
                      "cannot get the paramter: date_type: " + std::to_string(kind));
    }
}

TEST_F(ScheduleParameters, OfAnUnknownKindNeedATimeFirst) {
    ExpectMissing(FromJson(R"({"date_type": 3, "min": 30})"), "hour");
    ExpectMissing(FromJson(R"({"date_type": 3, "hour": 3})"), "min");
    ExpectWrong(FromJson(R"({"date_type": -1, "hour": "3", "min": 30})"), "hour");
    ExpectWrong(FromJson(R"({"date_type": -1, "hour": 3, "min": "30"})"), "min");
}

TEST_F(ScheduleParameters, HaveNoLimits) {
    ExpectAccepted(FromJson(R"({"date_type": 0, "week_name": "", "hour": 25, "min": -1, "repeat_hour": -7,
                                "last_work_hour": 2147483647})"));
    ExpectAccepted(FromJson(R"({"date_type": 1, "date": "never", "repeat": -2147483648, "hour": 99, "min": 60})"));
}

TEST_F(ScheduleParameters, AreComposedWhole) {
    EXPECT_EQ(Compose(R"({"date_type": 1, "date": "2026/11/29", "hour": 3, "last_work_hour": 22, "min": 30, "repeat": 5,
                          "repeat_hour": 4, "week_name": "0,6", "other": 1})"),
              FromJson(R"({"schedule": {"date_type": 1, "date": "2026/11/29", "hour": 3, "last_work_hour": 22,
                                        "min": 30, "repeat": 5, "repeat_hour": 4, "week_name": "0,6"}})"));
}

TEST_F(ScheduleParameters, ThatAreMissingAreComposedAsZeroOrEmpty) {
    EXPECT_EQ(Compose(kNever), FromJson(R"({"schedule": {"date_type": 2, "date": "", "hour": 0, "last_work_hour": 0,
                                                         "min": 0, "repeat": 0, "repeat_hour": 0, "week_name": ""}})"));
}

TEST_F(ScheduleParameters, AreReadInThisOrder) {
    Compose(kOnWeekdays);
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre(
            R"(VORN::APIRequest::GetParam("date_type", null))", R"(VORN::APIRequest::GetParam("date", null))",
            R"(VORN::APIRequest::GetParam("hour", null))", R"(VORN::APIRequest::GetParam("last_work_hour", null))",
            R"(VORN::APIRequest::GetParam("min", null))", R"(VORN::APIRequest::GetParam("repeat", null))",
            R"(VORN::APIRequest::GetParam("repeat_hour", null))", R"(VORN::APIRequest::GetParam("week_name", null))"));
}

TEST_F(ScheduleParameters, ThatAreNotCheckedFollowTheLibrarysConversion) {
    EXPECT_EQ(Compose(R"({"date_type": 0, "date": 5, "week_name": true, "hour": 3.7, "min": true, "repeat": null})"),
              FromJson(R"({"schedule": {"date_type": 0, "date": "5", "hour": 3, "last_work_hour": 0, "min": 1,
                                        "repeat": 0, "repeat_hour": 0, "week_name": "true"}})"));
}

TEST_F(ScheduleParameters, ReplaceOnlyTheScheduleOfTheirTarget) {
    Json::Value out = FromJson(R"({"schedule": "old", "other": 1})");
    EXPECT_TRUE(Step(kNever).handler.ComposeScheduleValue(out));
    EXPECT_EQ(out["schedule"].size(), 8U);
    EXPECT_EQ(out["other"], 1);
    EXPECT_EQ(out.size(), 2U);
}

}  // namespace
