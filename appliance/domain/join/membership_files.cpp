#include "appliance/domain/join/membership_files.h"

#include <sys/stat.h>

#include <cerrno>
#include <functional>
#include <system_error>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/settings.h"
#include "appliance/domain/join/domain_keys.h"
#include "appliance/domain/join/join_status.h"
#include "appliance/domain/join/join_target.h"
#include "appliance/domain/join/winbind.h"
#include "appliance/domain/membership/kerberos.h"
#include "appliance/domain/membership/secrets.h"
#include "appliance/platform/system/dns_servers.h"

namespace appliance {

namespace {

constexpr std::size_t kLargestKeytab = 1 << 20;
constexpr std::size_t kLargestConf = 64 << 20;
constexpr mode_t kSecretMode = 0600;
constexpr mode_t kConfMode = 0644;
constexpr std::chrono::milliseconds kLockWait{5000};

void Check(const std::error_code& error, const std::string& path) {
    if (error) {
        throw std::system_error(error, path);
    }
}

bool Exists(const std::string& path) {
    struct stat status {};
    return stat(path.c_str(), &status) == 0;
}

std::string Read(const std::string& path, std::size_t limit = kLargestConf) {
    std::string text;
    Check(ReadFile(path, text, limit), path);
    return text;
}

// Makes `to` what `from` is; a missing source removes it.
void CopyFile(const std::string& from, const std::string& to) {
    if (!Exists(from)) {
        Check(RemoveFile(to), to);
        return;
    }
    std::string text = Read(from, kLargestKeytab);
    const std::error_code error = ReplaceFile(to, text, kSecretMode);
    explicit_bzero(text.data(), text.size());
    Check(error, to);
}

FileLock LockConf() {
    std::optional<FileLock> lock = LockSmbConf(kLockWait);
    if (!lock) {
        throw std::system_error(errno, std::generic_category(), Path(kSmbConfLock));
    }
    return std::move(*lock);
}

// Turns smb.conf from one text into another. When somebody else has changed it meanwhile, only the keys in which the
// two differ are changed.
void ChangeConf(const std::string& from, const std::string& to) {
    const FileLock lock = LockConf();
    const std::string current = Read(Path(kSmbConf));
    if (current == to) {
        return;
    }
    if (current == from) {
        Check(ReplaceFile(Path(kSmbConf), to, kConfMode), Path(kSmbConf));
        return;
    }
    ConfFile conf(current);
    TakeOver(ConfFile(from), ConfFile(to), conf);
    if (conf.text() != current) {
        Check(conf.Save(Path(kSmbConf)), Path(kSmbConf));
    }
}

SecretsOwner OwnerOf(const Membership& membership) {
    return {membership.domain, membership.realm, membership.machine};
}

// The staged keytab keeps former keys of the same realm, for tickets that clients still hold, but none of a realm that
// is left. A keytab that can't be read is of no use to anybody: the join makes a new one.
void DropForeignKeys(const Journal& journal) {
    const bool leaves = journal.before.realm != journal.after.realm;
    try {
        RemoveRealmFromKeytab(journal::StagedKeytab(), leaves ? journal.before.realm : "");
    } catch (const std::exception& error) {
        Log(LOG_WARNING, Path(kKeytab) + " is replaced by the join: " + error.what());
        WipeFile(journal::StagedKeytab());
    }
}

std::vector<SecretsOwner> Owners(const Journal& journal) {
    std::vector<SecretsOwner> owners = {OwnerOf(journal.after)};
    if (journal.before.DomainMode()) {
        owners.push_back(OwnerOf(journal.before));
    }
    return owners;
}

// Runs one step of what must go on whatever fails; a failure becomes a line.
void Attempt(std::vector<std::string>& failures, const std::string& what, const std::function<void()>& step) {
    try {
        step();
    } catch (const std::exception& error) {
        failures.push_back(what + ": " + error.what());
    }
}

void ResetOptions() {
    ConfFile options;
    Check(ConfFile::Load(Path(kSmbInfo), options), Path(kSmbInfo));
    const std::string before = options.text();
    if (options.Get("global", "advanced_domain_option")) {
        options.Set("global", "advanced_domain_option", "no");
    }
    options.Remove("global", "register nic");
    if (options.text() != before) {
        Check(options.Save(Path(kSmbInfo)), Path(kSmbInfo));
    }
}

}  // namespace

void PrepareJoin(const Journal& journal, const std::string& controller) {
    MakeJournalFolder();
    const std::string old = Read(Path(kSmbConf));
    Check(ReplaceFile(journal::OldConf(), old), journal::OldConf());
    CopySecrets(Path(kSecrets), journal::OldSecrets());
    CopyFile(Path(kKeytab), journal::OldKeytab());
    CopyFile(journal::FormerKeysFile(), journal::OldFormerKeys());

    FormerKeys former;
    if (Exists(journal::OldFormerKeys())) {
        former = ParseFormerKeys(Read(journal::OldFormerKeys()));
    }
    ConfFile conf(old);
    if (!WriteDomainKeys(journal.after, TrustedDomainsEnabled(), conf, former)) {
        throw JoinError(status::kSystem, "a value can't be written to smb.conf");
    }
    Check(ReplaceFile(journal::NewConf(), conf.text()), journal::NewConf());
    Check(ReplaceFile(journal::NewFormerKeys(), FormatFormerKeys(former)), journal::NewFormerKeys());

    // The copy of the secrets keeps the machine's own SID in the staged join.
    CopySecrets(journal::OldSecrets(), journal::StagedSecrets());
    CopyFile(journal::OldKeytab(), journal::StagedKeytab());
    DropForeignKeys(journal);
    for (const auto& [key, value] : PrivateWorld(journal::Staging())) {
        conf.Set("global", key, value);
    }
    conf.Set("global", "password server", controller);
    Check(ReplaceFile(journal::StagedConf(), conf.text()), journal::StagedConf());
    WriteJournal(journal);
}

void RefreshOldSecrets() {
    CopySecrets(Path(kSecrets), journal::OldSecrets());
}

void PutInPlace(const Journal& journal) {
    ReplaceSecrets(Path(kSecrets), journal::StagedSecrets(), Owners(journal));
    CopyFile(journal::StagedKeytab(), Path(kKeytab));
    CopyFile(journal::NewFormerKeys(), journal::FormerKeysFile());
    ChangeConf(Read(journal::OldConf()), Read(journal::NewConf()));
}

void AdoptStagedSecret(const Journal& journal) {
    ReplaceSecrets(Path(kSecrets), journal::StagedSecrets(), {OwnerOf(journal.after)});
    if (Exists(journal::StagedKeytab())) {
        CopyFile(journal::StagedKeytab(), Path(kKeytab));
    }
}

std::vector<std::string> PutBack(const Journal& journal) {
    std::vector<std::string> failures;
    Attempt(failures, "smb.conf", [] { ChangeConf(Read(journal::NewConf()), Read(journal::OldConf())); });
    Attempt(failures, "the record of former keys",
            [] { CopyFile(journal::OldFormerKeys(), journal::FormerKeysFile()); });
    if (!journal.keepNewSecret) {
        Attempt(failures, "the secrets",
                [&journal] { ReplaceSecrets(Path(kSecrets), journal::OldSecrets(), Owners(journal)); });
        Attempt(failures, "the keytab", [] { CopyFile(journal::OldKeytab(), Path(kKeytab)); });
    }
    return failures;
}

namespace {

// The journal itself comes last: until then a join's is still true, which needs none of these on the way back.
void WriteLeave(const Journal& journal, const std::string& workgroup) {
    const std::string old = Read(Path(kSmbConf));
    FormerKeys former;
    if (Exists(journal::FormerKeysFile())) {
        former = ParseFormerKeys(Read(journal::FormerKeysFile()));
    }
    ConfFile conf(old);
    if (!WriteWorkgroupKeys(workgroup, former, conf)) {
        throw JoinError(status::kWorkgroup, "a value can't be written to smb.conf");
    }
    Check(ReplaceFile(journal::OldConf(), old), journal::OldConf());
    Check(ReplaceFile(journal::NewConf(), conf.text()), journal::NewConf());
    WriteJournal(journal);
}

}  // namespace

void PrepareLeave(const Journal& journal, const std::string& workgroup) {
    MakeJournalFolder();
    WriteLeave(journal, workgroup);
}

Journal TurnIntoLeave(const Journal& journal, const std::string& workgroup) {
    Journal leave;
    leave.phase = Journal::Phase::Leaving;
    leave.before = journal.before;
    leave.after = journal.before;
    leave.after.kind = DomainKind::Workgroup;
    leave.after.domain = workgroup;
    WriteLeave(leave, workgroup);
    return leave;
}

std::vector<std::string> ClearMembership(const Journal& journal) {
    ChangeConf(Read(journal::OldConf()), Read(journal::NewConf()));
    std::vector<std::string> failures;
    Attempt(failures, "the machine account's secret",
            [&journal] { ReplaceSecrets(Path(kSecrets), "", {OwnerOf(journal.before)}); });
    if (!journal.before.realm.empty()) {
        Attempt(failures, "the keytab", [&journal] { RemoveRealmFromKeytab(Path(kKeytab), journal.before.realm); });
    }
    Attempt(failures, "the record of former keys",
            [] { Check(RemoveFile(journal::FormerKeysFile()), journal::FormerKeysFile()); });
    Attempt(failures, "the caches", [] { RemoveDomainCaches(); });
    if (const std::string error = ForgetDnsServers(); !error.empty()) {
        failures.push_back("domain_dns: " + error);
    }
    if (journal.resetOptions) {
        Attempt(failures, "the advanced options", [] { ResetOptions(); });
    }
    return failures;
}

std::string RecordDnsServers() {
    std::vector<std::string> servers;
    if (ReadDnsServers(servers)) {
        return "the DNS servers in use can't be read";
    }
    std::string list;
    for (const std::string& server : servers) {
        list += (list.empty() ? "" : ",") + server;
    }
    const std::error_code error = SetSetting("domain_dns", list);
    return error ? Path(kSettings) + ": " + error.message() : "";
}

std::string ForgetDnsServers() {
    const std::error_code error = RemoveSetting("domain_dns");
    return error ? Path(kSettings) + ": " + error.message() : "";
}

}  // namespace appliance
