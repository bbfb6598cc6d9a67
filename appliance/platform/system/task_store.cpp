#include "appliance/platform/system/task_store.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <ctime>
#include <functional>
#include <limits>
#include <string>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/file_lock.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"

namespace appliance {

namespace {

constexpr mode_t kTableMode = 0644;
constexpr std::chrono::milliseconds kLockWait{10000};

std::optional<ErrorCode> Fail(ErrorCode code, const std::string& what) {
    Log(LOG_ERR, "scheduled tasks: " + what);
    return code;
}

std::optional<ErrorCode> Fail(ErrorCode code, const std::string& path, const std::error_code& error) {
    return Fail(code, path + ": " + error.message());
}

bool IsMissing(const std::error_code& error) {
    return error == std::errc::no_such_file_or_directory;
}

// The file's bytes, and what they say. A missing file is an empty one.
struct StoredTasks {
    std::string text;
    bool exists = false;
    TaskFile file;
};

std::optional<ErrorCode> ReadTasks(StoredTasks& stored) {
    const std::string path = Path(kSchedule);
    const std::error_code error = ReadFile(path, stored.text);
    if (error && !IsMissing(error)) {
        return Fail(ErrorCode::FileRead, path, error);
    }
    stored.exists = !error;
    const std::string wrong = ParseTasks(stored.text, stored.file);
    if (!wrong.empty()) {
        return Fail(ErrorCode::FileRead, path + " " + wrong);
    }
    return std::nullopt;
}

// Cron looks at the seconds of the times of the table and of its folder, and takes a table for unchanged when they are
// what they were. A second change within one second would go unnoticed if cron read between the two.
void MakeNewer(const std::string& path, std::time_t before) {
    const timespec now = {std::max(std::time(nullptr), before + 1), 0};
    const timespec times[] = {{0, UTIME_OMIT}, now};
    if (utimensat(AT_FDCWD, path.c_str(), times, 0) != 0) {
        Log(LOG_WARNING, "scheduled tasks: cannot set the time of " + path);
    }
}

std::time_t TimeOf(const std::string& path) {
    struct stat status = {};
    return stat(path.c_str(), &status) == 0 ? status.st_mtim.tv_sec : 0;
}

// Is the table what cron takes: a regular file of root that nobody else can write?
bool IsProperTable(const std::string& path) {
    struct stat status = {};
    return lstat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode) && status.st_uid == 0 &&
           (status.st_mode & 07777) == kTableMode;
}

std::error_code WriteTable(const std::string& path, const std::string& table) {
    // What stands there in another form (a link, a file that others may write) would pass its own form on.
    if (!IsProperTable(path)) {
        if (const std::error_code error = RemoveFile(path)) {
            return error;
        }
    }
    return ReplaceFile(path, table, kTableMode);
}

// Brings cron's table to what the tasks say; leaves it alone when it is that.
std::optional<ErrorCode> RenderTable(const TaskFile& file) {
    const std::string path = Path(kCronTable);
    const std::string folder = FolderOf(path);
    const std::string table = CronTable(file, Today());
    std::string present;
    const std::error_code unread = ReadFile(path, present);
    if (IsMissing(unread) ? table.empty() : !unread && present == table && IsProperTable(path)) {
        return std::nullopt;
    }
    const std::time_t before = std::max(TimeOf(path), TimeOf(folder));
    const std::error_code error = table.empty() ? RemoveFile(path) : WriteTable(path, table);
    if (error) {
        return Fail(ErrorCode::FileWrite, path, error);
    }
    if (!table.empty()) {
        MakeNewer(path, before);
    }
    MakeNewer(folder, before);
    return std::nullopt;
}

// Puts the old tasks back after a table that could not be written.
void PutBack(const StoredTasks& before) {
    const std::string path = Path(kSchedule);
    const std::error_code error = before.exists ? ReplaceFile(path, before.text, kTableMode) : RemoveFile(path);
    if (error) {
        Fail(ErrorCode::FileWrite, "cannot put back the former " + path + ": " + error.message());
    }
}

using Change = std::function<std::optional<ErrorCode>(TaskFile&)>;

std::optional<FileLock> TakeLock() {
    if (MakeFolder(Path(kRun), 0755)) {
        return std::nullopt;
    }
    return FileLock::Take(Path(kRun) + "/schedule.lock", kLockWait);
}

std::optional<ErrorCode> ChangeTasks(const Change& change) {
    const std::optional<FileLock> lock = TakeLock();
    if (!lock) {
        return Fail(ErrorCode::FileLock, "cannot lock the list");
    }
    StoredTasks before;
    if (const auto failure = ReadTasks(before)) {
        return failure;
    }
    TaskFile file = before.file;
    if (const auto failure = change(file)) {
        return failure;
    }
    const std::string path = Path(kSchedule);
    if (const std::error_code error = ReplaceFile(path, FormatTasks(file), kTableMode)) {
        return Fail(ErrorCode::FileWrite, path, error);
    }
    const std::optional<ErrorCode> failure = RenderTable(file);
    if (failure) {
        PutBack(before);
    }
    return failure;
}

std::vector<ScheduledTask>::iterator Find(TaskFile& file, int id) {
    return std::find_if(file.tasks.begin(), file.tasks.end(),
                        [id](const ScheduledTask& task) { return task.id == id; });
}

std::optional<ErrorCode> NoSuchTask(int id) {
    return Fail(ErrorCode::NotFound, "there is no task " + std::to_string(id));
}

std::optional<ErrorCode> AddTask(TaskFile& file, ScheduledTask& task) {
    if (file.tasks.size() >= kMostTasks) {
        return Fail(ErrorCode::BadArgument, "there are " + std::to_string(kMostTasks) + " tasks already");
    }
    if (file.nextId == std::numeric_limits<int>::max()) {
        return Fail(ErrorCode::BadArgument, "no number is left for a new task");
    }
    task.id = file.nextId++;
    file.tasks.push_back(task);
    return std::nullopt;
}

}  // namespace

