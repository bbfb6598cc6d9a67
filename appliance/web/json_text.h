// The JSON text of a request's body.

#ifndef VORN_APPLIANCE_WEB_JSON_TEXT_H
#define VORN_APPLIANCE_WEB_JSON_TEXT_H

#include <json/value.h>

#include <optional>
#include <string>
#include <string_view>

#include "appliance/web/server_codes.h"

namespace appliance {

// Reads the parameters of a call: one JSON object and nothing after it, as RFC 8259 has it: well-formed UTF-8, no
// comments, no numbers in other forms, no lone surrogates, and beyond that no key twice and no more than kJsonDepth
// levels. An empty text is an empty object. Answers what is wrong, or nothing; `parameters` counts only then.
std::optional<ServerCode> ReadParameters(std::string_view text, Json::Value& parameters);

// A value as one line of plain ASCII.
std::string WriteJson(const Json::Value& value);

}  // namespace appliance

#endif
