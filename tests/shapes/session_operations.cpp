#include <array>

#include "operations.h"

namespace Shapes {

namespace {

using OrvaDRCore::SqliteDB;
using std::string;

constexpr std::array<const char*, 16> Transactions = {
    "BEGIN",           "BEGIN",
    "BEGIN IMMEDIATE", "BEGIN EXCLUSIVE",
    "COMMIT",          "COMMIT",
    "COMMIT",          "ROLLBACK",
    "ROLLBACK",        "END",
    "SAVEPOINT s",     "RELEASE s",
    "ROLLBACK TO s",   "SAVEPOINT s2; SAVEPOINT s",
    "RELEASE s2",      "BEGIN; SELECT 1"};

constexpr std::array<const char*, 44> Pragmas = {"count_changes=1",
                                                 "count_changes=0",
                                                 "recursive_triggers=1",
                                                 "recursive_triggers=0",
                                                 "case_sensitive_like=1",
                                                 "case_sensitive_like=0",
                                                 "foreign_keys=1",
                                                 "foreign_keys=1",
                                                 "foreign_keys=0",
                                                 "writable_schema=1",
                                                 "writable_schema=0",
                                                 "writable_schema=RESET",
                                                 "reverse_unordered_selects=1",
                                                 "reverse_unordered_selects=0",
                                                 "full_column_names=1",
                                                 "full_column_names=0",
                                                 "short_column_names=0",
                                                 "short_column_names=1",
                                                 "empty_result_callbacks=1",
                                                 "query_only=1",
                                                 "query_only=0",
                                                 "query_only=0",
                                                 "ignore_check_constraints=1",
                                                 "ignore_check_constraints=0",
                                                 "defer_foreign_keys=1",
                                                 "automatic_index=0",
                                                 "busy_timeout=0",
                                                 "busy_timeout=20",
                                                 "cache_size=5",
                                                 "temp_store=MEMORY",
                                                 "max_page_count=25",
                                                 "max_page_count=100000",
                                                 "journal_mode=DELETE",
                                                 "journal_mode=MEMORY",
                                                 "journal_mode=WAL",
                                                 "locking_mode=NORMAL",
                                                 "legacy_alter_table=1",
                                                 "trusted_schema=0",
                                                 "schema_version=77",
                                                 "user_version=3",
                                                 "data_version",
                                                 "table_info(t)",
                                                 "optimize",
                                                 "shrink_memory"};

// Of this connection alone, and changes of the schema that it makes itself.
constexpr std::array<const char*, 34> Statements = {
    "ATTACH 'aux.db' AS aux",
    "ATTACH 'aux.db' AS aux",
    "ATTACH 'other.db' AS other",
    "DETACH aux",
    "DETACH other",
    "CREATE TABLE aux.t(id,a,b,c)",
    "CREATE TABLE IF NOT EXISTS aux.u(id,a,b,c)",
    "CREATE TABLE other.missing(id,a,b,c)",
    "DROP TABLE aux.t",
    "CREATE TEMP TABLE t(id,a,b,c)",
    "CREATE TEMP TABLE missing(id,a,b,c)",
    "DROP TABLE temp.t",
    "CREATE TEMP VIEW u AS SELECT * FROM t",
    "DROP VIEW temp.u",
    "INSERT INTO t(a) VALUES(1)",
    "ALTER TABLE t ADD COLUMN extra DEFAULT 3",
    "ALTER TABLE t DROP COLUMN extra",
    "ALTER TABLE t RENAME COLUMN b TO bb",
    "ALTER TABLE t RENAME COLUMN bb TO b",
    "CREATE INDEX IF NOT EXISTS own ON t(a)",
    "DROP INDEX own",
    "DROP TABLE IF EXISTS missing",
    "CREATE TABLE missing(id,a,b,c)",
    "ANALYZE",
    "REINDEX",
    "VACUUM",
    "CREATE TEMP TRIGGER tt AFTER INSERT ON t BEGIN DELETE FROM t WHERE id=new.id; END",
    "DROP TRIGGER temp.tt",
    "DROP TABLE t",
    "SELECT * FROM t",
    "EXPLAIN DELETE FROM t",
    "SELECT 1; SELECT 2; SELECT nosuch",
    "",
    ";"};

Operation ExecOf(Draw& draw, const string& statement)
{
    const std::size_t db = AnyConnection(draw);
    return {NameOf(db) + "Exec: " + statement,
            [=](Side& side) { side.Note("answer", side.Db(db).Exec(statement)); }};
}

// Some take effect even in an EXPLAIN.
string AnyPragma(Draw& draw)
{
    const char* const begin = draw.value.OneIn(5) ? "EXPLAIN PRAGMA " : "PRAGMA ";
    return begin + string(draw.value.Of(Pragmas));
}

Operation QueryPragma(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const string statement = AnyPragma(draw);
    return {NameOf(db) + "SelectByCommand: " + statement, [=](Side& side) {
                std::vector<OrvaDRCore::SqliteValueList> rows;
                side.Note("answer", side.Db(db).SelectByCommand(statement, rows));
                for (const auto& row : rows) side.Note("record", row.ToStr());
            }};
}

Operation TransactionOperation(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    switch (draw.value.Below(6)) {
        case 0:
        case 1:
            return {NameOf(db) + "transaction.Begin",
                    [db](Side& side) { side.Note("answer", side.Transaction(db).Begin()); }};
        case 2:
        case 3:
            return {NameOf(db) + "transaction.Commit",
                    [db](Side& side) { side.Note("answer", side.Transaction(db).Commit()); }};
        case 4:
            return {NameOf(db) + "transaction.Rollback",
                    [db](Side& side) { side.Note("answer", side.Transaction(db).Rollback()); }};
        default:
            return {NameOf(db) + "transaction.~SqliteTransaction",
                    [db](Side& side) { side.DropTransaction(db); }};
    }
}

// Closes the connection while it deletes. The deletion is committed later, while another reads.
Operation CloseInDelete(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const string text = "DELETE FROM " + draw.value.Of(draw.schema.tables).name + " RETURNING a";
    const bool wantsMore = draw.value.OneIn(2);
    return {NameOf(db) + "SelectEachByCommand: " + text + " { closes, while another reads }",
            [=](Side& side) {
                const char* const read = "BEGIN; SELECT count(*) FROM sqlite_master";
                side.Note("reader", side.RunAsNeighbour(false, read));
                const auto close = [&](const OrvaDRCore::SqliteRow&) {
                    side.DropTransaction(db);
                    side.Db(db).Close();
                    return wantsMore;
                };
                side.Note("answer", side.Db(db).SelectEachByCommand(text, close));
                side.Note("reader", side.RunAsNeighbour(false, "COMMIT"));
            }};
}

Operation ConnectionOperation(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    switch (draw.value.Below(5)) {
        case 0:
            return {NameOf(db) + "Close", [db](Side& side) {
                        side.DropTransaction(db);
                        side.Db(db).Close();
                    }};
        case 1:
            return {NameOf(db) + "moved away and back", [db](Side& side) {
                        side.DropTransaction(db);
                        SqliteDB moved(std::move(side.Db(db)));
                        side.Db(db) = std::move(moved);
                    }};
        case 2: return CloseInDelete(draw);
        default:
            return {NameOf(db) + "Open",
                    [db](Side& side) { side.Note("answer", side.Db(db).Open()); }};
    }
}

Operation TableOperation(Draw& draw)
{
    const std::size_t db = AnyConnection(draw);
    const Table& table = draw.value.Of(draw.schema.tables);
    const string name = draw.value.OneIn(4) ? AnyText(draw.value) : table.name;
    switch (draw.value.Below(4)) {
        case 0: {
            const OrvaDRCore::SqliteTableHandler handler(name, table.columns);
            return {NameOf(db) + "CreateTable: " + name,
                    [=](Side& side) { side.Note("answer", side.Db(db).CreateTable(handler)); }};
        }
        case 1: {
            const std::vector<string> steps = {"CREATE TABLE IF NOT EXISTS missing(id,a,b,c)",
                                               "ALTER TABLE t ADD COLUMN up", "DROP TABLE missing"};
            return {NameOf(db) + "Upgrade",
                    [=](Side& side) { side.Note("answer", side.Db(db).Upgrade(steps)); }};
        }
        default:
            return {NameOf(db) + "IsTableExisted: " + name,
                    [=](Side& side) { side.Note("answer", side.Db(db).IsTableExisted(name)); }};
    }
}

}  // namespace

Operation AnySessionOperation(Draw& draw)
{
    if (!draw.schema.session.empty() && draw.value.OneIn(2))
        return ExecOf(draw, draw.value.Of(draw.schema.session));
    switch (draw.value.Below(16)) {
        case 0:
        case 1:
        case 2:
        case 3: return ExecOf(draw, draw.value.Of(Transactions));
        case 4:
        case 5:
        case 6: return TransactionOperation(draw);
        case 7:
        case 8: return ExecOf(draw, AnyPragma(draw));
        case 9: return QueryPragma(draw);
        case 10: return ConnectionOperation(draw);
        case 11: return TableOperation(draw);
        default: return ExecOf(draw, draw.value.Of(Statements));
    }
}

}  // namespace Shapes
