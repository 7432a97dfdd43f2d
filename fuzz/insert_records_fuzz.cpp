// Inserts records into a table with a key and reads them back, compared with a model of the table.
// The first input line says how: "replace", "nested", "rollback". An empty line ends a record.
#include <orvadrcore/sqlite_transaction.h>

#include <map>
#include <vector>

#include "support/fields.h"

using namespace OrvaDRCore;  // NOLINT(google-build-using-namespace)

namespace {

constexpr std::size_t MaxRecords = 16;

// Columns without a type store each value unchanged.
const SqliteTableHandler& Table()
{
    static const SqliteTableHandler table("t", "a PRIMARY KEY,b,c,d,e,f,g,h");
    return table;
}

// A record, and what SQLite must store for it.
struct Record {
    SqliteValueList list;
    std::map<std::string, Stored> stored;
};

std::vector<Record> TakeRecords(Pieces& pieces)
{
    std::vector<Record> records;
    while (!pieces.AtEnd() && records.size() < MaxRecords) {
        Record record;
        while (!pieces.AtEnd()) {
            const Field field = TakeField(pieces);
            if (field.name.empty()) break;
            // Maps any name to one of the columns.
            const std::string column(1, static_cast<char>('a' + ((field.name[0] - 'a') & 7)));
            record.list.AddValue(column, ValueOf(field));
            record.stored[column] = StoredOf(field);
        }
        records.push_back(std::move(record));
    }
    return records;
}

// The table after the inserts, and what InsertRecords() must return.
struct Model {
    std::vector<std::map<std::string, Stored>> rows;
    bool succeeded = true;
};

Model Insert(const std::vector<Record>& records, bool replacable)
{
    Model model;
    for (const Record& record : records) {
        if (record.stored.empty()) return {{}, false};
        const auto key = record.stored.find("a");
        for (std::size_t row = 0; key != record.stored.end() && row < model.rows.size(); ++row) {
            const auto other = model.rows[row].find("a");
            if (other == model.rows[row].end() || other->second != key->second) continue;
            if (!replacable) return {{}, false};
            model.rows.erase(model.rows.begin() + static_cast<std::ptrdiff_t>(row));
            break;
        }
        model.rows.push_back(record.stored);
    }
    return model;
}

// Integers are read back as 32 bits, texts up to their first zero byte.
void CheckRow(const SqliteValueList& row, const std::map<std::string, Stored>& expected)
{
    Expect(row.GetValues().size() == expected.size(), "a row has the record's fields");
    for (const auto& [field, stored] : expected) {
        if (const auto* text = std::get_if<std::string>(&stored)) {
            std::string value;
            Expect(row.GetValue(field, value) && value == text->substr(0, text->find('\0')),
                   "a text comes back");
        } else {
            int value = 0;
            Expect(row.GetValue(field, value) &&
                       value == static_cast<int>(std::get<long long>(stored)),
                   "a number comes back");
        }
    }
}

}  // namespace

void Fuzz(const std::string& input)
{
    static SqliteDB db(":memory:", 0);
    Pieces pieces(input);
    const std::string how = pieces.Until('\n');
    const bool replacable = how.find("replace") != std::string::npos;
    const bool isNested = how.find("nested") != std::string::npos;
    const bool isRolledBack = isNested && how.find("rollback") != std::string::npos;

    const std::vector<Record> records = TakeRecords(pieces);
    std::vector<SqliteValueList> lists;
    lists.reserve(records.size());
    for (const Record& record : records) lists.push_back(record.list);
    const Model model = Insert(records, replacable);

    Expect(db.Open() && db.CreateTable(Table()), "the table can be made");
    SqliteTransaction transaction(db);
    if (isNested) Expect(transaction.Begin(), "a transaction can begin");
    Expect(db.InsertRecords(Table(), lists, replacable) == model.succeeded,
           "records are inserted unless a key comes twice or one has no field");
    if (isNested) Expect(isRolledBack ? transaction.Rollback() : transaction.Commit(), "it ends");

    SelectCommand select;
    select.SetTable(Table());
    select.SelectAll();
    std::vector<SqliteValueList> rows;
    Expect(db.SelectRecords(select, rows), "the rows can be read");
    Expect(rows.size() == (isRolledBack ? 0 : model.rows.size()), "all rows or none are there");
    for (std::size_t i = 0; i < rows.size(); ++i) CheckRow(rows[i], model.rows[i]);
    Expect(db.DeleteAllRecords(Table()), "the table can be emptied");
}
