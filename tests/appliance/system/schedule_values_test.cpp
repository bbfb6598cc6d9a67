// Which values a schedule may have, through the scheduler's JSON form.

#include <json/reader.h>
#include <json/value.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "appliance/base/error_code.h"
#include "platform/core.h"
#include "platform/scheduler.h"
#include "tests/appliance/system/system_test.h"

namespace {

using Task = std::unique_ptr<_tag_vorn_sched_task_, decltype(&VORNSchedTaskFree)>;

Json::Value Parse(const std::string& text) {
    Json::Value value;
    std::string errors;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    EXPECT_TRUE(reader->parse(text.data(), text.data() + text.size(), &value, &errors)) << errors;
    return value;
}

Json::Value OnWeekdays() {
    return Parse(R"({"date_type": 0, "date": "", "hour": 3, "last_work_hour": 20, "min": 30, "repeat": 0,
                     "repeat_hour": 4, "week_name": "0,6"})");
}

Json::Value FromDate() {
    return Parse(R"({"date_type": 1, "date": "2026/11/29", "hour": 3, "last_work_hour": 20, "min": 30, "repeat": 1,
                     "repeat_hour": 4, "week_name": ""})");
}

Json::Value With(Json::Value schedule, const std::string& key, const Json::Value& value) {
    schedule[key] = value;
    return schedule;
}

Json::Value Without(Json::Value schedule, const std::string& key) {
    schedule.removeMember(key);
    return schedule;
}

class ScheduleValues : public ::testing::Test {
protected:
    bool Set(const Json::Value& schedule) {
        Json::Value value;
        value["schedule"] = schedule;
        return VORNSchedTaskConvertFromJson_Schedule(value, task.get());
    }

    Json::Value Get() {
        Json::Value value;
        return VORNSchedTaskConvertToJson_Schedule(task.get(), value) ? value["schedule"] : Json::Value();
    }

    // With the last error set and the record as it was.
    void ExpectRefused(const Json::Value& schedule) {
        SCOPED_TRACE(schedule.toStyledString());
        for (const Json::Value& before : {OnWeekdays(), FromDate()}) {
            ASSERT_TRUE(Set(before));
            VLIBCErrSetEx(0, "", 0);
            EXPECT_FALSE(Set(schedule));
            EXPECT_EQ(VLIBCErrGet(), static_cast<int>(appliance::ErrorCode::BadArgument));
            EXPECT_STREQ(VLIBCErrorGetFile(), "scheduler.cpp");
            EXPECT_GT(VLIBCErrorGetLine(), 0);
            EXPECT_EQ(Get(), before);
        }
        ++refused;
    }

    Task task{VORNSchedTaskAlloc(), VORNSchedTaskFree};
    int refused = 0;
};

TEST_F(ScheduleValues, ComeBackAsTheyWereSet) {
    std::vector<Json::Value> schedules = {OnWeekdays(), FromDate()};
    for (const char* week : {"0", "6", "6,0", "3,3,3", "0,1,2,3,4,5,6"}) {
        schedules.push_back(With(OnWeekdays(), "week_name", week));
    }
    for (const char* date : {"1970/1/1", "2028/2/29", "2000/02/29", "2026/01/05", "9999/12/31", "2026/1/05"}) {
        schedules.push_back(With(FromDate(), "date", date));
    }
    for (int repeat = 0; repeat <= 4; ++repeat) {
        schedules.push_back(With(FromDate(), "repeat", repeat));
    }
    for (int hour = 0; hour <= 20; ++hour) {
        schedules.push_back(With(FromDate(), "hour", hour));
    }
    for (int hour = 3; hour <= 23; ++hour) {
        schedules.push_back(With(OnWeekdays(), "last_work_hour", hour));
        schedules.push_back(With(OnWeekdays(), "repeat_hour", hour));
    }
    for (int minute = 0; minute <= 59; ++minute) {
        schedules.push_back(With(OnWeekdays(), "min", minute));
    }
    // A last hour means nothing without a repetition.
    schedules.push_back(With(With(FromDate(), "repeat_hour", 0), "last_work_hour", 0));
    // What the kind has no use for is kept.
    schedules.push_back(With(With(OnWeekdays(), "date", "2026/2/30"), "repeat", -7));
    schedules.push_back(With(OnWeekdays(), "date", " \"some\" text\\ "));
    schedules.push_back(With(FromDate(), "week_name", "8,9"));
    for (const Json::Value& schedule : schedules) {
        ASSERT_TRUE(Set(schedule)) << schedule.toStyledString();
        EXPECT_EQ(Get(), schedule);
        EXPECT_EQ(Get().size(), 8U);
    }
}

