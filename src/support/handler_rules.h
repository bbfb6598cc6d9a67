// The rules that both handler classes follow: the first error wins, and parameters are checked, never converted.

#ifndef VORN_SRC_SUPPORT_HANDLER_RULES_H
#define VORN_SRC_SUPPORT_HANDLER_RULES_H

#include <json/value.h>

#include <cstdint>
#include <string>

#include "platform/webapi.h"

// Error codes with a meaning of their own in several places; docs/error-codes.md lists all of them.
constexpr std::int32_t kNoError = 2600;       // nothing recorded; sent when a failure has no code of its own
constexpr std::int32_t kSystemError = 2617;   // a resource is exhausted, or the platform failed
constexpr std::int32_t kBadParameter = 2618;  // a parameter is missing or of the wrong type
constexpr int kPollingError = 117;            // the background-task framework can't list or read its tasks

namespace handler_rules {

// A test of a JSON value's type.
using TypeTest = bool (*)(const Json::Value& value);

inline bool IsString(const Json::Value& value) {
    return value.isString();
}
inline bool IsInt(const Json::Value& value) {
    return value.isInt();
}
inline bool IsBool(const Json::Value& value) {
    return value.isBool();
}
inline bool IsArray(const Json::Value& value) {
    return value.isArray();
}

// Sets `error` to `code` unless a code was recorded before.
void RecordError(std::int32_t& error, std::int32_t code);

// True when the request's parameter passes: it is there or not required, and has the right type when it is there.
// Otherwise a line is logged under `unit` and kBadParameter recorded in `error`.
bool CheckParam(const VORN::APIRequest& request, const std::string& name, bool required, TypeTest isType,
                const char* unit, std::int32_t& error);

// The same for a member of a JSON object. A value that is no object has no members.
bool CheckMember(const Json::Value& object, const std::string& key, bool required, TypeTest isType, const char* unit,
                 std::int32_t& error);

// Logs a JSON value as one line under a title.
void ShowJson(const char* title, const Json::Value& value, const char* unit);

}  // namespace handler_rules

#endif
