#include "appliance/domain/join/domain_keys.h"

#include <json/json.h>

#include <array>
#include <memory>
#include <set>
#include <utility>
#include <vector>

#include "appliance/base/text.h"
#include "appliance/domain/membership/idmap.h"

namespace appliance {

namespace {

constexpr char kGlobal[] = "global";

// Without these a member works badly or not at all; a value that is there already is the administrator's.
constexpr std::array<std::pair<const char*, const char*>, 3> kNeeded = {{
    {"winbind enum users", "yes"},
    {"winbind enum groups", "yes"},
    {"winbind scan trusted domains", "yes"},
}};

// Remembers and changes the keys of one file.
class Editor {
public:
    Editor(ConfFile& conf, FormerKeys& former) : conf_(conf), former_(former) {}

    void Set(const std::string& key, const std::string& value) {
        const std::optional<std::string> present = conf_.Get(kGlobal, key);
        if (present == value) {
            return;
        }
        Remember(key, present);
        good_ = conf_.Set(kGlobal, key, value) && good_;
    }
    void SetWhenAbsent(const std::string& key, const std::string& value) {
        if (!conf_.Get(kGlobal, key)) {
            Set(key, value);
        }
    }
    void Remove(const std::string& key) {
        if (const std::optional<std::string> present = conf_.Get(kGlobal, key)) {
            Remember(key, present);
            conf_.Remove(kGlobal, key);
        }
    }
    bool Good() const {
        return good_;
    }

private:
    void Remember(const std::string& key, const std::optional<std::string>& value) {
        for (const auto& entry : former_) {
            if (SameKey(entry.first, key)) {
                return;
            }
        }
        former_.emplace(key, value);
    }

    ConfFile& conf_;
    FormerKeys& former_;
    bool good_ = true;
};

bool IsYes(const std::optional<std::string>& value) {
    return value && (EqualIgnoringCase(*value, "yes") || EqualIgnoringCase(*value, "true") || *value == "1");
}

// The domain in "idmap config DOMAIN : what"; empty when the key is another or stands for the default domain.
std::string IdmapDomain(const std::string& key) {
    constexpr std::string_view kBeginning = "idmap config";
    const std::size_t colon = key.find(':');
    if (colon == std::string::npos || !StartsWith(Lower(key), kBeginning)) {
        return "";
    }
    const std::string domain = Trim(std::string_view(key).substr(kBeginning.size(), colon - kBeginning.size()));
    return domain == "*" ? "" : domain;
}

bool IsFormer(const FormerKeys& former, const std::string& key) {
    for (const auto& entry : former) {
        if (SameKey(entry.first, key)) {
            return true;
        }
    }
    return false;
}

}  // namespace

bool WriteDomainKeys(const Membership& membership, bool trustedDomains, ConfFile& conf, FormerKeys& former) {
    Editor editor(conf, former);
    const bool ads = membership.kind == DomainKind::ActiveDirectory;
    // Remembered for every membership: it says which ranges were the administrator's.
    const bool first = former.empty();
    for (const auto& [key, value] : conf.Section(kGlobal)) {
        if (first && !IdmapDomain(key).empty()) {
            former.emplace(key, value);
        }
    }
    editor.Set("workgroup", membership.domain);
    editor.Set("security", ads ? "ads" : "domain");
    if (const auto role = conf.Get(kGlobal, "server role");
        role && !EqualIgnoringCase(*role, "auto") && !SameKey(*role, "member server")) {
        editor.Set("server role", "member server");
    }
    if (ads) {
        editor.Set("realm", membership.realm);
        editor.SetWhenAbsent("kerberos method", "secrets and keytab");
    } else {
        editor.Remove("realm");
        if (IsYes(conf.Get(kGlobal, "disable netbios"))) {
            editor.Set("disable netbios", "no");
        }
    }
    if (membership.passwordServer.empty()) {
        editor.Remove("password server");
    } else {
        editor.Set("password server", membership.passwordServer);
    }
    if (!trustedDomains) {
        editor.Set("allow trusted domains", "no");
    } else if (conf.Get(kGlobal, "allow trusted domains")) {
        editor.Set("allow trusted domains", "yes");
    }
    for (const auto& [key, value] : kNeeded) {
        editor.SetWhenAbsent(key, value);
    }
    for (const auto& [key, value] : MissingIdmapKeys(conf, {membership.domain})) {
        editor.Set(key, value);
    }
    return editor.Good();
}

bool WriteWorkgroupKeys(const std::string& workgroup, const FormerKeys& former, ConfFile& conf) {
    std::vector<std::string> ranges;
    for (const auto& entry : conf.Section(kGlobal)) {
        if (!IdmapDomain(entry.first).empty() && !IsFormer(former, entry.first)) {
            ranges.push_back(entry.first);
        }
    }
    for (const std::string& key : ranges) {
        conf.Remove(kGlobal, key);
    }
    conf.Remove(kGlobal, "realm");
    conf.Remove(kGlobal, "password server");
    bool good = true;
    for (const auto& [key, value] : former) {
        if (value) {
            good = (conf.Get(kGlobal, key) == value || conf.Set(kGlobal, key, *value)) && good;
        } else {
            conf.Remove(kGlobal, key);
        }
    }
    return conf.Set(kGlobal, "security", "user") && conf.Set(kGlobal, "workgroup", workgroup) && good;
}

void TakeOver(const ConfFile& from, const ConfFile& to, ConfFile& conf) {
    std::set<std::string> keys;
    for (const ConfFile* file : {&from, &to}) {
        for (const auto& entry : file->Section(kGlobal)) {
            keys.insert(entry.first);
        }
    }
    for (const std::string& key : keys) {
        const std::optional<std::string> wanted = to.Get(kGlobal, key);
        if (from.Get(kGlobal, key) == wanted || conf.Get(kGlobal, key) == wanted) {
            continue;
        }
        if (wanted) {
            conf.Set(kGlobal, key, *wanted);
        } else {
            conf.Remove(kGlobal, key);
        }
    }
}

std::string FormatFormerKeys(const FormerKeys& former) {
    Json::Value object(Json::objectValue);
    for (const auto& [key, value] : former) {
        object[key] = value ? Json::Value(*value) : Json::Value();
    }
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "    ";
    return Json::writeString(builder, object) + "\n";
}

FormerKeys ParseFormerKeys(const std::string& text) {
    FormerKeys former;
    Json::Value object;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    try {
        if (!reader->parse(text.data(), text.data() + text.size(), &object, nullptr) || !object.isObject()) {
            return former;
        }
    } catch (const Json::Exception&) {
        return former;
    }
    for (const std::string& key : object.getMemberNames()) {
        const Json::Value& value = object[key];
        if (value.isString() && IsWritableKey(key) && IsWritableValue(value.asString())) {
            former.emplace(key, value.asString());
        } else if (value.isNull()) {
            former.emplace(key, std::nullopt);
        }
    }
    return former;
}

}  // namespace appliance
