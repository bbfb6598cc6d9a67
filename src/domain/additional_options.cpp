// The five domain options of the file-sharing service, "get" and "set" of ".Conf":
//
//   {"enable_sync_time": false, "enable_server_signing": false, "enable_rpc_enum_usergroup": false,
//    "domain_nested_group": 1, "disable_domain_admins": false}
//
// "set" takes any of them and answers null. Time synchronisation is a key of smb.conf, "yes" or "no"; the others are
// keys of smbinfo.conf, where a switch is "yes" or not there at all.

#include <cstdlib>
#include <cstring>

#include "src/domain.h"
#include "src/domain/smbinfo.h"
#include "src/support/log.h"

namespace {

constexpr const char* kSyncTimeKey = "vorn sync dctime";
constexpr const char* kSigningKey = "server signing";
constexpr const char* kEnumKey = "enable nt4 enum";
constexpr const char* kNestedGroupsKey = "winbind expand groups";
constexpr const char* kDisableAdminsKey = "disable domain admins";

// A name of its own, not one of the platform's: two writers of these options share it.
constexpr const char* kSmbInfoTemporary = "/usr/vorn/etc/smbinfo.conf.tmp";

constexpr int kNestedGroupsDefault = 1;
constexpr int kNestedGroupsMost = 99;
constexpr int kServicesAfterAdmins = 8;  // type of the services that know the administrators' group

bool LoadSyncTime() {
    char value[64] = {};
    return VLIBCFileGetKeyValue(kSmbConf, kSyncTimeKey, value, sizeof(value), 0) > 0 && std::strcmp(value, "yes") == 0;
}

// What is stored has no limits, but what is out of range, or no number, is shown as the default.
int NestedGroups(const char* text) {
    const long depth = text == nullptr ? 0 : std::strtol(text, nullptr, 10);
    return depth >= 1 && depth <= kNestedGroupsMost ? static_cast<int>(depth) : kNestedGroupsDefault;
}

// True when the switch had to be changed.
bool UpdateSwitch(VLIBSZHASH** hash, const char* key, bool wanted) {
    if (wanted == IsYes(*hash, key)) {
        return false;
    }
    if (wanted) {
        VLIBCSzHashSetValue(hash, key, "yes");
    } else {
        VLIBCSzHashRemoveKey(*hash, key);
    }
    return true;
}

}  // namespace

void DomainServiceHandler::GetOption() {
    Json::Value data;
    if (LoadDomainAdditionalData(data)) {
        response->SetSuccess(data);
    } else {
        ReportError();
    }
}

void DomainServiceHandler::SetOption() {
    if (CheckAdditionalParam() && SaveAdditionalDomain()) {
        response->SetSuccess(Json::Value());
    } else {
        ReportError();
    }
}

bool DomainServiceHandler::LoadDomainAdditionalData(Json::Value& data) {
    data["enable_sync_time"] = LoadSyncTime();
    data["enable_server_signing"] = false;
    data["enable_rpc_enum_usergroup"] = false;
    data["domain_nested_group"] = kNestedGroupsDefault;
    data["disable_domain_admins"] = false;
    StringHash hash;
    if (!hash) {
        syslog(LOG_ERR, "%s:%d Cannot alloc memory", kDomainUnit, LOG_NUMBER(kAdditionalOptions));
        SetError(kSystemError);
        return false;
    }
    LoadSmbInfo(hash);
    data["enable_server_signing"] = IsYes(hash.get(), kSigningKey);
    data["enable_rpc_enum_usergroup"] = IsYes(hash.get(), kEnumKey);
    data["disable_domain_admins"] = IsYes(hash.get(), kDisableAdminsKey);
    data["domain_nested_group"] = NestedGroups(VLIBCSzHashGetValue(hash.get(), kNestedGroupsKey));
    return true;
}

bool DomainServiceHandler::CheckAdditionalParam() {
    // Not the order in which they are saved: a client that sends several wrong ones hears of the first of these.
    for (const char* name :
         {"enable_sync_time", "enable_server_signing", "enable_rpc_enum_usergroup", "disable_domain_admins"}) {
        if (!CHECK_PARAM_BOOL(name, false)) {
            return false;
        }
    }
    return CHECK_PARAM_INT("domain_nested_group", false);
}

