// Values of every kind go into a table by every way there is, and SQLite holds what was meant.
#include <gtest/gtest.h>
#include <orvadrcore/sqlite_db.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <random>

#include "sqlite/sqlite_connection.h"
#include "support/fixtures/stored_value.h"

namespace {

using namespace OrvaDRCore;  // NOLINT(google-build-using-namespace): the whole layer is used

using StoredValues = std::vector<StoredValue>;
using Int64Limits = std::numeric_limits<std::int64_t>;
using DoubleLimits = std::numeric_limits<double>;

std::string EveryByte()
{
    std::string bytes;
    for (int byte = 0; byte < 256; ++byte) bytes += static_cast<char>(byte);
    return bytes;
}

// The cases that a person thinks of.
StoredValues Chosen()
{
    StoredValues values{std::monostate()};
    for (const std::int64_t integer :
         {Int64Limits::min(), Int64Limits::min() + 1, std::int64_t{-1}, std::int64_t{0},
          std::int64_t{1}, std::int64_t{2147483648}, Int64Limits::max()}) {
        values.emplace_back(integer);
    }
    for (const double real :
         {0.0, 0.5, 5.0, -5.0, 0.1 + 0.2, 1e22, 9007199254740993.0, 1e-300, DoubleLimits::min(),
          DoubleLimits::denorm_min(), DoubleLimits::max(), DoubleLimits::lowest(),
          DoubleLimits::infinity(), -DoubleLimits::infinity(), 9223372036854775808.0}) {
        values.emplace_back(real);
    }
    for (const std::string& bytes :
         {std::string(), std::string("backup"), std::string("'"), std::string("it's ''"),
          std::string("NULL"), std::string("12"), std::string("a\0'b", 4), std::string(1, '\0'),
          std::string("\xff\xc3\x28\xed\xa0\x80"), std::string("'); DROP TABLE t; --"),
          EveryByte()}) {
        values.emplace_back(bytes);
        values.emplace_back(BlobBytes{bytes});
    }
    return values;
}

class Generator {
  public:
    StoredValue Next()
    {
        switch (Below(5)) {
            case 0:
                return static_cast<std::int64_t>(random_() >> Below(64)) * (Below(2) == 0 ? 1 : -1);
            case 1: return Real();
            case 2: return Bytes();
            case 3: return BlobBytes{Bytes()};
            default: return {};
        }
    }

  private:
    std::uint64_t Below(std::uint64_t limit) { return random_() % limit; }

    // No number between the denormals and 1e-290: SQLite before 3.43 cannot read some of them.
    double Real()
    {
        for (;;) {
            const std::uint64_t bits = Below(4) == 0 ? random_() >> 12U : random_();
            double real = 0;
            std::memcpy(&real, &bits, sizeof real);
            if (std::fpclassify(real) == FP_SUBNORMAL || std::abs(real) > 1e-290) return real;
        }
    }

    // Mostly quotes, zero bytes and letters.
    std::string Bytes()
    {
        std::string bytes(static_cast<std::size_t>(Below(20)), '\0');
        for (char& byte : bytes) {
            byte = Below(2) == 0 ? "'\0aZ"[Below(4)] : static_cast<char>(Below(256));
        }
        return bytes;
    }

    std::mt19937_64 random_{42};
};

StoredValues Generated(int count)
{
    Generator generator;
    StoredValues values;
    for (int i = 0; i < count; ++i) values.push_back(generator.Next());
    return values;
}

// A column without a type stores every value as it is.
class SqliteRoundTripTest : public ::testing::Test {
  protected:
    void SetUp() override { ASSERT_TRUE(db.Open() && db.CreateTable(table)); }

