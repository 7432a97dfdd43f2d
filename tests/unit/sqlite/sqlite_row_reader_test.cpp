// One row as a record. What the connection logs about it is tested in sqlite_db_select_test.cpp.
#include "sqlite/sqlite_row_reader.h"

#include <gtest/gtest.h>

#include "sqlite/sqlite_statement.h"
#include "support/fixtures/plain_db.h"

namespace {

using OrvaDRCore::PrepareStatement;
using OrvaDRCore::RowReader;
using OrvaDRCore::Statement;

class SqliteRowReaderTest : public ::testing::Test {
  protected:
    SqliteRowReaderTest() { leftOut.clear(); }

    // The first row of a select.
    std::string Read(const std::string& select)
    {
        Statement statement;
        EXPECT_EQ(PrepareStatement(db.Handle(), select, statement), SQLITE_OK);
        EXPECT_EQ(sqlite3_step(statement.get()), SQLITE_ROW);
        return RowReader(statement.get()).Read(NoteLeftOut).ToStr();
    }

    static void NoteLeftOut(const std::string& name, int type)
    {
        leftOut += name + ":" + std::to_string(type) + " ";
    }

    PlainDb db{":memory:"};
    static std::string leftOut;
};

std::string SqliteRowReaderTest::leftOut;

TEST_F(SqliteRowReaderTest, IntegersAndTextsBecomeFields)
{
    EXPECT_EQ(Read("SELECT 7 AS id, 'seven' AS name"), "id:7, name:'seven'");
    EXPECT_EQ(leftOut, "");
}

TEST_F(SqliteRowReaderTest, OtherColumnsAreLeftOutAndReportedInTheirOrder)
{
    EXPECT_EQ(Read("SELECT NULL AS a, 1 AS b, x'00' AS c, 0.5 AS d"), "b:1");
    EXPECT_EQ(leftOut, "a:5 c:4 d:2 ");
}

TEST_F(SqliteRowReaderTest, TheOrderOfTheNamesDoesNotChangeTheOrderOfTheReports)
{
    EXPECT_EQ(Read("SELECT NULL AS d, 2 AS c, x'00' AS b, 1 AS a"), "a:1, c:2");
    EXPECT_EQ(leftOut, "d:5 b:4 ");
}

TEST_F(SqliteRowReaderTest, TheLastColumnOfANameCountsUnlessItIsLeftOut)
{
    EXPECT_EQ(Read("SELECT 1 AS b, 2 AS a, NULL AS b, 'x' AS b, NULL AS a, 3 AS c, 4 AS c"),
              "a:2, b:'x', c:4");
    EXPECT_EQ(leftOut, "b:5 a:5 ");
}

TEST_F(SqliteRowReaderTest, ManyColumnsAreReadInAnyOrder)
{
    std::string select = "SELECT 0 AS c0";
    OrvaDRCore::SqliteValueList expected;
    expected.AddValue("c0", 0);
    for (int number = 1; number < 500; ++number) {
        const int column = number * 181 % 500;
        const std::string name = "c" + std::to_string(column);
        select += "," + std::to_string(column) + " AS " + name;
        expected.AddValue(name, column);
    }
    EXPECT_EQ(Read(select), expected.ToStr());
    EXPECT_EQ(leftOut, "");
}

TEST_F(SqliteRowReaderTest, EachRowIsReadWithTheSameNames)
{
    Statement statement;
    ASSERT_EQ(PrepareStatement(db.Handle(), "SELECT 1 AS id UNION SELECT 2", statement), SQLITE_OK);
    ASSERT_EQ(sqlite3_step(statement.get()), SQLITE_ROW);
    const RowReader row(statement.get());
    EXPECT_TRUE(row.HasStatement());
    EXPECT_EQ(row.Read(NoteLeftOut).ToStr(), "id:1");
    ASSERT_EQ(sqlite3_step(statement.get()), SQLITE_ROW);
    EXPECT_EQ(row.Read(NoteLeftOut).ToStr(), "id:2");
}

TEST_F(SqliteRowReaderTest, TheLastColumnOfANameIsFoundInAnyOrder)
{
    Statement statement;
    ASSERT_EQ(PrepareStatement(db.Handle(), "SELECT 1 AS b, 2 AS a, 3 AS b, 4 AS c", statement),
              SQLITE_OK);
    ASSERT_EQ(sqlite3_step(statement.get()), SQLITE_ROW);
    RowReader row(statement.get());
    const auto find = [&row](const std::string& name) {
        const RowReader::Column* const column = row.Find(name);
        return column != nullptr ? sqlite3_value_int(row.GetValue(*column)) : 0;
    };
    for (const std::string order : {"abc", "abc", "cba", "aabbcc", "acbacb", "bd", "da", "b"}) {
        for (const char name : order) {
            const int expected = name == 'a' ? 2 : name == 'b' ? 3 : name == 'c' ? 4 : 0;
            EXPECT_EQ(find(std::string(1, name)), expected) << name << " of " << order;
        }
    }
    EXPECT_EQ(find(""), 0);
    EXPECT_EQ(find("A"), 0);
}

TEST_F(SqliteRowReaderTest, WithoutAStatementThereIsNoRow)
{
    RowReader row(nullptr);
    EXPECT_FALSE(row.HasStatement());
    EXPECT_EQ(row.Find("x"), nullptr);
    EXPECT_TRUE(row.GetColumns().empty());
}

}  // namespace
