// Inserting over a plain connection. Transactions, retries and log lines are tested in
// sqlite_db_insert_test.cpp.
#include "sqlite/sqlite_batch.h"

#include <gtest/gtest.h>

#include <cmath>

#include "base/json_helpers.h"
#include "support/fixtures/plain_db.h"

namespace {

using OrvaDRCore::InsertRows;
using OrvaDRCore::IsStorable;
using OrvaDRCore::SqliteError;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;

using Records = std::vector<SqliteValueList>;

class SqliteBatchTest : public ::testing::Test {
  protected:
    SqliteBatchTest() { db.Run("CREATE TABLE jobs (id INTEGER PRIMARY KEY, name)"); }

    static SqliteValueList Job(int id, const std::string& name)
    {
        SqliteValueList record;
        record.AddValue("id", id);
        record.AddValue("name", name);
        return record;
    }

    bool Insert(const Records& records, bool replacable = false)
    {
        return InsertRows(db.Handle(), "jobs", records, replacable, error);
    }

    PlainDb db{":memory:"};
    SqliteError error;
};

TEST_F(SqliteBatchTest, ARecordIsStorableWhenItHasAFieldAndAllValuesAreValid)
{
    EXPECT_FALSE(IsStorable(SqliteValueList()));
    EXPECT_TRUE(IsStorable(Job(1, "a")));
    const SqliteValueList broken = Job(1, "a");
    // NOLINTNEXTLINE(cppcoreguidelines-pro-type-const-cast)
    const_cast<SqliteValue&>(broken.GetValue("name")) = SqliteValue();
    EXPECT_FALSE(IsStorable(broken));
}

TEST_F(SqliteBatchTest, RecordsAreInsertedInTheirOrder)
{
    EXPECT_TRUE(Insert({Job(2, "it's"), Job(1, "")}));
    EXPECT_EQ(error.GetCode(), 0);
    EXPECT_EQ(db.Run("SELECT id, name FROM jobs"), "1,;2,it's");
}

TEST_F(SqliteBatchTest, RecordsMayHaveDifferentFields)
{
    SqliteValueList onlyName;
    onlyName.AddValue("name", "b");
    EXPECT_TRUE(Insert({Job(1, "a"), onlyName, Job(7, "c"), onlyName}));
    EXPECT_EQ(db.Run("SELECT id, name FROM jobs"), "1,a;2,b;7,c;8,b");
}

TEST_F(SqliteBatchTest, ValuesAreStoredByTheirKind)
{
    Records records;
    for (const SqliteValue& value :
         {SqliteValue::Text("it's"), SqliteValue("it's"), SqliteValue::Integer(5'000'000'000),
          SqliteValue(4000000000U), SqliteValue(true), SqliteValue::Real(0.5),
          SqliteValue::Blob("o"), SqliteValue::Blob(""), SqliteValue::Null(),
          SqliteValue::Real(std::nan(""))}) {
        records.emplace_back().AddValue("name", value);
    }
    EXPECT_TRUE(Insert(records));
    EXPECT_EQ(db.Run("SELECT typeof(name), quote(name) FROM jobs ORDER BY id"),
              "text,'it''s';text,'it''s';integer,5000000000;integer,4000000000;integer,1;"
              "real,0.5;blob,X'6F';blob,X'';null,NULL;null,NULL");
}

TEST_F(SqliteBatchTest, ARowThatIsThereIsReplacedOnlyWhenThatIsAllowed)
{
    EXPECT_TRUE(Insert({Job(1, "a")}));
    EXPECT_FALSE(Insert({Job(1, "b")}));
    EXPECT_TRUE(Insert({Job(1, "c")}, true));
    EXPECT_EQ(db.Run("SELECT id, name FROM jobs"), "1,c");
}

TEST_F(SqliteBatchTest, TheFirstRecordThatFailsSetsTheErrorAndStops)
{
    EXPECT_FALSE(Insert({Job(1, "a"), Job(1, "b"), Job(2, "c")}));
    EXPECT_EQ(error.GetCode(), 404);
    EXPECT_EQ(OrvaDRCore::toString(error.GetRecord()),
              R"({"command":"INSERT INTO jobs (id,name) VALUES (?,?);","sqlite_errcode":19,)"
              R"("sqlite_errmsg":"UNIQUE constraint failed: jobs.id"})");
    EXPECT_EQ(db.Run("SELECT id, name FROM jobs"), "1,a");
}

TEST_F(SqliteBatchTest, AStatementThatCannotBePreparedSetsTheError)
{
    EXPECT_FALSE(InsertRows(db.Handle(), "nowhere", {Job(1, "a")}, false, error));
    EXPECT_EQ(error.GetRecord()["sqlite_errmsg"], "no such table: nowhere");
}

}  // namespace
