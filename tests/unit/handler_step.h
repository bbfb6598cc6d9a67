// For tests that call a step of a handler by itself.

#ifndef VORN_TESTS_UNIT_HANDLER_STEP_H
#define VORN_TESTS_UNIT_HANDLER_STEP_H

#include <algorithm>
#include <cstdio>
#include <string>
#include <vector>

#include "tests/double/fault.h"
#include "tests/unit/module_test.h"

namespace unit {

constexpr const char* kSmbInfoTemporary = "/usr/vorn/etc/smbinfo.conf.tmp";
constexpr const char* kSmbLine = "    %s=%s\n";

// A handler of one request. Each step answers through `exchange`, if at all, and records its error in `handler`.
template <typename Handler>
struct Step {
    explicit Step(const Json::Value& parameters = Json::Value(Json::objectValue))
        : exchange(parameters), handler(&exchange.request, &exchange.response) {}
    explicit Step(const char* json) : Step(FromJson(json)) {}

    fake::Exchange exchange;
    Handler handler;
};

// The end of the log line of a failed call: the last error that the function's `nth` call left.
inline std::string ErrorAfter(const std::string& function, int nth = 1) {
    char text[128];
    std::snprintf(text, sizeof(text), "[0x%04X platform.c:%d]", static_cast<unsigned>(fake::ErrorCodeOf(function)),
                  nth);
    return text;
}

// The recorded calls without those of some functions.
inline std::vector<std::string> CallsWithout(const fake::Appliance& appliance, const std::vector<std::string>& names) {
    return appliance.CallTexts([&names](const fake::Call& call) {
        return std::find(names.begin(), names.end(), call.function) == names.end();
    });
}

// What is no "yes", though nearly.
inline const std::vector<std::string>& NearlyYes() {
    static const std::vector<std::string> texts = {"YES",  "Yes",     "yeS", "ye", "yess", " yes", "yes ", "yes\n",
                                                   "yes,", "\"yes\"", "no",  "y",  "1",    "true", "on"};
    return texts;
}

}  // namespace unit

#endif
