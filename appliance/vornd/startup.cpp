#include "appliance/vornd/startup.h"

#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <optional>
#include <system_error>
#include <vector>

#include "appliance/base/error_code.h"
#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "appliance/base/settings.h"
#include "appliance/domain/join/recovery.h"
#include "appliance/domain/membership/membership.h"
#include "appliance/platform/system/task_store.h"
#include "appliance/platform/webapi/task_store.h"

namespace appliance {
namespace {

bool Exists(const std::string& path) {
    struct stat found {};
    return stat(path.c_str(), &found) == 0;
}

void CopyDefault(const char* target, mode_t mode) {
    const std::string path = Path(target);
    if (Exists(path)) {
        return;
    }
    std::optional<SettingsLock> lock;
    if (SettingsLock::Guards(path)) {
        lock = SettingsLock::Take();
        if (!lock) {
            throw StartError(path + " can't be made: its lock can't be had: " + std::strerror(errno));
        }
        if (Exists(path)) {
            return;
        }
    }
    const std::string source = Path(kDefaults) + "/" + NameOf(target);
    std::string content;
    if (const std::error_code error = ReadFile(source, content)) {
        throw StartError(path + " is missing, and so is its default " + source + ": " + error.message());
    }
    if (const std::error_code error = ReplaceFile(path, content, mode)) {
        throw StartError(path + " can't be made: " + error.message());
    }
    Log(LOG_NOTICE, path + " made from the defaults");
}

void CheckReadable(const char* file) {
    std::string content;
    const std::string path = Path(file);
    if (const std::error_code error = ReadFile(path, content)) {
        throw StartError(path + " can't be read: " + error.message());
    }
}

// Of the file-sharing service's parts these are what nothing can be done without.
void CheckSamba() {
    constexpr std::array<std::array<const char*, 2>, 3> kPrograms{
        {{"/usr/sbin/smbd", "samba"}, {"/usr/bin/net", "samba-common-bin"}, {"/usr/sbin/winbindd", "winbind"}}};
    for (const auto& [program, package] : kPrograms) {
        const std::string path = Path(program);
        if (access(path.c_str(), X_OK) != 0) {
            throw StartError(path + " is missing: install the package " + package);
        }
    }
}

// A refresh outlives the server, and may take its time for a list; without one, nobody goes on with what is unfinished.
int RemoveUnfinishedLists() {
    // Looked for first: what a fetch makes that begins behind the next line is not among them.
    std::vector<std::filesystem::path> unfinished;
    std::error_code error;
    std::filesystem::directory_iterator files(Path(kDirectoryData), error);
    for (; !error && files != std::filesystem::directory_iterator(); files.increment(error)) {
        if (!TemporaryTarget(files->path().filename().string()).empty()) {
            unfinished.push_back(files->path());
        }
    }
    if (ReadPidFile(Path(kUserPid)) >= 0 || ReadPidFile(Path(kGroupPid)) >= 0) {
        return 0;
    }
    int removed = 0;
    for (const std::filesystem::path& file : unfinished) {
        removed += unlink(file.c_str()) == 0 ? 1 : 0;
    }
    return removed;
}

void RemoveTemporaries() {
    int removed = 0;
    for (const std::string& folder :
         {Path(kPrivate), Path(kJoinJournal), Path(kState), Path(kRun), FolderOf(Path(kSmbConf)),
          FolderOf(Path(kSettings)), FolderOf(Path(kCronTable)), FolderOf(Path(kJoinStatus))}) {
        removed += Exists(folder) ? RemoveStaleTemporaries(folder) : 0;
    }
    removed += RemoveUnfinishedLists();
    // Only this server's module writes that one, and it has not begun yet.
    removed += unlink((Path(kSmbInfo) + ".tmp").c_str()) == 0 ? 1 : 0;
    if (removed > 0) {
        Log(LOG_NOTICE, std::to_string(removed) + " temporary files of killed writers removed");
    }
}

void PutAside(const std::string& path) {
    const std::string aside = path + ".damaged";
    if (rename(path.c_str(), aside.c_str()) != 0) {
        throw StartError(path + " is damaged and can't be put aside: " + std::strerror(errno));
    }
    unlink((path + "-wal").c_str());
    unlink((path + "-shm").c_str());
    Log(LOG_ERR, path + " was damaged; it is now " + aside + ", and a new one begins");
}

}  // namespace

void MakeFolders() {
    struct Folder {
        const char* path;
        mode_t mode;
    };
    constexpr std::array<Folder, 5> kFolders{
        {{kPrivate, 0700}, {kDirectoryData, 0700}, {kJoinJournal, 0700}, {kState, 0700}, {kRun, 0755}}};
    for (const Folder& folder : kFolders) {
        const std::string path = Path(folder.path);
        if (const std::error_code error = MakeFolder(path, folder.mode)) {
            throw StartError("folder " + path + " can't be made: " + error.message());
        }
    }
}

void PrepareConfiguration() {
    CheckSamba();
    CopyDefault(kSmbConf, 0644);
    CopyDefault(kSettings, 0644);
    CheckReadable(kSmbConf);
    CheckReadable(kSettings);
    CheckReadable(kCapabilities);
    Membership membership;
    if (const std::error_code error = ReadMembership(membership)) {
        Log(LOG_ERR, Path(kSmbConf) + " does not say whether this is a member of a domain: " + error.message());
    }
    RemoveTemporaries();
}

void PrepareTasks() {
    const std::string path = Path(kTasks);
    for (bool again = false;; again = true) {
        try {
            const int ended = TaskStore(path).EndDead();
            if (ended > 0) {
                Log(LOG_WARNING, std::to_string(ended) + " background tasks had died and count as failed");
            }
            return;
        } catch (const SqliteError& error) {
            const int kind = error.code() & 0xFF;
            if (kind == SQLITE_FULL || kind == SQLITE_IOERR || kind == SQLITE_READONLY) {
                // All but the tasks works without them, and they work again when the disk has room.
                Log(LOG_ERR, std::string("the records of background tasks can't be used: ") + error.what());
                return;
            }
            if (again || (kind != SQLITE_NOTADB && kind != SQLITE_CORRUPT)) {
                throw StartError(std::string("the records of background tasks can't be used: ") + error.what());
            }
            PutAside(path);
        }
    }
}

void RepairLeftovers() {
    if (const std::optional<ErrorCode> failure = RepairCronTable()) {
        Log(LOG_ERR, "cron's table could not be brought in line with the scheduled tasks");
    }
    // It logs what it does and what stays behind.
    RecoverInterruptedJoin();
}

}  // namespace appliance
