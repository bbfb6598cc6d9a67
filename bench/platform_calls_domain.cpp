// The platform's side of "get", "set", "test_dc" and "get_domain_list".

#include <string>

#include "bench/cheap_platform.h"
#include "bench/platform_calls.h"
#include "platform/core.h"
#include "platform/domain.h"
#include "platform/eventlog.h"
#include "platform/network.h"
#include "platform/settings.h"
#include "platform/webutils.h"

namespace platform_calls {

namespace {

const Json::Value kNull;
const std::string kComma = ",";
const std::string kEnableDomain = "enable_domain";
const std::string kDomainName = "domain_name";
const std::string kUserName = "username";
const std::string kPassword = "password";
const std::string kDns = "dns";
const std::string kManageMode = "manage_mode";
const std::string kAdvanced = "advance_domain_conf";
const char* const kPath = "/a/path";

void CheckParam(const VORN::APIRequest* request, const std::string& name) {
    request->HasParam(name);
    request->GetParam(name, kNull);
}

void Query(bool both) {
    char name[256];
    int first = 0;
    int second = 0;
    WINIQuery1(name, sizeof(name), &first, both ? &second : nullptr);
}

// What "get", "test_dc" and "get_domain_list" begin with.
void LoadMembership() {
    {
        VornConf conf;
        conf.Def("supportdomain", "");
    }
    Query(true);
}

void ReadDns() {
    VLIBSZLIST* servers = VLIBCSzListAlloc(1);
    VORNNetDNSListGet(&servers);
    for (int i = 0; i < servers->count; ++i) {
        VLIBCSzListGet(servers, i);
    }
    VLIBCSzListFree(servers);
}

void WriteDns(const std::vector<std::string>& list) {
    VLIBSZLIST* servers = VLIBCSzListAlloc(1);
    for (const std::string& server : list) {
        VLIBCSzListPush(&servers, server.c_str());
    }
    VORNNetDNSListSet(servers);
    VLIBCSzListFree(servers);
}

VLIBSZHASH* LoadSection() {
    VLIBSZHASH* hash = VLIBCSzHashAlloc(1);
    VLIBCFileGetSection(kPath, "global", &hash);
    return hash;
}

void SaveSection(VLIBSZHASH* hash) {
    char name[256];
    VLIBCFileITmpName(kPath, name, sizeof(name));
    VLIBCFileAddSection(name, "global", hash, "%s=%s");
    VLIBCSysRename(name, kPath);
    VLIBCSzHashFree(hash);
}

// "set" up to the decision between joining and leaving.
void CheckJoinParams(const VORN::APIRequest* request) {
    CheckParam(request, kEnableDomain);
    request->GetParam(kEnableDomain, kNull);
    CheckParam(request, kDomainName);
    request->GetParam(kDomainName, kNull);
    BlVLIBIsIpAddr("lab.test");
    BlVLIBIsv6IpAddrValid("lab.test");
    CheckParam(request, kUserName);
    CheckParam(request, kPassword);
    CheckParam(request, kDns);
    CheckParam(request, kAdvanced);
}

// The join itself, with what is changed ahead of it.
void TryJoin(const VORN::APIRequest* request, std::vector<std::string>& newDns) {
    static _tag_VORN_WIN2_ record{1, 0, "", "", "", {}, {}, {}, {}};
    request->GetParam(kDomainName, kNull);
    request->GetParam(kUserName, kNull);
    request->GetParam(kPassword, kNull);
    VORNWinIsEnableTrustDomain();
    CheckParam(request, kManageMode);
    request->GetParam(kManageMode, kNull);
    VORNWinSetTrustDomain(0);
    ReadDns();
    request->HasParam(kDns);
    newDns = WebUtils::StringExplode(request->GetParam(kDns, kNull).asString(), kComma);
    WebUtils::StringImplode(newDns, kComma);
    WebUtils::StringImplode(cheap::TheState().dnsTexts, kComma);
    WriteDns(newDns);
    CheckParam(request, kAdvanced);
    VLIBSZHASH* hash = LoadSection();
    VLIBCSzHashSetValue(&hash, "key", "value");
    VLIBCSzHashSetValue(&hash, "key", "value");
    SaveSection(hash);
    VORNWinJoin1(&record);
}

void BeginJoin(const VORN::APIRequest* request, VornConf& conf) {
    conf.Def("supportdomain", "");
    Query(false);
    request->GetParam(kEnableDomain, kNull);
    VORNLDAPIsBinded(0);
}

}  // namespace

void Get(VORN::APIRequest* /*request*/, VORN::APIResponse* response) {
    char text[256];
    LoadMembership();
    VLIBCFileGetKeyValue(kPath, "security", text, sizeof(text), 0);
    VORNWinIsEnableTrustDomain();
    ReadDns();
    WebUtils::StringImplode(cheap::TheState().dnsTexts, kComma);
    VLIBSZHASH* hash = LoadSection();
    VLIBCSzHashGetValue(hash, "advanced_domain_option");
    VLIBCFileGetKeyValue(kPath, "password server", text, sizeof(text), 0);
    VLIBCFileGetKeyValue(kPath, "workgroup", text, sizeof(text), 0);
    VLIBCFileGetKeyValue(kPath, "realm", text, sizeof(text), 0);
    VLIBCSzHashGetValue(hash, "register nic");
    VLIBCSzHashFree(hash);
    response->SetSuccess(kNull);
}

void GetInWorkgroup(VORN::APIRequest* /*request*/, VORN::APIResponse* response) {
    LoadMembership();
    response->SetSuccess(kNull);
}

void SetJoin(VORN::APIRequest* request, VORN::APIResponse* response) {
    CheckJoinParams(request);
    {
        VornConf conf;
        BeginJoin(request, conf);
        std::vector<std::string> newDns;
        TryJoin(request, newDns);
        VORNGroupAddDomainAdminGroup();
        VLIBServiceReload("samba");
        VLIBServiceReload("nmbd");
        VLIBServiceReload("winbindd");
        Query(false);
        VORNLogSet1(2, 1, 0, "LAB", "", "", "");
        VornConf settings;
        settings.Info("enableduserhome", "");
        VORNDomainUserHomeInclude(1);
        VLIBServiceIsEnabled("webdav-httpd-pure");
        VLIBServiceRestart("webdav-httpd-pure");
    }
    response->SetSuccess(kNull);
}

void SetJoinThatFails(VORN::APIRequest* request, VORN::APIResponse* response) {
    CheckJoinParams(request);
    {
        VornConf conf;
        BeginJoin(request, conf);
        std::vector<std::string> newDns;
        TryJoin(request, newDns);
        char key[24];
        char message[512];
        ErrWINIState1Get(key, sizeof(key), message, sizeof(message));
        WriteDns(cheap::TheState().dnsTexts);
        VORNWinSetTrustDomain(1);
    }
    response->SetError(2610, kNull);
}

void SetLeave(VORN::APIRequest* request, VORN::APIResponse* response) {
    CheckParam(request, kEnableDomain);
    request->GetParam(kEnableDomain, kNull);
    request->HasParam(kAdvanced);
    {
        VornConf conf;
        conf.Def("supportdomain", "");
        Query(false);
        request->GetParam(kEnableDomain, kNull);
        static _tag_VORN_WIN2_ record{};
        VORNWinJoin1(&record);
        VLIBSZHASH* hash = LoadSection();
        VLIBCSzHashSetValue(&hash, "key", "value");
        VLIBCSzHashRemoveKey(hash, "key");
        SaveSection(hash);
        VLIBCFileLock(0, 0);
        VLIBCFileRemoveKey(kPath, "key");
        VLIBCFileUnlock(0);
        VORNLogSet1(2, 1, 0, "", "", "", "");
    }
    response->SetSuccess(kNull);
}

void SetRefused(VORN::APIRequest* request, VORN::APIResponse* response) {
    CheckParam(request, kEnableDomain);
    request->GetParam(kEnableDomain, kNull);
    request->HasParam(kDomainName);
    response->SetError(2618, kNull);
}

void TestDc(VORN::APIRequest* /*request*/, VORN::APIResponse* response) {
    LoadMembership();
    VORNWinTestJoin(VORNWinADSJoined());
    response->SetSuccess(kNull);
}

void DomainList1(VORN::APIRequest* /*request*/, VORN::APIResponse* response) {
    LoadMembership();
    VLIBSZLIST* domains = VLIBCSzListAlloc(1);
    VORNWinsEnumAllDomains(&domains);
    for (int i = 0; i < domains->count; ++i) {
        VLIBCSzListGet(domains, i);
    }
    VLIBCSzListFree(domains);
    response->SetSuccess(kNull);
}

void DomainList2Trusts(VORN::APIRequest* /*request*/, VORN::APIResponse* response) {
    char fqdn[256];
    LoadMembership();
    VLIBSZLIST* domains = VLIBCSzListAlloc(1);
    VORNWinIsEnableTrustDomain();
    VORNWinsEnumAllDomains(&domains);
    for (int i = 0; i < domains->count; ++i) {
        VORNWinsGetDomainFQDN(VLIBCSzListGet(domains, i), fqdn, sizeof(fqdn));
    }
    VLIBCSzListFree(domains);
    response->SetSuccess(kNull);
}

void DomainList2Units(VORN::APIRequest* /*request*/, VORN::APIResponse* response) {
    char workgroup[256];
    LoadMembership();
    VLIBSZLIST* names = VLIBCSzListAlloc(1);
    VORNWinIsEnableTrustDomain();
    VLIBSZLIST* values = VLIBCSzListAlloc(1);
    VORNWinsEnumOU(&names, &values);
    VORNWorkgroupGet(workgroup, sizeof(workgroup));
    for (int i = 0; i < names->count; ++i) {
        VLIBCSzListGet(names, i);
        VLIBCSzListGet(values, i);
    }
    VLIBCSzListFree(values);
    VLIBCSzListFree(names);
    response->SetSuccess(kNull);
}

}  // namespace platform_calls
