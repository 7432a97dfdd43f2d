#include <array>
#include <string>

#include "draw.h"

namespace Shapes {

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteOrder;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;
using std::string;

constexpr std::array<const char*, 29> Writes = {
    "INSERT INTO $t DEFAULT VALUES",
    "INSERT INTO $t(a,b) VALUES($v,$v)",
    "INSERT INTO $t (a,b) VALUES ($v,$v),($v,$v);",
    "INSERT OR IGNORE INTO $t (id,a) VALUES ($v,$v);",
    "REPLACE INTO $t (id,a) VALUES ($v,$v)",
    "INSERT INTO $t SELECT * FROM $t WHERE $c=$v",
    "INSERT INTO $t (id,a,b,c) VALUES ($v,$v,$v,$v);",
    "INSERT INTO $t VALUES ($v,$v,$v,$v);",
    "INSERT INTO $t (id) VALUES ($v) ON CONFLICT DO NOTHING",
    "insert into $t (a) values ($v);",
    "INSERT INTO $t (id,a) VALUES ($v,$v) RETURNING id",
    "INSERT INTO $t (a) VALUES ($v,$v);",
    "UPDATE $t SET a=$v",
    "UPDATE $t SET a=$v,b=$v WHERE $c=$v",
    "UPDATE $t SET a=$c WHERE $c=$v",
    "UPDATE $t SET a=a+$v WHERE $c=$v",
    "UPDATE OR IGNORE $t SET id=$v WHERE $c=$v",
    "UPDATE $t SET (a,b)=($v,$v) WHERE $c=$v",
    "UPDATE $t SET a=$v WHERE $c=$v RETURNING a",
    "DELETE FROM $t WHERE $c=$v LIMIT 1",
    "DELETE FROM $t WHERE $c=$v RETURNING *",
    "DELETE FROM $t RETURNING $c",
    "DELETE FROM $t AS x WHERE x.a=$v",
    "DELETE FROM $t;",
    "WITH x AS (SELECT 1) DELETE FROM $t WHERE $c=$v",
    "INSERT INTO $t (a) VALUES ($v); UPDATE $t SET b=$v WHERE a=$v;",
    "UPDATE $t SET nosuch=$v WHERE a=$v",
    "INSERT INTO $t (a,a) VALUES ($v,$v);",
    "INSERT INTO $t (nosuch) VALUES ($v);"};

constexpr std::array<const char*, 24> Queries = {
    "SELECT * FROM $t",
    "SELECT a,b FROM $t WHERE $c=$v",
    "SELECT *,rowid FROM $t WHERE $c=$v",
    "SELECT count(*) FROM $t WHERE $c=$v",
    "SELECT a AS x,b AS x FROM $t WHERE $c=$v",
    "select * from $t where $c=$v",
    "SELECT a FROM $t WHERE $c=$v ORDER BY b LIMIT $v",
    "SELECT a FROM $t WHERE $c=$v UNION SELECT b FROM $t",
    "SELECT DISTINCT a FROM $t WHERE $c=$v",
    "SELECT $v",
    "SELECT $v,$v FROM $t",
    "SELECT x.a FROM $t AS x, $t AS y WHERE x.$c=$v AND y.$c=$v",
    "SELECT a FROM $t INDEXED BY t_a WHERE a=$v",
    "SELECT a,sum(c) FROM $t WHERE $c=$v GROUP BY a HAVING a>$v",
    "VALUES($v)",
    "WITH x AS (SELECT * FROM $t) SELECT * FROM x WHERE $c=$v",
    "SELECT total_changes()",
    "EXPLAIN QUERY PLAN SELECT * FROM $t WHERE $c=$v",
    "SELECT type,name FROM sqlite_master",
    "SELECT * FROM $t WHERE $c=$v; SELECT 2",
    "SELECT last_insert_rowid()",
    "SELECT 1 FROM $t",
    "SELECT a, a=$v FROM $t WHERE $c=$v",
    "SELECT \"a\", 'b', [c] FROM $t WHERE $c=$v"};

}  // namespace

SqliteTableHandler AnyHandler(Draw& draw, const Table& table)
{
    const bool hasSchema = draw.shape.Below(3) != 0;
    const bool isUpper = draw.shape.OneIn(20) && table.name == "t";
    return {isUpper ? "T" : table.name, hasSchema ? table.columns : ""};
}

SqliteValueList AnyRecord(Draw& draw, const Table& table)
{
    SqliteValueList record;
    if (draw.shape.OneIn(3)) {
        for (const string& name : table.names) record.AddValue(name, AnyValue(draw));
        return record;
    }
    for (std::size_t count = 1 + draw.shape.Below(4); count > 0; --count) {
        const bool isOdd = draw.IsOdd(12);
        const string field = isOdd ? AnyColumn(draw, table) : draw.shape.Of(table.names);
        record.AddValue(field, AnyValue(draw));
    }
    return record;
}

InsertCommand AnyInsert(Draw& draw, const Table& table)
{
    InsertCommand insert;
    insert.SetTable(AnyHandler(draw, table));
    insert.SetReplacable(draw.shape.OneIn(3));
    insert.SetFieldValues(AnyRecord(draw, table));
    return insert;
}

UpdateCommand AnyUpdate(Draw& draw, const Table& table)
{
    UpdateCommand update;
    update.SetTable(AnyHandler(draw, table));
    update.SetFieldValues(AnyRecord(draw, table));
    update.SetCondition(AnyCondition(draw, table));
    return update;
}

SelectCommand AnySelect(Draw& draw, const Table& table)
{
    SelectCommand select;
    select.SetTable(AnyHandler(draw, table));
    if (draw.shape.OneIn(3)) {
        select.SelectAll();
    } else {
        for (std::size_t count = 1 + draw.shape.Below(4); count > 0; --count)
            select.AddField(AnyColumn(draw, table));
    }
    if (!draw.shape.OneIn(6)) select.SetCondition(AnyCondition(draw, table));
    if (draw.IsOdd(12)) select.GroupBy(draw.shape.Of(table.names));
    if (draw.shape.OneIn(6)) {
        const bool isDescending = draw.shape.OneIn(2);
        select.OrderBy(draw.shape.Of(table.names),
                       isDescending ? SqliteOrder::Descending : SqliteOrder::Ascending);
    }
    const std::size_t offset = draw.value.Below(3);
    if (draw.shape.OneIn(6)) select.Limit(draw.value.Below(5), offset);
    return select;
}

string AnyDelete(Draw& draw, const Table& table)
{
    return "DELETE FROM " + table.name + " WHERE " + AnyCondition(draw, table) + ";";
}

string AnyWrite(Draw& draw)
{
    const Table& table = AnyTable(draw);
    switch (draw.shape.Below(6)) {
        case 0:
        case 1: return MaybeMutated(draw, AnyInsert(draw, table).GetCommand());
        case 2: return MaybeMutated(draw, AnyUpdate(draw, table).GetCommand());
        case 3: return MaybeMutated(draw, AnyDelete(draw, table));
        default: return MaybeMutated(draw, FillIn(draw, table, draw.shape.Of(Writes)));
    }
}

string AnyQuery(Draw& draw)
{
    const Table& table = AnyTable(draw);
    const bool isBuilt = draw.shape.OneIn(2);
    const string query =
        isBuilt ? AnySelect(draw, table).GetCommand() : FillIn(draw, table, draw.shape.Of(Queries));
    return MaybeMutated(draw, query);
}

}  // namespace Shapes
