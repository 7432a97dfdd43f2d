// Values from the makers. Those from constructors are tested in sqlite_value_test.cpp.
#include <orvadrcore/sqlite_value.h>

#include <climits>
#include <cmath>
#include <limits>
#include <optional>
#include <vector>

#include "support/fixtures/log_capture.h"

namespace {

using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using std::string;

using Int64Limits = std::numeric_limits<std::int64_t>;
constexpr double Infinity = std::numeric_limits<double>::infinity();
constexpr const char* NullText = nullptr;

const string ZeroByte("a\0'b", 4);

// A value is no larger than a text, a number, and what tells its kind.
static_assert(sizeof(SqliteValue) <= sizeof(string) + 2 * sizeof(std::int64_t));

class SqliteValueKindsTest : public LoggedTest {
  protected:
    SqliteValueKindsTest() : LoggedTest("sqlite_value.cpp") {}

    // The value as T. Nothing, and one line, when it is refused, which must leave the output as it
    // was.
    template <class T>
    std::optional<T> Read(const SqliteValue& value, T before, const string& refusal)
    {
        T out = before;
        if (value.GetValue(out)) {
            ExpectLines({});
            return out;
        }
        EXPECT_EQ(out, before);
        ExpectLines({Warn("GetValue<" + Name(out) + ">", refusal)});
        return std::nullopt;
    }

    std::optional<std::int64_t> ReadInteger(const SqliteValue& value, const string& refusal = "")
    {
        return Read<std::int64_t>(value, -77, refusal);
    }

    std::optional<double> ReadReal(const SqliteValue& value, const string& refusal = "")
    {
        return Read<double>(value, -7.5, refusal);
    }

    std::optional<string> ReadText(const SqliteValue& value, const string& refusal = "")
    {
        return Read<string>(value, "before", refusal);
    }

