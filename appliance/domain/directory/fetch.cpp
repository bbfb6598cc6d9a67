#include "appliance/domain/directory/fetch.h"

#include <unistd.h>

#include <chrono>
#include <deque>
#include <system_error>

#include "appliance/base/conf_file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "appliance/base/text.h"
#include "appliance/domain/directory/domain_list.h"
#include "appliance/domain/directory/fetch_source.h"
#include "appliance/domain/directory/list_writer.h"
#include "appliance/domain/directory/utf8.h"
#include "appliance/domain/directory/worker.h"
#include "appliance/domain/membership/idmap.h"

namespace appliance {

namespace {

constexpr Patience kPatience{std::chrono::seconds(45), std::chrono::minutes(30)};
// While other domains wait for their turn.
constexpr std::chrono::seconds kShortSilence{10};

// The pid file of a fetch that runs, gone when it ends. A killed one leaves its file, which then names nobody.
class PidFile {
public:
    explicit PidFile(const std::string& path) : path_(path), written_(WritePidFile(path)) {}
    ~PidFile() {
        if (written_ && ReadPidFile(path_) == getpid()) {
            unlink(path_.c_str());
        }
    }
    PidFile(const PidFile&) = delete;
    PidFile& operator=(const PidFile&) = delete;

    bool written() const {
        return written_;
    }

private:
    std::string path_;
    bool written_;
};

// "users" or "groups", for log lines.
std::string Plural(EntryKind kind) {
    return std::string(KindName(kind)) + "s";
}

// What the fetch needs to know besides the names of the domains.
struct Setting {
    Membership membership;
    ConfFile conf;
    bool useRpc = false;
    bool newRanges = false;
    std::vector<KnownDomain> domains;
};

void ReadConf(ConfFile& conf) {
    if (const std::error_code error = ConfFile::Load(Path(kSmbConf), conf, false)) {
        throw DirectoryError(ErrorCode::FileRead, Path(kSmbConf) + ": " + error.message());
    }
}

// A domain that came into sight after the join has no range of ids yet.
void GiveRanges(const std::vector<std::string>& wanted, Setting& setting) {
    std::vector<std::string> names;
    for (const std::string& name : wanted) {
        const std::optional<KnownDomain> domain = FindDomain(setting.domains, name);
        unsigned low = 0;
        unsigned high = 0;
        if (domain && !IdmapRange(setting.conf, domain->name, low, high)) {
            names.push_back(domain->name);
        }
    }
    if (names.empty()) {
        return;
    }
    try {
        setting.newRanges = EnsureIdmapRanges(names);
        ReadConf(setting.conf);
    } catch (const std::system_error& error) {
        Log(LOG_ERR, std::string("no ranges of ids for new domains: ") + error.what());
    }
}

Setting ReadSetting(const std::vector<std::string>& wanted) {
    Setting setting;
    if (const std::error_code error = ReadMembership(setting.membership)) {
        throw DirectoryError(ErrorCode::FileRead, Path(kSmbConf) + ": " + error.message());
    }
    if (!setting.membership.Joined()) {
        throw DirectoryError(ErrorCode::NotMember, "the appliance is no member of a domain");
    }
    ReadConf(setting.conf);
    ConfFile options;
    if (const std::error_code error = ConfFile::Load(Path(kSmbInfo), options)) {
        Log(LOG_WARNING, Path(kSmbInfo) + ": " + error.message());
    }
    setting.useRpc = options.Get("global", "enable nt4 enum").value_or("") == "yes";
    setting.domains = LoadDomains(setting.membership);
    for (const std::string& name : wanted) {
        if (!FindDomain(setting.domains, name)) {
            setting.domains = ListDomains(setting.membership);
            break;
        }
    }
    GiveRanges(wanted, setting);
    return setting;
}

FetchDomain DomainOf(const Setting& setting, const std::string& name) {
    const std::optional<KnownDomain> known = FindDomain(setting.domains, name);
    if (!known || !IsListDomain(known->name)) {
        throw DirectoryError(ErrorCode::NotFound, "the domain is not in sight");
    }
    FetchDomain domain;
    domain.name = known->name;
    domain.dns = known->dns;
    domain.own = known->own;
    domain.useRpc = setting.useRpc;
    unsigned low = 0;
    unsigned high = 0;
    if (IdmapRange(setting.conf, domain.name, low, high)) {
        domain.range.emplace(low, high);
    } else {
        Log(LOG_WARNING, domain.name + " has no range of ids; its accounts are listed without any");
    }
    return domain;
}

// The child's part: fetch, and put the list in place when it is complete.
Json::Value FetchInChild(EntryKind kind, const FetchDomain& domain, const Membership& membership,
                         ProgressReport& report) {
    ListWriter writer(kind, domain.name);
    const bool rpc = domain.dns.empty() || domain.useRpc;
    const std::string controller = rpc ? FetchByRpc(kind, domain, membership, writer, report)
                                       : FetchByLdap(kind, domain, membership, writer, report);
    if (!writer.Publish(rpc ? "rpc" : "ldap", controller)) {
        throw DirectoryError(ErrorCode::BadData, controller + " lists no " + Plural(kind) + ", which can't be right");
    }
    Json::Value result;
    result["count"] = writer.count();
    result["refused"] = writer.refused();
    result["controller"] = controller;
    return result;
}

void FetchOne(EntryKind kind, const FetchDomain& domain, const Membership& membership, const Patience& patience,
              FetchProgress& progress) {
    const auto started = std::chrono::steady_clock::now();
    const Json::Value result = RunWorker(
        patience, [&](ProgressReport& report) { return FetchInChild(kind, domain, membership, report); },
        [&](std::int64_t count) { progress.Count(count); });
    const auto took =
        std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() - started).count();
    progress.Count(result["count"].asInt64());
    Log(LOG_INFO, domain.name + ": " + std::to_string(result["count"].asInt64()) + " " + Plural(kind) + " from " +
                      result["controller"].asString() + " in " + std::to_string(took) + " ms");
    if (result["refused"].asInt64() > 0) {
        Log(LOG_WARNING, domain.name + ": " + std::to_string(result["refused"].asInt64()) + " " + Plural(kind) +
                             " left out, with control characters or no UTF-8 in their names");
    }
}

void KeepOldList(EntryKind kind, const std::string& name, const DirectoryError& error) {
    Log(LOG_ERR, name + ": " + Plural(kind) + " not fetched, the last list stays: " + error.what());
    // A refresh of all domains begins with the removal of the links; the list that stays gets its own again.
    if (IsListDomain(name) && !LinkList(kind, name)) {
        Log(LOG_ERR, "cannot write " + ListLinkPath(kind, name));
    }
}

// A domain that is silent lets the others go first, and has its full time behind them.
void FetchInTurn(EntryKind kind, const std::vector<std::string>& domains, const Setting& setting,
                 FetchProgress& progress, FetchResult& result) {
    struct Turn {
        std::string name;
        bool again;
    };
    std::deque<Turn> turns;
    for (const std::string& name : domains) {
        turns.push_back({name, false});
    }
    while (!turns.empty()) {
        const Turn turn = turns.front();
        turns.pop_front();
        const bool othersWait = !turn.again && !turns.empty();
        const Patience patience{othersWait ? kShortSilence : kPatience.silence, kPatience.overall};
        progress.Begin(turn.name);
        const auto begun = std::chrono::steady_clock::now();
        try {
            FetchOne(kind, DomainOf(setting, turn.name), setting.membership, patience, progress);
            ++result.stored;
        } catch (const DirectoryError& error) {
            const bool silent =
                error.code() == ErrorCode::TimedOut && std::chrono::steady_clock::now() - begun < patience.overall;
            if (silent && othersWait) {
                Log(LOG_NOTICE, turn.name + ": " + Plural(kind) + ": " + error.what() + "; the other domains go first");
                turns.push_back({turn.name, true});
                continue;
            }
            result.code = error.code();
            progress.Fail(error.what());
            KeepOldList(kind, turn.name, error);
        }
        progress.End();
    }
}

}  // namespace

