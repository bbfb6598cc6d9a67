// The parameters of a call: checked, never converted.

#ifndef VORN_APPLIANCE_MODULE_PARAMETERS_H
#define VORN_APPLIANCE_MODULE_PARAMETERS_H

#include <json/value.h>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>

#include "platform/webapi.h"

namespace appliance {

// The codes of the domain module that this one answers, too, with the same meaning.
enum class AnswerCode : int {
    SystemError = 2617,
    BadParameter = 2618,
    NotMember = 2624,
};

// Ends a call with a code; the text is for the log.
class CallFailure : public std::runtime_error {
public:
    CallFailure(int code, const std::string& why) : std::runtime_error(why), code_(code) {}
    CallFailure(AnswerCode code, const std::string& why) : CallFailure(static_cast<int>(code), why) {}
    int code() const {
        return code_;
    }

private:
    int code_;
};

class Parameters {
public:
    explicit Parameters(const VORN::APIRequest& request) : request_(request) {}

    // Each throws CallFailure (BadParameter) when the parameter is there and of another type or out of its bounds; an
    // absent one is `fallback`, or nothing.
    std::int64_t Integer(const char* name, std::int64_t lowest, std::int64_t highest, std::int64_t fallback) const;
    // Of at most `longest` bytes, none of them a control byte.
    std::optional<std::string> Text(const char* name, std::size_t longest) const;

    // Throws when it is absent, too.
    bool RequiredBool(const char* name) const;

private:
    const VORN::APIRequest& request_;
};

// Runs `method`: its value is the answer. What it throws becomes a code, and a line in the log.
void Answer(const VORN::APIRequest& request, VORN::APIResponse& response,
            Json::Value (*method)(const Parameters& parameters));

}  // namespace appliance

#endif
