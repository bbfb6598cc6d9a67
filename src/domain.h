// The handler of "VORN.Core.Directory.Domain" and "VORN.Core.Directory.Domain.Conf": one object for one request.
//
// An operation of the API (Get, Set, ...) takes its parameters from `request`, does its work in steps, and answers
// `response` once: SetSuccess, or ReportError with the first code that a step recorded. Steps return false, or a negative
// number, on failure. The members stand in the order of the files under domain/; all are public, so that a test can
// call each step by itself.

#ifndef VORN_SRC_DOMAIN_H
#define VORN_SRC_DOMAIN_H

#include <json/value.h>

#include <cstdint>
#include <string>
#include <vector>

#include "platform/core.h"
#include "platform/domain.h"
#include "platform/webapi.h"
#include "src/support/handler_rules.h"

class DomainServiceHandler {
public:
    // Neither pointer is owned.
    DomainServiceHandler(VORN::APIRequest* request, VORN::APIResponse* response);

    // ---- domain/handler.cpp: errors and checks (support/handler_rules.h has the rules) ----
    void SetError(int code);
    void ReportError();
    void ShowJson(const char* title, const Json::Value& value);
    bool CHECK_PARAM_STRING(std::string name, bool required);
    bool CHECK_PARAM_INT(std::string name, bool required);
    bool CHECK_PARAM_BOOL(std::string name, bool required);
    bool CHECK_JSON_STRING(const Json::Value& object, std::string key, bool required);
    bool CHECK_JSON_INT(const Json::Value& object, std::string key, bool required);
    bool CHECK_JSON_BOOL(const Json::Value& object, std::string key, bool required);
    bool CHECK_JSON_JSONARRAY(const Json::Value& object, std::string key, bool required);

    // ---- domain/membership_state.cpp: is the appliance a member? ----
    static constexpr int kNameSize = 128;
    // `name` holds the name of the domain, or of the workgroup when it is no member. Records 2622 on failure.
    bool LoadMembership(bool& isMember, char (&name)[kNameSize]);

    // ---- domain/status.cpp: "get" ----
    void Get();
    bool LoadDomainData(Json::Value& result);

    // ---- domain/set.cpp: "set", what it accepts ----
    void Set();
    bool CheckDomainParam();
    bool CheckBaseParam();
    bool CheckAdvanceParam();

    // ---- domain/membership.cpp: "set", join, leave or nothing ----
    bool ApplyDomainConfig();
    bool SaveDomainWorkgroup();
    bool LeaveDomain();

    // ---- domain/join.cpp: the join ----
    struct JoinAttempt;
    bool SaveDomain();
    // Everything that may fail; true when the appliance has joined.
    bool TryJoin(JoinAttempt& attempt);
    // What follows a join that succeeded; nothing here can undo it.
    void FinishJoin();
    // Removes the join tool's status and, unless the join succeeded, puts back what was changed ahead of it.
    void CleanUpJoin(const JoinAttempt& attempt);

    // ---- domain/join_failure.cpp: why a join failed ----
    // Records one code for a join of `domain` that failed; `dnsGiven` tells whether the request brought DNS servers.
    void RecordJoinFailure(const char* domain, bool dnsGiven);

    // ---- domain/dns_list.cpp: the appliance's DNS servers (see internal.h for the reader) ----
    bool SetDNSList(const std::vector<std::string>& list);

    // ---- domain/advanced_options.cpp: the advanced domain options ----
    void InitDomainAdvData(Json::Value& data);
    bool LoadDomainAdvData(Json::Value& data);
    bool IsDomainAdvOptEnable();
    bool convertNICtoJsonArray(const char* list, Json::Value& nics);
    bool convertNICtoString(const Json::Value& nics, std::string& list);
    bool SaveSMBOption(const Json::Value& options);
    int RemoveSmbinfoKeys();
    bool SaveAdvanceDomain(_tag_VORN_WIN2_& record);

    // ---- domain/additional_options.cpp: the five options of ".Conf" ----
    void GetOption();
    void SetOption();
    bool LoadDomainAdditionalData(Json::Value& data);
    bool CheckAdditionalParam();
    bool SaveAdditionalDomain();
    bool SaveSyncDCTime(bool& changed);
    bool UpdateBoolConf(VLIBSZHASH** hash, const char* jsonKey, const char* confKey);
    bool UpdateIntConf(VLIBSZHASH** hash, const char* jsonKey, const char* confKey);
    bool UpdateDisableAdminConf(VLIBSZHASH** hash, const char* jsonKey, const char* confKey);
    bool SaveSmbAdvConf(VLIBSZHASH* hash);

    // ---- domain/test_dc.cpp: "test_dc" ----
    void TestDC();
    bool TestDCData(Json::Value& result);

    // ---- domain/domain_list.cpp: "get_domain_list", versions 1 and 2 ----
    void GetDomainList();
    void GetDomainList_V2();
    bool GetDomainListData(Json::Value& result);
    bool GetDomainListData_V2(Json::Value& result);
    // What both versions begin with. Records 2619 or 2622 on failure.
    bool BeginDomainList(bool& isMember);

    // ---- domain/update.cpp: "update_start" and the worker ----
    void UpdateStart();
    bool CheckUpdating();
    bool CheckDomainDBUpdating();
    void UpdateStartFork();

    // ---- domain/update_tasks.cpp: "update_status", "update_stop" and the monitor ----
    void UpdateStatus();
    void UpdateStop();
    void MonitorUpdate();

    VORN::APIRequest* request;
    VORN::APIResponse* response;
    std::int32_t error = kNoError;
    // Set when "disable domain admins" changed on a member: the administrators' group is then added once more.
    bool needAddDomainAdminGroup = false;
};

#endif
