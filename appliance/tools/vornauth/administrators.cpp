#include "appliance/tools/vornauth/administrators.h"

#include <grp.h>
#include <pwd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <memory>
#include <optional>
#include <vector>

#include "appliance/base/paths.h"

namespace appliance::auth {
namespace {

constexpr std::size_t kMostBytes = std::size_t{1} << 22;  // a group may have many members

struct Group {
    gid_t id = 0;
    std::vector<std::string> members;
};

struct CloseFile {
    void operator()(std::FILE* file) const {
        std::fclose(file);
    }
};

std::optional<Group> LocalGroup(const std::string& name) {
    const std::unique_ptr<std::FILE, CloseFile> file(std::fopen(Path("/etc/group").c_str(), "re"));
    std::vector<char> buffer(std::size_t{1} << 16);
    while (file != nullptr) {
        group entry{};
        group* found = nullptr;
        const long place = std::ftell(file.get());
        const int error = fgetgrent_r(file.get(), &entry, buffer.data(), buffer.size(), &found);
        if (error == ERANGE && buffer.size() < kMostBytes) {
            buffer.resize(2 * buffer.size());
            std::fseek(file.get(), place, SEEK_SET);
            continue;
        }
        if (error != 0 || found == nullptr) {
            break;
        }
        if (name == found->gr_name) {
            Group group{found->gr_gid, {}};
            for (char** member = found->gr_mem; *member != nullptr; ++member) {
                group.members.emplace_back(*member);
            }
            return group;
        }
    }
    return std::nullopt;
}

// The primary group of a user that the system knows.
std::optional<gid_t> PrimaryGroup(const std::string& user) {
    std::vector<char> buffer(std::size_t{1} << 14);
    passwd entry{};
    passwd* found = nullptr;
    int error = 0;
    while ((error = getpwnam_r(user.c_str(), &entry, buffer.data(), buffer.size(), &found)) == ERANGE &&
           buffer.size() < kMostBytes) {
        buffer.resize(2 * buffer.size());
    }
    return error == 0 && found != nullptr ? std::optional(found->pw_gid) : std::nullopt;
}

std::vector<gid_t> GroupsOf(const std::string& user, gid_t primary) {
    std::vector<gid_t> groups(64);
    int count = static_cast<int>(groups.size());
    // Told how many there are, it takes a second turn; a third when one came meanwhile.
    for (int turn = 0; turn < 3; ++turn) {
        if (getgrouplist(user.c_str(), primary, groups.data(), &count) >= 0) {
            groups.resize(static_cast<std::size_t>(count));
            return groups;
        }
        groups.resize(static_cast<std::size_t>(count));
    }
    return {primary};
}

bool Holds(const std::vector<gid_t>& groups, gid_t id) {
    return std::find(groups.begin(), groups.end(), id) != groups.end();
}

}  // namespace

bool IsUser(const std::string& user) {
    return PrimaryGroup(user).has_value();
}

bool IsAdministrator(const std::string& user) {
    const std::optional<Group> group = LocalGroup(kAdministrators);
    const std::optional<gid_t> primary = PrimaryGroup(user);
    if (!group || !primary) {
        return false;
    }
    return *primary == group->id ||
           std::find(group->members.begin(), group->members.end(), user) != group->members.end() ||
           Holds(GroupsOf(user, *primary), group->id);
}

}  // namespace appliance::auth