std::optional<ErrorCode> LoadTasks(std::vector<ScheduledTask>& tasks) {
    StoredTasks stored;
    if (const auto failure = ReadTasks(stored)) {
        return failure;
    }
    tasks = std::move(stored.file.tasks);
    return std::nullopt;
}

std::optional<ErrorCode> LoadListableTasks(std::vector<ScheduledTask>& tasks) {
    std::vector<ScheduledTask> all;
    if (const auto failure = LoadTasks(all)) {
        return failure;
    }
    all.erase(std::remove_if(all.begin(), all.end(), [](const ScheduledTask& task) { return !task.listable; }),
              all.end());
    tasks = std::move(all);
    return std::nullopt;
}

std::optional<ErrorCode> SaveTask(ScheduledTask& task) {
    if (const std::string wrong = Impossible(task); !wrong.empty()) {
        return Fail(ErrorCode::BadArgument, "a task is refused: " + wrong);
    }
    ScheduledTask saved = task;
    const auto failure = ChangeTasks([&saved](TaskFile& file) -> std::optional<ErrorCode> {
        if (saved.id == -1) {
            return AddTask(file, saved);
        }
        const auto found = Find(file, saved.id);
        if (found == file.tasks.end()) {
            return NoSuchTask(saved.id);
        }
        *found = saved;
        return std::nullopt;
    });
    if (!failure) {
        task.id = saved.id;
    }
    return failure;
}

std::optional<ErrorCode> RemoveTask(int id) {
    return ChangeTasks([id](TaskFile& file) -> std::optional<ErrorCode> {
        const auto found = Find(file, id);
        if (found == file.tasks.end()) {
            return NoSuchTask(id);
        }
        file.tasks.erase(found);
        return std::nullopt;
    });
}

std::optional<ErrorCode> RepairCronTable() {
    const std::optional<FileLock> lock = TakeLock();
    if (!lock) {
        return Fail(ErrorCode::FileLock, "cannot lock the list");
    }
    StoredTasks stored;
    if (const auto failure = ReadTasks(stored)) {
        return failure;
    }
    return RenderTable(stored.file);
}

}  // namespace appliance