TEST_F(ScheduleValues, WithImpossibleNumbersAreRefused) {
    const std::vector<std::pair<std::string, std::vector<int>>> table = {
        {"date_type", {2, 3, -1, 99, 0x7FFFFFFF}},
        {"hour", {24, 25, 99, -1, -3, 21, 22, 23, 1000, -0x7FFFFFFF, 0x7FFFFFFF}},
        {"min", {60, 61, 99, -1, -30, 1000, 0x7FFFFFFF}},
        {"repeat_hour", {24, 25, 99, -1, -4, 0x7FFFFFFF}},
        {"last_work_hour", {24, 25, 99, -1, 0, 1, 2, 0x7FFFFFFF}},
    };
    for (const auto& [key, numbers] : table) {
        for (const int number : numbers) {
            ExpectRefused(With(OnWeekdays(), key, number));
            ExpectRefused(With(FromDate(), key, number));
        }
    }
    for (const int repeat : {5, 6, 9, 99, -1, -5, 0x7FFFFFFF}) {
        ExpectRefused(With(FromDate(), "repeat", repeat));
    }
    EXPECT_EQ(refused, 2 * 37 + 7);
}

TEST_F(ScheduleValues, WithImpossibleWeekNamesAreRefused) {
    std::vector<std::string> names = {"",    "x",     "7",    "8",   "9",   "-1",   "10",   "06",   "00",    ",",
                                      "0,",  ",0",    "0,,1", "0;1", "0 1", " 0",   "0 ",   "0, 1", "0,7",   "7,0",
                                      "1-5", "*",     "mon",  "Sun", "0.0", "+1",   "1,+2", "0x1",  "0\n",   "0\t",
                                      "\r0", "1\x7F", "0,x",  "x,0", "٣",   "0,1,", "0\\",  "'0'",  "\"0\"", "0/2"};
    names.emplace_back("0\0", 2);
    names.push_back("0" + std::string(300, ' '));
    std::string many = "0";
    while (many.size() <= 255) {
        many += ",0";
    }
    names.push_back(many);
    for (const std::string& name : names) {
        ExpectRefused(With(OnWeekdays(), "week_name", name));
    }
    EXPECT_EQ(refused, 43);
}

TEST_F(ScheduleValues, WithImpossibleDatesAreRefused) {
    std::vector<std::string> dates = {"",
                                      "x",
                                      "2026",
                                      "2026/11",
                                      "2026/11/29/1",
                                      "2026/11/",
                                      "/11/29",
                                      "2026//29",
                                      "2026-11-29",
                                      "29/11/2026",
                                      "11/29/2026",
                                      "26/11/29",
                                      "02026/11/29",
                                      "2026/011/29",
                                      "2026/11/029",
                                      "1969/12/31",
                                      "0000/1/1",
                                      "10000/1/1",
                                      "2026/13/1",
                                      "2026/0/1",
                                      "2026/1/0",
                                      "2026/11/31",
                                      "2026/2/30",
                                      "2026/02/30",
                                      "2026/2/29",
                                      "2100/2/29",
                                      "1900/2/28",
                                      "2026/99/99",
                                      "-2026/1/1",
                                      "2026/-1/1",
                                      "2026/1/-1",
                                      "+2026/1/1",
                                      " 2026/1/1",
                                      "2026/1/1 ",
                                      "2026/ 1/1",
                                      "2026/1/1\n",
                                      "2026\t/1/1",
                                      "2026/1/1x",
                                      "2026/1.0/1",
                                      "2026/Nov/29",
                                      "tomorrow",
                                      "2026/1/1\x7F",
                                      "٢٠٢٦/1/1",
                                      "2026\\1\\1",
                                      "2026.1.1",
                                      "2026/1/1/",
                                      "0x7EA/1/1",
                                      "1e3/1/1",
                                      "20261129"};
    dates.emplace_back("2026/1/1\0", 9);
    for (const char* month : {"4", "04", "6", "06", "9", "09", "11"}) {
        dates.push_back(std::string("2027/") + month + "/31");
    }
    for (int month = 1; month <= 12; ++month) {
        for (const char* day : {"0", "00", "32", "33", "40", "99", "100"}) {
            dates.push_back("2027/" + std::to_string(month) + "/" + day);
        }
    }
    for (const char* year : {"2025", "2026", "2027", "2029", "2100", "2200", "1999", "2030"}) {
        dates.push_back(std::string(year) + "/2/29");
        dates.push_back(std::string(year) + "/02/30");
    }
    for (const std::string& date : dates) {
        ExpectRefused(With(FromDate(), "date", date));
    }
    EXPECT_EQ(refused, 50 + 7 + 84 + 16);
}

