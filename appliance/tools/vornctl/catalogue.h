// The appliance's catalogues, built into the program: error codes and methods.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_CATALOGUE_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_CATALOGUE_H

#include <json/value.h>

#include <map>
#include <string>

namespace appliance::ctl {

struct ErrorText {
    std::string meaning;
    std::string cause;
    std::string action;
};

// All codes with their texts.
const std::map<int, ErrorText>& ErrorTexts();

// The texts of a code; null for one that the catalogue does not know.
const ErrorText* FindErrorText(int code);

// The methods of the web API: an array of objects with "api", "version", "method", "summary" and more.
const Json::Value& MethodCatalogue();

}  // namespace appliance::ctl

#endif
