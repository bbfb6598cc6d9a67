// SQLite behind two small owners.

#ifndef VORN_APPLIANCE_BASE_SQLITE_H
#define VORN_APPLIANCE_BASE_SQLITE_H

#include <sqlite3.h>

#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>

namespace appliance {

// What SQLite said, with the file's name.
class SqliteError : public std::runtime_error {
public:
    SqliteError(int code, const std::string& what) : std::runtime_error(what), code_(code) {}
    int code() const {
        return code_;
    }

private:
    int code_;
};

class Database;

// A prepared statement. Places are counted from 1, columns from 0. Throws SqliteError.
class Statement {
public:
    Statement(Database& database, std::string_view sql);

    Statement& Bind(int place, std::string_view text);  // the text is copied
    Statement& Bind(int place, std::int64_t number);
    Statement& BindNull(int place);

    // True when there is a row, false at the end.
    bool Step();
    // Runs to the end and can be bound anew.
    void Run();
    void Reset();

    std::string Text(int column) const;
    std::int64_t Number(int column) const;
    bool IsNull(int column) const;

private:
    struct Finalize {
        void operator()(sqlite3_stmt* statement) const {
            sqlite3_finalize(statement);
        }
    };
    std::unique_ptr<sqlite3_stmt, Finalize> statement_;
    sqlite3* database_;
};

// An open database; used by one thread at a time. Throws SqliteError.
class Database {
public:
    enum class Mode {
        ReadWrite,  // made with mode 0600 when it is missing
        ReadOnly,
        Unchanging,  // read only, and nobody writes the file: no lock, no journal is looked for
    };
    // Waits up to `busy` milliseconds for another's lock.
    Database(const std::string& path, Mode mode, int busy = 5000);

    // Runs one or more statements that give no rows.
    void Execute(const std::string& sql);
    std::int64_t LastRowId() const;
    int Changes() const;

    sqlite3* get() const {
        return database_.get();
    }

private:
    struct Close {
        void operator()(sqlite3* database) const {
            sqlite3_close_v2(database);
        }
    };
    std::unique_ptr<sqlite3, Close> database_;
};

// BEGIN IMMEDIATE; rolled back at its end unless committed.
class Transaction {
public:
    explicit Transaction(Database& database);
    ~Transaction();
    Transaction(const Transaction&) = delete;
    Transaction& operator=(const Transaction&) = delete;
    void Commit();

private:
    Database& database_;
    bool open_ = true;
};

}  // namespace appliance

#endif
