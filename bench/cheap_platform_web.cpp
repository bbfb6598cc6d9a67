// The cheap platform: the web-API framework and its string helpers. An answer is looked at for its code only. Where
// the framework hands a JSON value over, a copy can't be avoided; platform_calls.h measures it by itself.

#include "bench/cheap_platform.h"
#include "platform/webutils.h"

using cheap::TheState;

namespace VORN {

class APIRequest::Impl {
public:
    Json::Value params;
};

APIRequest::APIRequest() : impl(std::make_unique<Impl>()) {}

APIRequest::~APIRequest() = default;

bool APIRequest::HasParam(const std::string& name) const {
    NOTE_CALL("APIRequest::HasParam");
    return impl->params.isMember(name);
}

Json::Value APIRequest::GetParam(const std::string& name, const Json::Value& fallback) const {
    NOTE_CALL("APIRequest::GetParam");
    const Json::Value* found = impl->params.find(name.data(), name.data() + name.size());
    return found == nullptr ? fallback : *found;
}

class APIResponse::Impl {};

APIResponse::APIResponse() = default;

APIResponse::~APIResponse() = default;

void APIResponse::SetSuccess(const Json::Value& /*data*/) {
    NOTE_CALL("APIResponse::SetSuccess");
    TheState().lastCode = 0;
}

void APIResponse::SetError(int code, const Json::Value& /*errors*/) {
    NOTE_CALL("APIResponse::SetError");
    TheState().lastCode = code;
}

class APIPolling::Impl {};

APIPolling::APIPolling() {
    NOTE_CALL("APIPolling::APIPolling");
}

APIPolling::APIPolling(APIRequest* /*request*/) {
    NOTE_CALL("APIPolling::APIPolling");
}

APIPolling::~APIPolling() {
    NOTE_CALL("APIPolling::~APIPolling");
}

void APIPolling::SetRequest(APIRequest* /*request*/) {
    NOTE_CALL("APIPolling::SetRequest");
}

void APIPolling::SetGroupAttr(const std::string& /*group*/) {
    NOTE_CALL("APIPolling::SetGroupAttr");
}

void APIPolling::SetPrefixAttr(const std::string& /*prefix*/) {
    NOTE_CALL("APIPolling::SetPrefixAttr");
}

void APIPolling::SetRemoveAttr(bool /*remove*/) {
    NOTE_CALL("APIPolling::SetRemoveAttr");
}

bool APIPolling::Start(APIResponse* /*response*/, APITaskFunction /*body*/, void* /*userData*/) {
    NOTE_CALL("APIPolling::Start");
    TheState().lastCode = 0;
    return true;
}

bool APIPolling::List(const std::string& /*prefix*/, const Json::Value& /*groups*/, Json::Value& tasks) {
    NOTE_CALL("APIPolling::List");
    tasks = TheState().tasks;
    return true;
}

bool APIPolling::Status(const std::string& /*id*/, Json::Value& status) {
    NOTE_CALL("APIPolling::Status");
    status = TheState().taskStatus;
    return true;
}

bool APIPolling::Stop(const std::string& /*id*/, bool /*force*/) {
    NOTE_CALL("APIPolling::Stop");
    return true;
}

int APIPolling::GetError() const {
    NOTE_CALL("APIPolling::GetError");
    return 0;
}

}  // namespace VORN

namespace cheap {

void SetParams(VORN::APIRequest& request, const Json::Value& params) {
    request.impl->params = params;
}

}  // namespace cheap

namespace WebUtils {

std::vector<std::string> StringExplode(const std::string& text, const std::string& separator) {
    NOTE_CALL("WebUtils::StringExplode");
    std::vector<std::string> pieces;
    if (text.empty()) {
        return pieces;
    }
    std::size_t begin = 0;
    for (std::size_t end = text.find(separator); end != std::string::npos; end = text.find(separator, begin)) {
        pieces.push_back(text.substr(begin, end - begin));
        begin = end + separator.size();
    }
    pieces.push_back(text.substr(begin));
    return pieces;
}

std::string StringImplode(const std::vector<std::string>& pieces, const std::string& separator) {
    NOTE_CALL("WebUtils::StringImplode");
    std::string text;
    for (std::size_t i = 0; i < pieces.size(); ++i) {
        if (i > 0) {
            text += separator;
        }
        text += pieces[i];
    }
    return text;
}

}  // namespace WebUtils
