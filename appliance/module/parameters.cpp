#include "appliance/module/parameters.h"

#include "appliance/base/log.h"
#include "appliance/base/sqlite.h"
#include "appliance/base/text.h"

namespace appliance {
namespace {

CallFailure Bad(const char* name, const std::string& why) {
    return {AnswerCode::BadParameter, std::string("parameter ") + name + " " + why};
}

void Fail(VORN::APIResponse& response, int code, const std::string& why) {
    Log(LOG_ERR, "error " + std::to_string(code) + ": " + why);
    response.SetError(code, Json::Value());
}

}  // namespace

std::int64_t Parameters::Integer(const char* name, std::int64_t lowest, std::int64_t highest,
                                 std::int64_t fallback) const {
    if (!request_.HasParam(name)) {
        return fallback;
    }
    const Json::Value value = request_.GetParam(name, Json::Value());
    if ((value.type() != Json::intValue && value.type() != Json::uintValue) || !value.isInt64()) {
        throw Bad(name, "is no whole number");
    }
    const std::int64_t number = value.asInt64();
    if (number < lowest || number > highest) {
        throw Bad(name, "is not within " + std::to_string(lowest) + " to " + std::to_string(highest));
    }
    return number;
}

std::optional<std::string> Parameters::Text(const char* name, std::size_t longest) const {
    if (!request_.HasParam(name)) {
        return std::nullopt;
    }
    const Json::Value value = request_.GetParam(name, Json::Value());
    if (!value.isString()) {
        throw Bad(name, "is no text");
    }
    std::string text = value.asString();
    if (text.size() > longest || HasControlBytes(text)) {
        throw Bad(name, "is longer than " + std::to_string(longest) + " bytes, or holds a control byte");
    }
    return text;
}

bool Parameters::RequiredBool(const char* name) const {
    const Json::Value value = request_.GetParam(name, Json::Value());
    if (!value.isBool()) {
        throw Bad(name, "is missing or neither true nor false");
    }
    return value.asBool();
}

void Answer(const VORN::APIRequest& request, VORN::APIResponse& response,
            Json::Value (*method)(const Parameters& parameters)) {
    try {
        response.SetSuccess(method(Parameters(request)));
    } catch (const CallFailure& failure) {
        Fail(response, failure.code(), failure.what());
    } catch (const SqliteError& error) {
        Fail(response, static_cast<int>(AnswerCode::SystemError), error.what());
    }
}

}  // namespace appliance
