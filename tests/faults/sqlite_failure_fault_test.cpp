// Statements that SQLite refuses while memory runs out, too: reporting a failure needs memory.
#include <string>
#include <vector>

#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>

#include "fault.h"
#include "support/fakes/sqlite_faults.h"
#include "support/fixtures/plain_db.h"
#include "support/fixtures/temp_dir.h"

using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValueList;

namespace {

constexpr const char* Update = "UPDATE nodes SET name='a name that is long enough'";

// A file with a node in it, and an open connection.
struct Place {
    explicit Place(unsigned int retries) : db(path, retries)
    {
        PlainDb(path).Run("CREATE TABLE nodes (id INTEGER PRIMARY KEY, name TEXT)");
        PlainDb(path).Run("INSERT INTO nodes VALUES (1,'old')");
        EXPECT_TRUE(db.Open());
    }

    std::string Names() const { return PlainDb(path).Run("SELECT name FROM nodes"); }

    // No transaction is open, and another one can do its work.
    void ExpectUsable()
    {
        EXPECT_TRUE(db.Open());
        SqliteTransaction transaction(db);
        EXPECT_TRUE(transaction.Begin() && db.Exec(Update) && transaction.Commit());
        EXPECT_EQ(Names(), "a name that is long enough");
    }

    TempDir dir;
    std::string path = dir.File("test.db");
    SqliteDB db;
};

// While it lives SQLite refuses the first `count` statements with this text.
class Refusal {
  public:
    Refusal(const std::string& text, int count)
    {
        faults_.prepare = [text, count](sqlite3* db, const char* sql,
                                        sqlite3_stmt** statement) mutable {
            if (text != sql || count-- <= 0) return RealPrepare(db, sql, statement);
            *statement = nullptr;
            return SQLITE_IOERR;
        };
    }

  private:
    SqliteFaults faults_;
};

void RefuseInTransaction(const std::string& text, int count)
{
    EveryCallFails("a transaction whose " + text + " fails", [&] {
        Place place(1);
        bool isCommitted = false;
        {
            const Refusal refusal(text, count);
            const Outcome outcome = WithFault([&] {
                SqliteTransaction transaction(place.db);
                isCommitted = transaction.Begin() && place.db.Exec(Update) && transaction.Commit();
                return isCommitted && transaction.Rollback();
            });
            outcome.ExpectLogged();
        }
        const std::string names = place.Names();
        EXPECT_TRUE(names == "old" || names == "a name that is long enough") << names;
        if (isCommitted) {
            EXPECT_NE(names, "old");
        }
        place.ExpectUsable();
    });
}

}  // namespace

TEST(SqliteFailureFaults, Exec)
{
    EveryCallFails("SqliteDB: Exec that is refused", [] {
        Place place(1);
        WithFault([&] { return place.db.Exec("INSERT INTO nodes VALUES (1,'the same number')"); });
        EXPECT_EQ(place.Names(), "old");
        place.ExpectUsable();
    });
}

TEST(SqliteFailureFaults, Select)
{
    EveryCallFails("SqliteDB: a select that is refused", [] {
        Place place(1);
        SqliteValueList record;
        record.AddValue("old", 1);
        WithFault([&] { return place.db.SelectByCommand("SELECT colour FROM nodes", record); });
        EXPECT_EQ(record.ToStr(), "old:1");
        place.ExpectUsable();
    });
}

TEST(SqliteFailureFaults, InsertRecords)
{
    for (const std::string text : {"", "BEGIN IMMEDIATE", "COMMIT", "ROLLBACK"}) {
        EveryCallFails("SqliteDB: InsertRecords that is refused, and " + text, [&] {
            Place place(0);
            SqliteValueList another;
            another.AddValue("id", 2);
            SqliteValueList same;
            same.AddValue("id", 1);
            const std::vector<SqliteValueList> records{another, same};
            {
                const Refusal refusal(text, 1);
                WithFault([&] {
                    const SqliteTableHandler nodes("nodes", "");
                    return place.db.InsertRecords(nodes, records);
                });
            }
            EXPECT_EQ(place.Names(), "old");
            place.ExpectUsable();
        });
    }
}

TEST(SqliteFailureFaults, Begin)
{
    RefuseInTransaction("BEGIN IMMEDIATE", 1);
}

TEST(SqliteFailureFaults, Commit)
{
    RefuseInTransaction("COMMIT", 2);
}

TEST(SqliteFailureFaults, Rollback)
{
    EveryCallFails("a transaction whose ROLLBACK fails", [] {
        Place place(0);
        {
            const Refusal refusal("ROLLBACK", 1);
            WithFault([&] {
                SqliteTransaction transaction(place.db);
                return transaction.Begin() && place.db.Exec(Update) && transaction.Rollback();
            });
        }
        EXPECT_EQ(place.Names(), "old");
        place.ExpectUsable();
    });
}

// The destructor must not throw.
TEST(SqliteFailureFaults, Destructor)
{
    EveryCallFails("a transaction that is left and whose ROLLBACK fails", [] {
        Place place(0);
        {
            const Refusal refusal("ROLLBACK", 1);
            WithFault([&] {
                SqliteTransaction transaction(place.db);
                return transaction.Begin() && place.db.Exec(Update);
            });
        }
        EXPECT_EQ(place.Names(), "old");
        place.ExpectUsable();
    });
}
