// Requests, responses, capabilities and settings, string helpers.

#include "tests/double/framework.h"

#include <utility>

#include "platform/settings.h"
#include "platform/webutils.h"
#include "tests/double/recording.h"

using fake::Compact;
using fake::Number;
using fake::Quoted;
using fake::Recording;
using fake::TheAppliance;

namespace fake {

Exchange::Exchange(const Json::Value& parameters) {
    request.impl->parameters = parameters;
}

}  // namespace fake

namespace VORN {

class APIResponse::Impl {};

APIRequest::APIRequest() : impl(std::make_unique<Impl>()) {}

APIRequest::~APIRequest() = default;

bool APIRequest::HasParam(const std::string& name) const {
    const Recording call("VORN::APIRequest::HasParam", {Quoted(name)});
    return impl->parameters.isObject() && impl->parameters.isMember(name);
}

Json::Value APIRequest::GetParam(const std::string& name, const Json::Value& fallback) const {
    const Recording call("VORN::APIRequest::GetParam", {Quoted(name), Compact(fallback)});
    const bool sent = impl->parameters.isObject() && impl->parameters.isMember(name);
    return sent ? impl->parameters[name] : fallback;
}

APIResponse::APIResponse() : impl(std::make_unique<Impl>()) {}

APIResponse::~APIResponse() = default;

void APIResponse::SetSuccess(const Json::Value& data) {
    const Recording call("VORN::APIResponse::SetSuccess", {Compact(data)});
    TheAppliance().RecordAnswer(true, 0, data);
}

void APIResponse::SetError(int code, const Json::Value& errors) {
    const Recording call("VORN::APIResponse::SetError", {Number(code), Compact(errors)});
    TheAppliance().RecordAnswer(false, code, errors);
}

}  // namespace VORN

class VornConf::Impl {
public:
    // Each answer has memory of its own, freed by the next call, so that a text kept too long is found.
    const char* Keep(std::string answer) {
        text = std::make_unique<std::vector<char>>(answer.begin(), answer.end());
        text->push_back('\0');
        return text->data();
    }

    const char* Look(Recording& call, const std::map<std::string, std::string>& values, const char* key,
                     const char* fallback) {
        if (call.Null(key, fallback)) {
            return Keep("");
        }
        const auto found = values.find(key);
        return Keep(found == values.end() ? fallback : found->second);
    }

private:
    std::unique_ptr<std::vector<char>> text;
};

VornConf::VornConf() {
    Recording call("VornConf::VornConf", {});
    impl = std::make_unique<Impl>();
    TheAppliance().AddHandle(this, fake::HandleKind::kConf, call.Text());
}

VornConf::~VornConf() {
    const Recording call("VornConf::~VornConf", {});
    TheAppliance().RemoveHandle(this);
}

const char* VornConf::Def(const char* key, const char* fallback) {
    Recording call("VornConf::Def", {Quoted(key), Quoted(fallback)});
    return impl->Look(call, TheAppliance().state.capabilities, key, fallback);
}

const char* VornConf::Info(const char* key, const char* fallback) {
    Recording call("VornConf::Info", {Quoted(key), Quoted(fallback)});
    return impl->Look(call, TheAppliance().state.settings, key, fallback);
}

namespace WebUtils {

std::vector<std::string> StringExplode(const std::string& text, const std::string& separator) {
    const Recording call("WebUtils::StringExplode", {Quoted(text), Quoted(separator)});
    std::vector<std::string> pieces;
    if (text.empty()) {
        return pieces;
    }
    if (separator.empty()) {
        return {text};
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
    std::string shown;
    for (const std::string& piece : pieces) {
        shown += (shown.empty() ? "" : ", ") + Quoted(piece);
    }
    const Recording call("WebUtils::StringImplode", {"[" + shown + "]", Quoted(separator)});
    std::string text;
    for (std::size_t index = 0; index < pieces.size(); ++index) {
        text += (index == 0 ? "" : separator) + pieces[index];
    }
    return text;
}

}  // namespace WebUtils
