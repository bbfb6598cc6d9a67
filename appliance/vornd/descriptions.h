// What the server says of itself: the list of methods and the OpenAPI document.

#ifndef VORN_APPLIANCE_VORND_DESCRIPTIONS_H
#define VORN_APPLIANCE_VORND_DESCRIPTIONS_H

#include <json/value.h>

#include <string>

#include "appliance/vornd/method_table.h"

namespace appliance {

// Reads the installed descriptions of methods: an array of {"api", "version", "method", "summary", "parameters":
// [{"name", "type", "required", "description"}], "example_request", "example_answer"}. Null when the file is missing;
// also when it can't be read, and then a line is logged.
Json::Value ReadDescriptions(const std::string& path);

// What is loaded: {"apis": [{"api", "methods": [{"method", "versions": [1, 2]}]}]}.
Json::Value ListMethods(const MethodTable& methods);

// The same as an OpenAPI 3.0 document, with what `descriptions` says of the methods that are loaded.
Json::Value OpenApiDocument(const MethodTable& methods, const Json::Value& descriptions);

}  // namespace appliance

#endif
