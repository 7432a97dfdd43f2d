// Attempts and transactions of a connection by themselves. What callers see of them is tested with
// SqliteDB and SqliteTransaction.
#include "sqlite/sqlite_connection.h"

#include <orvadrcore/sqlite_transaction.h>

#include <stdexcept>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::RowReader;
using OrvaDRCore::SqliteConnection;
using OrvaDRCore::SqliteTransaction;

class SqliteConnectionTest : public SqliteFixture {
  protected:
    SqliteConnectionTest()
    {
        Run("CREATE TABLE jobs (id INTEGER PRIMARY KEY)");
        EXPECT_TRUE(connection.Open() && connection.InstallBusyWait());
    }

    void TearDown() override
    {
        connection.Close();
        SqliteFixture::TearDown();
    }

    bool Insert(int id)
    {
        return connection.Execute("INSERT INTO jobs VALUES (" + std::to_string(id) + ")");
    }

    std::string Ids() const { return Run("SELECT id FROM jobs"); }

    SqliteConnection connection{path, 3};
};

// -------------------------------------------------------------------------------------- statements

TEST_F(SqliteConnectionTest, ASelectGivesEachRowUntilNoMoreAreWanted)
{
    ASSERT_TRUE(Insert(1) && Insert(2) && Insert(3));
    int rows = 0;
    EXPECT_TRUE(connection.Select("SELECT id FROM jobs", [&](const RowReader&) {
        ++rows;
        return true;
    }));
    EXPECT_EQ(rows, 3);
    EXPECT_TRUE(
        connection.Select("SELECT id FROM jobs", [&](const RowReader&) { return ++rows < 5; }));
    EXPECT_EQ(rows, 5);
}

TEST_F(SqliteConnectionTest, WhatARowsTakerThrowsEndsTheSelect)
{
    ASSERT_TRUE(Insert(1));
    const auto fail = [](const RowReader&) -> bool { throw std::runtime_error("enough"); };
    EXPECT_THROW(connection.Select("SELECT id FROM jobs", fail), std::runtime_error);
    EXPECT_TRUE(connection.Execute("DROP TABLE jobs"));  // no statement holds a lock
}

TEST_F(SqliteConnectionTest, AClosedConnectionFailsThroughSqlite)
{
    connection.Close();
    EXPECT_FALSE(connection.IsOpen());
    EXPECT_FALSE(connection.IsInTransaction());
    EXPECT_FALSE(connection.Select("SELECT 1", [](const RowReader&) { return true; }));
    EXPECT_EQ(connection.Error().GetRecord()["sqlite_errcode"], SQLITE_MISUSE);
}

// ----------------------------------------------------------------------------------- RunAtomically

TEST_F(SqliteConnectionTest, WorkThatSucceedsIsCommitted)
{
    EXPECT_TRUE(connection.RunAtomically(false, [&] {
        EXPECT_TRUE(connection.IsInTransaction());
        return Insert(1) && Insert(2);
    }));
    EXPECT_FALSE(connection.IsInTransaction());
    EXPECT_EQ(Ids(), "1;2");
}

TEST_F(SqliteConnectionTest, WorkThatFailsIsRolledBackAndItsErrorStays)
{
    EXPECT_FALSE(connection.RunAtomically(false, [&] { return Insert(1) && Insert(1); }));
    EXPECT_FALSE(connection.IsInTransaction());
    EXPECT_EQ(connection.Error().GetRecord()["sqlite_errcode"], SQLITE_CONSTRAINT);
    EXPECT_EQ(Ids(), "");
}

TEST_F(SqliteConnectionTest, WorkThatThrowsIsRolledBack)
{
    const auto fail = [&]() -> bool {
        EXPECT_TRUE(Insert(1));
        throw std::runtime_error("enough");
    };
    EXPECT_THROW(connection.RunAtomically(false, fail), std::runtime_error);
    EXPECT_FALSE(connection.IsInTransaction());
    EXPECT_EQ(Ids(), "");
}

TEST_F(SqliteConnectionTest, NestedWorkThatFailsTakesBackItsOwnChangesOnly)
{
    ASSERT_TRUE(connection.Execute("BEGIN") && Insert(1));
    EXPECT_FALSE(connection.RunAtomically(true, [&] { return Insert(2) && Insert(1); }));
    EXPECT_TRUE(connection.RunAtomically(true, [&] { return Insert(3); }));
    EXPECT_TRUE(connection.IsInTransaction());
    EXPECT_TRUE(connection.Execute("COMMIT"));
    EXPECT_EQ(Ids(), "1;3");
}

TEST_F(SqliteConnectionTest, NestedWorkIsNotDoneAfterTheTransactionHasEnded)
{
    EXPECT_FALSE(connection.RunAtomically(true, [&] { return Insert(1); }));
    EXPECT_EQ(OrvaDRCore::toString(connection.Error().GetRecord()),
              R"({"command":"SAVEPOINT orvadr_insert","sqlite_errcode":4,)"
              R"("sqlite_errmsg":"the transaction was rolled back"})");
    EXPECT_EQ(Ids(), "");
}

// ------------------------------------------------------------------------------------------- owner

TEST_F(SqliteConnectionTest, NothingIsRetriedWhileATransactionHasAnOwner)
{
    const SqliteTransaction owner(db);
    const auto fail = [] { return false; };
    EXPECT_EQ(connection.Retry(fail).failures, 4U);
    connection.SetOwner(&owner);
    EXPECT_EQ(connection.Retry(fail).failures, 1U);
    connection.SetOwner(nullptr);
    EXPECT_EQ(connection.Retry(fail).failures, 4U);
}

}  // namespace
