// Errors and checks of DomainServiceHandler.

#include "src/domain.h"
#include "src/support/log.h"

DomainServiceHandler::DomainServiceHandler(VORN::APIRequest* apiRequest, VORN::APIResponse* apiResponse)
    : request(apiRequest), response(apiResponse) {}

void DomainServiceHandler::SetError(int code) {
    handler_rules::RecordError(error, code);
}

void DomainServiceHandler::ReportError() {
    response->SetError(error, Json::Value());
}

void DomainServiceHandler::ShowJson(const char* title, const Json::Value& value) {
    handler_rules::ShowJson(title, value, kDomainUnit);
}

bool DomainServiceHandler::CHECK_PARAM_STRING(std::string name, bool required) {
    return handler_rules::CheckParam(*request, name, required, handler_rules::IsString, kDomainUnit, error);
}

bool DomainServiceHandler::CHECK_PARAM_INT(std::string name, bool required) {
    return handler_rules::CheckParam(*request, name, required, handler_rules::IsInt, kDomainUnit, error);
}

bool DomainServiceHandler::CHECK_PARAM_BOOL(std::string name, bool required) {
    return handler_rules::CheckParam(*request, name, required, handler_rules::IsBool, kDomainUnit, error);
}

bool DomainServiceHandler::CHECK_JSON_STRING(const Json::Value& object, std::string key, bool required) {
    return handler_rules::CheckMember(object, key, required, handler_rules::IsString, kDomainUnit, error);
}

bool DomainServiceHandler::CHECK_JSON_INT(const Json::Value& object, std::string key, bool required) {
    return handler_rules::CheckMember(object, key, required, handler_rules::IsInt, kDomainUnit, error);
}

bool DomainServiceHandler::CHECK_JSON_BOOL(const Json::Value& object, std::string key, bool required) {
    return handler_rules::CheckMember(object, key, required, handler_rules::IsBool, kDomainUnit, error);
}

bool DomainServiceHandler::CHECK_JSON_JSONARRAY(const Json::Value& object, std::string key, bool required) {
    return handler_rules::CheckMember(object, key, required, handler_rules::IsArray, kDomainUnit, error);
}