  private:
    // How log lines name the types.
    static string Name(const string& /*out*/) { return "std::basic_string<char> "; }
    static string Name(int /*out*/) { return "int"; }
    static string Name(unsigned int /*out*/) { return "unsigned int"; }
    static string Name(std::int64_t /*out*/) { return "long int"; }
    static string Name(double /*out*/) { return "double"; }
    static string Name(bool /*out*/) { return "bool"; }
};

TEST_F(SqliteValueKindsTest, EveryKindIsValidAndWrittenAsItsLiteral)
{
    struct Row {
        SqliteValue value;
        string literal;
    };
    const std::vector<Row> rows{
        {SqliteValue::Text("backup"), "'backup'"},
        {SqliteValue::Text(string("backup")), "'backup'"},
        {SqliteValue::Text(""), "''"},
        {SqliteValue::Text("'"), "''''"},
        {SqliteValue::Text("it's 'quoted'"), "'it''s ''quoted'''"},
        {SqliteValue::Text("\xc3\xa4\xff\n%s"), "'\xc3\xa4\xff\n%s'"},
        {SqliteValue::Text(ZeroByte), "CAST(X'61002762' AS TEXT)"},
        {SqliteValue::Text(string(1, '\0')), "CAST(X'00' AS TEXT)"},
        {SqliteValue::Integer(0), "0"},
        {SqliteValue::Integer(-1), "-1"},
        {SqliteValue::Integer(2147483648), "2147483648"},
        {SqliteValue::Integer(Int64Limits::max()), "9223372036854775807"},
        {SqliteValue::Integer(Int64Limits::min()), "-9223372036854775808"},
        {SqliteValue::Real(5), "5.0"},
        {SqliteValue::Real(0.1), "0.1"},
        {SqliteValue::Real(-0.0), "-0.0"},
        {SqliteValue::Real(1e300), "1e+300"},
        {SqliteValue::Real(Infinity), "9e999"},
        {SqliteValue::Real(-Infinity), "-9e999"},
        {SqliteValue::Real(std::nan("")), "NULL"},
        {SqliteValue::Blob("o"), "X'6f'"},
        {SqliteValue::Blob(""), "X''"},
        {SqliteValue::Blob(string("\0\xff'\x7f", 4)), "X'00ff277f'"},
        {SqliteValue::Null(), "NULL"},
    };
    for (const Row& row : rows) {
        EXPECT_TRUE(row.value.IsValid()) << row.literal;
        EXPECT_EQ(row.value.ToFormatedValue(), row.literal);
    }
}

TEST_F(SqliteValueKindsTest, ANullTextMakesNoValue)
{
    const SqliteValue value = SqliteValue::Text(NullText);
    EXPECT_FALSE(value.IsValid());
    EXPECT_FALSE(value.IsNull());
    EXPECT_EQ(value.ToFormatedValue(), "");
}

TEST_F(SqliteValueKindsTest, OnlyNullIsNull)
{
    EXPECT_TRUE(SqliteValue::Null().IsNull());
    for (const SqliteValue& value :
         {SqliteValue(), SqliteValue(0), SqliteValue(""), SqliteValue(NullText),
          SqliteValue::Text(""), SqliteValue::Blob(""), SqliteValue::Integer(0),
          SqliteValue::Real(0), SqliteValue::Real(std::nan(""))}) {
        EXPECT_FALSE(value.IsNull()) << value.ToFormatedValue();
    }
}

TEST_F(SqliteValueKindsTest, TextsAndBlobsAreReadAsTheirBytes)
{
    for (const string& bytes : {string(), string("it's"), ZeroByte, string("\xff\xc3")}) {
        EXPECT_EQ(ReadText(SqliteValue::Text(bytes)), bytes);
        EXPECT_EQ(ReadText(SqliteValue::Blob(bytes)), bytes);
    }
    EXPECT_EQ(ReadText(SqliteValue::Integer(5), "[5] is not string"), std::nullopt);
    EXPECT_EQ(ReadText(SqliteValue::Real(0.5), "[0.5] is not string"), std::nullopt);
    EXPECT_EQ(ReadText(SqliteValue::Null(), "[null] is not string"), std::nullopt);
}

TEST_F(SqliteValueKindsTest, EveryIntegerIsReadAs64Bits)
{
    for (const std::int64_t number : {Int64Limits::min(), std::int64_t{-1}, std::int64_t{0},
                                      std::int64_t{2147483648}, Int64Limits::max()}) {
        EXPECT_EQ(ReadInteger(SqliteValue::Integer(number)), number);
    }
    EXPECT_EQ(ReadInteger(SqliteValue(-5)), -5);
    EXPECT_EQ(ReadInteger(SqliteValue(UINT_MAX)), std::int64_t{UINT_MAX});
}

TEST_F(SqliteValueKindsTest, NothingElseIsReadAsAnInteger)
{
    struct Row {
        SqliteValue value;
        string shown;
    };
    const std::vector<Row> rows{
        {SqliteValue::Real(5), "5.0"},
        {SqliteValue::Real(0.5), "0.5"},
        {SqliteValue::Real(0.1), "0.10000000000000001"},
        {SqliteValue::Real(1e300), "1.0000000000000001e+300"},
        {SqliteValue::Real(Infinity), "1e+9999"},
        {SqliteValue::Real(-Infinity), "-1e+9999"},
        {SqliteValue::Real(std::nan("")), "null"},
        {SqliteValue(false), "false"},
        {SqliteValue::Text("5"), "\"5\""},
        {SqliteValue::Text("a\"'"), R"("a\"'")"},
        {SqliteValue::Blob("5"), "X'35'"},
        {SqliteValue::Null(), "null"},
        {SqliteValue(), "null"},
        {SqliteValue(true), "true"},
        {SqliteValue("5"), "\"5\""},
    };
    for (const Row& row : rows) {
        const string refusal = "[" + row.shown + "] is not int";
        EXPECT_EQ(ReadInteger(row.value, refusal), std::nullopt);
        EXPECT_EQ(Read<int>(row.value, -77, refusal), std::nullopt);
        EXPECT_EQ(Read<unsigned int>(row.value, 77, refusal), std::nullopt);
    }
}

TEST_F(SqliteValueKindsTest, A64BitIntegerIsReadAsASmallerTypeThatItFits)
{
    EXPECT_EQ(Read<int>(SqliteValue::Integer(INT_MIN), 0, ""), INT_MIN);
    EXPECT_EQ(Read<unsigned int>(SqliteValue::Integer(UINT_MAX), 0, ""), UINT_MAX);
    EXPECT_EQ(Read<bool>(SqliteValue::Integer(1), false, ""), true);
    const SqliteValue large = SqliteValue::Integer(5'000'000'000);
    EXPECT_EQ(Read<int>(large, 7, "[5000000000] is not int"), std::nullopt);
    EXPECT_EQ(Read<unsigned int>(large, 7, "[5000000000] is not int"), std::nullopt);
    EXPECT_EQ(Read<bool>(large, true, "[5000000000] is not bool"), std::nullopt);
    EXPECT_EQ(Read<unsigned int>(SqliteValue::Integer(-1), 7, "[-1] is not int"), std::nullopt);
}

TEST_F(SqliteValueKindsTest, EveryNumberIsReadAsADouble)
{
    EXPECT_EQ(ReadReal(SqliteValue::Real(0.1)), 0.1);
    EXPECT_EQ(ReadReal(SqliteValue::Real(-Infinity)), -Infinity);
    EXPECT_TRUE(std::isnan(*ReadReal(SqliteValue::Real(std::nan("")))));
    EXPECT_EQ(ReadReal(SqliteValue::Integer(-5)), -5.0);
    EXPECT_EQ(ReadReal(SqliteValue::Integer(Int64Limits::min())), -9223372036854775808.0);
    EXPECT_EQ(ReadReal(SqliteValue(5)), 5.0);
    EXPECT_EQ(ReadReal(SqliteValue(UINT_MAX)), 4294967295.0);
}

TEST_F(SqliteValueKindsTest, NothingElseIsReadAsADouble)
{
    EXPECT_EQ(ReadReal(SqliteValue::Text("0.5"), "[\"0.5\"] is not double"), std::nullopt);
    EXPECT_EQ(ReadReal(SqliteValue("0.5"), "[\"0.5\"] is not double"), std::nullopt);
    EXPECT_EQ(ReadReal(SqliteValue::Blob("0"), "[X'30'] is not double"), std::nullopt);
    EXPECT_EQ(ReadReal(SqliteValue::Null(), "[null] is not double"), std::nullopt);
    EXPECT_EQ(ReadReal(SqliteValue(), "[null] is not double"), std::nullopt);
    EXPECT_EQ(ReadReal(SqliteValue(true), "[true] is not double"), std::nullopt);
}

TEST_F(SqliteValueKindsTest, ARealIsNoBoolean)
{
    EXPECT_EQ(Read<bool>(SqliteValue::Real(1), false, "[1.0] is not bool"), std::nullopt);
    EXPECT_EQ(Read<bool>(SqliteValue::Blob("\x01"), false, "[X'01'] is not bool"), std::nullopt);
    EXPECT_EQ(Read<bool>(SqliteValue::Null(), false, "[null] is not bool"), std::nullopt);
}

TEST_F(SqliteValueKindsTest, AnAssignmentTakesTheKindButNotTheValidity)
{
    for (const SqliteValue& other :
         {SqliteValue::Text("it's"), SqliteValue::Blob("o"), SqliteValue::Null(),
          SqliteValue::Real(0.5), SqliteValue("it's"), SqliteValue::Integer(1)}) {
        for (SqliteValue value : {SqliteValue(1), SqliteValue::Blob("x"), SqliteValue::Null()}) {
            value = other;
            EXPECT_TRUE(value.IsValid());
            EXPECT_EQ(value.IsNull(), other.IsNull());
            EXPECT_EQ(value.ToFormatedValue(), other.ToFormatedValue());
        }
        SqliteValue empty;
        empty = other;
        EXPECT_FALSE(empty.IsValid());
        EXPECT_EQ(empty.ToFormatedValue(), other.ToFormatedValue());
    }
    SqliteValue emptied = SqliteValue::Null();
    emptied = SqliteValue();
    EXPECT_FALSE(emptied.IsValid());
    EXPECT_FALSE(emptied.IsNull());
}

TEST_F(SqliteValueKindsTest, AMovedFromValueHoldsNothingUntilItIsAssigned)
{
    for (const SqliteValue& original :
         {SqliteValue::Text("a text that is too long to be kept in place"), SqliteValue::Integer(5),
          SqliteValue::Real(0.5), SqliteValue(true), SqliteValue::Null()}) {
        SqliteValue value(original);
        const SqliteValue taken(std::move(value));
        // The moved-from value is what is tested. NOLINTBEGIN(bugprone-use-after-move)
        EXPECT_EQ(value.ToFormatedValue(), "");
        EXPECT_FALSE(value.IsNull());
        EXPECT_EQ(ReadText(value, "[null] is not string"), std::nullopt);
        EXPECT_EQ(ReadInteger(value, "[null] is not int"), std::nullopt);
        EXPECT_EQ(ReadReal(value, "[null] is not double"), std::nullopt);
        EXPECT_EQ(Read<bool>(value, true, "[null] is not bool"), std::nullopt);
        // NOLINTEND(bugprone-use-after-move)
        value = taken;
        EXPECT_TRUE(value.IsValid());
        EXPECT_EQ(value.ToFormatedValue(), original.ToFormatedValue());
    }
}

TEST_F(SqliteValueKindsTest, CopiesAndMovesKeepTheKind)
{
    for (const SqliteValue& original : {SqliteValue::Text("it's"), SqliteValue::Blob("o"),
                                        SqliteValue::Null(), SqliteValue::Real(0.5)}) {
        SqliteValue copy(original);
        const SqliteValue moved(std::move(copy));
        EXPECT_TRUE(moved.IsValid());
        EXPECT_EQ(moved.ToFormatedValue(), original.ToFormatedValue());
    }
    SqliteValue text = SqliteValue::Text("it's");
    const SqliteValue taken(std::move(text));
    EXPECT_FALSE(text.IsValid());  // NOLINT(bugprone-use-after-move): that is what is tested
}

TEST_F(SqliteValueKindsTest, ARecordHoldsEveryKind)
{
    SqliteValueList record;
    EXPECT_TRUE(record.AddValue("a", SqliteValue::Text("it's")));
    EXPECT_TRUE(record.AddValue("b", SqliteValue::Integer(Int64Limits::max())));
    EXPECT_TRUE(record.AddValue("c", SqliteValue::Real(2.5)));
    EXPECT_TRUE(record.AddValue("d", SqliteValue::Blob("o")));
    EXPECT_TRUE(record.AddValue("e", SqliteValue::Null()));
    EXPECT_EQ(record.ToStr(), "a:'it''s', b:9223372036854775807, c:2.5, d:X'6f', e:NULL");

    std::int64_t integer = 0;
    EXPECT_TRUE(record.GetValue("b", integer));
    EXPECT_EQ(integer, Int64Limits::max());
    double real = 0;
    EXPECT_TRUE(record.GetValue("c", real));
    EXPECT_EQ(real, 2.5);
    EXPECT_FALSE(record.GetValue("e", real));
    ExpectLines({Warn("GetValue<double>", "[null] is not double")});
    EXPECT_TRUE(record.GetValue("e").IsNull());

    EXPECT_TRUE(record.AddValue("e", SqliteValue::Blob("e")));
    EXPECT_TRUE(record.AddValue("d", SqliteValue::Null()));
    EXPECT_EQ(record.ToStr(), "a:'it''s', b:9223372036854775807, c:2.5, d:NULL, e:X'65'");
}

TEST_F(SqliteValueKindsTest, ARefusedFieldIsShownByItsLiteral)
{
    SqliteValueList record;
    EXPECT_FALSE(record.AddValue("", SqliteValue::Text("it's")));
    EXPECT_FALSE(record.AddValue("", SqliteValue::Blob("o")));
    EXPECT_FALSE(record.AddValue("", SqliteValue::Null()));
    EXPECT_FALSE(record.AddValue("a", SqliteValue::Text(NullText)));
    ExpectLines({Err("AddValue", "Bad Field[] or value ['it''s']"),
                 Err("AddValue", "Bad Field[] or value [X'6f']"),
                 Err("AddValue", "Bad Field[] or value [NULL]"),
                 Err("AddValue", "Bad Field[a] or value []")});
}

}  // namespace
