#include "appliance/platform/webapi/task_store.h"

#include <json/reader.h>
#include <json/writer.h>
#include <sys/random.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <ctime>
#include <memory>
#include <system_error>

#include "appliance/base/text.h"

namespace appliance {
namespace {

constexpr std::size_t kLongestName = 128;
constexpr std::size_t kRandomBytes = 16;

constexpr const char* kTables =
    "CREATE TABLE IF NOT EXISTS tasks("
    "number INTEGER PRIMARY KEY AUTOINCREMENT, id TEXT NOT NULL UNIQUE, task_group TEXT NOT NULL, prefix TEXT NOT NULL,"
    "removed_when_read INTEGER NOT NULL, module TEXT NOT NULL, symbol TEXT NOT NULL, parameters TEXT NOT NULL,"
    "state INTEGER NOT NULL, pid INTEGER NOT NULL, start INTEGER NOT NULL, boot TEXT NOT NULL,"
    "created INTEGER NOT NULL, ended INTEGER NOT NULL DEFAULT 0,"
    "success INTEGER NOT NULL DEFAULT 1, data TEXT NOT NULL DEFAULT 'null',"
    "code INTEGER NOT NULL DEFAULT 0, errors TEXT NOT NULL DEFAULT 'null')";

std::string ToText(const Json::Value& value) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return Json::writeString(builder, value);
}

Json::Value FromText(const std::string& text) {
    Json::Value value;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    if (!reader->parse(text.data(), text.data() + text.size(), &value, nullptr)) {
        value = Json::Value();
    }
    return value;
}

std::int64_t Now() {
    return std::time(nullptr);
}

std::string RandomDigits() {
    std::array<unsigned char, kRandomBytes> bytes{};
    if (getrandom(bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) {
        throw std::system_error(errno, std::generic_category(), "no random bytes");
    }
    constexpr const char* kDigits = "0123456789abcdef";
    std::string digits;
    for (const unsigned char byte : bytes) {
        digits += kDigits[byte >> 4];
        digits += kDigits[byte & 15];
    }
    return digits;
}

bool MayBeSecret(const std::string& name) {
    const std::string lower = Lower(name);
    constexpr std::array<const char*, 4> kParts{"pass", "pwd", "secret", "token"};
    return std::any_of(kParts.begin(), kParts.end(), [&](const char* part) { return Contains(lower, part); });
}

std::int64_t Number(TaskState state) {
    return static_cast<std::int64_t>(state);
}

TaskEnd Failed(FrameworkCode code) {
    TaskEnd end;
    end.code = static_cast<int>(code);
    return end;
}

TaskEnd Stopped() {
    return Failed(FrameworkCode::TaskStopped);
}

}  // namespace

Json::Value WithoutSecrets(const Json::Value& parameters) {
    if (parameters.isArray()) {
        Json::Value copy(Json::arrayValue);
        for (const Json::Value& element : parameters) {
            copy.append(WithoutSecrets(element));
        }
        return copy;
    }
    if (!parameters.isObject()) {
        return parameters;
    }
    Json::Value copy(Json::objectValue);
    for (const std::string& name : parameters.getMemberNames()) {
        if (!MayBeSecret(name)) {
            copy[name] = WithoutSecrets(parameters[name]);
        }
    }
    return copy;
}

bool IsTaskName(std::string_view text) {
    return text.size() <= kLongestName && std::all_of(text.begin(), text.end(), [](char letter) {
               return (letter >= 'a' && letter <= 'z') || (letter >= 'A' && letter <= 'Z') ||
                      (letter >= '0' && letter <= '9') || letter == '_' || letter == '-' || letter == '.';
           });
}

Json::Value TaskRecord::Status() const {
    Json::Value status(Json::objectValue);
    status["finish"] = state == TaskState::Ended;
    status["success"] = success;
    status["data"] = data;
    if (!success) {
        status["error"]["code"] = code;
        status["error"]["errors"] = errors;
    }
    return status;
}

TaskStore::TaskStore(const std::string& path) : database_(path, Database::Mode::ReadWrite) {
    // Readers and the writer don't block one another, and a killed process leaves nothing half written. After a power
    // failure the last records may be missing, and with them nothing: the processes are gone as well.
    Statement(database_, "PRAGMA journal_mode=WAL").Step();
    database_.Execute("PRAGMA synchronous=NORMAL");
    database_.Execute(kTables);
}

std::string TaskStore::Add(const NewTask& task) {
    const std::string id = task.prefix + "_" + RandomDigits();
    const ProcessIdentity self = ProcessIdentity::OfCaller();
    Transaction transaction(database_);
    Statement(database_,
              "INSERT INTO tasks(id, task_group, prefix, removed_when_read, module, symbol, parameters, state, pid, "
              "start, boot, created) VALUES(?,?,?,?,?,?,?,?,?,?,?,?)")
        .Bind(1, id)
        .Bind(2, task.group)
        .Bind(3, task.prefix)
        .Bind(4, std::int64_t{task.removedWhenRead})
        .Bind(5, task.module)
        .Bind(6, task.symbol)
        .Bind(7, ToText(WithoutSecrets(task.parameters)))
        .Bind(8, Number(TaskState::Starting))
        .Bind(9, std::int64_t{self.pid})
        .Bind(10, static_cast<std::int64_t>(self.start))
        .Bind(11, self.boot)
        .Bind(12, Now())
        .Run();
    RemoveOld();
    transaction.Commit();
    return id;
}

void TaskStore::RemoveOld() {
    Statement(database_, "DELETE FROM tasks WHERE state=? AND ended<?")
        .Bind(1, Number(TaskState::Ended))
        .Bind(2, Now() - kEndedTasksAge)
        .Run();
    Statement(database_,
              "DELETE FROM tasks WHERE number IN (SELECT number FROM (SELECT number, row_number() OVER "
              "(PARTITION BY prefix ORDER BY number DESC) AS place FROM tasks WHERE state=?) WHERE place>?)")
        .Bind(1, Number(TaskState::Ended))
        .Bind(2, std::int64_t{kEndedTasksKept})
        .Run();
}

std::vector<std::string> TaskStore::List(std::string_view prefix, std::string_view group) {
    EndDead();
    std::vector<std::string> ids;
    Statement select(
        database_,
        "SELECT id FROM tasks WHERE task_group=?1 AND substr(id,1,length(?2))=?2 AND (state<>?3 OR ended>=?4) "
        "ORDER BY number");
    select.Bind(1, group).Bind(2, prefix).Bind(3, Number(TaskState::Ended)).Bind(4, Now() - kEndedTasksAge);
    while (select.Step()) {
        ids.push_back(select.Text(0));
    }
    return ids;
}

std::optional<TaskRecord> TaskStore::Find(std::string_view id) {
    if (id.empty() || !IsTaskName(id)) {
        return std::nullopt;
    }
    EndDead();
    Statement select(database_,
                     "SELECT id, task_group, prefix, removed_when_read, module, symbol, parameters, state, pid, start, "
                     "boot, success, data, code, errors FROM tasks WHERE id=? AND (state<>? OR ended>=?)");
    select.Bind(1, id).Bind(2, Number(TaskState::Ended)).Bind(3, Now() - kEndedTasksAge);
    if (!select.Step()) {
        return std::nullopt;
    }
    TaskRecord record;
    record.id = select.Text(0);
    record.task.group = select.Text(1);
    record.task.prefix = select.Text(2);
    record.task.removedWhenRead = select.Number(3) != 0;
    record.task.module = select.Text(4);
    record.task.symbol = select.Text(5);
    record.task.parameters = FromText(select.Text(6));
    record.state = static_cast<TaskState>(select.Number(7));
    record.process.pid = static_cast<pid_t>(select.Number(8));
    record.process.start = static_cast<std::uint64_t>(select.Number(9));
    record.process.boot = select.Text(10);
    record.success = select.Number(11) != 0;
    record.data = FromText(select.Text(12));
    record.code = static_cast<int>(select.Number(13));
    record.errors = FromText(select.Text(14));
    return record;
}

void TaskStore::Remove(std::string_view id) {
    Statement(database_, "DELETE FROM tasks WHERE id=?").Bind(1, id).Run();
}

bool TaskStore::Claim(std::string_view id, const ProcessIdentity& process) {
    Statement(database_, "UPDATE tasks SET state=?, pid=?, start=?, boot=? WHERE id=? AND state=?")
        .Bind(1, Number(TaskState::Running))
        .Bind(2, std::int64_t{process.pid})
        .Bind(3, static_cast<std::int64_t>(process.start))
        .Bind(4, process.boot)
        .Bind(5, id)
        .Bind(6, Number(TaskState::Starting))
        .Run();
    return database_.Changes() == 1;
}

void TaskStore::Publish(std::string_view id, const Json::Value& data) {
    Statement(database_, "UPDATE tasks SET data=? WHERE id=? AND state=?")
        .Bind(1, ToText(data))
        .Bind(2, id)
        .Bind(3, Number(TaskState::Running))
        .Run();
}

void TaskStore::SetEnd(std::string_view id, TaskState from, const TaskEnd& end) {
    Statement(database_,
              "UPDATE tasks SET state=?1, ended=?2, success=?3, data=CASE WHEN ?3 THEN ?4 ELSE data END, code=?5, "
              "errors=?6 WHERE id=?7 AND state=?8")
        .Bind(1, Number(TaskState::Ended))
        .Bind(2, Now())
        .Bind(3, std::int64_t{end.success})
        .Bind(4, ToText(end.data))
        .Bind(5, std::int64_t{end.code})
        .Bind(6, ToText(end.errors))
        .Bind(7, id)
        .Bind(8, Number(from))
        .Run();
}

void TaskStore::End(std::string_view id, const TaskEnd& end) {
    SetEnd(id, TaskState::Running, end);
}

void TaskStore::MarkStopping(std::string_view id) {
    SetEnd(id, TaskState::Starting, Stopped());
    Statement(database_, "UPDATE tasks SET state=? WHERE id=? AND state=?")
        .Bind(1, Number(TaskState::Stopping))
        .Bind(2, id)
        .Bind(3, Number(TaskState::Running))
        .Run();
}

void TaskStore::MarkStopped(std::string_view id) {
    SetEnd(id, TaskState::Stopping, Stopped());
}

int TaskStore::EndDead() {
    struct Open {
        std::string id;
        TaskState state;
        ProcessIdentity process;
    };
    std::vector<Open> open;
    Statement select(database_, "SELECT id, state, pid, start, boot FROM tasks WHERE state<>?");
    select.Bind(1, Number(TaskState::Ended));
    while (select.Step()) {
        Open task{select.Text(0), static_cast<TaskState>(select.Number(1)), {}};
        task.process.pid = static_cast<pid_t>(select.Number(2));
        task.process.start = static_cast<std::uint64_t>(select.Number(3));
        task.process.boot = select.Text(4);
        open.push_back(std::move(task));
    }
    select.Reset();
    int ended = 0;
    for (const Open& task : open) {
        if (task.process.IsAlive()) {
            continue;
        }
        // A process writes its end before it goes, so a record that is open here and now has none to come; the state in
        // the condition keeps an end that was written since the list was read, and a claim.
        SetEnd(task.id, task.state,
               task.state == TaskState::Stopping ? Stopped() : Failed(FrameworkCode::TaskWithoutResult));
        ended += database_.Changes() > 0 ? 1 : 0;
    }
    return ended;
}

}  // namespace appliance
