// The handler of "VORN.Core.Directory.Domain.Schedule": one object for one request. The one scheduled task that it keeps
// refreshes the database of domain users and groups, and is known by its command alone.
//
// Errors and checks are those of DomainServiceHandler; the members stand in the order of the files.

#ifndef VORN_SRC_DOMAIN_SCHEDULE_H
#define VORN_SRC_DOMAIN_SCHEDULE_H

#include <json/value.h>

#include <cstdint>
#include <string>

#include "platform/webapi.h"
#include "src/support/handler_rules.h"

class DomainScheduleHandler {
public:
    // Neither pointer is owned.
    DomainScheduleHandler(VORN::APIRequest* request, VORN::APIResponse* response);

    // ---- domain_schedule.cpp: errors, checks, "get" and "set" ----
    void SetError(int code);
    void ReportError();
    void ShowJson(const char* title, const Json::Value& value);
    bool CHECK_PARAM_STRING(std::string name, bool required);
    bool CHECK_PARAM_INT(std::string name, bool required);
    bool CHECK_PARAM_BOOL(std::string name, bool required);

    void Get();
    void Set();
    bool CheckScheduleParam();
    bool ComposeScheduleValue(Json::Value& out);
    bool IsAllowSetSchedule();
    bool SaveSchedule();

    // ---- domain_schedule_store.cpp: the task in the platform's scheduler ----
    bool LoadSchedule(Json::Value& out);
    int GetScheduleTaskId();
    int SetUpdatePeriod(const Json::Value& value);
    int RemoveUpdatePeriod();

    VORN::APIRequest* request;
    VORN::APIResponse* response;
    std::int32_t error = kNoError;
};

// "date_type" of no schedule at all: "set" then removes the task, and "get" answers it when there is none.
constexpr int kNoSchedule = 2;

#endif
