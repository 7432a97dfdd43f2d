// Building statement texts.
#include <sqlite3.h>

#include <map>
#include <numeric>
#include <sstream>

#include <orvadrcore/sqlite_command.h>

#include "support/bench.h"
#include "support/by_hand.h"

namespace Bench {

namespace {

using OrvaDRCore::SqliteValue;

struct Row {
    int id = 4711;
    std::string name = "backup-of-the-node";
    std::string address = "192.168.10.17";
    bool enabled = true;
};

struct InsertText {
    std::string Result() const { return text; }

    Row row;
    std::string table = "nodes";
    std::string text;
};

OrvaDRCore::InsertCommand MakeCommand(const InsertText& given,
                                      const OrvaDRCore::SqliteTableHandler& handler)
{
    OrvaDRCore::InsertCommand command;
    command.SetTable(handler);
    command.AddFieldValue("id", given.row.id);
    command.AddFieldValue("name", given.row.name);
    command.AddFieldValue("address", given.row.address);
    command.AddFieldValue("enabled", given.row.enabled);
    return command;
}

struct OurInsert : InsertText {
    void Run() { text = command.GetCommand(); }

    OrvaDRCore::SqliteTableHandler handler{table, "id INTEGER PRIMARY KEY"};
    OrvaDRCore::InsertCommand command = MakeCommand(*this, handler);
};

struct OurMadeInsert : InsertText {
    void Run() { text = MakeCommand(*this, handler).GetCommand(); }

    OrvaDRCore::SqliteTableHandler handler{table, "id INTEGER PRIMARY KEY"};
};

struct BareInsert : InsertText {
    void Run()
    {
        std::string made = "INSERT INTO " + table + " (address,enabled,id,name) VALUES (";
        AppendLiteral(made, std::string_view(row.address));
        made += row.enabled ? ",1," : ",0,";
        AppendLiteral(made, row.id);
        AppendLiteral(made += ',', std::string_view(row.name));
        made += ");";
        text = std::move(made);
    }
};

// Columns are sorted by name.
std::string WriteInsert(const std::string& table, const std::map<std::string, Value>& fields)
{
    std::string made = "INSERT INTO " + table + " (";
    std::string literals;
    for (const auto& [field, value] : fields) {
        if (!literals.empty()) {
            made += ',';
            literals += ',';
        }
        made += field;
        AppendLiteral(literals, value);
    }
    made += ") VALUES (";
    made += literals;
    made += ");";
    return made;
}

std::map<std::string, Value> MakeFields(const Row& row)
{
    std::map<std::string, Value> fields;
    fields.insert_or_assign("id", row.id);
    fields.insert_or_assign("name", row.name);
    fields.insert_or_assign("address", row.address);
    fields.insert_or_assign("enabled", row.enabled);
    return fields;
}

struct ContractInsert : InsertText {
    void Run() { text = WriteInsert(table, fields); }

    std::map<std::string, Value> fields = MakeFields(row);
};

// Columns are added one by one; the builder copies them.
struct ContractMadeInsert : InsertText {
    void Run()
    {
        const std::string tableCopy = table;
        text = WriteInsert(tableCopy, MakeFields(row));
    }
};

struct SqliteInsert : InsertText {
    void Run()
    {
        char* made = sqlite3_mprintf(
            "INSERT INTO %s (address,enabled,id,name) VALUES ('%q',%d,%d,'%q');", table.c_str(),
            row.address.c_str(), row.enabled ? 1 : 0, row.id, row.name.c_str());
        text = made;
        sqlite3_free(made);
    }
};

// The obvious way: a stream for the statement, and one for each value.
template <class T>
std::string StreamLiteral(const T& value)
{
    std::ostringstream literal;
    literal << value;
    return literal.str();
}

std::string StreamLiteral(const std::string& words)
{
    std::ostringstream literal;
    literal << '\'' << words << '\'';
    return literal.str();
}

struct StreamInsert : InsertText {
    void Run()
    {
        std::ostringstream made;
        made << "INSERT INTO " << table << " (address,enabled,id,name) VALUES ("
             << StreamLiteral(row.address) << ',' << StreamLiteral(row.enabled) << ','
             << StreamLiteral(row.id) << ',' << StreamLiteral(row.name) << ");";
        text = made.str();
    }
};

struct InText {
    explicit InText(int count) : ids(static_cast<std::size_t>(count))
    {
        std::iota(ids.begin(), ids.end(), 100000);
    }
    std::string Result() const { return text; }

    std::vector<int> ids;
    std::string text;
};

struct OurIn : InText {
    explicit OurIn(int count) : InText(count), values(ids.begin(), ids.end()) {}
    void Run() { text = OrvaDRCore::SqliteIn("id", values).GetCondition(); }

    std::vector<SqliteValue> values;
};

struct BareIn : InText {
    using InText::InText;
    void Run()
    {
        std::string made = "id IN ( ";
        for (const int id : ids) {
            AppendLiteral(made, id);
            made += ',';
        }
        made.pop_back();
        made += " )";
        text = std::move(made);
    }
};

// A list of typed values.
struct ContractIn : InText {
    explicit ContractIn(int count) : InText(count), values(ids.begin(), ids.end()) {}
    void Run()
    {
        std::string made = "id IN ( ";
        for (const Value& value : values) {
            AppendLiteral(made, value);
            made += ',';
        }
        made.pop_back();
        made += " )";
        text = std::move(made);
    }

    std::vector<Value> values;
};

struct StreamIn : InText {
    using InText::InText;
    void Run()
    {
        std::ostringstream made;
        made << "id IN ( ";
        const char* comma = "";
        for (const int id : ids) {
            made << comma << StreamLiteral(id);
            comma = ",";
        }
        made << " )";
        text = made.str();
    }
};

}  // namespace

// The targets are 400 ns and 30 us where streams take 2 us and 230 us.
void AddTexts()
{
    constexpr double InsertOfStream = 0.2;
    constexpr double InOfStream = 0.13;
    Add<OurInsert>("text of an insert of 4 values", Ours);
    Add<BareInsert>("text of an insert of 4 values", Bare);
    Add<ContractInsert>("text of an insert of 4 values", Contract);
    Add<SqliteInsert>("text of an insert of 4 values", "sqlite3_mprintf");
    Add<StreamInsert>("text of an insert of 4 values", "ostringstream");
    Aim({"ostringstream"}, InsertOfStream);
    Add<OurMadeInsert>("insert of 4 values, built and written", Ours);
    Add<BareInsert>("insert of 4 values, built and written", Bare);
    Add<ContractMadeInsert>("insert of 4 values, built and written", Contract);
    Add<OurIn>("text of an IN list of 1,000", Ours, 1000);
    Add<BareIn>("text of an IN list of 1,000", Bare, 1000);
    Add<ContractIn>("text of an IN list of 1,000", Contract, 1000);
    Add<StreamIn>("text of an IN list of 1,000", "ostringstream", 1000);
    Aim({"ostringstream"}, InOfStream);
}

}  // namespace Bench
