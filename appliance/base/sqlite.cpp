#include "appliance/base/sqlite.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

namespace appliance {

namespace {

// What went wrong last. Of an error of the system SQLite's own words name only the kind.
std::string Words(sqlite3* database) {
    const int system = sqlite3_system_errno(database);
    const int kind = sqlite3_errcode(database) & 0xFF;
    const bool told = system == 0 || (kind != SQLITE_IOERR && kind != SQLITE_CANTOPEN);
    return sqlite3_errmsg(database) + (told ? std::string() : std::string(": ") + std::strerror(system));
}

[[noreturn]] void Fail(sqlite3* database, int code) {
    const char* file = database == nullptr ? nullptr : sqlite3_db_filename(database, "main");
    const std::string name = file == nullptr || *file == '\0' ? "database" : file;
    throw SqliteError(code, name + ": " + (database == nullptr ? sqlite3_errstr(code) : Words(database)));
}

// The path as a URI: what would mean something in one is written as %XX.
std::string UriOf(const std::string& path, const char* parameters) {
    std::string uri = path.empty() || path.front() != '/' ? "file:" : "file://";
    for (const char letter : path) {
        if (std::strchr("%?#", letter) != nullptr) {
            char shown[4] = {};
            static_cast<void>(std::snprintf(shown, sizeof(shown), "%%%02X", static_cast<unsigned char>(letter)));
            uri += shown;
        } else {
            uri += letter;
        }
    }
    return uri + parameters;
}

}  // namespace

Statement::Statement(Database& database, std::string_view sql) : database_(database.get()) {
    sqlite3_stmt* statement = nullptr;
    const char* rest = nullptr;
    const int code = sqlite3_prepare_v2(database_, sql.data(), static_cast<int>(sql.size()), &statement, &rest);
    statement_.reset(statement);
    if (code != SQLITE_OK) {
        Fail(database_, code);
    }
    const std::string_view unread = sql.substr(static_cast<std::size_t>(rest - sql.data()));
    if (!statement_ || unread.find_first_not_of(" \t\r\n;") != std::string_view::npos) {
        throw SqliteError(SQLITE_MISUSE, "not one SQL statement: " + std::string(sql));
    }
}

Statement& Statement::Bind(int place, std::string_view text) {
    // A null pointer would bind NULL in place of the empty text.
    const char* bytes = text.data() == nullptr ? "" : text.data();
    const int code = sqlite3_bind_text64(statement_.get(), place, bytes, text.size(), SQLITE_TRANSIENT, SQLITE_UTF8);
    if (code != SQLITE_OK) {
        Fail(database_, code);
    }
    return *this;
}

Statement& Statement::Bind(int place, std::int64_t number) {
    const int code = sqlite3_bind_int64(statement_.get(), place, number);
    if (code != SQLITE_OK) {
        Fail(database_, code);
    }
    return *this;
}

Statement& Statement::BindNull(int place) {
    const int code = sqlite3_bind_null(statement_.get(), place);
    if (code != SQLITE_OK) {
        Fail(database_, code);
    }
    return *this;
}

bool Statement::Step() {
    const int code = sqlite3_step(statement_.get());
    if (code == SQLITE_ROW) {
        return true;
    }
    if (code != SQLITE_DONE) {
        // The text of the error first: the reset may replace it.
        const std::string text = std::string(sqlite3_db_filename(database_, "main")) + ": " + Words(database_);
        sqlite3_reset(statement_.get());
        throw SqliteError(code, text);
    }
    return false;
}

void Statement::Run() {
    while (Step()) {
    }
    Reset();
}

void Statement::Reset() {
    sqlite3_reset(statement_.get());
    sqlite3_clear_bindings(statement_.get());
}

std::string Statement::Text(int column) const {
    const auto* text =
        static_cast<const char*>(static_cast<const void*>(sqlite3_column_text(statement_.get(), column)));
    return text == nullptr
               ? std::string()
               : std::string(text, static_cast<std::size_t>(sqlite3_column_bytes(statement_.get(), column)));
}

std::int64_t Statement::Number(int column) const {
    return sqlite3_column_int64(statement_.get(), column);
}

bool Statement::IsNull(int column) const {
    return sqlite3_column_type(statement_.get(), column) == SQLITE_NULL;
}

Database::Database(const std::string& path, Mode mode, int busy) {
    int flags = SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_EXRESCODE;
    std::string name = path;
    if (mode == Mode::ReadWrite) {
        flags |= SQLITE_OPEN_READWRITE;
        // Made without being opened: closing a descriptor of the file would drop the locks that another connection of
        // this process holds on it.
        if (mknod(path.c_str(), S_IFREG | 0600, 0) != 0 && errno != EEXIST) {
            throw SqliteError(SQLITE_CANTOPEN, path + ": " + std::strerror(errno));
        }
    } else {
        flags |= SQLITE_OPEN_READONLY;
    }
    if (mode == Mode::Unchanging) {
        flags |= SQLITE_OPEN_URI;
        name = UriOf(path, "?immutable=1");
    }
    sqlite3* database = nullptr;
    const int code = sqlite3_open_v2(name.c_str(), &database, flags, nullptr);
    database_.reset(database);
    if (code != SQLITE_OK) {
        throw SqliteError(code, path + ": " + (database == nullptr ? sqlite3_errstr(code) : Words(database)));
    }
    sqlite3_busy_timeout(database, busy);
}

void Database::Execute(const std::string& sql) {
    const int code = sqlite3_exec(database_.get(), sql.c_str(), nullptr, nullptr, nullptr);
    if (code != SQLITE_OK) {
        Fail(database_.get(), code);
    }
}

std::int64_t Database::LastRowId() const {
    return sqlite3_last_insert_rowid(database_.get());
}

int Database::Changes() const {
    return sqlite3_changes(database_.get());
}

Transaction::Transaction(Database& database) : database_(database) {
    database_.Execute("BEGIN IMMEDIATE");
}

Transaction::~Transaction() {
    if (open_) {
        // An error that SQLite rolled back by itself leaves nothing to do, and this fails.
        sqlite3_exec(database_.get(), "ROLLBACK", nullptr, nullptr, nullptr);
    }
}

void Transaction::Commit() {
    database_.Execute("COMMIT");
    open_ = false;
}

}  // namespace appliance
