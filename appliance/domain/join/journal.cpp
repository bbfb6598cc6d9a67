#include "appliance/domain/join/journal.h"

#include <fcntl.h>
#include <json/json.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <filesystem>
#include <memory>
#include <system_error>
#include <vector>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"

namespace appliance {

namespace {

constexpr mode_t kFolderMode = 0700;
constexpr mode_t kFileMode = 0600;
constexpr std::size_t kLargestJournal = 1 << 20;

constexpr std::array kPhases = {"prepared", "joining",   "joined",       "swapping",
                                "swapped",  "confirmed", "putting back", "leaving"};
constexpr std::array kAccounts = {"absent", "present", "unknown"};
constexpr std::array kKinds = {"workgroup", "ads", "domain"};

std::string JournalFile() {
    return journal::Folder() + "/journal.json";
}

template <typename Enum, std::size_t size>
bool FromName(const std::array<const char*, size>& names, const std::string& name, Enum& value) {
    const auto* place = std::find(names.begin(), names.end(), name);
    value = static_cast<Enum>(place - names.begin());
    return place != names.end();
}

Json::Value FormatMembership(const Membership& membership) {
    Json::Value object(Json::objectValue);
    object["kind"] = kKinds[static_cast<std::size_t>(membership.kind)];
    object["secret"] = membership.hasSecret;
    object["domain"] = membership.domain;
    object["realm"] = membership.realm;
    object["machine"] = membership.machine;
    object["password server"] = membership.passwordServer;
    return object;
}

bool ParseMembership(const Json::Value& object, Membership& membership) {
    if (!object.isObject() || !FromName(kKinds, object["kind"].asString(), membership.kind)) {
        return false;
    }
    membership.hasSecret = object["secret"].asBool();
    membership.domain = object["domain"].asString();
    membership.realm = object["realm"].asString();
    membership.machine = object["machine"].asString();
    membership.passwordServer = object["password server"].asString();
    return true;
}

}  // namespace

bool Journal::EqualDomain() const {
    return before.kind == after.kind && EqualIgnoringCase(before.domain, after.domain);
}

namespace journal {
std::string Folder() {
    return Path(kJoinJournal);
}
std::string Staging() {
    return Folder() + "/staging";
}
std::string OldConf() {
    return Folder() + "/old.smb.conf";
}
std::string NewConf() {
    return Folder() + "/new.smb.conf";
}
std::string OldSecrets() {
    return Folder() + "/old.secrets.tdb";
}
std::string OldKeytab() {
    return Folder() + "/old.keytab";
}
std::string OldFormerKeys() {
    return Folder() + "/old.former_keys.json";
}
std::string NewFormerKeys() {
    return Folder() + "/new.former_keys.json";
}
std::string StagedSecrets() {
    return Staging() + "/secrets.tdb";
}
std::string StagedKeytab() {
    return Staging() + "/krb5.keytab";
}
std::string StagedConf() {
    return Staging() + "/smb.conf";
}
std::string FormerKeysFile() {
    return Path(kPrivate) + std::string("/former_keys.json");
}
}  // namespace journal

void MakeJournalFolder() {
    RemoveJournal();
    for (const std::string& folder : {journal::Folder(), journal::Staging()}) {
        if (const std::error_code error = MakeFolder(folder, kFolderMode)) {
            throw std::system_error(error, folder);
        }
    }
}

void WriteJournal(const Journal& journal) {
    Json::Value object(Json::objectValue);
    object["phase"] = kPhases[static_cast<std::size_t>(journal.phase)];
    object["before"] = FormatMembership(journal.before);
    object["after"] = FormatMembership(journal.after);
    object["account before"] = kAccounts[static_cast<std::size_t>(journal.accountBefore)];
    object["keep new secret"] = journal.keepNewSecret;
    object["reset options"] = journal.resetOptions;
    object["controller"] = journal.controller;
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "    ";
    if (const std::error_code error =
            ReplaceFile(JournalFile(), Json::writeString(builder, object) + "\n", kFileMode)) {
        throw std::system_error(error, JournalFile());
    }
}

std::optional<Journal> ReadJournal() {
    std::string text;
    if (const std::error_code error = ReadFile(JournalFile(), text, kLargestJournal)) {
        if (error.value() != ENOENT) {
            Log(LOG_ERR, JournalFile() + ": " + error.message());
        }
        return std::nullopt;
    }
    Journal journal;
    Json::Value object;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    try {
        if (reader->parse(text.data(), text.data() + text.size(), &object, nullptr) && object.isObject() &&
            FromName(kPhases, object["phase"].asString(), journal.phase) &&
            FromName(kAccounts, object.get("account before", "unknown").asString(), journal.accountBefore) &&
            ParseMembership(object["before"], journal.before) && ParseMembership(object["after"], journal.after)) {
            journal.keepNewSecret = object["keep new secret"].asBool();
            journal.resetOptions = object["reset options"].asBool();
            journal.controller = object["controller"].asString();
            return journal;
        }
    } catch (const Json::Exception&) {
        // Told below.
    }
    // What it stood for nobody knows, so what might put things right by hand stays.
    const std::string aside = journal::Folder() + ".damaged";
    std::error_code error;
    std::filesystem::remove_all(aside, error);
    std::filesystem::rename(journal::Folder(), aside, error);
    Log(LOG_ERR, JournalFile() + ": no journal of a join" + (error ? "" : "; the folder is now " + aside));
    if (!error) {
        MakeFolder(journal::Folder(), kFolderMode);
    }
    return std::nullopt;
}

void RemoveJournal() {
    if (const std::error_code error = RemoveFile(JournalFile()); error && error.value() != ENOENT) {
        Log(LOG_ERR, JournalFile() + ": " + error.message());
    }
    std::error_code error;
    std::vector<std::string> files;
    for (std::filesystem::recursive_directory_iterator place(journal::Folder(), error), end; !error && place != end;
         place.increment(error)) {
        if (place->is_regular_file(error) && !place->is_symlink(error)) {
            files.push_back(place->path().string());
        }
    }
    for (const std::string& file : files) {
        WipeFile(file);
    }
    std::filesystem::remove_all(journal::Staging(), error);
    if (error) {
        Log(LOG_ERR, journal::Staging() + ": " + error.message());
    }
}

void WipeFile(const std::string& path) {
    const FileDescriptor file(open(path.c_str(), O_WRONLY | O_CLOEXEC | O_NOFOLLOW));
    struct stat status {};
    if (file && fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode)) {
        constexpr std::array<char, 4096> zeros = {};
        for (off_t place = 0; place < status.st_size; place += static_cast<off_t>(zeros.size())) {
            const auto left = static_cast<std::size_t>(status.st_size - place);
            if (pwrite(file.get(), zeros.data(), std::min(left, zeros.size()), place) < 0) {
                break;
            }
        }
        fdatasync(file.get());
    }
    if (unlink(path.c_str()) != 0 && errno != ENOENT) {
        Log(LOG_ERR, path + ": " + std::generic_category().message(errno));
    }
}

}  // namespace appliance
