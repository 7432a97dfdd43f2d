// The columns of a row, read by name and by number. SqliteDB's part is in sqlite_db_each_test.cpp.
#include <orvadrcore/sqlite_row.h>

#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <type_traits>
#include <utility>

#include <orvadrcore/sqlite_db.h>

#include "support/fakes/sqlite_faults.h"
#include "support/fixtures/log_capture.h"

namespace {

using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteRow;
using namespace std::string_literals;

class SqliteRowTest : public LoggedTest {
  protected:
    SqliteRowTest() : LoggedTest("sqlite_row.cpp") { EXPECT_TRUE(db.Open()); }

    // Checks the one row of a select.
    void OnRow(const std::string& select, const std::function<void(const SqliteRow&)>& check)
    {
        SCOPED_TRACE(select);
        int rows = 0;
        EXPECT_TRUE(db.SelectEachByCommand(select, [&](const SqliteRow& row) {
            check(row);
            return ++rows < 2;
        }));
        EXPECT_EQ(rows, 1);
    }

    // The expression has this value, read by name and by number.
    template <class T>
    void ExpectRead(const std::string& expression, const T& expected)
    {
        OnRow("SELECT " + expression + " AS x", [&](const SqliteRow& row) {
            T named{};
            EXPECT_TRUE(row.GetValue("x", named));
            EXPECT_EQ(named, expected);
            T numbered{};
            EXPECT_TRUE(row.GetValue(0, numbered));
            EXPECT_EQ(numbered, expected);
            EXPECT_FALSE(row.IsNull("x"));
        });
        ExpectLines({});
    }

    // The expression cannot be read as a T. `out` stays, and the line shows the value.
    template <class T>
    void ExpectRefused(const std::string& expression, T out, const std::string& function,
                       const std::string& message)
    {
        const T before = out;
        OnRow("SELECT " + expression + " AS x", [&](const SqliteRow& row) {
            EXPECT_FALSE(row.GetValue("x", out));
            EXPECT_FALSE(row.GetValue(0, out));
            EXPECT_EQ(out, before);
        });
        const LogLine line = Warn(function, message);
        ExpectLines({line, line});
    }

    // Refused as any of the integers and as bool.
    void ExpectNoInteger(const std::string& expression, const std::string& shown)
    {
        ExpectRefused(expression, 7, "GetValue<int>", "[" + shown + "] is not int");
        ExpectRefused(expression, 7U, "GetValue<unsigned int>", "[" + shown + "] is not int");
        ExpectRefused(expression, std::int64_t{7}, "GetValue<long int>",
                      "[" + shown + "] is not int");
        ExpectRefused(expression, true, "GetValue<bool>", "[" + shown + "] is not bool");
    }

