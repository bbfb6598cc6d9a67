#include <fcntl.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <vector>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/directory/domain_list.h"
#include "appliance/domain/directory/home_include.h"
#include "appliance/domain/membership/idmap.h"

namespace appliance {

namespace {

constexpr std::size_t kAccountBuffer = 65536;
constexpr mode_t kParentMode = 0755;
constexpr mode_t kHomeMode = 0700;

struct Account {
    uid_t uid = 0;
    gid_t gid = 0;
    std::string home;
};

std::string Reason(const std::string& what) {
    return what + ": " + strerror(errno);
}

std::string FindAccount(const std::string& user, Account& account) {
    if (!IsAccountName(user)) {
        return "that can't be the name of an account";
    }
    std::vector<char> buffer(kAccountBuffer);
    passwd entry{};
    passwd* found = nullptr;
    const int result = getpwnam_r(user.c_str(), &entry, buffer.data(), buffer.size(), &found);
    if (found == nullptr) {
        const bool unknown = result == 0 || result == ENOENT || result == ESRCH;
        return user + ": " + (unknown ? "no such account" : strerror(result));
    }
    account = {entry.pw_uid, entry.pw_gid, entry.pw_dir == nullptr ? "" : entry.pw_dir};
    return "";
}

bool IsDomainUser(uid_t uid) {
    Membership membership;
    ConfFile conf;
    if (ReadMembership(membership) || !membership.Joined() || ConfFile::Load(Path(kSmbConf), conf, false)) {
        return false;
    }
    const std::vector<KnownDomain> domains = LoadDomains(membership);
    return std::any_of(domains.begin(), domains.end(), [&](const KnownDomain& domain) {
        unsigned low = 0;
        unsigned high = 0;
        return IdmapRange(conf, domain.name, low, high) && uid >= low && uid <= high;
    });
}

bool IsEmptyFolder(int folder) {
    std::error_code error;
    return std::filesystem::is_empty("/proc/self/fd/" + std::to_string(folder), error) && !error;
}

// Opens the folder `name` in `parent`, made when it is missing. No symbolic link is followed.
FileDescriptor OpenFolder(int parent, const std::string& name, mode_t mode) {
    if (mkdirat(parent, name.c_str(), mode) != 0 && errno != EEXIST) {
        return {};
    }
    return FileDescriptor(openat(parent, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
}

}  // namespace

std::string MakeUserHome(const std::string& user) {
    Account account;
    if (const std::string reason = FindAccount(user, account); !reason.empty()) {
        return reason;
    }
    if (!IsDomainUser(account.uid)) {
        return user + " is no user of a domain";
    }
    std::vector<std::string> parts;
    for (const std::string& part : Split(account.home, "/")) {
        if (part == "." || part == "..") {
            return user + ": the home folder " + account.home + " is no plain path";
        }
        if (!part.empty()) {
            parts.push_back(part);
        }
    }
    if (parts.size() < 2 || account.home.front() != '/' || HasControlBytes(account.home)) {
        return user + ": " + account.home + " can't be a home folder";
    }
    const std::string root = Path("/");
    FileDescriptor folder(open(root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    for (std::size_t part = 0; folder && part + 1 < parts.size(); ++part) {
        folder = OpenFolder(folder.get(), parts[part], kParentMode);
    }
    if (folder) {
        folder = OpenFolder(folder.get(), parts.back(), kHomeMode);
    }
    struct stat status {};
    if (!folder || fstat(folder.get(), &status) != 0) {
        return Reason(account.home);
    }
    if (status.st_uid == account.uid) {
        return "";
    }
    // Just made, or left by a run that was cut short; anything else belongs to somebody else.
    if (status.st_uid != 0 || !IsEmptyFolder(folder.get())) {
        return account.home + " belongs to another account";
    }
    if (fchown(folder.get(), account.uid, account.gid) != 0 || fchmod(folder.get(), kHomeMode) != 0) {
        return Reason(account.home);
    }
    return "";
}

}  // namespace appliance
