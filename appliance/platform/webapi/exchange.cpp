// Requests and responses.

#include "appliance/platform/webapi/exchange.h"

namespace VORN {

APIRequest::APIRequest() : impl(std::make_unique<Impl>()) {}

APIRequest::~APIRequest() = default;

bool APIRequest::HasParam(const std::string& name) const {
    return impl->parameters.isObject() && impl->parameters.isMember(name);
}

Json::Value APIRequest::GetParam(const std::string& name, const Json::Value& fallback) const {
    return HasParam(name) ? impl->parameters[name] : fallback;
}

APIResponse::APIResponse() : impl(std::make_unique<Impl>()) {}

APIResponse::~APIResponse() = default;

void APIResponse::SetSuccess(const Json::Value& data) {
    impl->data = data;
    impl->answered = true;
    impl->success = true;
    if (impl->published) {
        impl->published(impl->data);
    }
}

void APIResponse::SetError(int code, const Json::Value& errors) {
    impl->code = code;
    impl->errors = errors;
    impl->answered = true;
    impl->success = false;
}

}  // namespace VORN
