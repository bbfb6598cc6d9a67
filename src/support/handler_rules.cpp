#include "src/support/handler_rules.h"

#include <json/writer.h>

#include "src/support/json_access.h"
#include "src/support/log.h"

namespace handler_rules {

namespace {

// The end that every check has in common; `value` is looked at only when it is there.
bool Judge(const std::string& name, bool present, bool required, bool rightType, const char* unit,
           std::int32_t& error) {
    if (!present && required) {
        syslog(LOG_ERR, "%s:%d cannot get the paramter: %s", unit, LOG_NUMBER(kHandlerRules), name.c_str());
        RecordError(error, kBadParameter);
        return false;
    }
    if (present && !rightType) {
        syslog(LOG_ERR, "%s:%d wrong the paramter: %s", unit, LOG_NUMBER(kHandlerRules), name.c_str());
        RecordError(error, kBadParameter);
        return false;
    }
    return true;
}

}  // namespace

void RecordError(std::int32_t& error, std::int32_t code) {
    if (error == kNoError) {
        error = code;
    }
}

bool CheckParam(const VORN::APIRequest& request, const std::string& name, bool required, TypeTest isType,
                const char* unit, std::int32_t& error) {
    const bool present = request.HasParam(name);
    const bool rightType = present && (request.GetParam(name, Json::Value()).*isType)();
    return Judge(name, present, required, rightType, unit, error);
}

bool CheckMember(const Json::Value& object, const std::string& key, bool required, TypeTest isType, const char* unit,
                 std::int32_t& error) {
    const bool present = HasMember(object, key);
    const bool rightType = present && (object[key].*isType)();
    return Judge(key, present, required, rightType, unit, error);
}

void ShowJson(const char* title, const Json::Value& value, const char* unit) {
// The writer's one-line form, final newline included, is what readers of the log know.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
    Json::FastWriter writer;
#pragma GCC diagnostic pop
    syslog(LOG_ERR, "%s:%d %s: %s", unit, LOG_NUMBER(kHandlerRules), title, writer.write(value).c_str());
}

}  // namespace handler_rules
