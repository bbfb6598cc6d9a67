// Reading answers of any shape.

#include <json/reader.h>

#include <memory>

#include "appliance/tools/vornctl/client.h"

namespace appliance::ctl {

bool ParseJson(std::string_view text, Json::Value& value) {
    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    builder["strictRoot"] = false;
    builder["stackLimit"] = 64;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    try {
        return reader->parse(text.data(), text.data() + text.size(), &value, nullptr);
    } catch (const Json::Exception&) {
        return false;  // nested too deep
    }
}

const Json::Value& MemberOf(const Json::Value& object, const char* key) {
    return object.isObject() ? object[key] : Json::Value::nullSingleton();
}

std::string TextOf(const Json::Value& object, const char* key) {
    const Json::Value& value = MemberOf(object, key);
    return value.isString() ? value.asString() : std::string();
}

Json::Int64 NumberOf(const Json::Value& object, const char* key) {
    const Json::Value& value = MemberOf(object, key);
    return value.isInt64() ? value.asInt64() : 0;
}

const Json::Value& ListOf(const Json::Value& object, const char* key) {
    static const Json::Value kEmpty(Json::arrayValue);
    const Json::Value& value = MemberOf(object, key);
    return value.isArray() ? value : kEmpty;
}

bool FlagOf(const Json::Value& object, const char* key) {
    const Json::Value& value = MemberOf(object, key);
    return value.isBool() && value.asBool();
}

}  // namespace appliance::ctl
