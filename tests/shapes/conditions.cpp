#include <orvadrcore/sqlite_condition.h>

#include <array>
#include <vector>

#include "draw.h"

namespace Shapes {

namespace {

using namespace OrvaDRCore;  // NOLINT(google-build-using-namespace): its conditions
using std::string;

// What a program writes by hand, and what only looks like a condition of the library.
constexpr std::array<const char*, 76> Written = {"$c = $v",
                                                 "$c==$v",
                                                 "$c<>$v",
                                                 "$c  =  $v",
                                                 "$c\n=$v",
                                                 "$v=$c",
                                                 "$v = $v",
                                                 "$c=$c",
                                                 "$c",
                                                 "$v",
                                                 "$c IS $v",
                                                 "$c IS NOT $v",
                                                 "$c IS NULL",
                                                 "$c ISNULL",
                                                 "$c NOTNULL",
                                                 "$c NOT NULL",
                                                 "NOT $c=$v",
                                                 "NOT ($c=$v)",
                                                 "($c=$v)",
                                                 "(($c=$v))",
                                                 "($c)=($v)",
                                                 "$c=($v)",
                                                 "-$c=$v",
                                                 "$c=-$v",
                                                 "$c BETWEEN $v AND $v",
                                                 "$c NOT BETWEEN $v AND $v",
                                                 "$c=$v AND $c=$v",
                                                 "$c=$v OR $c=$v",
                                                 "$c=$v and $c>$v or $c<$v",
                                                 "$c=$v AND ($c=$v OR $c=$v)",
                                                 "($c=$v) AND ($c!=$v) AND ($c<$v)",
                                                 "$c=5 OR $c<5",
                                                 "$c=2 OR $c<=2",
                                                 "$c=1AND $c=2",
                                                 "$c=1 AND$c=2",
                                                 "$c IN($v)",
                                                 "$c IN ()",
                                                 "$c IN ( $v )",
                                                 "$c IN ($v,$v)",
                                                 "$c in ( $v, $v )",
                                                 "$c NOT IN ( $v,$v,$v )",
                                                 "$c IN ( 1,1 )",
                                                 "$c IN (SELECT a FROM $t)",
                                                 "$c NOT  IN ($v)",
                                                 "$c LIKE $v",
                                                 "$c LIKE 'a%'",
                                                 "$c GLOB 'a*'",
                                                 "$c LIKE 'a' ESCAPE 'x'",
                                                 "$c=$v COLLATE NOCASE",
                                                 "$c COLLATE NOCASE=$v",
                                                 "$c=$v+$v",
                                                 "$c+$v=$v",
                                                 "$c||$v=$v",
                                                 "$c=$v ORDER BY $c",
                                                 "$c=$v ORDER BY $c LIMIT 2",
                                                 "$c=$v LIMIT 1",
                                                 "$c=$v GROUP BY $c",
                                                 "$c=$v -- end",
                                                 "$c=$v /* end",
                                                 "/* x */ $c=$v",
                                                 "$c=$v;",
                                                 "$c=$v; SELECT 1",
                                                 "$c=$v;DELETE FROM $t WHERE $c=$v",
                                                 "$c=$v) OR ($c=$v",
                                                 "$c=$v RETURNING $c",
                                                 "$c=?",
                                                 "$c=?2",
                                                 "EXISTS(SELECT 1 FROM $t WHERE a=$v)",
                                                 "CASE WHEN $c=$v THEN $v ELSE $v END",
                                                 "$c=$v UNION SELECT $v",
                                                 "$t MATCH 'a'",
                                                 "CAST($c AS INT)=$v",
                                                 "coalesce($c,$v)=$v",
                                                 "$c=$v=$v",
                                                 "$c<$v<$v",
                                                 "$c!=$v IS $v"};

string List(Draw& draw, const string& column, bool isIn)
{
    std::vector<SqliteValue> values;
    const std::size_t many = 60 + draw.shape.Below(80);
    const std::size_t count = draw.IsOdd(12) ? many : draw.shape.Below(6);
    for (std::size_t at = 0; at < count; ++at) values.push_back(AnyValue(draw));
    return isIn ? SqliteIn(column, values).GetCondition()
                : SqliteNotIn(column, values).GetCondition();
}

string Pair(Draw& draw, const Table& table, int depth)
{
    const string left = AnyCondition(draw, table, depth + 1);
    const string right = AnyCondition(draw, table, depth + 1);
    return draw.shape.OneIn(2) ? SqliteAnd(left, right).GetCondition()
                               : SqliteOr(left, right).GetCondition();
}

// A condition near SQLite's limits for the depth of expressions and of parentheses, or near those of
// the library. For SQLite -5 is deeper than a parameter.
string AtLimit(Draw& draw, const string& column)
{
    static const std::array<const char*, 5> others = {" AND c=1", " AND a<>0", " OR c>-1",
                                                      " OR a IS NULL", " AND b IS NOT NULL"};
    const string first = column + "=-" + std::to_string(2 + draw.value.Below(6));
    if (draw.shape.OneIn(2)) {
        const std::size_t depth = (draw.shape.OneIn(3) ? 38 : 84) + draw.value.Below(8);
        return string(depth, '(') + first + string(depth, ')');
    }
    const std::size_t terms = (draw.shape.OneIn(3) ? 14 : 997) + draw.value.Below(4);
    const string other = draw.shape.Of(others);
    string chain = first;
    for (std::size_t count = 1; count < terms; ++count) chain += other;
    return chain;
}

string OddCondition(Draw& draw, const Table& table)
{
    const string column = AnyColumn(draw, table);
    switch (draw.shape.Below(8)) {
        case 0: return SqliteContains(column, AnyText(draw.value)).GetCondition();
        case 1: return SqliteBeginsWith(column, AnyText(draw.value)).GetCondition();
        case 2: return SqliteIn(column, FillIn(draw, table, "SELECT $c FROM $t")).GetCondition();
        default: return FillIn(draw, table, draw.shape.Of(Written));
    }
}

}  // namespace

const Table& AnyTable(Draw& draw)
{
    const std::vector<Table>& tables = draw.schema.tables;
    return draw.shape.OneIn(2) ? tables.front() : draw.shape.Of(tables);
}

string AnyColumn(Draw& draw, const Table& table)
{
    static const std::array<const char*, 26> others = {
        "rowid",    "oid",      "nosuch",    "\"a\"",     "[b]",
        "`a`",      "lower(b)", "+a",        "-c",        "a COLLATE NOCASE",
        "a+c",      "abs(c)",   "length(b)", "typeof(a)", "A",
        " a",       "a ",       "main.t.a",  "t.a",       "5",
        "'a'",      "a--",      "a+1",       "\"it's\"",  "b||a",
        "likely(a)"};
    if (draw.IsOdd(10)) return draw.shape.Of(others);
    if (draw.IsOdd(12)) return table.name + "." + draw.shape.Of(table.names);
    return draw.shape.Of(table.names);
}

string FillIn(Draw& draw, const Table& table, const string& text)
{
    string filled;
    for (std::size_t at = 0; at < text.size(); ++at) {
        const char kind = text[at] == '$' && at + 1 < text.size() ? text[at + 1] : ' ';
        if (kind == 'c') filled += AnyColumn(draw, table);
        if (kind == 'v') filled += AnyLiteral(draw);
        if (kind == 't') filled += table.name;
        if (kind == 'c' || kind == 'v' || kind == 't') {
            ++at;
        } else {
            filled += text[at];
        }
    }
    return filled;
}

string AnyCondition(Draw& draw, const Table& table, int depth)
{
    constexpr int Deepest = 4;
    if (draw.IsOdd(5)) return OddCondition(draw, table);
    const string column = AnyColumn(draw, table);
    const bool isCommon =
        draw.schema.conditions.empty() ? draw.shape.OneIn(8) : !draw.shape.OneIn(3);
    if (isCommon) return CommonCondition(draw, column);
    constexpr std::size_t UntilLimit = 100;
    if (draw.shape.OneIn(UntilLimit)) return AtLimit(draw, column);
    switch (draw.shape.Below(depth < Deepest ? 15 : 11)) {
        case 0:
        case 1:
        case 2:
        case 3: return SqliteEqual(column, AnyValue(draw)).GetCondition();
        case 4: return SqliteNotEqual(column, AnyValue(draw)).GetCondition();
        case 5: return SqliteLess(column, AnyValue(draw)).GetCondition();
        case 6: return SqliteLessEqual(column, AnyValue(draw)).GetCondition();
        case 7: return SqliteGreater(column, AnyValue(draw)).GetCondition();
        case 8: return SqliteGreaterEqual(column, AnyValue(draw)).GetCondition();
        case 9: return List(draw, column, true);
        case 10: return List(draw, column, false);
        default: return Pair(draw, table, depth);
    }
}

}  // namespace Shapes
