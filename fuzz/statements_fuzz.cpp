// Builds statements from any names and values, with quoted names and escaped texts, tokenizes them
// and runs them. Then builds them again from the raw names and texts, and only inspects them. The
// first input line is the table's name, the others are fields.
#include <orvadrcore/sqlite_command.h>
#include <sqlite3.h>

#include <algorithm>
#include <map>
#include <memory>
#include <set>
#include <vector>

#include "support/fields.h"
#include "support/sql_tokens.h"

using namespace OrvaDRCore;  // NOLINT(google-build-using-namespace)

namespace {

constexpr std::size_t MaxFields = 12;

// Quoted names and their values, in the order of the statements.
using Fields = std::map<std::string, Field>;

// SQLite ends a statement at a zero byte.
std::string WithoutZeros(std::string text)
{
    text.erase(std::remove(text.begin(), text.end(), '\0'), text.end());
    return text;
}

// SQLite takes column names that differ only in case for the same.
std::string Folded(std::string name)
{
    for (char& character : name) {
        if (character >= 'A' && character <= 'Z') character = static_cast<char>(character + 32);
    }
    return name;
}

std::vector<Field> TakeFields(Pieces& pieces)
{
    std::vector<Field> fields;
    std::set<std::string> names;
    while (!pieces.AtEnd() && fields.size() < MaxFields) {
        Field field = TakeField(pieces);
        field.name = WithoutZeros(field.name);
        if (auto* text = std::get_if<std::string>(&field.value)) *text = WithoutZeros(*text);
        if (names.insert(Folded(field.name)).second) fields.push_back(std::move(field));
    }
    return fields;
}

Field Escaped(Field field)
{
    auto* text = std::get_if<std::string>(&field.value);
    if (text != nullptr) *text = SqliteValue::EscapeText(*text);
    return field;
}

SqliteValue EscapedValue(const Field& field)
{
    return ValueOf(Escaped(field));
}

// ---------------------------------------------------------------------------------------- tokens

std::string Literal(const Field& field)
{
    const Stored stored = StoredOf(field);
    const auto* text = std::get_if<std::string>(&stored);
    return text != nullptr ? Quoted(*text, '\'') : std::to_string(std::get<long long>(stored));
}

void Append(Tokens& tokens, const Tokens& more)
{
    tokens.insert(tokens.end(), more.begin(), more.end());
}

// The tokens that `make` returns for each field, separated by commas.
template <class Make>
Tokens Listed(const Fields& fields, Make make)
{
    Tokens tokens;
    for (const auto& field : fields) {
        if (!tokens.empty()) tokens.emplace_back(",");
        Append(tokens, make(field));
    }
    return tokens;
}

Tokens Names(const Fields& fields)
{
    return Listed(fields, [](const auto& field) { return Tokens{field.first}; });
}

Tokens Literals(const Fields& fields)
{
    return Listed(fields, [](const auto& field) { return Tokens{Literal(field.second)}; });
}

Tokens Pairs(const Fields& fields)
{
    return Listed(fields, [](const auto& field) {
        return Tokens{field.first, "=", Literal(field.second)};
    });
}

void CheckTokens(const std::string& text, std::initializer_list<Tokens> expected)
{
    Tokens tokens;
    for (const Tokens& part : expected) Append(tokens, part);
    Expect(Tokenize(text) == tokens, "a statement says what it was built from");
}

// ---------------------------------------------------------------------------------------- SQLite

sqlite3* Database()
{
    static sqlite3* const db = [] {
        sqlite3* opened = nullptr;
        Expect(sqlite3_open(":memory:", &opened) == SQLITE_OK, "a database can be opened");
        return opened;
    }();
    return db;
}

void Run(const std::string& statement)
{
    Expect(sqlite3_exec(Database(), statement.c_str(), nullptr, nullptr, nullptr) == SQLITE_OK,
           "a statement runs");
}

Stored Column(sqlite3_stmt* statement, int column)
{
    if (sqlite3_column_type(statement, column) == SQLITE_INTEGER) {
        return sqlite3_column_int64(statement, column);
    }
    Expect(sqlite3_column_type(statement, column) == SQLITE_TEXT, "all else is text");
    const auto size = static_cast<std::size_t>(sqlite3_column_bytes(statement, column));
    return std::string(reinterpret_cast<const char*>(sqlite3_column_text(statement, column)), size);
}

std::vector<std::vector<Stored>> Rows(const std::string& text)
{
    sqlite3_stmt* made = nullptr;
    Expect(sqlite3_prepare_v2(Database(), text.c_str(), -1, &made, nullptr) == SQLITE_OK,
           "a select can be prepared");
    const std::unique_ptr<sqlite3_stmt, decltype(&sqlite3_finalize)> statement(made,
                                                                               sqlite3_finalize);
    std::vector<std::vector<Stored>> rows;
    while (sqlite3_step(made) == SQLITE_ROW) {
        rows.emplace_back();
        for (int column = 0; column < sqlite3_column_count(made); ++column) {
            rows.back().push_back(Column(made, column));
        }
    }
    return rows;
}

// ------------------------------------------------------------------------------------ statements

struct Statements {
    SqliteTableHandler table;
    Fields fields;

