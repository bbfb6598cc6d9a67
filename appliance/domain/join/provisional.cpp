#include "appliance/domain/join/provisional.h"

#include <sys/stat.h>

#include <cerrno>
#include <optional>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/kept_copy.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/settings.h"
#include "appliance/domain/membership/membership.h"
#include "appliance/platform/system/dns_servers.h"
#include "appliance/platform/system/resolv_conf.h"

namespace appliance {

namespace {

constexpr char kFormerTrust[] = "/usr/vorn/etc/private/trustdomain.kept";
constexpr char kSection[] = "global";
constexpr char kTrust[] = "trustdomain";
constexpr mode_t kSettingsMode = 0644;

void Remove(const std::string& path) {
    if (const std::error_code error = RemoveFile(Path(path)); error && error != std::errc::no_such_file_or_directory) {
        Log(LOG_WARNING, Path(path) + ": " + error.message());
    }
}

// False also when it is missing.
bool IsOlder(const std::string& path, Moment moment) {
    struct stat status {};
    return stat(Path(path).c_str(), &status) == 0 && WrittenAt(status) <= moment;
}

std::string Joined(const std::vector<std::string>& texts) {
    std::string joined;
    for (const std::string& text : texts) {
        joined += (joined.empty() ? "" : ",") + text;
    }
    return joined.empty() ? "none" : joined;
}

// Nothing when nothing is left changed.
std::string DnsChange() {
    const std::optional<KeptCopy> kept = ReadKeptCopy(Path(kResolvCopy));
    Content current;
    if (!kept || ReadContent(Path(kResolvConf), current) || current != kept->after) {
        return "";
    }
    return "the DNS servers are still " + Joined(Servers(*current)) +
           "; before the join: " + Joined(Servers(kept->before.value_or("")));
}

bool TrustIn(const Content& settings) {
    return TrustedDomainsEnabled(ConfFile(settings.value_or("")));
}

const char* Word(bool enabled) {
    return enabled ? "yes" : "no";
}

std::string TrustChange() {
    const std::optional<KeptCopy> kept = ReadKeptCopy(Path(kFormerTrust));
    if (!kept || TrustIn(kept->before) == TrustedDomainsEnabled()) {
        return "";
    }
    return std::string("the trusted-domain setting is still changed; before the join: ") + kTrust + "=" +
           Word(TrustIn(kept->before));
}

// What the settings are to be: as they were, or the key alone where somebody else has changed them meanwhile.
std::error_code PutBackTrust(const KeptCopy& kept, const Content& current) {
    const std::string path = Path(kSettings);
    if (current == kept.after) {
        return kept.before ? ReplaceFile(path, *kept.before, kSettingsMode) : RemoveFile(path);
    }
    ConfFile settings(current.value_or(""));
    if (const auto value = ConfFile(kept.before.value_or("")).Get(kSection, kTrust); !value) {
        settings.Remove(kSection, kTrust);
    } else if (!settings.Set(kSection, kTrust, *value)) {
        return std::make_error_code(std::errc::invalid_argument);
    }
    return settings.text() == current ? std::error_code() : settings.Save(path, kSettingsMode);
}

// The copy first: a setting that was changed must be one that the next start can name.
std::error_code SetTrust(const Content& current, bool enabled) {
    ConfFile settings(current.value_or(""));
    if (!settings.Set(kSection, kTrust, Word(enabled))) {
        return std::make_error_code(std::errc::invalid_argument);
    }
    if (const std::error_code error = WriteKeptCopy(Path(kFormerTrust), {current, settings.text()})) {
        Log(LOG_ERR, Path(kFormerTrust) + ": " + error.message());
        return error;
    }
    const std::error_code error = settings.Save(Path(kSettings), kSettingsMode);
    if (error) {
        Remove(kFormerTrust);
    }
    return error;
}

}  // namespace

std::error_code ChangeTrustSetting(bool enabled) {
    const std::optional<SettingsLock> lock = SettingsLock::Take();
    if (!lock) {
        return errno == EAGAIN ? std::make_error_code(std::errc::timed_out)
                               : std::error_code(errno, std::generic_category());
    }
    Content current;
    if (const std::error_code error = ReadContent(Path(kSettings), current)) {
        return error;
    }
    const std::optional<KeptCopy> kept = ReadKeptCopy(Path(kFormerTrust));
    if (kept && TrustIn(kept->before) == enabled) {
        // The copy goes last: while the setting is changed, the next start can name it.
        const std::error_code error = PutBackTrust(*kept, current);
        if (!error) {
            Remove(kFormerTrust);
        }
        return error;
    }
    return TrustIn(current) == enabled ? std::error_code() : SetTrust(current, enabled);
}

void KeepProvisionalChanges() {
    Remove(kFormerTrust);
    Remove(kResolvCopy);
}

std::vector<std::string> TakeProvisionalChanges(Moment before) {
    std::vector<std::string> changes;
    if (IsOlder(kResolvCopy, before)) {
        if (const std::string dns = DnsChange(); !dns.empty()) {
            changes.push_back(dns);
        }
        Remove(kResolvCopy);
    }
    if (IsOlder(kFormerTrust, before)) {
        if (const std::string trust = TrustChange(); !trust.empty()) {
            changes.push_back(trust);
        }
        Remove(kFormerTrust);
    }
    return changes;
}

}  // namespace appliance
