// Reading of JSON values that may have any shape.

#ifndef VORN_SRC_SUPPORT_JSON_ACCESS_H
#define VORN_SRC_SUPPORT_JSON_ACCESS_H

#include <json/value.h>

#include <string>

// Whether `value` is an object with this member. (Json::Value::isMember throws on what is neither object nor null.)
inline bool HasMember(const Json::Value& value, const std::string& key) {
    return value.isObject() && value.isMember(key);
}

// The member of an object; null for a missing member and for a value that is no object.
inline const Json::Value& MemberOf(const Json::Value& value, const std::string& key) {
    return HasMember(value, key) ? value[key] : Json::Value::nullSingleton();
}

// The value as a bool; what can't be read as one is false.
inline bool IsTrue(const Json::Value& value) {
    return value.isConvertibleTo(Json::booleanValue) && value.asBool();
}

#endif
