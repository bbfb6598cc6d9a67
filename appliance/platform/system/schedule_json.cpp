#include "appliance/platform/system/schedule_json.h"

#include <utility>

namespace appliance {

namespace {

struct NumberValue {
    const char* name;
    int Schedule::*member;
    bool required;
};

constexpr NumberValue kNumbers[] = {
    {"date_type", &Schedule::dateType, true},
    {"hour", &Schedule::hour, true},
    {"last_work_hour", &Schedule::lastWorkHour, false},
    {"min", &Schedule::minute, true},
    {"repeat", &Schedule::repeat, false},
    {"repeat_hour", &Schedule::repeatHour, false},
};

struct TextValue {
    const char* name;
    std::string Schedule::*member;
};

constexpr TextValue kTexts[] = {{"date", &Schedule::date}, {"week_name", &Schedule::weekName}};

}  // namespace

std::string ScheduleFromJson(const Json::Value& object, Schedule& schedule) {
    if (!object.isObject()) {
        return "there is no schedule";
    }
    Schedule read;
    for (const NumberValue& number : kNumbers) {
        if (!object.isMember(number.name)) {
            if (number.required) {
                return std::string(number.name) + " is missing";
            }
            continue;
        }
        const Json::Value& value = object[number.name];
        if (!value.isInt()) {
            return std::string(number.name) + " is no whole number";
        }
        read.*number.member = value.asInt();
    }
    for (const TextValue& text : kTexts) {
        if (!object.isMember(text.name)) {
            continue;
        }
        const Json::Value& value = object[text.name];
        if (!value.isString()) {
            return std::string(text.name) + " is no text";
        }
        read.*text.member = value.asString();
    }
    std::string wrong = Impossible(read);
    if (wrong.empty()) {
        schedule = std::move(read);
    }
    return wrong;
}

Json::Value ScheduleToJson(const Schedule& schedule) {
    Json::Value object(Json::objectValue);
    for (const NumberValue& number : kNumbers) {
        object[number.name] = schedule.*number.member;
    }
    for (const TextValue& text : kTexts) {
        object[text.name] = schedule.*text.member;
    }
    return object;
}

}  // namespace appliance