TEST_F(ScheduleValues, OfTheWrongTypeOrMissingAreRefused) {
    const std::vector<Json::Value> wrong = {Json::Value(),
                                            Json::Value(true),
                                            Json::Value("3"),
                                            Json::Value(3.5),
                                            Json::Value(1e300),
                                            Json::Value(Json::Int64{1} << 40),
                                            Json::Value(Json::arrayValue),
                                            Json::Value(Json::objectValue)};
    for (const char* key : {"date_type", "hour", "min", "repeat", "repeat_hour", "last_work_hour"}) {
        for (const Json::Value& value : wrong) {
            ExpectRefused(With(FromDate(), key, value));
        }
    }
    for (const char* key : {"date", "week_name"}) {
        for (const Json::Value& value : {Json::Value(), Json::Value(0), Json::Value(true),
                                         Json::Value(Json::arrayValue), Json::Value(Json::objectValue)}) {
            ExpectRefused(With(FromDate(), key, value));
            ExpectRefused(With(OnWeekdays(), key, value));
        }
    }
    for (const char* key : {"date_type", "hour", "min"}) {
        ExpectRefused(Without(FromDate(), key));
        ExpectRefused(Without(OnWeekdays(), key));
    }
    ExpectRefused(Without(FromDate(), "date"));
    ExpectRefused(Without(OnWeekdays(), "week_name"));
    ExpectRefused(Without(OnWeekdays(), "last_work_hour"));
    for (const Json::Value& schedule : {Json::Value(), Json::Value(1), Json::Value("x"), Json::Value(Json::arrayValue),
                                        Json::Value(Json::objectValue)}) {
        ExpectRefused(schedule);
    }
    // Texts that the kind has no use for must still be fit for the file.
    ExpectRefused(With(OnWeekdays(), "date", "a\nhour=99"));
    ExpectRefused(With(FromDate(), "week_name", std::string(256, 'x')));
    EXPECT_EQ(refused, 48 + 20 + 6 + 3 + 5 + 2);
}

TEST_F(ScheduleValues, AbsentOnesThatTheKindHasNoUseForCountAsNone) {
    ASSERT_TRUE(Set(Parse(R"({"date_type": 0, "hour": 3, "min": 30, "week_name": "1"})")));
    EXPECT_EQ(Get(), Parse(R"({"date_type": 0, "date": "", "hour": 3, "last_work_hour": 0, "min": 30, "repeat": 0,
                               "repeat_hour": 0, "week_name": "1"})"));
}

TEST_F(ScheduleValues, AreReadFromTheMemberOfAnObjectOnly) {
    for (const Json::Value& value : {Json::Value(), Json::Value("schedule"), Json::Value(Json::arrayValue),
                                     Json::Value(Json::objectValue), OnWeekdays()}) {
        EXPECT_FALSE(VORNSchedTaskConvertFromJson_Schedule(value, task.get()));
    }
    EXPECT_FALSE(VORNSchedTaskConvertFromJson_Schedule(OnWeekdays(), nullptr));
}

TEST_F(ScheduleValues, OfANewRecordAreNone) {
    Json::Value value("as it was");
    EXPECT_FALSE(VORNSchedTaskConvertToJson_Schedule(task.get(), value));
    EXPECT_EQ(value, Json::Value("as it was"));
    EXPECT_FALSE(VORNSchedTaskConvertToJson_Schedule(nullptr, value));
}

TEST_F(ScheduleValues, LeaveOtherMembersOfTheObjectAlone) {
    ASSERT_TRUE(Set(OnWeekdays()));
    Json::Value value;
    value["other"] = 1;
    ASSERT_TRUE(VORNSchedTaskConvertToJson_Schedule(task.get(), value));
    EXPECT_EQ(value["other"], 1);
    EXPECT_EQ(value["schedule"], OnWeekdays());
}

}  // namespace
