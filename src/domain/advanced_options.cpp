// The advanced domain options, "advance_domain_conf" in requests and answers:
//
//   {"enable_advance_option": true, "kdc": "10.0.0.1", "netbios_name": "LAB", "fqdn_name": "lab.test",
//    "register_nics": ["eth0", "eth1"]}
//
// The switch and the interfaces are kept in smbinfo.conf. The other three go into the join's record and are read back
// from smb.conf, where the join puts them.

#include <cstdio>
#include <cstring>

#include "src/domain.h"
#include "src/domain/smbinfo.h"
#include "src/support/json_access.h"
#include "src/support/log.h"

namespace {

constexpr const char* kSwitchKey = "advanced_domain_option";
constexpr const char* kNicsKey = "register nic";
constexpr const char* kAllNics = "all";  // to the client; in the file, no key means all interfaces

// A key of smb.conf; empty when it can't be read.
std::string SmbConfText(const char* key) {
    char value[128] = {};
    const bool found = VLIBCFileGetKeyValue(kSmbConf, key, value, sizeof(value), 0) > 0;
    return found ? value : "";
}

// A member of the options as a text, cut to fit the zeroed field; a missing one leaves it empty.
template <std::size_t Size>
void FillField(char (&field)[Size], const Json::Value& options, const char* key) {
    std::memset(field, 0, Size);
    std::strncpy(field, options[key].asString().c_str(), Size - 1);
}

// False when no temporary name was to be had. What becomes of the writing and the rename is not looked at.
bool RewriteSmbInfo(const StringHash& hash) {
    char temporary[4095] = {};
    if (VLIBCFileITmpName(kSmbInfoConf, temporary, sizeof(temporary)) == -1) {
        return false;
    }
    VLIBCFileAddSection(temporary, kGlobalSection, hash.get(), kSmbLineFormat);
    VLIBCSysRename(temporary, kSmbInfoConf);
    return true;
}

}  // namespace

void DomainServiceHandler::InitDomainAdvData(Json::Value& data) {
    data["kdc"] = "";
    data["netbios_name"] = "";
    data["fqdn_name"] = "";
    data["register_nics"] = Json::Value(Json::arrayValue);
    data["enable_advance_option"] = false;
}

bool DomainServiceHandler::LoadDomainAdvData(Json::Value& data) {
    InitDomainAdvData(data);
    StringHash hash;
    if (!hash) {
        syslog(LOG_ERR, "%s:%d cannot alloc memory", kDomainUnit, LOG_NUMBER(kAdvancedOptions));
        SetError(kSystemError);
        return false;
    }
    LoadSmbInfo(hash);
    data["enable_advance_option"] = IsYes(hash.get(), kSwitchKey);
    data["kdc"] = SmbConfText("password server");
    data["netbios_name"] = SmbConfText("workgroup");
    std::string realm = SmbConfText("realm");
    if (realm == "*") {
        realm.clear();
    }
    data["fqdn_name"] = realm;
    convertNICtoJsonArray(VLIBCSzHashGetValue(hash.get(), kNicsKey), data["register_nics"]);
    return true;
}

bool DomainServiceHandler::IsDomainAdvOptEnable() {
    StringHash hash;
    if (!hash) {
        syslog(LOG_ERR, "%s:%d cannot alloc memory", kDomainUnit, LOG_NUMBER(kAdvancedOptions));
        return false;
    }
    LoadSmbInfo(hash);
    return IsYes(hash.get(), kSwitchKey);
}

bool DomainServiceHandler::convertNICtoJsonArray(const char* list, Json::Value& nics) {
    nics = Json::Value(Json::arrayValue);
    if (list == nullptr || *list == '\0') {
        nics.append(kAllNics);
        return true;
    }
    char copy[128] = {};
    std::strncpy(copy, list, sizeof(copy) - 1);
    char* piece = copy;
    while (char* comma = std::strchr(piece, ',')) {
        *comma = '\0';
        nics.append(piece);
        piece = comma + 1;
    }
    nics.append(piece);
    return true;
}

bool DomainServiceHandler::convertNICtoString(const Json::Value& nics, std::string& list) {
    list.clear();
    for (Json::ArrayIndex i = 0; i < nics.size(); ++i) {
        const std::string nic = nics[i].asString();
        if (nic == kAllNics) {
            list.clear();
            return true;
        }
        if (i > 0) {
            list += ',';
        }
        list += nic;
    }
    return true;
}

bool DomainServiceHandler::SaveSMBOption(const Json::Value& options) {
    StringHash hash;
    if (!hash) {
        syslog(LOG_ERR, "%s:%d Cannot alloc memory", kDomainUnit, LOG_NUMBER(kAdvancedOptions));
        SetError(kSystemError);
        return false;
    }
    LoadSmbInfo(hash);

    bool stored = true;
    if (IsTrue(MemberOf(options, "enable_advance_option"))) {
        stored = VLIBCSzHashSetValue(hash.address(), kSwitchKey, "yes") >= 0;
    } else {
        VLIBCSzHashRemoveKey(hash.get(), kSwitchKey);
    }
    std::string nics;
    convertNICtoString(MemberOf(options, "register_nics"), nics);
    if (nics.empty()) {
        VLIBCSzHashRemoveKey(hash.get(), kNicsKey);
    } else {
        stored = stored && VLIBCSzHashSetValue(hash.address(), kNicsKey, nics.c_str()) >= 0;
    }
    if (!stored || !RewriteSmbInfo(hash)) {
        SetError(kSystemError);
        return false;
    }
    return true;
}

int DomainServiceHandler::RemoveSmbinfoKeys() {
    StringHash hash;
    if (!hash) {
        return -1;  // without a line or a code: the caller has its own
    }
    LoadSmbInfo(hash);
    // "no" and not removed, unlike in SaveSMBOption: the file then shows that the options were switched off.
    if (VLIBCSzHashSetValue(hash.address(), kSwitchKey, "no") < 0) {
        const PlatformError last;
        syslog(LOG_ERR, "%s:%d VLIBCSzHashSetValue() failed [0x%04X %s:%d]", kDomainUnit, LOG_NUMBER(kAdvancedOptions),
               last.Code(), last.file, last.line);
        SetError(kSystemError);
        return -1;
    }
    VLIBCSzHashRemoveKey(hash.get(), kNicsKey);
    if (!RewriteSmbInfo(hash)) {
        syslog(LOG_ERR, "%s:%d cannot store smbinfo.conf", kDomainUnit, LOG_NUMBER(kAdvancedOptions));
        SetError(kSystemError);
        return -1;
    }
    return 0;
}

bool DomainServiceHandler::SaveAdvanceDomain(_tag_VORN_WIN2_& record) {
    Json::Value options;
    if (request->HasParam("advance_domain_conf")) {
        options = request->GetParam("advance_domain_conf", Json::Value());
    }
    // A join that does not ask for advanced options switches them off.
    if (!IsTrue(MemberOf(options, "enable_advance_option"))) {
        if (RemoveSmbinfoKeys() < 0) {
            SetError(kSystemError);
            return false;
        }
        return true;
    }
    FillField(record.kdc, options, "kdc");
    FillField(record.netbiosName, options, "netbios_name");
    FillField(record.fqdn, options, "fqdn_name");
    return SaveSMBOption(options);
}