    // What is stored in the order of the ids, which begin with 0.
    void ExpectStored(const StoredValues& values)
    {
        const StoredValues stored = Select("SELECT value FROM t ORDER BY id");
        ASSERT_EQ(stored.size(), values.size());
        for (std::size_t id = 0; id < values.size(); ++id) {
            EXPECT_EQ(stored[id], values[id]) << ValueOf(values[id]).ToFormatedValue();
        }
        std::size_t read = 0;
        const auto take = [&](const SqliteRow& row) {
            EXPECT_TRUE(IsReadAs(row, values[read++]));
            return true;
        };
        EXPECT_TRUE(db.SelectEachByCommand("SELECT value FROM t ORDER BY id", take));
        EXPECT_EQ(read, values.size());
    }

    // Whether the condition is met by the row with this id.
    bool IsMet(const SqliteCondition& condition, std::size_t id)
    {
        const SqliteAnd both("id=" + std::to_string(id), condition.GetCondition());
        return !Select("SELECT id FROM t WHERE " + both.GetCondition()).empty();
    }

    StoredValues Select(const std::string& select)
    {
        return StoredBy(db.Connection().GetHandle(), select);
    }

    static SqliteValueList Record(std::size_t id, const StoredValue& value)
    {
        SqliteValueList record;
        record.AddValue("id", static_cast<int>(id));
        record.AddValue("value", ValueOf(value));
        return record;
    }

    bool InsertAtOnce(const StoredValues& values)
    {
        std::vector<SqliteValueList> records;
        for (const StoredValue& value : values) records.push_back(Record(records.size(), value));
        return db.InsertRecords(table, records);
    }

