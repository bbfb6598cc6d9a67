#include "appliance/domain/membership/membership.h"

#include <unistd.h>

#include <array>
#include <cerrno>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/membership/secrets.h"

namespace appliance {

namespace {

constexpr std::size_t kNetbiosNameLength = 15;

// The file-sharing service's own default for "netbios name": the host's name up to its first dot.
std::string HostNetbiosName() {
    std::array<char, 256> host{};
    if (gethostname(host.data(), host.size() - 1) != 0) {
        return "";
    }
    const std::string name(host.data());
    return Upper(name.substr(0, name.find('.')).substr(0, kNetbiosNameLength));
}

}  // namespace

std::error_code ReadMembership(Membership& membership) {
    ConfFile conf;
    if (const std::error_code error = ConfFile::Load(Path(kSmbConf), conf, false)) {
        return error;
    }
    membership = MembershipOf(conf);
    if (membership.domain.empty()) {
        return std::make_error_code(std::errc::invalid_argument);
    }
    membership.hasSecret = membership.DomainMode() && HasMachineSecret(Path(kSecrets), membership.domain);
    return {};
}

Membership MembershipOf(const ConfFile& conf) {
    Membership membership;
    const std::string security = Lower(conf.Get("global", "security").value_or(""));
    if (security == "ads") {
        membership.kind = DomainKind::ActiveDirectory;
    } else if (security == "domain") {
        membership.kind = DomainKind::Nt4;
    }
    membership.domain = conf.Get("global", "workgroup").value_or("");
    if (membership.kind == DomainKind::ActiveDirectory) {
        membership.realm = Upper(conf.Get("global", "realm").value_or(""));
    }
    membership.machine = Upper(conf.Get("global", "netbios name").value_or(""));
    if (membership.machine.empty()) {
        membership.machine = HostNetbiosName();
    }
    membership.passwordServer = conf.Get("global", "password server").value_or("");
    return membership;
}

bool TrustedDomainsEnabled() {
    ConfFile settings;
    return ConfFile::Load(Path(kSettings), settings) || TrustedDomainsEnabled(settings);
}

bool TrustedDomainsEnabled(const ConfFile& settings) {
    return !EqualIgnoringCase(settings.Get("global", "trustdomain").value_or("yes"), "no");
}

std::optional<FileLock> LockSmbConf(std::chrono::milliseconds wait) {
    // Whoever comes first after a start of the machine makes the folder: cron's programs may come before the server.
    if (const std::error_code error = MakeFolder(Path(kRun), 0755)) {
        errno = error.value();
        return std::nullopt;
    }
    return FileLock::Take(Path(kSmbConfLock), wait);
}

}  // namespace appliance
