// The inside of a request and of a response, for the server and the task processes that make and read them.

#ifndef VORN_APPLIANCE_PLATFORM_WEBAPI_EXCHANGE_H
#define VORN_APPLIANCE_PLATFORM_WEBAPI_EXCHANGE_H

#include <json/value.h>

#include <functional>

#include "appliance/platform/contract.h"

namespace appliance {

struct TaskHost;

}  // namespace appliance

namespace VORN {

class APIRequest::Impl {
public:
    // The parameters of the call: a JSON object.
    Json::Value parameters = Json::Value(Json::objectValue);

    // Where this request's background tasks are recorded and what runs them; null: the appliance's own places. Not
    // owned.
    const appliance::TaskHost* taskHost = nullptr;
};

class APIResponse::Impl {
public:
    bool answered = false;
    bool success = false;
    Json::Value data;    // of the last SetSuccess
    int code = 0;        // of the last SetError
    Json::Value errors;  // likewise

    // Called with the data of every SetSuccess; empty: nobody listens.
    std::function<void(const Json::Value& data)> published;
};

}  // namespace VORN

#endif