    const SqliteTableHandler table{"t", "id INTEGER PRIMARY KEY, value"};
    SqliteDB db{":memory:", 0};
};

// With the cases that somebody chose, and with random ones.
class SqliteDoorTest : public SqliteRoundTripTest, public ::testing::WithParamInterface<bool> {
  protected:
    const StoredValues values = GetParam() ? Generated(1500) : Chosen();
};
INSTANTIATE_TEST_SUITE_P(Values, SqliteDoorTest, ::testing::Bool(), [](const auto& isGenerated) {
    return isGenerated.param ? "Generated" : "Chosen";
});

TEST_P(SqliteDoorTest, InsertRecordStoresARecord)
{
    std::size_t id = 0;
    for (const StoredValue& value : values) {
        InsertCommand insert;
        insert.SetTable(table);
        insert.SetFieldValues(Record(id++, value));
        EXPECT_TRUE(db.InsertRecord(insert));
    }
    ExpectStored(values);
}

TEST_P(SqliteDoorTest, InsertRecordStoresFields)
{
    int id = 0;
    for (const StoredValue& value : values) {
        InsertCommand insert;
        insert.SetTable(table);
        EXPECT_TRUE(insert.AddFieldValue("id", id++));
        EXPECT_TRUE(insert.AddFieldValue("value", ValueOf(value)));
        EXPECT_TRUE(db.InsertRecord(insert));
    }
    ExpectStored(values);
}

TEST_P(SqliteDoorTest, InsertRecordsStoresRecords)
{
    EXPECT_TRUE(InsertAtOnce(values));
    ExpectStored(values);
}

TEST_P(SqliteDoorTest, UpdateRecordStoresFields)
{
    ASSERT_TRUE(InsertAtOnce(StoredValues(values.size(), std::string("old"))));
    int id = 0;
    for (const StoredValue& value : values) {
        UpdateCommand update;
        update.SetTable(table);
        EXPECT_TRUE(update.AddFieldValue("value", ValueOf(value)));
        EXPECT_TRUE(update.SetCondition(SqliteEqual("id", id++)));
        EXPECT_TRUE(db.UpdateRecord(update));
    }
    ExpectStored(values);
}

TEST_P(SqliteDoorTest, ComparisonsFindWhatIsStored)
{
    ASSERT_TRUE(InsertAtOnce(values));
    std::size_t id = 0;
    for (const StoredValue& value : values) {
        EXPECT_TRUE(IsMet(SqliteEqual("value", ValueOf(value)), id));
        EXPECT_FALSE(IsMet(SqliteNotEqual("value", ValueOf(value)), id));
        ++id;
    }
}

// By SQL's rule NULL is in no list, and nothing is surely missing in a list with NULL.
TEST_P(SqliteDoorTest, ListsFindWhatIsStored)
{
    ASSERT_TRUE(InsertAtOnce(values));
    std::size_t id = 0;
    for (const StoredValue& value : values) {
        const bool isNull = std::holds_alternative<std::monostate>(value);
        const std::vector<SqliteValue> list{SqliteValue::Text("another"), ValueOf(value)};
        EXPECT_EQ(IsMet(SqliteIn("value", list), id), !isNull);
        EXPECT_FALSE(IsMet(SqliteNotIn("value", list), id));
        ++id;
    }
    std::vector<SqliteValue> all;
    for (const StoredValue& value : values) all.push_back(ValueOf(value));
    const SqliteIn among("value", all);
    const auto nulls =
        static_cast<std::size_t>(std::count(values.begin(), values.end(), StoredValue()));
    EXPECT_EQ(Select("SELECT id FROM t WHERE " + among.GetCondition()).size(),
              values.size() - nulls);
}

TEST_P(SqliteDoorTest, SqliteNamesTheSameType)
{
    ASSERT_TRUE(InsertAtOnce(values));
    const StoredValues types = Select("SELECT typeof(value) FROM t ORDER BY id");
    for (std::size_t id = 0; id < values.size(); ++id) {
        const std::string literal = ValueOf(values[id]).ToFormatedValue();
        EXPECT_EQ(Select("SELECT typeof(" + literal + ")").front(), types[id]) << literal;
    }
}

TEST_F(SqliteRoundTripTest, NotANumberIsStoredAsNull)
{
    const StoredValues null{std::monostate()};
    EXPECT_TRUE(InsertAtOnce({std::nan("")}));
    ExpectStored(null);
    UpdateCommand update;
    update.SetTable(table);
    update.AddFieldValue("value", SqliteValue::Real(std::nan("")));
    update.SetCondition(SqliteEqual("value", SqliteValue::Real(std::nan(""))));
    EXPECT_TRUE(db.UpdateRecord(update));
    ExpectStored(null);
}

TEST_F(SqliteRoundTripTest, TenMegabytesGoInByEveryWay)
{
    std::string bytes;
    while (bytes.size() < 10'000'000) bytes += EveryByte();
    std::string text = bytes;
    text.erase(std::remove(text.begin(), text.end(), '\0'), text.end());
    const StoredValues values{text, bytes, BlobBytes{bytes}};
    for (std::size_t id = 0; id < values.size(); ++id) {
        InsertCommand insert;
        insert.SetTable(table);
        insert.SetFieldValues(Record(id, values[id]));
        EXPECT_TRUE(db.InsertRecord(insert));
    }
    for (std::size_t id = 0; id < values.size(); ++id) {
        EXPECT_TRUE(Select("SELECT value FROM t WHERE id=" + std::to_string(id)) ==
                    StoredValues{values[id]});
    }
    EXPECT_TRUE(db.DeleteAllRecords(table));
    EXPECT_TRUE(InsertAtOnce(values));
    for (std::size_t id = 0; id < values.size(); ++id) {
        EXPECT_TRUE(Select("SELECT value FROM t WHERE id=" + std::to_string(id)) ==
                    StoredValues{values[id]});
    }
}

// SQLite converts texts there, which only works for UTF-8.
TEST_F(SqliteRoundTripTest, AUtf16DatabaseReplacesWhatIsNotUtf8)
{
    SqliteDB utf16(":memory:", 0);
    ASSERT_TRUE(utf16.Open());
    ASSERT_TRUE(utf16.Exec("PRAGMA encoding='UTF-16le'"));
    ASSERT_TRUE(utf16.InsertRecords(
        table, {Record(0, "\xc3\xa4'"), Record(1, "a\xff"), Record(2, BlobBytes{"a\xff"})}));
    EXPECT_EQ(StoredBy(utf16.Connection().GetHandle(), "SELECT value FROM t ORDER BY id"),
              (StoredValues{"\xc3\xa4'", "a\xef\xbf\xbd", BlobBytes{"a\xff"}}));
}

}  // namespace
