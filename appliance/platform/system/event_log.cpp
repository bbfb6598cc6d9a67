#include "appliance/platform/system/event_log.h"

#include <unistd.h>

#include <algorithm>
#include <ctime>
#include <string_view>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/sqlite.h"

namespace appliance {

namespace {

constexpr const char kTable[] =
    "CREATE TABLE IF NOT EXISTS events (id INTEGER PRIMARY KEY AUTOINCREMENT, time INTEGER NOT NULL,"
    " kind INTEGER NOT NULL, level INTEGER NOT NULL, code INTEGER NOT NULL,"
    " argument1 TEXT NOT NULL, argument2 TEXT NOT NULL, argument3 TEXT NOT NULL, argument4 TEXT NOT NULL)";

std::string_view Cut(const std::string& argument) {
    return std::string_view(argument).substr(0, kLongestEventArgument);
}

bool HasTable(Database& database) {
    Statement statement(database, "SELECT 1 FROM sqlite_master WHERE type = 'table' AND name = 'events'");
    return statement.Step();
}

std::int64_t Count(Database& database) {
    Statement statement(database, "SELECT count(*) FROM events");
    return statement.Step() ? statement.Number(0) : 0;
}

Event EventOf(const Statement& row) {
    Event event;
    event.time = row.Number(0);
    event.kind = static_cast<int>(row.Number(1));
    event.level = static_cast<int>(row.Number(2));
    event.code = static_cast<int>(row.Number(3));
    event.text = EventText(event.code, {row.Text(4), row.Text(5), row.Text(6), row.Text(7)});
    return event;
}

}  // namespace

void AddEvent(int kind, int level, int code, const EventArguments& arguments) {
    const std::string path = Path(kEvents);
    if (const std::error_code error = MakeFolder(FolderOf(path), 0700)) {
        throw std::system_error(error, FolderOf(path));
    }
    Database database(path, Database::Mode::ReadWrite);
    Transaction transaction(database);
    database.Execute(kTable);
    Statement insert(database,
                     "INSERT INTO events (time, kind, level, code, argument1, argument2, argument3, argument4)"
                     " VALUES (?, ?, ?, ?, ?, ?, ?, ?)");
    insert.Bind(1, std::int64_t{std::time(nullptr)}).Bind(2, std::int64_t{kind}).Bind(3, std::int64_t{level});
    insert.Bind(4, std::int64_t{code});
    int place = 5;
    for (const std::string& argument : arguments) {
        insert.Bind(place++, Cut(argument));
    }
    insert.Run();
    // Ids are never used twice and have no gaps but those of failed inserts, so this leaves at most the newest ones.
    Statement remove(database, "DELETE FROM events WHERE id <= ?");
    remove.Bind(1, database.LastRowId() - kMostEvents).Run();
    transaction.Commit();
}

EventPage ReadEvents(std::int64_t offset, std::int64_t limit) {
    EventPage page;
    const std::string path = Path(kEvents);
    if (access(path.c_str(), F_OK) != 0) {
        return page;
    }
    // Not read only: that could not roll back what a killed writer left half done.
    Database database(path, Database::Mode::ReadWrite);
    // One view of the log for the number and the events.
    database.Execute("BEGIN");
    if (!HasTable(database)) {
        return page;
    }
    page.total = Count(database);
    Statement select(database,
                     "SELECT time, kind, level, code, argument1, argument2, argument3, argument4 FROM events"
                     " ORDER BY id DESC LIMIT ? OFFSET ?");
    select.Bind(1, std::max<std::int64_t>(limit, 0)).Bind(2, std::max<std::int64_t>(offset, 0));
    while (select.Step()) {
        page.events.push_back(EventOf(select));
    }
    return page;
}

}  // namespace appliance
