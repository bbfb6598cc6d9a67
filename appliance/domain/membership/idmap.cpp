#include "appliance/domain/membership/idmap.h"

#include <algorithm>
#include <charconv>
#include <system_error>

#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

namespace {

constexpr unsigned kFirst = 1000000;  // below are the machine's own accounts and the default domain's
constexpr unsigned kSize = 1000000;
constexpr unsigned kLast = 2000000000;
constexpr char kDefaultRange[] = "3000-7999";
constexpr std::chrono::milliseconds kLockWait{5000};

std::string IdmapKey(const std::string& domain, const std::string& what) {
    return "idmap config " + domain + " : " + what;
}

bool ParseRange(const std::string& text, unsigned& low, unsigned& high) {
    const std::size_t dash = text.find('-');
    if (dash == std::string::npos) {
        return false;
    }
    const std::string first = Trim(text.substr(0, dash));
    const std::string last = Trim(text.substr(dash + 1));
    const auto one = std::from_chars(first.data(), first.data() + first.size(), low);
    const auto other = std::from_chars(last.data(), last.data() + last.size(), high);
    return one.ec == std::errc() && one.ptr == first.data() + first.size() && other.ec == std::errc() &&
           other.ptr == last.data() + last.size() && low <= high;
}

// The lowest start of a free range above all that the file knows.
unsigned NextFree(const ConfFile& conf) {
    unsigned next = kFirst;
    for (const auto& [key, value] : conf.Section("global")) {
        unsigned low = 0;
        unsigned high = 0;
        if (StartsWith(Lower(key), "idmap config") && ParseRange(value, low, high) && high >= next) {
            next = (high / kSize + 1) * kSize;
        }
    }
    return next;
}

}  // namespace

std::vector<std::pair<std::string, std::string>> MissingIdmapKeys(const ConfFile& conf,
                                                                  const std::vector<std::string>& domains) {
    std::vector<std::pair<std::string, std::string>> keys;
    if (!conf.Get("global", IdmapKey("*", "range"))) {
        keys.emplace_back(IdmapKey("*", "backend"), "tdb");
        keys.emplace_back(IdmapKey("*", "range"), kDefaultRange);
    }
    unsigned next = NextFree(conf);
    for (const std::string& name : domains) {
        const std::string domain = Upper(name);
        const bool odd = !IsNetbiosName(domain) || domain.find_first_of(": =#;[]") != std::string::npos;
        if (odd || conf.Get("global", IdmapKey(domain, "range")) || next >= kLast) {
            continue;
        }
        keys.emplace_back(IdmapKey(domain, "backend"), "rid");
        keys.emplace_back(IdmapKey(domain, "range"), std::to_string(next) + "-" + std::to_string(next + kSize - 1));
        next += kSize;
    }
    return keys;
}

bool EnsureIdmapRanges(const std::vector<std::string>& domains) {
    const std::optional<FileLock> lock = LockSmbConf(kLockWait);
    if (!lock) {
        throw std::system_error(errno, std::generic_category(), Path(kSmbConfLock));
    }
    ConfFile conf;
    if (const std::error_code error = ConfFile::Load(Path(kSmbConf), conf, false)) {
        throw std::system_error(error, Path(kSmbConf));
    }
    const auto keys = MissingIdmapKeys(conf, domains);
    for (const auto& [key, value] : keys) {
        conf.Set("global", key, value);
    }
    if (keys.empty()) {
        return false;
    }
    if (const std::error_code error = conf.Save(Path(kSmbConf))) {
        throw std::system_error(error, Path(kSmbConf));
    }
    return true;
}

bool IdmapRange(const ConfFile& conf, const std::string& domain, unsigned& low, unsigned& high) {
    const std::optional<std::string> range = conf.Get("global", IdmapKey(Upper(domain), "range"));
    return range && ParseRange(*range, low, high);
}

}  // namespace appliance
