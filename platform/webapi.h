// The web-API framework: requests, responses and background tasks. The appliance's web-API server supplies it.
// See conventions.h for the rules that hold for every declaration.

#ifndef VORN_PLATFORM_WEBAPI_H
#define VORN_PLATFORM_WEBAPI_H

#include <json/value.h>

#include <cstdint>
#include <memory>
#include <string>

#include "platform/conventions.h"

namespace VORN {

// One request: the parameters of a call, a JSON value under each name. The server owns it and keeps it alive for the
// whole call of an entry function or a task body.
class APIRequest {
public:
    APIRequest();
    ~APIRequest();
    APIRequest(const APIRequest&) = delete;
    APIRequest& operator=(const APIRequest&) = delete;

    // True when the client sent a parameter of this name, also one with the value null.
    // Failure: throws.
    bool HasParam(const std::string& name) const;

    // The parameter's value as the client sent it, or `fallback` when there is none.
    // Failure: throws.
    Json::Value GetParam(const std::string& name, const Json::Value& fallback) const;

    class Impl;
    std::unique_ptr<Impl> impl;
};

// The answer to one request. The last call decides what the client sees; within a background task every call of
// SetSuccess publishes progress, and the last call is the task's result.
class APIResponse {
public:
    APIResponse();
    ~APIResponse();
    APIResponse(const APIResponse&) = delete;
    APIResponse& operator=(const APIResponse&) = delete;

    // Answers success with `data`, which is copied.
    // Failure: throws.
    void SetSuccess(const Json::Value& data);

    // Answers failure with a code and with `errors`, which is copied; null when there is nothing to add.
    // Failure: throws.
    void SetError(int code, const Json::Value& errors);

    class Impl;
    std::unique_ptr<Impl> impl;
};

// An entry function serves one method of an API.
using APIFunction = void (*)(APIRequest* request, APIResponse* response);

// The body of a background task. `userData` is what was given to APIPolling::Start.
using APITaskFunction = void (*)(APIRequest* request, APIResponse* response, void* userData);

// A row of a module's API table. The table ends with a row of zeros.
struct APIEntry {
    const char* api;
    std::int32_t version;
    const char* method;
    APIFunction function;
};

// The background-task framework. A task has an id, belongs to a group, and is found again by the prefix of its id.
class APIPolling {
public:
    // A polling object without a request (SetRequest gives it one before Start), or on one.
    // Failure: throws.
    APIPolling();
    explicit APIPolling(APIRequest* request);
    ~APIPolling();
    APIPolling(const APIPolling&) = delete;
    APIPolling& operator=(const APIPolling&) = delete;

    // The request whose parameters the task body will see. Not owned; the framework copies what it needs in Start.
    // Failure: none.
    void SetRequest(APIRequest* request);

    // The group whose members may see the task, and the prefix of the task's id.
    // Failure: throws.
    void SetGroupAttr(const std::string& group);
    void SetPrefixAttr(const std::string& prefix);

    // Whether the record of the task goes away as soon as its end has been read.
    // Failure: none.
    void SetRemoveAttr(bool remove);

    // Starts a task that runs `body` apart from this request, and answers `response` with the task's id.
    // On failure `response` carries the framework's own error.
    // Failure: false, throws.
    bool Start(APIResponse* response, APITaskFunction body, void* userData);

    // Fills `tasks` with an object that holds an array of task ids for each of `groups` (an array of names), limited to
    // the ids that begin with `prefix`.
    // Failure: false, throws.
    bool List(const std::string& prefix, const Json::Value& groups, Json::Value& tasks);

    // Fills `status` with the record of a task: "finish" (bool), "success" (bool, false only once the task has failed),
    // "data" (what the body published last), and "error" with "code" (int) and "errors" when the task failed.
    // Failure: false, throws.
    bool Status(const std::string& id, Json::Value& status);

    // Stops a task, with all that it started when `force` is true. A task that has ended stays as it is.
    // Failure: false, throws.
    bool Stop(const std::string& id, bool force);

    // The framework's error code of the last call of this object that failed; 0 when none did.
    // Failure: none.
    int GetError() const;

    class Impl;
    std::unique_ptr<Impl> impl;
};

}  // namespace VORN

#endif
