#include "appliance/domain/join/join_request.h"

#include <json/json.h>

#include <memory>

namespace appliance {

namespace {

constexpr char kJoin[] = "join";
constexpr char kLeave[] = "leave";

bool TakeText(const Json::Value& object, const char* key, std::string& text, std::string& error) {
    const Json::Value& value = object[key];
    if (value.isNull()) {
        return true;
    }
    if (!value.isString()) {
        error = std::string("\"") + key + "\" is no text";
        return false;
    }
    text = value.asString();
    if (text.find('\0') != std::string::npos) {
        error = std::string("\"") + key + "\" holds a NUL";
        return false;
    }
    return true;
}

bool TakeFlag(const Json::Value& object, const char* key, bool& flag, std::string& error) {
    const Json::Value& value = object[key];
    if (!value.isNull() && !value.isBool()) {
        error = std::string("\"") + key + "\" is neither true nor false";
        return false;
    }
    flag = value.isBool() && value.asBool();
    return true;
}

}  // namespace

Secret FormatJoinRequest(const JoinRequest& request) {
    Json::Value object(Json::objectValue);
    object["action"] = request.action == JoinRequest::Action::Join ? kJoin : kLeave;
    object["domain"] = request.domain;
    object["username"] = request.credentials.user;
    object["kdc"] = request.controller;
    object["fqdn"] = request.realm;
    object["netbios_name"] = request.netbiosName;
    object["delete_account"] = request.deleteAccount;
    object["reset_options"] = request.resetOptions;
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    std::string text = Json::writeString(builder, object) + "\n";
    const std::size_t plain = text.size();
    text.reserve(plain + request.credentials.password.view().size());
    text += request.credentials.password.view();
    Secret secret(text);
    explicit_bzero(text.data() + plain, text.size() - plain);
    return secret;
}

bool ParseJoinRequest(std::string_view text, JoinRequest& request, std::string& error) {
    const std::size_t end = text.find('\n');
    if (end == std::string_view::npos) {
        error = "it has no complete first line";
        return false;
    }
    Json::Value object;
    Json::CharReaderBuilder builder;
    builder["failIfExtra"] = true;
    builder["rejectDupKeys"] = true;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    std::string complaint;
    bool parsed = false;
    try {
        parsed = reader->parse(text.data(), text.data() + end, &object, &complaint);
    } catch (const Json::Exception&) {
        parsed = false;
    }
    if (!parsed || !object.isObject() || !object["action"].isString()) {
        error = "its first line is no JSON object with an action";
        return false;
    }
    const std::string action = object["action"].asString();
    if (action != kJoin && action != kLeave) {
        error = "its action is neither join nor leave";
        return false;
    }
    request.action = action == kJoin ? JoinRequest::Action::Join : JoinRequest::Action::Leave;
    const std::string_view password = text.substr(end + 1);
    if (password.find('\0') != std::string_view::npos) {
        error = "the password holds a NUL";
        return false;
    }
    request.credentials.password = Secret(password);
    return TakeText(object, "domain", request.domain, error) &&
           TakeText(object, "username", request.credentials.user, error) &&
           TakeText(object, "kdc", request.controller, error) && TakeText(object, "fqdn", request.realm, error) &&
           TakeText(object, "netbios_name", request.netbiosName, error) &&
           TakeFlag(object, "delete_account", request.deleteAccount, error) &&
           TakeFlag(object, "reset_options", request.resetOptions, error);
}

}  // namespace appliance