std::string FetchPidFile(EntryKind kind) {
    return Path(kind == EntryKind::User ? kUserPid : kGroupPid);
}

FetchResult FetchDirectory(EntryKind kind, const std::vector<std::string>& domains) {
    FetchResult result;
    const PidFile pidFile(FetchPidFile(kind));
    if (!pidFile.written()) {
        const int running = ReadPidFile(FetchPidFile(kind));
        result.code = running >= 0 ? ErrorCode::FileLock : ErrorCode::FileWrite;
        Log(running >= 0 ? LOG_NOTICE : LOG_ERR,
            running >= 0 ? "process " + std::to_string(running) + " fetches the domain " + Plural(kind) + " already"
                         : "cannot write " + FetchPidFile(kind));
        return result;
    }
    Setting setting;
    try {
        setting = ReadSetting(domains);
    } catch (const DirectoryError& error) {
        result.code = error.code();
        Log(LOG_ERR, "domain " + Plural(kind) + " not fetched: " + error.what());
        return result;
    }
    result.started = true;
    RemoveUnfinishedLists(kind);
    result.newRanges = setting.newRanges;
    FetchProgress progress(kind, static_cast<int>(domains.size()));
    FetchInTurn(kind, domains, setting, progress, result);
    result.failures = progress.failures();
    return result;
}

}  // namespace appliance
