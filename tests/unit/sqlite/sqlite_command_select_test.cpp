// SelectCommand's groups, orders and limits: their texts, and what they select.
#include <orvadrcore/sqlite_command.h>

#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "support/fixtures/sqlite_fixture.h"

namespace {

using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteGreater;
using OrvaDRCore::SqliteGreaterEqual;
using OrvaDRCore::SqliteLess;
using OrvaDRCore::SqliteLessEqual;
using OrvaDRCore::SqliteOrder;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;

constexpr std::uint64_t Largest = std::numeric_limits<std::uint64_t>::max();

SelectCommand FromVolumes(const std::vector<std::string>& fields)
{
    SelectCommand select;
    EXPECT_TRUE(select.SetTable(SqliteTableHandler("volumes", "")));
    for (const std::string& field : fields) EXPECT_TRUE(select.AddField(field));
    return select;
}

class SqliteSelectCommandTest : public SqliteFixture {
  protected:
    // Four volumes on two nodes.
    void MakeVolumes() const
    {
        Run("CREATE TABLE volumes (name TEXT, node TEXT, bytes INTEGER);"
            "INSERT INTO volumes VALUES ('a','n1',900),('b','n2',5000000000),"
            "('c','n1',30),('d','n2',NULL)");
    }

    // The field `name` of each row: "abc".
    std::string Names(const SelectCommand& select)
    {
        std::vector<SqliteValueList> rows;
        EXPECT_TRUE(db.SelectRecords(select, rows));
        std::string names;
        for (const SqliteValueList& row : rows) {
            std::string name = "?";
            EXPECT_TRUE(row.GetValue("name", name));
            names += name;
        }
        return names;
    }

