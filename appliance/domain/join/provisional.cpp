#include "appliance/domain/join/provisional.h"

#include <sys/stat.h>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/platform/system/dns_servers.h"
#include "appliance/platform/system/resolv_conf.h"

namespace appliance {

namespace {

constexpr char kFormerTrust[] = "/usr/vorn/etc/private/trustdomain.kept";
constexpr std::size_t kLargest = 1 << 20;

std::string Read(const std::string& path) {
    std::string text;
    return ReadFile(Path(path), text, kLargest) ? "" : text;
}

void Remove(const std::string& path) {
    if (const std::error_code error = RemoveFile(Path(path)); error && error != std::errc::no_such_file_or_directory) {
        Log(LOG_WARNING, Path(path) + ": " + error.message());
    }
}

// False also when it is missing.
bool IsOlder(const std::string& path, std::time_t moment) {
    struct stat status {};
    return stat(Path(path).c_str(), &status) == 0 && status.st_mtime <= moment;
}

std::string Joined(const std::vector<std::string>& texts) {
    std::string joined;
    for (const std::string& text : texts) {
        joined += (joined.empty() ? "" : ",") + text;
    }
    return joined.empty() ? "none" : joined;
}

// The kept copy begins with a line of its own; then come the bytes of the file as it was, as many as that line says,
// and the bytes that it was changed to.
std::string DnsChange() {
    const std::string kept = Read(kResolvCopy);
    const std::string current = Read(kResolvConf);
    const std::size_t end = kept.find('\n');
    if (end == std::string::npos || current.empty() || kept.size() < end + 1 + current.size() ||
        kept.compare(kept.size() - current.size(), current.size(), current) != 0) {
        return "";
    }
    const std::string before = kept.substr(end + 1, kept.size() - current.size() - end - 1);
    return "the DNS servers are still " + Joined(Servers(current)) + "; before the join: " + Joined(Servers(before));
}

}  // namespace

void NoteTrustChange(const std::string& from, const std::string& to) {
    const std::string kept = Trim(Read(kFormerTrust));
    if (kept.empty() && from != to) {
        if (const std::error_code error = ReplaceFile(Path(kFormerTrust), from + "\n")) {
            Log(LOG_WARNING, Path(kFormerTrust) + ": " + error.message());
        }
    } else if (!kept.empty() && kept == to) {
        Remove(kFormerTrust);
    }
}

void KeepProvisionalChanges() {
    Remove(kFormerTrust);
    Remove(kResolvCopy);
}

std::vector<std::string> TakeProvisionalChanges(std::time_t before) {
    std::vector<std::string> changes;
    if (IsOlder(kResolvCopy, before)) {
        if (const std::string dns = DnsChange(); !dns.empty()) {
            changes.push_back(dns);
        }
        Remove(kResolvCopy);
    }
    if (IsOlder(kFormerTrust, before)) {
        changes.push_back("the trusted-domain setting is still changed; before the join: trustdomain=" +
                          Trim(Read(kFormerTrust)));
        Remove(kFormerTrust);
    }
    return changes;
}

}  // namespace appliance