bool DomainServiceHandler::SaveAdditionalDomain() {
    const auto given = [this](const char* name) { return request->HasParam(name); };
    bool changed = false;
    if (given("enable_sync_time") && !SaveSyncDCTime(changed)) {
        return false;
    }
    StringHash hash;
    if (!hash) {
        syslog(LOG_ERR, "%s:%d Cannot alloc memory", kDomainUnit, LOG_NUMBER(kAdditionalOptions));
        SetError(kSystemError);
        return false;
    }
    LoadSmbInfo(hash);

    if (given("enable_server_signing") && UpdateBoolConf(hash.address(), "enable_server_signing", kSigningKey)) {
        changed = true;
    }
    if (given("enable_rpc_enum_usergroup") && UpdateBoolConf(hash.address(), "enable_rpc_enum_usergroup", kEnumKey)) {
        changed = true;
    }
    if (given("domain_nested_group") && UpdateIntConf(hash.address(), "domain_nested_group", kNestedGroupsKey)) {
        changed = true;
    }
    if (given("disable_domain_admins") &&
        UpdateDisableAdminConf(hash.address(), "disable_domain_admins", kDisableAdminsKey)) {
        changed = true;
    }
    if (!changed) {
        return true;
    }
    // Also when only the time synchronisation changed: the file is then rewritten as it was.
    if (!SaveSmbAdvConf(hash.get())) {
        syslog(LOG_ERR, "%s:%d Cannot save smb conf", kDomainUnit, LOG_NUMBER(kAdditionalOptions));
        SetError(kSystemError);
        return false;
    }
    VLIBServiceReload("samba");
    VLIBServiceReload("nmbd");
    VLIBServiceReload("winbindd");
    return true;
}

bool DomainServiceHandler::SaveSyncDCTime(bool& changed) {
    const bool wanted = request->GetParam("enable_sync_time", Json::Value()).asBool();
    if (wanted == LoadSyncTime()) {
        return true;
    }
    if (VORNWinsSetSectionKey(kGlobalSection, kSyncTimeKey, wanted ? "yes" : "no") < 0) {
        syslog(LOG_ERR, "%s:%d Failed to save sync dc time to smb.conf.", kDomainUnit, LOG_NUMBER(kAdditionalOptions));
        SetError(kSystemError);
        return false;
    }
    changed = true;
    return true;
}

bool DomainServiceHandler::UpdateBoolConf(VLIBSZHASH** hash, const char* jsonKey, const char* confKey) {
    return UpdateSwitch(hash, confKey, request->GetParam(jsonKey, Json::Value()).asBool());
}

bool DomainServiceHandler::UpdateIntConf(VLIBSZHASH** hash, const char* jsonKey, const char* confKey) {
    const std::string wanted = std::to_string(request->GetParam(jsonKey, Json::Value()).asInt());
    const char* current = VLIBCSzHashGetValue(*hash, confKey);
    if (current != nullptr && wanted == current) {
        return false;
    }
    VLIBCSzHashSetValue(hash, confKey, wanted.c_str());
    return true;
}

bool DomainServiceHandler::UpdateDisableAdminConf(VLIBSZHASH** hash, const char* jsonKey, const char* confKey) {
    const bool wanted = request->GetParam(jsonKey, Json::Value()).asBool();
    const bool joined = VORNWinsIsJoined() != 0;
    const bool changed = UpdateSwitch(hash, confKey, wanted);
    // In either direction: switching the administrators off is the platform's to carry out as well.
    needAddDomainAdminGroup = changed && joined;
    return changed;
}

bool DomainServiceHandler::SaveSmbAdvConf(VLIBSZHASH* hash) {
    if (VLIBCFileExist(kSmbInfoTemporary) != 0) {
        VLIBCSysRemove(kSmbInfoTemporary);
    }
    if (VLIBCFileAddSection(kSmbInfoTemporary, kGlobalSection, hash, kSmbLineFormat) == 0) {
        return false;
    }
    const bool replaced = VLIBCSysRename(kSmbInfoTemporary, kSmbInfoConf) == 0;
    // Whatever became of the rename.
    if (needAddDomainAdminGroup) {
        VORNGroupAddDomainAdminGroup();
        VLIBServiceTypeReload(kServicesAfterAdmins);
    }
    return replaced;
}
