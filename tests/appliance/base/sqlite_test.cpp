// Databases, statements, transactions.

#include "appliance/base/sqlite.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <thread>

#include "tests/appliance/base/temporary_folder.h"

using appliance::Database;
using appliance::SqliteError;
using appliance::Statement;
using appliance::Transaction;
using testing::ElementsAre;
using testing::HasSubstr;
using Mode = appliance::Database::Mode;

namespace {

class SqliteTest : public appliance_test::FolderTest {
protected:
    std::string path = folder / "data.db";

    static std::int64_t Count(Database& database) {
        Statement count(database, "SELECT count(*) FROM t");
        EXPECT_TRUE(count.Step());
        return count.Number(0);
    }
};

TEST_F(SqliteTest, ANewDatabaseIsClosedToOthers) {
    const mode_t before = umask(0);
    Database database(path, Mode::ReadWrite);
    umask(before);
    database.Execute("CREATE TABLE t(a)");
    struct stat found = {};
    ASSERT_EQ(stat(path.c_str(), &found), 0);
    EXPECT_EQ(found.st_mode & 07777, 0600U);
}

TEST_F(SqliteTest, ValuesComeBackAsTheyWere) {
    Database database(path, Mode::ReadWrite);
    database.Execute("CREATE TABLE t(a, b, c)");
    Statement insert(database, "INSERT INTO t VALUES(?, ?, ?);");
    const std::string odd("a\0'b\xC3\xA4", 6);
    insert.Bind(1, odd).Bind(2, std::int64_t{-5000000000}).BindNull(3).Run();
    EXPECT_EQ(database.LastRowId(), 1);
    EXPECT_EQ(database.Changes(), 1);
    insert.Bind(1, std::string_view()).Run();  // the others are null again
    Statement select(database, "SELECT a, b, c FROM t ORDER BY rowid");
    ASSERT_TRUE(select.Step());
    EXPECT_EQ(select.Text(0), odd);
    EXPECT_EQ(select.Number(1), -5000000000);
    EXPECT_TRUE(select.IsNull(2));
    EXPECT_EQ(select.Text(2), "");
    ASSERT_TRUE(select.Step());
    EXPECT_FALSE(select.IsNull(0));
    EXPECT_EQ(select.Text(0), "");
    EXPECT_TRUE(select.IsNull(1));
    EXPECT_FALSE(select.Step());
    select.Reset();
    EXPECT_TRUE(select.Step());
}

TEST_F(SqliteTest, ErrorsNameTheFile) {
    Database database(path, Mode::ReadWrite);
    try {
        database.Execute("SELECT * FROM none");
        FAIL();
    } catch (const SqliteError& error) {
        EXPECT_THAT(error.what(), HasSubstr("data.db: no such table: none"));
        EXPECT_EQ(error.code() & 0xFF, SQLITE_ERROR);
    }
    EXPECT_THROW(Statement(database, "SELEKT 1"), SqliteError);
    EXPECT_THROW(Statement(database, "SELECT 1; SELECT 2"), SqliteError);
    EXPECT_THROW(Statement(database, "  "), SqliteError);
    EXPECT_THROW(Statement(database, "SELECT 1").Bind(1, "x"), SqliteError);
    EXPECT_THROW(Database(folder / "none/data.db", Mode::ReadWrite), SqliteError);
    EXPECT_THROW(Database(folder / "none.db", Mode::ReadOnly), SqliteError);
    EXPECT_THROW(Database(folder / "none.db", Mode::Unchanging), SqliteError);
    EXPECT_THAT(folder.Names(), ElementsAre("data.db"));
}

TEST_F(SqliteTest, AFileThatIsNoDatabase) {
    Put(path, std::string(4096, 'x'));
    Database database(path, Mode::ReadWrite);
    EXPECT_THROW(database.Execute("CREATE TABLE t(a)"), SqliteError);
    EXPECT_EQ(Got(path), std::string(4096, 'x'));
}

TEST_F(SqliteTest, AFailedStatementCanBeUsedAgain) {
    Database database(path, Mode::ReadWrite);
    database.Execute("CREATE TABLE t(a UNIQUE)");
    Statement insert(database, "INSERT INTO t VALUES(?)");
    insert.Bind(1, "x").Run();
    try {
        insert.Bind(1, "x").Run();
        FAIL();
    } catch (const SqliteError& error) {
        EXPECT_THAT(error.what(), HasSubstr("UNIQUE"));
        EXPECT_EQ(error.code(), SQLITE_CONSTRAINT_UNIQUE);
    }
    insert.Bind(1, "y").Run();
    EXPECT_EQ(Count(database), 2);
}

TEST_F(SqliteTest, TransactionsAreAllOrNothing) {
    Database database(path, Mode::ReadWrite);
    database.Execute("CREATE TABLE t(a)");
    {
        Transaction transaction(database);
        database.Execute("INSERT INTO t VALUES(1)");
    }
    EXPECT_EQ(Count(database), 0);
    {
        Transaction transaction(database);
        database.Execute("INSERT INTO t VALUES(1); INSERT INTO t VALUES(2)");
        transaction.Commit();
    }
    EXPECT_EQ(Count(database), 2);
    EXPECT_THROW(
        {
            Transaction transaction(database);
            Transaction nested(database);
        },
        SqliteError);
    Transaction after(database);
    after.Commit();
}

TEST_F(SqliteTest, WaitsForAnothersLock) {
    Database first(path, Mode::ReadWrite);
    first.Execute("CREATE TABLE t(a)");
    auto transaction = std::make_unique<Transaction>(first);
    Database second(path, Mode::ReadWrite, 50);
    try {
        Transaction refused(second);
        FAIL();
    } catch (const SqliteError& error) {
        EXPECT_EQ(error.code() & 0xFF, SQLITE_BUSY);
    }
    std::thread writer([&] {
        Database third(path, Mode::ReadWrite, 8000);
        third.Execute("INSERT INTO t VALUES(1)");
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
    transaction.reset();
    writer.join();
    EXPECT_EQ(Count(first), 1);
}

TEST_F(SqliteTest, OpeningItAgainKeepsTheLocks) {
    Database first(path, Mode::ReadWrite);
    first.Execute("CREATE TABLE t(a)");
    const Transaction transaction(first);
    Database(path, Mode::ReadWrite);
    // Another process still finds it locked.
    EXPECT_EQ(appliance_test::WaitFor(appliance_test::Fork([&] {
                  Database other(path, Mode::ReadWrite, 0);
                  try {
                      other.Execute("BEGIN IMMEDIATE");
                  } catch (const SqliteError&) {
                      return true;
                  }
                  return false;
              })),
              0);
}

TEST_F(SqliteTest, ReadOnlyAndUnchanging) {
    const std::string odd = folder / "odd ?#%41.db";
    {
        Database database(odd, Mode::ReadWrite);
        database.Execute("CREATE TABLE t(a); INSERT INTO t VALUES(1)");
    }
    Database reader(odd, Mode::ReadOnly);
    EXPECT_EQ(Count(reader), 1);
    EXPECT_THROW(reader.Execute("INSERT INTO t VALUES(2)"), SqliteError);
    ASSERT_EQ(chmod(folder.path().c_str(), 0500), 0);
    Database unchanging(odd, Mode::Unchanging);
    EXPECT_EQ(Count(unchanging), 1);
    EXPECT_THROW(unchanging.Execute("INSERT INTO t VALUES(2)"), SqliteError);
    // No lock of another's stands in its way.
    Database writer(odd, Mode::ReadWrite);
    writer.Execute("BEGIN EXCLUSIVE");
    EXPECT_EQ(Count(unchanging), 1);
    // And its file may be replaced while it is open.
    ASSERT_EQ(std::filesystem::remove(odd), true);
    EXPECT_EQ(Count(unchanging), 1);
}

}  // namespace
