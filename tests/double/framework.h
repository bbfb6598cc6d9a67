// The inside of a request, for those parts of the imitated framework that look into it.

#ifndef VORN_TESTS_DOUBLE_FRAMEWORK_H
#define VORN_TESTS_DOUBLE_FRAMEWORK_H

#include <json/value.h>

#include "platform/webapi.h"

namespace VORN {

class APIRequest::Impl {
public:
    Json::Value parameters = Json::Value(Json::objectValue);
};

}  // namespace VORN

#endif
