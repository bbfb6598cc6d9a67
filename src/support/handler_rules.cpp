#include "src/support/handler_rules.h"

#include <json/writer.h>

#include "src/support/json_access.h"
#include "src/support/log.h"

namespace handler_rules {

namespace {

// What every check comes to; `value` is null when there is none.
bool Judge(const std::string& name, const Json::Value* value, bool required, TypeTest isType, const char* unit,
           std::int32_t& error) {
    if (value == nullptr && required) {
        syslog(LOG_ERR, "%s:%d cannot get the paramter: %s", unit, LOG_NUMBER(kHandlerRules), name.c_str());
        RecordError(error, kBadParameter);
        return false;
    }
    if (value != nullptr && !isType(*value)) {
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
    if (!request.HasParam(name)) {
        return Judge(name, nullptr, required, isType, unit, error);
    }
    const Json::Value value = request.GetParam(name, Json::Value());
    return Judge(name, &value, required, isType, unit, error);
}

bool CheckMember(const Json::Value& object, const std::string& key, bool required, TypeTest isType, const char* unit,
                 std::int32_t& error) {
    const Json::Value* value = HasMember(object, key) ? &object[key] : nullptr;
    return Judge(key, value, required, isType, unit, error);
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
