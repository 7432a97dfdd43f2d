// Databases whose partial indexes have conditions like those of the statements.
//
// Whether SQLite uses such an index depends on how the literals are written. The rows come in another
// order then, which a view's triggers write into the file.
#include <array>

#include "draw.h"

namespace Shapes {

namespace {

using std::string;

// "$c" is one column, and each "$n" a number.
constexpr std::array<const char*, 24> Conditions = {"$c=$n",
                                                    "$c=$n",
                                                    "$c=$n",
                                                    "$c==$n",
                                                    "($c=$n)",
                                                    "$c IN ($n)",
                                                    "$c IN ($n,$n)",
                                                    "$c IN ($n,$n)",
                                                    "$c IN ( $n,$n,$n )",
                                                    "$c NOT IN ($n)",
                                                    "$c NOT IN ($n,$n)",
                                                    "$c NOT IN ($n,$n)",
                                                    "$c=$n OR $c=$n",
                                                    "($c=$n) OR ($c=$n)",
                                                    "$c=$n OR $c IN ($n)",
                                                    "$c=1 OR $c=$n",
                                                    "$c>$n",
                                                    "$c>=$n",
                                                    "$c<$n",
                                                    "$c<=$n",
                                                    "$c<>$n",
                                                    "$c>$n AND $c<$n",
                                                    "$c IS NOT NULL",
                                                    "$c=$n AND $c>$n"};

// So few that those of a statement are often those of an index.
constexpr std::array<const char*, 10> Numbers = {"5", "5", "5",  "7",   "7",
                                                 "9", "6", "-5", "'5'", "'x'"};

// In an index they are also written in other ways.
constexpr std::array<const char*, 16> IndexNumbers = {"5",   "5",   "5",   "5.0",  "5.0", "+5",
                                                      "7",   "7",   "7.0", "9",    "'5'", "'x'",
                                                      "5e0", "0x5", "-5",  "'5.0'"};

template <class Choices>
string Fill(Random& shape, Random& value, const string& column, const Choices& numbers)
{
    string filled;
    for (const char* at = shape.Of(Conditions); *at != '\0'; ++at) {
        if (*at != '$') {
            filled += *at;
        } else {
            filled += *++at == 'c' ? column : value.Of(numbers);
        }
    }
    return filled;
}

string AnyIndex(Random& random, std::size_t number)
{
    static const std::array<const char*, 8> keys = {"b", "b",   "c",   "c DESC",
                                                    "a", "b,a", "c,b", "a DESC"};
    static const std::array<const char*, 4> columns = {"a", "a", "a", "c"};
    const string key = random.Of(keys);
    const string column = random.Of(columns);
    return "CREATE INDEX p" + std::to_string(number) + " ON t(" + key + ") WHERE " +
           Fill(random, random, column, IndexNumbers);
}

// Rows with the numbers of the conditions as integers, reals and texts. Each column has another order.
const char* const Rows =
    "INSERT OR REPLACE INTO t(id,a,b,c) WITH RECURSIVE n(i) AS (VALUES(1) UNION ALL SELECT i+1 "
    "FROM n "
    "WHERE i<15) SELECT i*7%17, CASE i%8 WHEN 0 THEN 7 WHEN 1 THEN '5' WHEN 2 THEN 5.0 WHEN 3 THEN "
    "9 "
    "WHEN 4 THEN NULL ELSE 5 END, char(120-i*5%13), CASE i%4 WHEN 0 THEN 5 WHEN 1 THEN 7 ELSE i "
    "END "
    "FROM n";

std::vector<string> Triggers(Random& random)
{
    const string end = random.OneIn(3) ? "; DELETE FROM t WHERE id=old.id; END" : "; END";
    return {"CREATE TABLE log(op,id,a)", "CREATE VIEW v AS SELECT id,a,b,c FROM t",
            "CREATE TRIGGER v1 INSTEAD OF DELETE ON v BEGIN "
            "INSERT INTO log VALUES('d',old.id,old.a)" +
                end,
            "CREATE TRIGGER v2 INSTEAD OF UPDATE ON v BEGIN "
            "INSERT INTO log VALUES('u',old.id,new.a); END",
            "CREATE TRIGGER v3 INSTEAD OF INSERT ON v BEGIN "
            "INSERT INTO t(id,a,b,c) VALUES(new.id,new.a,new.b,new.c); END"};
}

}  // namespace

string CommonCondition(Draw& draw, const string& column)
{
    return Fill(draw.shape, draw.value, column, Numbers);
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
    schema.hasCommonConditions = true;
    constexpr std::size_t Indexes = 6;
    const std::size_t present = random.Below(3);
    for (std::size_t number = 0; number < Indexes; ++number) {
        const string create = AnyIndex(random, number);
        schema.name += (number < present ? "; " : "; later ") + create;
        if (number < present) schema.setup.push_back(create);
        schema.neighbour.push_back(create);
        schema.neighbour.push_back("DROP INDEX p" + std::to_string(number));
        schema.neighbour.emplace_back(Rows);
    }
    if (random.OneIn(3)) schema.setup.emplace_back("ANALYZE");
    return schema;
}

}  // namespace Shapes
