#include "appliance/vornd/router.h"

#include <charconv>
#include <chrono>
#include <exception>
#include <optional>
#include <utility>
#include <vector>

#include "appliance/base/log.h"
#include "appliance/base/text.h"
#include "appliance/platform/webapi/exchange.h"
#include "appliance/vornd/descriptions.h"
#include "appliance/web/json_text.h"

namespace appliance {
namespace {

constexpr std::string_view kRootPath = "/webapi";
constexpr std::string_view kOpenApiPath = "/webapi/openapi.json";
constexpr const char* kDescriptionsApi = "webapi";
constexpr std::int32_t kHighestVersion = 999999;

std::optional<std::int32_t> ParseVersion(std::string_view text) {
    std::int32_t version = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), version);
    if (error != std::errc() || end != text.data() + text.size() || version < 1 || version > kHighestVersion ||
        text.front() == '0') {
        return std::nullopt;
    }
    return version;
}

// application/json, with or without parameters.
bool IsJsonType(std::string_view type) {
    return EqualIgnoringCase(Trim(type.substr(0, type.find(';'))), "application/json");
}

std::string NameOf(const VORN::APIEntry& method) {
    return std::string(method.api) + "/" + std::to_string(method.version) + "/" + method.method;
}

}  // namespace

std::optional<ServerCode> ReadBody(const WebRequest& request, Json::Value& parameters) {
    const bool needsType = !request.body.empty() || request.hasContentType;
    if ((needsType && !IsJsonType(request.contentType)) || request.hasContentEncoding) {
        return ServerCode::WrongType;
    }
    return ReadParameters(request.body, parameters);
}

Router::Router(const MethodTable& methods, const Json::Value& descriptions, TaskHost taskHost)
    : methods_(methods),
      taskHost_(std::move(taskHost)),
      list_(SuccessBody(ListMethods(methods))),
      openApi_(WriteJson(OpenApiDocument(methods, descriptions))) {}

std::variant<Reply, Call> Router::Route(const WebRequest& request) const {
    const std::string_view target = request.target;
    const bool isList = target == kRootPath;
    if (isList || target == kOpenApiPath) {
        if (request.verb != "GET") {
            return ErrorReply(ServerCode::WrongVerb, "GET");
        }
        Reply reply;
        reply.body = isList ? list_ : openApi_;
        reply.api = kDescriptionsApi;
        reply.method = isList ? "list" : "openapi";
        return reply;
    }
    if (target.size() <= kRootPath.size() + 1 || !StartsWith(target, kRootPath) || target[kRootPath.size()] != '/') {
        return ErrorReply(ServerCode::NoSuchPage);
    }
    return RouteCall(target.substr(kRootPath.size() + 1), request);
}

std::variant<Reply, Call> Router::RouteCall(std::string_view path, const WebRequest& request) const {
    const std::vector<std::string> parts = Split(path, "/");
    if (parts.size() != 3) {
        return ErrorReply(ServerCode::NoSuchPage);
    }
    const std::optional<std::int32_t> version = ParseVersion(parts[1]);
    ServerCode code = ServerCode::NoSuchVersion;
    Call call;
    call.method = methods_.Find(parts[0], version.value_or(0), parts[2], code);
    if (call.method == nullptr) {
        return ErrorReply(code);
    }
    if (request.verb != "POST") {
        return ErrorReply(ServerCode::WrongVerb, "POST");
    }
    if (const std::optional<ServerCode> wrong = ReadBody(request, call.parameters)) {
        return ErrorReply(*wrong);
    }
    return call;
}

Reply Router::Execute(const Call& call) const {
    const auto begin = std::chrono::steady_clock::now();
    VORN::APIRequest request;
    VORN::APIResponse response;
    request.impl->parameters = call.parameters;
    request.impl->taskHost = &taskHost_;
    try {
        call.method->function(&request, &response);
    } catch (const std::exception& error) {
        Log(LOG_ERR, NameOf(*call.method) + ": an exception left the module: " + error.what());
        return ErrorReply(ServerCode::ModuleException);
    } catch (...) {
        Log(LOG_ERR, NameOf(*call.method) + ": an exception of unknown type left the module");
        return ErrorReply(ServerCode::ModuleException);
    }
    if (!response.impl->answered) {
        Log(LOG_ERR, NameOf(*call.method) + ": the module gave no answer");
        return ErrorReply(ServerCode::NoAnswer);
    }
    if (response.impl->success) {
        return SuccessReply(response.impl->data);
    }
    const auto took = std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() - begin);
    Log(LOG_NOTICE, NameOf(*call.method) + ": answered with error " + std::to_string(response.impl->code) + " after " +
                        std::to_string(took.count()) + " ms");
    return FailureReply(response.impl->code, response.impl->errors);
}

}  // namespace appliance
