#include "appliance/vornd/reply.h"

#include <utility>

#include "appliance/web/json_text.h"

namespace appliance {
namespace {

std::string FailureBody(int code, const Json::Value& errors) {
    Json::Value answer(Json::objectValue);
    answer["success"] = false;
    answer["error"]["code"] = code;
    answer["error"]["errors"] = errors;
    return WriteJson(answer);
}

}  // namespace

std::string SuccessBody(const Json::Value& data) {
    Json::Value answer(Json::objectValue);
    answer["success"] = true;
    answer["data"] = data;
    return WriteJson(answer);
}

Reply SuccessReply(const Json::Value& data) {
    Reply reply;
    reply.body = SuccessBody(data);
    return reply;
}

Reply FailureReply(int code, const Json::Value& errors) {
    Reply reply;
    reply.body = FailureBody(code, errors);
    reply.code = code;
    return reply;
}

Reply ErrorReply(ServerCode code, const char* allow) {
    Reply reply = FailureReply(static_cast<int>(code), Describe(code));
    reply.status = HttpStatus(code);
    reply.allow = allow;
    return reply;
}

}  // namespace appliance