    SqliteDB db{":memory:", 0};
};

// ------------------------------------------------------------------------------------------ values

TEST_F(SqliteRowTest, IntegersAreReadAsEveryTypeTheyFit)
{
    ExpectRead("-2147483648", std::numeric_limits<int>::min());
    ExpectRead("2147483647", std::numeric_limits<int>::max());
    ExpectRead("0", 0U);
    ExpectRead("4294967295", std::numeric_limits<unsigned int>::max());
    ExpectRead("-9223372036854775808", std::numeric_limits<std::int64_t>::min());
    ExpectRead("9223372036854775807", std::numeric_limits<std::int64_t>::max());
    ExpectRead("0", false);
    ExpectRead("1", true);
}

TEST_F(SqliteRowTest, IntegersThatDoNotFitAreRefusedAndNeverCut)
{
    ExpectRefused("2147483648", 7, "GetValue<int>", "[2147483648] is not int");
    ExpectRefused("-2147483649", 7, "GetValue<int>", "[-2147483649] is not int");
    ExpectRefused("4294967296", 7U, "GetValue<unsigned int>", "[4294967296] is not int");
    ExpectRefused("-1", 7U, "GetValue<unsigned int>", "[-1] is not int");
    ExpectRefused("2", true, "GetValue<bool>", "[2] is not bool");
    ExpectRefused("-1", true, "GetValue<bool>", "[-1] is not bool");
    ExpectRefused("4294967297", true, "GetValue<bool>", "[4294967297] is not bool");
}

TEST_F(SqliteRowTest, DoubleReadsRealsAndIntegers)
{
    ExpectRead("0.1", 0.1);
    ExpectRead("-1e22", -1e22);
    ExpectRead("9e999", std::numeric_limits<double>::infinity());
    ExpectRead("-9e999", -std::numeric_limits<double>::infinity());
    ExpectRead("3", 3.0);
    ExpectRead("-9223372036854775808", -9223372036854775808.0);
    ExpectRefused("'0.5'", 7.0, "GetValue<double>", R"(["0.5"] is not double)");
    ExpectRefused("x'07'", 7.0, "GetValue<double>", "[X'07'] is not double");
}

TEST_F(SqliteRowTest, TextsAndBlobsAreReadWhole)
{
    ExpectRead("'it''s'", "it's"s);
    ExpectRead("''", ""s);
    ExpectRead("'ab' || char(0) || 'cd'", "ab\0cd"s);
    ExpectRead("CAST(x'FF0061' AS TEXT)", "\xFF\0a"s);  // not UTF-8
    ExpectRead("x'00ff0a'", "\0\xFF\n"s);
    ExpectRead("x''", ""s);
    ExpectRead("zeroblob(3)", "\0\0\0"s);
    ExpectRead("replace(hex(zeroblob(5000000)), '00', 'xy')", [] {
        std::string text;
        for (int i = 0; i < 5'000'000; ++i) text += "xy";
        return text;
    }());
}

TEST_F(SqliteRowTest, ATextOfAUtf16FileIsReadAsUtf8)
{
    ASSERT_TRUE(db.Exec("PRAGMA encoding='UTF-16'"));
    ASSERT_TRUE(db.Exec("CREATE TABLE texts (x); INSERT INTO texts VALUES ('Z\xC3\xBCrich')"));
    OnRow("SELECT x FROM texts", [](const SqliteRow& row) {
        std::string text;
        EXPECT_TRUE(row.GetValue("x", text));
        EXPECT_EQ(text, "Z\xC3\xBCrich");
    });
}

TEST_F(SqliteRowTest, NothingIsConverted)
{
    ExpectNoInteger("'12'", "\"12\"");
    ExpectNoInteger("x'313A'", "X'313a'");
    ExpectNoInteger("x''", "X''");
    ExpectNoInteger("0.5", "0.5");
    ExpectNoInteger("'say \"' || char(10)", R"("say \"\n")");
    const std::string kind = "GetValue<std::basic_string<char> >";
    ExpectRefused("12", "old"s, kind, "[12] is not string");
    ExpectRefused("0.5", "old"s, kind, "[0.5] is not string");
}

TEST_F(SqliteRowTest, NullIsNoValueOfAnyType)
{
    ExpectNoInteger("NULL", "null");
    ExpectRefused("NULL", 7.0, "GetValue<double>", "[null] is not double");
    ExpectRefused("NULL", "old"s, "GetValue<std::basic_string<char> >", "[null] is not string");
    OnRow("SELECT NULL AS x, 1 AS y", [](const SqliteRow& row) {
        EXPECT_TRUE(row.IsNull("x"));
        EXPECT_FALSE(row.IsNull("y"));
    });
    ExpectLines({});
}

// Whether a row can be read as a T.
template <class T, class = void>
struct IsReadable : std::false_type {
};
template <class T>
struct IsReadable<
    T, std::void_t<decltype(std::declval<const SqliteRow&>().GetValue("x", std::declval<T&>()))>>
    : std::true_type {
};

TEST_F(SqliteRowTest, OtherTypesDoNotCompile)
{
    EXPECT_TRUE((IsReadable<std::string>::value && IsReadable<std::int64_t>::value));
    EXPECT_FALSE((IsReadable<short>::value || IsReadable<std::uint64_t>::value));
    EXPECT_FALSE((IsReadable<float>::value || IsReadable<const char*>::value));
}

// ----------------------------------------------------------------------------------------- columns

TEST_F(SqliteRowTest, ColumnsHaveTheNamesThatTheStatementGivesThem)
{
    OnRow("SELECT 1 AS id, 2 AS \"two words\", 3 AS ID", [](const SqliteRow& row) {
        EXPECT_EQ(row.GetColumnCount(), 3U);
        EXPECT_EQ(row.GetColumnName(0), "id");
        EXPECT_EQ(row.GetColumnName(1), "two words");
        EXPECT_EQ(row.GetColumnName(2), "ID");
        EXPECT_EQ(row.GetColumnName(3), "");
        EXPECT_EQ(row.GetColumnName(std::numeric_limits<std::size_t>::max()), "");
        int number = 0;
        EXPECT_TRUE(row.GetValue("id", number));
        EXPECT_EQ(number, 1);
        EXPECT_TRUE(row.GetValue("ID", number));
        EXPECT_EQ(number, 3);
    });
}

TEST_F(SqliteRowTest, OfARepeatedNameTheLastColumnCounts)
{
    OnRow("SELECT 1 AS x, 2 AS y, NULL AS x, 4 AS y", [](const SqliteRow& row) {
        int number = 0;
        for (int reading = 0; reading < 3; ++reading) {
            EXPECT_TRUE(row.IsNull("x"));
            EXPECT_TRUE(row.GetValue("y", number));
            EXPECT_EQ(number, 4);
        }
        EXPECT_TRUE(row.GetValue(1, number));
        EXPECT_EQ(number, 2);
    });
}

TEST_F(SqliteRowTest, AMissingColumnIsReportedForThoseWhoLog)
{
    int out = 7;
    OnRow("SELECT 1 AS x", [&](const SqliteRow& row) {
        EXPECT_FALSE(row.GetValue("y", out));
        EXPECT_FALSE(row.GetValue("", out));
        EXPECT_FALSE(row.GetValue(1, out));
        EXPECT_TRUE(row.IsNull("y"));
        EXPECT_TRUE(row.IsNull(""));
    });
    EXPECT_EQ(out, 7);
    ExpectLines({Debug("GetValue", "field [y] is not existed"), Err("GetValue", "Invalid field []"),
                 Debug("GetValue", "field [1] is not existed")});
}

TEST_F(SqliteRowTest, EveryRowIsReadInAnyOrder)
{
    const std::string select =
        "WITH RECURSIVE n (c) AS (VALUES (0) UNION ALL SELECT c+1 FROM n WHERE c<99)"
        "SELECT c AS a, c+100 AS b, c+200 AS c FROM n";
    int rows = 0;
    EXPECT_TRUE(db.SelectEachByCommand(select, [&](const SqliteRow& row) {
        const std::string order = rows % 3 == 0 ? "cba" : rows % 3 == 1 ? "cabbc" : "bbaac";
        for (const char name : order) {
            int number = -1;
            EXPECT_TRUE(row.GetValue(std::string(1, name), number));
            EXPECT_EQ(number, rows + 100 * (name - 'a'));
        }
        ++rows;
        return true;
    }));
    EXPECT_EQ(rows, 100);
}

TEST_F(SqliteRowTest, AValueThatSqliteHasNoMemoryForIsNotTakenForNull)
{
    SqliteFaults faults;
    std::string out = "old";
    for (const bool isMoreWanted : {true, false}) {
        const auto take = [&](const SqliteRow& row) {
            EXPECT_FALSE(row.IsNull("x"));
            // Set here, because SQLite itself calls it for the names of the columns.
            faults.valueText = [](sqlite3_value*) -> const unsigned char* { return nullptr; };
            EXPECT_FALSE(row.GetValue("x", out));
            faults.valueText = nullptr;
            return isMoreWanted;
        };
        EXPECT_FALSE(db.SelectEachByCommand("SELECT 'text' AS x", take));
        EXPECT_EQ(out, "old");
        EXPECT_EQ(db.GetErr()[0]["err_msg"]["sqlite_errcode"], SQLITE_NOMEM);
        EXPECT_EQ(db.GetErr()[0]["err_msg"]["sqlite_errmsg"], "out of memory");
        const std::vector<LogRecord> lines = TakeLines();
        ASSERT_EQ(lines.size(), 2U);
        EXPECT_NE(lines[0].text.find("no memory to read field [x]"), std::string::npos);
    }
}

}  // namespace
