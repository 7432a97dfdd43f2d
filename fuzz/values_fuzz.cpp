// Stores values of every kind by every way there is and compares what SQLite holds. One value per
// line: its kind, a blank, and the value.
//
//     int -9223372036854775808
//     real 0.1
//     bits fff0000000000000        a real, as the bits that represent it
//     text O'Brien
//     blob \0\n
//     null
#include <orvadrcore/sqlite_db.h>

#include <charconv>
#include <cmath>
#include <cstring>

#include "sqlite/sqlite_connection.h"
#include "support/fixtures/stored_value.h"
#include "support/fuzz.h"

using namespace OrvaDRCore;  // NOLINT(google-build-using-namespace)

namespace {

constexpr std::size_t MaxValues = 16;

using Values = std::vector<StoredValue>;

// Not-a-number, which is stored as NULL, becomes zero; so do those small numbers of which SQLite
// before 3.43 cannot read all.
double Readable(double real)
{
    const bool isReadable = std::fpclassify(real) == FP_SUBNORMAL || std::abs(real) > 1e-290;
    return isReadable ? real : 0;
}

template <class Number, class... Base>
Number Parsed(const std::string& text, Base... base)
{
    Number number{};
    std::from_chars(text.data(), text.data() + text.size(), number, base...);
    return number;
}

double OfBits(std::uint64_t bits)
{
    double real = 0;
    std::memcpy(&real, &bits, sizeof real);
    return real;
}

StoredValue TakeValue(Pieces& pieces)
{
    const std::string kind = pieces.Until(' ');
    const std::string text = pieces.Until('\n');
    if (kind == "int") return Parsed<std::int64_t>(text);
    if (kind == "real") return Readable(Parsed<double>(text));
    if (kind == "bits") return Readable(OfBits(Parsed<std::uint64_t>(text, 16)));
    if (kind == "blob") return BlobBytes{text};
    if (kind == "text") return text;
    return {};
}

// ---------------------------------------------------------------------------------- values alone

template <class T>
bool Reads(const SqliteValue& value, const T& expected)
{
    T out{};
    return value.GetValue(out) && out == expected;
}

void CheckValue(const StoredValue& stored)
{
    const SqliteValue value = ValueOf(stored);
    Expect(value.IsValid(), "every kind is valid");
    Expect(value.IsNull() == std::holds_alternative<std::monostate>(stored), "only NULL is null");
    if (const auto* integer = std::get_if<std::int64_t>(&stored)) {
        Expect(Reads(value, *integer), "an integer is read");
        Expect(Reads(value, static_cast<double>(*integer)), "an integer is a number");
    }
    if (const auto* real = std::get_if<double>(&stored)) {
        Expect(Reads(value, *real), "a real is read");
    }
    if (const auto* text = std::get_if<std::string>(&stored)) {
        Expect(Reads(value, *text), "a text is read");
    }
    if (const auto* blob = std::get_if<BlobBytes>(&stored)) {
        Expect(Reads(value, blob->bytes), "a blob is read");
    }
    SqliteValue assigned(1);
    assigned = value;
    Expect(assigned.IsValid() && assigned.ToFormatedValue() == value.ToFormatedValue(),
           "an assignment takes payload and kind");
    Expect(value.ToFormatedValue().find('\0') == std::string::npos, "a literal ends no statement");
}

// ------------------------------------------------------------------------------------- in a table

class Database {
  public:
    Database() { Expect(db.Open() && db.CreateTable(table), "a table can be made"); }

    void CheckInserts(const Values& values)
    {
        for (std::size_t id = 0; id < values.size(); ++id) {
            InsertCommand insert;
            insert.SetTable(table);
            insert.AddFieldValue("id", static_cast<int>(id));
            insert.AddFieldValue("value", ValueOf(values[id]));
            Expect(db.InsertRecord(insert), "a record is inserted");
        }
        Expect(Stored() == values, "literals are stored as what was meant");
        Clear();

        std::vector<SqliteValueList> records(values.size());
        for (std::size_t id = 0; id < values.size(); ++id) {
            records[id].AddValue("id", static_cast<int>(id));
            records[id].AddValue("value", ValueOf(values[id]));
        }
        Expect(db.InsertRecords(table, records), "records are inserted");
        Expect(Stored() == values, "bound values are stored as what was meant");
    }

    void CheckConditions(const Values& values)
    {
        for (const StoredValue& stored : values) {
            const SqliteValue value = ValueOf(stored);
            const std::size_t equal = Count(SqliteEqual("value", value));
            const std::size_t different = Count(SqliteNotEqual("value", value));
            const std::size_t listed = Count(SqliteIn("value", std::vector<SqliteValue>{value}));
            Expect(equal > 0, "a value that is stored is found");
            Expect(equal + different + (value.IsNull() ? 0 : Nulls()) == values.size(),
                   "a value is equal, different or NULL");
            Expect(listed == (value.IsNull() ? 0 : equal), "a list finds what a comparison finds");
        }
    }

    void CheckUpdates(const Values& values)
    {
        for (const StoredValue& stored : values) {
            UpdateCommand update;
            update.SetTable(table);
            update.AddFieldValue("value", ValueOf(stored));
            update.SetCondition("1");
            Expect(db.UpdateRecord(update), "records are updated");
            Expect(Stored() == Values(values.size(), stored), "an update stores what was meant");
        }
    }

    void Clear() { Expect(db.DeleteAllRecords(table), "the table can be emptied"); }

  private:
    Values Select(const std::string& select)
    {
        return StoredBy(db.Connection().GetHandle(), select);
    }

    // The library must read the same as SQLite's own interface.
    Values Stored()
    {
        const std::string select = "SELECT value FROM t ORDER BY id";
        Values stored = Select(select);
        std::size_t read = 0;
        const auto take = [&](const SqliteRow& row) {
            Expect(IsReadAs(row, stored.at(read++)), "a row is read as what is stored");
            return true;
        };
        Expect(db.SelectEachByCommand(select, take) && read == stored.size(), "rows are read");
        return stored;
    }

    std::size_t Count(const SqliteCondition& condition)
    {
        return Select("SELECT id FROM t WHERE " + condition.GetCondition()).size();
    }

    std::size_t Nulls() { return Count(SqliteCondition("value IS NULL")); }

    const SqliteTableHandler table{"t", "id INTEGER PRIMARY KEY, value"};
    SqliteDB db{":memory:", 0};
};

}  // namespace

void Fuzz(const std::string& input)
{
    static Database database;
    Pieces pieces(input);
    Values values;
    while (!pieces.AtEnd() && values.size() < MaxValues) {
        values.push_back(TakeValue(pieces));
        CheckValue(values.back());
    }
    database.CheckInserts(values);
    database.CheckConditions(values);
    database.CheckUpdates(values);
    database.Clear();
}
