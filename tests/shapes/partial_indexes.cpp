// Databases whose partial indexes have conditions like those of the statements.
//
// Whether SQLite uses such an index depends on how the literals are written. The rows come in another
// order then, which a view's triggers write into the file.
#include <array>

#include "draw.h"

namespace Shapes {

namespace {

using std::string;

// Conditions of which SQLite may make each other. "$c" is one column, and each "$n" a number.
using Family = std::vector<const char*>;
const std::array<Family, 7> Families = {
    {{"$c=$n"},
     {"$c=$n", "$c==$n", "($c=$n)", "$c IN ($n)"},
     {"$c IN ($n,$n)", "$c=$n OR $c=$n"},
     {"$c IN ($n,$n)", "($c=$n) OR ($c IN ($n))", "$c IN ( $n,$n,$n )"},
     {"$c=1 OR $c=$n", "$c IN (1,$n)"},
     {"$c NOT IN ($n,$n)", "$c NOT IN ($n)", "$c<>$n"},
     {"$c>$n", "$c>=$n", "$c<$n", "$c>$n AND $c<$n", "$c=$n", "$c IS NOT NULL"}}};

// So few that those of a statement are often those of an index.
constexpr std::array<const char*, 10> Numbers = {"5", "5", "5", "5", "7",
                                                 "7", "7", "7", "9", "'5'"};

// In an index they are also written in other ways.
constexpr std::array<const char*, 12> IndexNumbers = {"5.0", "5.0", "5.0", "7.0", "7.0", "+5",
                                                      "+7",  "5e0", "0x5", "'5'", "5",   "7"};

// Puts a column, or numbers, in the place of each "$c" or "$n".
template <class Next>
string Replace(const string& text, char kind, const Next& next)
{
    string replaced;
    for (std::size_t at = 0; at < text.size(); ++at) {
        const bool isPlace = text[at] == '$' && text[at + 1] == kind;
        replaced += isPlace ? next() : string(1, text[at]);
        if (isPlace) ++at;
    }
    return replaced;
}

string AnyIndex(Random& random, const string& condition)
{
    // Either the index has all columns, or its first one is that of the condition. So it is used.
    static const std::array<const char*, 5> keys = {"b,a,c", "c DESC,a,b", "c,b DESC,a", "a,b",
                                                    "a,b DESC"};
    static const std::array<const char*, 3> plain = {"5", "7", "9"};
    const string key = random.Of(keys);
    const bool isPlain = random.OneIn(2);
    std::size_t count = 0;
    const auto next = [&] {
        return string(isPlain ? plain[count++ % plain.size()] : random.Of(IndexNumbers));
    };
    return " ON t(" + key + ") WHERE " + Replace(condition, 'n', next);
}

// Rows with the numbers of the conditions as integers, reals and texts. Each column has another order.
const char* const Rows =
    "INSERT OR REPLACE INTO t(id,a,b,c) "
    "WITH RECURSIVE n(i) AS (VALUES(1) UNION ALL SELECT i+1 FROM n WHERE i<15) "
    "SELECT i*7%17, CASE i%8 WHEN 0 THEN 7 WHEN 1 THEN '5' WHEN 2 THEN 5.0 WHEN 3 THEN 9 "
    "WHEN 4 THEN NULL ELSE 5 END, char(120-i*5%13), "
    "CASE i%4 WHEN 0 THEN 5 WHEN 1 THEN 7 ELSE i END FROM n";

std::vector<string> Triggers(Random& random)
{
    const string log = "BEGIN INSERT INTO log VALUES(old.id,old.a); ";
    const string del = random.OneIn(3) ? "DELETE FROM t WHERE id=old.id; " : "";
    return {"CREATE TABLE log(id,a)", "CREATE VIEW v AS SELECT id,a,b,c FROM t",
            "CREATE TRIGGER v1 INSTEAD OF DELETE ON v " + log + del + "END",
            "CREATE TRIGGER v2 INSTEAD OF UPDATE ON v " + log + "END",
            "CREATE TRIGGER v3 INSTEAD OF INSERT ON v BEGIN "
            "INSERT INTO t(id,a,b,c) VALUES(new.id,new.a,new.b,new.c); END"};
}

}  // namespace

string CommonCondition(Draw& draw, const string& column)
{
    const std::vector<string>& own = draw.schema.conditions;
    const bool isOwn = !own.empty() && !draw.shape.OneIn(8);
    const string condition = isOwn ? draw.shape.Of(own) : draw.shape.Of(draw.shape.Of(Families));
    const string ofColumn = Replace(condition, 'c', [&] { return column; });
    return Replace(ofColumn, 'n', [&] { return string(draw.value.Of(Numbers)); });
}

Schema AnyPartialIndexes(Random& random)
{
    static const std::array<const char*, 6> types = {"INTEGER", "REAL", "TEXT", "", "", "NUMERIC"};
    Table t{"t", "id INTEGER PRIMARY KEY, a ", {"id", "a", "a", "b", "c"}};
    t.columns += string(random.Of(types)) + ", b TEXT, c " + random.Of(types);
    const Table v{"v", t.columns, t.names};
    Schema schema{"random partial indexes of t(" + t.columns + ")", {}, {t, v, v}};
    schema.setup = {"CREATE TABLE t(" + t.columns + ")", Rows};
    for (const string& statement : Triggers(random)) schema.setup.push_back(statement);
    const string column = random.OneIn(4) ? "c" : "a";
    for (const char* const condition : random.Of(Families))
        schema.conditions.push_back(Replace(condition, 'c', [&] { return column; }));
    // With more of them, the values of most statements would matter for one, and no shape be run.
    constexpr std::size_t Indexes = 2;
    const std::size_t present = random.Below(Indexes);
    schema.neighbour = {Rows};
    for (std::size_t number = 0; number < Indexes; ++number) {
        const string name = "p" + std::to_string(number);
        const string create =
            "CREATE INDEX " + name + AnyIndex(random, random.Of(schema.conditions));
        schema.name += (number < present ? "; " : "; later ") + create;
        if (number < present) schema.setup.push_back(create);
        schema.neighbour.push_back(create);
        schema.neighbour.push_back("DROP INDEX " + name);
    }
    if (random.OneIn(3)) schema.setup.emplace_back("ANALYZE");
    return schema;
}

}  // namespace Shapes
