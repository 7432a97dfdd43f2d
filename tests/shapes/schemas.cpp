#include "schemas.h"

#include <sqlite3.h>

namespace Shapes {

namespace {

// Columns that most tables have, so that a statement means something with any schema.
const char* const Usual = "id INTEGER PRIMARY KEY, a, b TEXT, c INTEGER";

Table Usually(const std::string& name, const std::string& columns = Usual)
{
    return {name, columns, {"id", "a", "b", "c"}};
}

Table Wide()
{
    Table wide{"wide", "id INTEGER PRIMARY KEY", {"id"}};
    constexpr int Columns = 110;
    for (int number = 0; number < Columns; ++number) {
        wide.names.push_back("c" + std::to_string(number));
        wide.columns += "," + wide.names.back();
    }
    return wide;
}

std::string Create(const Table& table, const std::string& options = "")
{
    return "CREATE TABLE " + table.name + "(" + table.columns + ")" + options;
}

// Some rows, so that the first conditions already match something. Their order is another one in
// each index.
std::string Fill(const std::string& table)
{
    return "INSERT INTO " + table +
           "(id,a,b,c) WITH RECURSIVE n(i) AS (VALUES(1) UNION ALL SELECT i+1 FROM n WHERE i<14) "
           "SELECT i*5%17, CASE i%7 WHEN 4 THEN 9 ELSE i%7 END, substr('abAx1bxaB aab1x',i,1), "
           "nullif(i*3%16,6) FROM n";
}

Schema Plain()
{
    const Table t = Usually("t");
    const Table u = Usually("u", "id, a INT, b VARCHAR(10), c REAL");
    return {"plain", {Create(t), Create(u), Fill("t"), Fill("u")}, {t, u, Usually("missing")}};
}

Schema Indexes()
{
    const Table t = Usually("t");
    return {
        "indexes",
        {Create(t), "CREATE INDEX t_a ON t(a)", "CREATE INDEX t_b ON t(b COLLATE NOCASE, c DESC)",
         "CREATE UNIQUE INDEX t_ac ON t(a,b,c)", Fill("t"), "ANALYZE"},
        {t}};
}

Schema PartialIndexes()
{
    const Table t = Usually("t", "id, a, b TEXT, c INTEGER");
    return {"partial indexes",
            {Create(t), "CREATE INDEX t_1 ON t(b) WHERE a>1",
             "CREATE INDEX t_2 ON t(c) WHERE b='a'", "CREATE INDEX t_3 ON t(a) WHERE c IS NOT NULL",
             "CREATE UNIQUE INDEX t_4 ON t(id) WHERE a=5", Fill("t")},
            {t}};
}

Schema ExpressionIndexes()
{
    const Table t = Usually("t");
    return {"expression indexes",
            {Create(t), "CREATE INDEX t_1 ON t(lower(b))", "CREATE INDEX t_2 ON t(a+c)",
             "CREATE INDEX t_3 ON t(abs(c),b)", "CREATE INDEX t_4 ON t(+a) WHERE a+1>2", Fill("t")},
            {t}};
}

Schema Strict()
{
    const Table t = Usually("t", "id INTEGER PRIMARY KEY, a ANY, b TEXT NOT NULL, c INT");
    return {"strict", {Create(t, " STRICT"), Fill("t")}, {t}};
}

Schema WithoutRowid()
{
    const Table t = Usually("t", "id, a, b TEXT COLLATE NOCASE, c INTEGER, PRIMARY KEY(b,id DESC)");
    return {
        "without rowid", {Create(t, " WITHOUT ROWID"), "CREATE INDEX t_a ON t(a)", Fill("t")}, {t}};
}

Schema Triggers()
{
    const Table t = Usually("t");
    const Table log{"log", "op TEXT, id, a", {"op", "id", "a"}};
    return {
        "triggers",
        {Create(t), Create(log), Fill("t"),
         "CREATE TRIGGER t1 AFTER INSERT ON t BEGIN INSERT INTO log VALUES('i',new.id,new.a); END",
         "CREATE TRIGGER t2 AFTER UPDATE OF a ON t WHEN new.a<20 BEGIN "
         "INSERT INTO log VALUES('u',old.id,new.a); UPDATE t SET c=c+1 WHERE id=new.id; END",
         "CREATE TRIGGER t3 BEFORE DELETE ON t WHEN old.a=3 BEGIN SELECT RAISE(IGNORE); END",
         "CREATE TRIGGER t4 BEFORE INSERT ON t WHEN new.a=4 BEGIN SELECT RAISE(ABORT,'no 4'); END",
         "CREATE TRIGGER t5 BEFORE INSERT ON t WHEN new.a=5 "
         "BEGIN SELECT RAISE(ROLLBACK,'no 5'); END",
         "CREATE TRIGGER t6 BEFORE UPDATE ON t WHEN new.a=6 BEGIN SELECT RAISE(FAIL,'no 6'); END",
         "CREATE TRIGGER t7 AFTER DELETE ON t BEGIN DELETE FROM t WHERE id=old.id+1; END"},
        {t, log}};
}

Schema Checks()
{
    const Table t = Usually("t",
                            "id INTEGER PRIMARY KEY ON CONFLICT REPLACE, "
                            "a CHECK(a IS NULL OR a<>4), b TEXT NOT NULL ON CONFLICT IGNORE "
                            "DEFAULT 'none', c INTEGER UNIQUE ON CONFLICT ROLLBACK");
    const Table u = Usually("u",
                            "id INTEGER PRIMARY KEY AUTOINCREMENT, a UNIQUE ON CONFLICT FAIL, "
                            "b DEFAULT (lower('X')), c DEFAULT 7 CHECK(c<100)");
    return {"checks", {Create(t), Create(u), Fill("t")}, {t, u}};
}

Schema Views()
{
    const Table t = Usually("t");
    return {"views",
            {Create(t), Fill("t"), "CREATE VIEW v AS SELECT id,a,b,c FROM t WHERE a<5",
             "CREATE VIEW readonly AS SELECT id, a+1 AS a, b, c FROM t ORDER BY b",
             "CREATE TRIGGER v1 INSTEAD OF INSERT ON v BEGIN "
             "INSERT INTO t(id,a,b,c) VALUES(new.id,new.a,new.b,new.c); END",
             "CREATE TRIGGER v2 INSTEAD OF UPDATE ON v BEGIN "
             "UPDATE t SET a=new.a,b=new.b WHERE id=old.id; END",
             "CREATE TRIGGER v3 INSTEAD OF DELETE ON v BEGIN DELETE FROM t WHERE id=old.id; END"},
            {Usually("v"), t, Usually("readonly")}};
}

Schema FullText()
{
    const Table t{"t", "b", {"b", "a", "t", "rank", "rowid"}};
    const Table u = Usually("u");
    const Table box{"box", "id", {"id", "x0", "x1"}};
    return {
        "virtual tables",
        {"CREATE VIRTUAL TABLE t USING fts5(a,b)",
         "INSERT INTO t(a,b) VALUES('one','a'),('two','b x'),('1','a b')", Create(u), Fill("u"),
         "CREATE VIRTUAL TABLE box USING rtree(id,x0,x1)", "INSERT INTO box VALUES(1,0,2),(2,1,3)"},
        {t, u, box}};
}

Schema Utf16()
{
    const Table t = Usually("t");
    return {"UTF-16",
            {"PRAGMA encoding='UTF-16le'", Create(t), "CREATE INDEX t_b ON t(b)", Fill("t")},
            {t}};
}

Schema WriteAheadLog()
{
    const Table t = Usually("t");
    const Table u = Usually("u");
    return {
        "write-ahead log",
        {"PRAGMA journal_mode=WAL", Create(t), Create(u), "CREATE INDEX t_a ON t(a)", Fill("t")},
        {t, u}};
}

Schema Generated()
{
    Table t = Usually("t",
                      "id INTEGER PRIMARY KEY, a, b TEXT, c INTEGER, s AS (a||b) STORED, "
                      "v AS (c*2) VIRTUAL");
    const std::string create = Create(t);
    t.names = {"id", "a", "b", "c", "a", "b", "s", "v"};
    return {"generated columns",
            {create, "CREATE INDEX t_s ON t(s)", "CREATE INDEX t_v ON t(v) WHERE v>2", Fill("t")},
            {t}};
}

Schema ForeignKeys()
{
    const Table t = Usually("t");
    const Table u =
        Usually("u",
                "id INTEGER PRIMARY KEY, a REFERENCES t(id) ON DELETE CASCADE ON UPDATE "
                "SET NULL, b TEXT, c INTEGER REFERENCES t(id) DEFERRABLE INITIALLY DEFERRED");
    return {"foreign keys",
            {Create(t), Create(u), Fill("t"), "DELETE FROM t WHERE id%3=0",
             "INSERT INTO u VALUES(1,1,'a',1),(2,2,'b',4)"},
            {u, t},
            {"PRAGMA foreign_keys=1", "PRAGMA foreign_keys=0", "EXPLAIN PRAGMA foreign_keys=1",
             "EXPLAIN PRAGMA foreign_keys=0"}};
}

Schema Collations()
{
    const Table t = Usually("t",
                            "id INTEGER PRIMARY KEY DESC, a COLLATE NOCASE, b TEXT COLLATE RTRIM, "
                            "c NUMERIC COLLATE BINARY");
    return {"collations",
            {Create(t), "CREATE INDEX t_a ON t(a)", "CREATE INDEX t_b ON t(b COLLATE NOCASE)",
             Fill("t")},
            {t}};
}

Schema OddNames()
{
    const Table select = Usually("\"select\"");
    Table order{"[order by]", "\"from\", \"a b\" INTEGER, \"it's\", [x?y], rowid TEXT", {}};
    const std::string create = Create(order);
    order.names = {"\"from\"", "\"a b\"", "\"it's\"", "[x?y]", "rowid", "_rowid_", "`from`"};
    const Table values = Usually("\"t\"\"q\"", "id INTEGER PRIMARY KEY, a, b, c");
    return {"odd names",
            {Create(select), create, Create(values), Fill(select.name)},
            {select, order, values, Usually("sqlite_master"), Usually("main.\"select\"")}};
}

Schema WideTables()
{
    const Table wide = Wide();
    const Table t = Usually("t");
    return {"wide",
            {Create(wide), Create(t), "CREATE INDEX w ON wide(c1,c2,c3)", Fill("t")},
            {wide, t}};
}

// Both connections of a side use one cache, and meet each other's locks there.
Schema SharedCache()
{
    const Table t = Usually("t");
    const Table u = Usually("u");
    Schema schema{"shared cache", {Create(t), Create(u), Fill("t")}, {t, u}};
    if (sqlite3_compileoption_used("USE_URI") != 0) schema.file = "file:main.db?cache=shared";
    return schema;
}

Schema SmallPages()
{
    const Table t = Usually("t", "a, b BLOB, c FLOAT, id INTEGER PRIMARY KEY");
    return {"small pages",
            {"PRAGMA page_size=512", "PRAGMA auto_vacuum=FULL", "PRAGMA journal_mode=TRUNCATE",
             Create(t), "CREATE INDEX t_abc ON t(a,b,c)",
             "INSERT INTO t(a,b,c) WITH RECURSIVE n(i) AS (VALUES(1) UNION ALL SELECT i+1 FROM n "
             "WHERE i<60) SELECT i%7, printf('%.*c',i,'x'), i FROM n",
             "ANALYZE"},
            {t}};
}

const std::vector<Schema>& Schemas()
{
    static const std::vector<Schema> schemas = {
        Plain(),      Indexes(),      PartialIndexes(), ExpressionIndexes(),
        Strict(),     WithoutRowid(), Triggers(),       Checks(),
        Views(),      FullText(),     Utf16(),          WriteAheadLog(),
        Generated(),  ForeignKeys(),  Collations(),     OddNames(),
        WideTables(), SmallPages(),   SharedCache()};
    return schemas;
}

}  // namespace

Schema AnySchema(Random& random)
{
    return random.OneIn(3) ? AnyPartialIndexes(random) : random.Of(Schemas());
}

}  // namespace Shapes