    // The names, sorted by bytes with NULL first, of at most this many rows after these.
    std::string Smallest(std::uint64_t rows, std::uint64_t offset = 0)
    {
        SelectCommand select = FromVolumes({"name"});
        EXPECT_TRUE(select.OrderBy("bytes"));
        select.Limit(rows, offset);
        return Names(select);
    }
};

// ------------------------------------------------------------------------------------------ texts

TEST_F(SqliteSelectCommandTest, PartsFollowTheConditionInTheOrderOfSql)
{
    SelectCommand select = FromVolumes({"a", "sum(b)"});
    select.Limit(20, 5);
    EXPECT_TRUE(select.OrderBy("c", SqliteOrder::Descending));
    EXPECT_TRUE(select.GroupBy("a"));
    EXPECT_TRUE(select.OrderBy("d"));
    EXPECT_TRUE(select.GroupBy("b"));
    EXPECT_TRUE(select.SetCondition("id=7"));
    EXPECT_EQ(select.GetCommand(),
              "SELECT a,sum(b) FROM volumes WHERE id=7 "
              "GROUP BY a,b ORDER BY c DESC,d LIMIT 20 OFFSET 5");
}

TEST_F(SqliteSelectCommandTest, EachPartIsWrittenOnlyWhenItIsUsed)
{
    SelectCommand grouped = FromVolumes({"a"});
    EXPECT_TRUE(grouped.GroupBy("a"));
    EXPECT_EQ(grouped.GetCommand(), "SELECT a FROM volumes GROUP BY a");

    SelectCommand ordered = FromVolumes({"a"});
    EXPECT_TRUE(ordered.OrderBy("lower(a)", SqliteOrder::Ascending));
    EXPECT_EQ(ordered.GetCommand(), "SELECT a FROM volumes ORDER BY lower(a)");

    SelectCommand limited = FromVolumes({"a"});
    limited.SelectAll();
    limited.Limit(20);
    EXPECT_EQ(limited.GetCommand(), "SELECT  * FROM volumes LIMIT 20");
}

TEST_F(SqliteSelectCommandTest, ALimitIsReplacedAndMayBeZero)
{
    SelectCommand select = FromVolumes({"a"});
    select.Limit(20, 5);
    select.Limit(0);
    EXPECT_EQ(select.GetCommand(), "SELECT a FROM volumes LIMIT 0");
    select.Limit(0, 1);
    EXPECT_EQ(select.GetCommand(), "SELECT a FROM volumes LIMIT 0 OFFSET 1");
}

// SQLite takes a larger number for a real and fails.
TEST_F(SqliteSelectCommandTest, ALimitBeyond64BitIntegersBecomesTheLargestOfThem)
{
    SelectCommand select = FromVolumes({"a"});
    select.Limit(Largest, Largest);
    EXPECT_EQ(select.GetCommand(),
              "SELECT a FROM volumes LIMIT 9223372036854775807 OFFSET 9223372036854775807");
    select.Limit(9223372036854775807U, 9223372036854775808U);
    EXPECT_EQ(select.GetCommand(),
              "SELECT a FROM volumes LIMIT 9223372036854775807 OFFSET 9223372036854775807");
    select.Limit(9223372036854775806U);
    EXPECT_EQ(select.GetCommand(), "SELECT a FROM volumes LIMIT 9223372036854775806");
}

TEST_F(SqliteSelectCommandTest, AnEmptyFieldIsRefusedAndLogged)
{
    SelectCommand select = FromVolumes({"a"});
    EXPECT_FALSE(select.OrderBy(""));
    ExpectLines({Err("OrderBy", "Invalid field []").In("sqlite_command.cpp")});
    EXPECT_FALSE(select.OrderBy("", SqliteOrder::Descending));
    ExpectLines({Err("OrderBy", "Invalid field []").In("sqlite_command.cpp")});
    EXPECT_FALSE(select.GroupBy(""));
    ExpectLines({Err("GroupBy", "Invalid field []").In("sqlite_command.cpp")});
    EXPECT_EQ(select.GetCommand(), "SELECT a FROM volumes");

    EXPECT_TRUE(select.OrderBy("b"));
    EXPECT_TRUE(select.GroupBy("c"));
    EXPECT_FALSE(select.OrderBy(""));
    EXPECT_FALSE(select.GroupBy(""));
    ExpectLines({Err("OrderBy", "Invalid field []").In("sqlite_command.cpp"),
                 Err("GroupBy", "Invalid field []").In("sqlite_command.cpp")});
    EXPECT_EQ(select.GetCommand(), "SELECT a FROM volumes GROUP BY c ORDER BY b");
}

TEST_F(SqliteSelectCommandTest, OnlyThePartsInUseAreDescribedForTheLog)
{
    SelectCommand select = FromVolumes({"a", "b"});
    EXPECT_EQ(select.ToStr(), "volumes]condition:[]/fields:[a, b]");
    select.Limit(20, 5);
    EXPECT_EQ(select.ToStr(), "volumes]condition:[]/fields:[a, b]/limit:[20 OFFSET 5]");
    EXPECT_TRUE(select.GroupBy("a"));
    EXPECT_TRUE(select.GroupBy("b"));
    EXPECT_TRUE(select.OrderBy("c", SqliteOrder::Descending));
    EXPECT_TRUE(select.OrderBy("d"));
    EXPECT_EQ(
        select.ToStr(),
        "volumes]condition:[]/fields:[a, b]/group:[a,b]/order:[c DESC,d]/limit:[20 OFFSET 5]");
}

TEST_F(SqliteSelectCommandTest, PartsAloneDoNotMakeACommandValid)
{
    SelectCommand select;
    EXPECT_TRUE(select.OrderBy("a"));
    EXPECT_TRUE(select.GroupBy("a"));
    select.Limit(1);
    EXPECT_FALSE(select.IsValid());
    EXPECT_EQ(select.GetCommand(), "");
    ExpectLines({Err("GetCommand", "Bad select command").In("sqlite_command.cpp")});
}

TEST_F(SqliteSelectCommandTest, ACopyIsIndependent)
{
    SelectCommand select = FromVolumes({"a"});
    EXPECT_TRUE(select.OrderBy("a"));
    SelectCommand copy(select);
    EXPECT_TRUE(copy.OrderBy("b"));
    copy.Limit(1);
    EXPECT_EQ(select.GetCommand(), "SELECT a FROM volumes ORDER BY a");
    select = copy;
    EXPECT_EQ(select.GetCommand(), "SELECT a FROM volumes ORDER BY a,b LIMIT 1");
}

// ---------------------------------------------------------------------------------------- results

TEST_F(SqliteSelectCommandTest, AColumnOfNumbersIsSortedByTheirValue)
{
    MakeVolumes();
    SelectCommand select = FromVolumes({"name"});
    EXPECT_TRUE(select.OrderBy("bytes"));
    EXPECT_EQ(Names(select), "dcab");  // NULL, 30, 900, 5000000000

    SelectCommand backwards = FromVolumes({"name"});
    EXPECT_TRUE(backwards.OrderBy("node", SqliteOrder::Descending));
    EXPECT_TRUE(backwards.OrderBy("bytes"));
    EXPECT_EQ(Names(backwards), "dbca");
}

// What the header warns of.
TEST_F(SqliteSelectCommandTest, ANameGivenByAsIsSortedByUnlessTheTableIsNamed)
{
    MakeVolumes();
    SelectCommand select = FromVolumes({"name", "CAST(bytes AS TEXT) AS bytes"});
    EXPECT_TRUE(select.SetCondition(SqliteGreater("bytes", 30)));
    SelectCommand qualified = select;
    EXPECT_TRUE(select.OrderBy("bytes"));
    EXPECT_EQ(Names(select), "ba");  // '5000000000' before '900'
    EXPECT_TRUE(qualified.OrderBy("volumes.bytes"));
    EXPECT_EQ(Names(qualified), "ab");
}

TEST_F(SqliteSelectCommandTest, RowsAreGroupedAndGroupsAreSorted)
{
    MakeVolumes();
    SelectCommand select = FromVolumes({"node AS name", "count(*) AS volumes"});
    EXPECT_TRUE(select.GroupBy("node"));
    EXPECT_TRUE(select.OrderBy("sum(bytes)", SqliteOrder::Descending));
    std::vector<SqliteValueList> rows;
    ASSERT_TRUE(db.SelectRecords(select, rows));
    ASSERT_EQ(rows.size(), 2U);
    EXPECT_EQ(rows[0].ToStr(), "name:'n2', volumes:2");
    EXPECT_EQ(rows[1].ToStr(), "name:'n1', volumes:2");

    EXPECT_TRUE(select.GroupBy("bytes"));
    rows.clear();
    ASSERT_TRUE(db.SelectRecords(select, rows));
    EXPECT_EQ(rows.size(), 4U);
}

TEST_F(SqliteSelectCommandTest, ALimitTakesAndSkipsRows)
{
    MakeVolumes();
    EXPECT_EQ(Smallest(2), "dc");
    EXPECT_EQ(Smallest(2, 1), "ca");
    EXPECT_EQ(Smallest(2, 3), "b");
    EXPECT_EQ(Smallest(2, 4), "");
    EXPECT_EQ(Smallest(0), "");
    EXPECT_EQ(Smallest(Largest), "dcab");
    EXPECT_EQ(Smallest(Largest, 3), "b");
    EXPECT_EQ(Smallest(1, Largest), "");
}

TEST_F(SqliteSelectCommandTest, OneRowIsSelectedWithAnOrderAndALimit)
{
    MakeVolumes();
    SelectCommand select = FromVolumes({"name"});
    EXPECT_TRUE(select.OrderBy("bytes", SqliteOrder::Descending));
    select.Limit(1, 1);
    SqliteValueList row;
    EXPECT_TRUE(db.SelectRecord(select, row));
    EXPECT_EQ(row.ToStr(), "name:'a'");

    select.Limit(0);
    EXPECT_TRUE(db.SelectRecord(select, row));  // a success without a row
    EXPECT_EQ(row.ToStr(), "name:'a'");
}

TEST_F(SqliteSelectCommandTest, ComparisonsSelectByTheValueOfAColumn)
{
    MakeVolumes();
    const auto names = [&](const OrvaDRCore::SqliteCondition& condition) {
        SelectCommand select = FromVolumes({"name"});
        EXPECT_TRUE(select.SetCondition(condition));
        EXPECT_TRUE(select.OrderBy("name"));
        return Names(select);
    };
    EXPECT_EQ(names(SqliteLess("bytes", 900)), "c");
    EXPECT_EQ(names(SqliteLessEqual("bytes", 900)), "ac");
    EXPECT_EQ(names(SqliteGreater("bytes", 900)), "b");
    EXPECT_EQ(names(SqliteGreaterEqual("bytes", 900)), "ab");
    EXPECT_EQ(names(SqliteLess("name", "c")), "ab");
    EXPECT_EQ(names(SqliteGreater("bytes", "900")), "b");  // the column makes it a number
    EXPECT_EQ(names(SqliteEqual("bytes", 900)), "a");
}

}  // namespace
