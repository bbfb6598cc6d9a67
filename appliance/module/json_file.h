// The JSON files that the appliance's programs keep for their readers.

#ifndef VORN_APPLIANCE_MODULE_JSON_FILE_H
#define VORN_APPLIANCE_MODULE_JSON_FILE_H

#include <json/value.h>

namespace appliance {

// An object in a file that another process replaces now and then; null when the file is not there. `file` is a fixed path
// (paths.h). Throws CallFailure for what can't be read.
Json::Value ReadJsonFile(const char* file);

}  // namespace appliance

#endif