    std::string Insert() const
    {
        SqliteValueList record;
        InsertCommand byField;
        byField.SetTable(table);
        for (const auto& [name, field] : fields) {
            record.AddValue(name, EscapedValue(field));
            const bool isAdded =
                std::visit([&, &column = name](
                               const auto& value) { return byField.AddFieldValue(column, value); },
                           Escaped(field).value);
            Expect(isAdded, "a field with a name is taken");
        }
        InsertCommand byRecord;
        byRecord.SetTable(table);
        byRecord.SetFieldValues(record);
        Expect(byRecord.GetCommand() == byField.GetCommand(), "both ways give one statement");
        return byField.GetCommand();
    }

    std::string Update(const SqliteCondition& condition, const Field& value) const
    {
        UpdateCommand update;
        update.SetTable(table);
        SqliteValueList record;
        for (const auto& [name, field] : fields) record.AddValue(name, EscapedValue(value));
        update.SetFieldValues(record);
        Expect(update.SetCondition(condition), "a condition is taken");
        return update.GetCommand();
    }

    std::string Select(const SqliteCondition& condition) const
    {
        SelectCommand select;
        select.SetTable(table);
        for (const auto& [name, field] : fields) select.AddField(name);
        Expect(select.SetCondition(condition), "a condition is taken");
        return select.GetCommand();
    }
};

SqliteCondition AllEqual(const Fields& fields)
{
    std::string text;
    for (const auto& [name, field] : fields) {
        const SqliteEqual equal(name, EscapedValue(field));
        text = text.empty() ? equal.GetCondition()
                            : SqliteAnd(text, equal.GetCondition()).GetCondition();
    }
    return text;
}

void CheckTexts(const Statements& statements)
{
    const Fields& fields = statements.fields;
    const auto& [name, field] = *fields.begin();
    const Tokens table{statements.table.GetName()};
    const SqliteEqual equal(name, EscapedValue(field));
    CheckTokens(statements.Insert(), {{"INSERT", "INTO"},
                                      table,
                                      {"("},
                                      Names(fields),
                                      {")", "VALUES", "("},
                                      Literals(fields),
                                      {")", ";"}});
    CheckTokens(statements.Select(equal),
                {{"SELECT"}, Names(fields), {"FROM"}, table, {"WHERE", name, "=", Literal(field)}});
    Fields alike = fields;
    for (auto& entry : alike) entry.second = field;
    CheckTokens(statements.Update(equal, field),
                {{"UPDATE"}, table, {"SET"}, Pairs(alike), {"WHERE", name, "=", Literal(field)}});
}

void CheckConditions(const Statements& statements, std::size_t rows)
{
    const Fields& fields = statements.fields;
    const auto& [name, field] = *fields.begin();
    const SqliteEqual equal(name, EscapedValue(field));
    const SqliteNotEqual differs(name, EscapedValue(field));
    std::vector<SqliteValue> values;
    for (const auto& entry : fields) values.push_back(EscapedValue(entry.second));
    const SqliteIn in(name, values);
    const SqliteNotIn notIn(name, values);
    CheckTokens(in.GetCondition(), {{name, "IN", "("}, Literals(fields), {")"}});
    CheckTokens(SqliteOr(differs.GetCondition(), notIn.GetCondition()).GetCondition(),
                {{"(", name, "!", "=", Literal(field), ")", "OR", "(", name, "NOT", "IN", "("},
                 Literals(fields),
                 {")", ")"}});

    const SqliteOr either(differs.GetCondition(), equal.GetCondition());
    for (const SqliteCondition& met :
         {SqliteCondition(equal), SqliteCondition(in.GetCondition()), SqliteCondition(either)}) {
        Expect(Rows(statements.Select(met)).size() == rows, "a condition is met");
    }
    for (const SqliteCondition& missed :
         {SqliteCondition(differs), SqliteCondition(notIn.GetCondition())}) {
        Expect(Rows(statements.Select(missed)).empty(), "its opposite is not");
    }
}

// A text matches itself, whatever wildcards and quotes it holds.
void CheckPatterns(const Statements& statements)
{
    for (const auto& [name, field] : statements.fields) {
        const auto* text = std::get_if<std::string>(&field.value);
        if (text == nullptr) continue;
        const SqliteContains contains(name, *text);
        const SqliteBeginsWith begins(name, *text);
        const Tokens tokens = Tokenize(contains.GetCondition());
        Expect(tokens.size() == 5 && tokens[0] == name && tokens[1] == "LIKE" &&
                   tokens[3] == "ESCAPE" && tokens[4] == "'\\'",
               "a pattern is one literal");
        Expect(Rows(statements.Select(contains)).size() == 1, "a text contains itself");
        Expect(Rows(statements.Select(begins)).size() == 1, "a text begins with itself");
    }
}

void CheckOrders(const Statements& statements)
{
    SelectCommand select;
    select.SetTable(statements.table);
    Tokens keys;
    for (const auto& entry : statements.fields) {
        select.AddField(entry.first);
        Expect(select.GroupBy(entry.first) && select.OrderBy(entry.first, SqliteOrder::Descending),
               "a name is taken");
        Append(keys, keys.empty() ? Tokens() : Tokens{","});
        Append(keys, {entry.first, "DESC"});
    }
    select.Limit(1);
    const Tokens names = Names(statements.fields);
    CheckTokens(select.GetCommand(), {{"SELECT"},
                                      names,
                                      {"FROM", statements.table.GetName(), "GROUP", "BY"},
                                      names,
                                      {"ORDER", "BY"},
                                      keys,
                                      {"LIMIT", "1"}});
    Expect(Rows(select.GetCommand()).size() == 1, "one row is one group");
}

void CheckRuns(const Statements& statements)
{
    const Fields& fields = statements.fields;
    std::vector<Stored> row;
    for (const auto& entry : fields) row.push_back(StoredOf(entry.second));
    Run(statements.Insert());
    Expect(Rows(statements.Select(AllEqual(fields))) == std::vector<std::vector<Stored>>{row},
           "what was inserted is selected");
    CheckConditions(statements, 1);
    CheckPatterns(statements);
    CheckOrders(statements);

    const Field& last = fields.rbegin()->second;
    Run(statements.Update(AllEqual(fields), last));
    const SqliteEqual updated(fields.begin()->first, EscapedValue(last));
    row.assign(fields.size(), StoredOf(last));
    Expect(Rows(statements.Select(updated)) == std::vector<std::vector<Stored>>{row},
           "what was updated is selected");
}

// Raw names and texts: there must be a statement, whatever it says.
void CheckRaw(const std::string& table, const std::vector<Field>& fields)
{
    InsertCommand insert;
    UpdateCommand update;
    SelectCommand select;
    bool isNamed = false;
    for (SqliteCommand* command :
         {static_cast<SqliteCommand*>(&insert), static_cast<SqliteCommand*>(&update),
          static_cast<SqliteCommand*>(&select)}) {
        isNamed = command->SetTable(SqliteTableHandler(table, ""));
        Expect(isNamed == !table.empty(), "a table has a name");
    }
    bool hasFields = false;
    std::vector<SqliteValue> values;
    SqliteInFamily family(table);
    for (const Field& field : fields) {
        const bool hasName = !field.name.empty();
        hasFields = hasFields || hasName;
        std::visit(
            [&](const auto& value) {
                Expect(insert.AddFieldValue(field.name, value) == hasName, "a field has a name");
                Expect(update.AddFieldValue(field.name, value) == hasName, "a field has a name");
                values.emplace_back(value);
            },
            field.value);
        Expect(select.AddField(field.name) == hasName, "a field has a name");
        update.SetCondition(SqliteNotEqual(field.name, values.back()));
        select.SetCondition(SqliteIn(field.name, values));
        Expect(family.SetValue(field.name, values) == (family.IsValid() && hasName),
               "a list has a name and a keyword");
    }
    for (const SqliteCommand* command :
         {static_cast<const SqliteCommand*>(&insert), static_cast<const SqliteCommand*>(&update),
          static_cast<const SqliteCommand*>(&select)}) {
        Expect(command->IsValid() == (isNamed && hasFields), "a command has a table and fields");
        Expect(command->GetCommand().empty() != command->IsValid(), "and gives a statement then");
        Expect(command->ToStr().size() > table.size(), "and is shown in any case");
    }
}

}  // namespace

void Fuzz(const std::string& input)
{
    Pieces pieces(input);
    const std::string table = WithoutZeros(pieces.Until('\n'));
    const std::vector<Field> fields = TakeFields(pieces);
    CheckRaw(table, fields);
    if (fields.empty()) return;

    // The letter avoids the names that SQLite reserves.
    Statements statements{SqliteTableHandler(Quoted("t" + table), ""), {}};
    for (const Field& field : fields) statements.fields.emplace(Quoted(field.name), field);
    CheckTexts(statements);

    std::string columns;
    for (const auto& entry : statements.fields) {
        columns.append(columns.empty() ? "" : ",").append(entry.first);
    }
    Run("CREATE TABLE " + statements.table.GetName() + " (" + columns + ")");
    CheckRuns(statements);
    Run("DROP TABLE " + statements.table.GetName());
}
