#include "operations.h"

#include <array>

namespace Shapes {

namespace {

using std::string;

constexpr std::array<const char*, 48> SchemaChanges = {
    "ALTER TABLE $t ADD COLUMN extra DEFAULT 3",
    "ALTER TABLE $t ADD COLUMN c2",
    "ALTER TABLE $t DROP COLUMN extra",
    "ALTER TABLE $t DROP COLUMN c",
    "ALTER TABLE $t ADD COLUMN c",
    "ALTER TABLE $t RENAME COLUMN b TO bb",
    "ALTER TABLE $t RENAME COLUMN bb TO b",
    "ALTER TABLE $t RENAME COLUMN bb TO b",
    "ALTER TABLE $t RENAME COLUMN bb TO b",
    "ALTER TABLE $t ADD COLUMN c",
    "ALTER TABLE $t ADD COLUMN c",
    "PRAGMA user_version=5",
    "CREATE TABLE IF NOT EXISTS $t(id INTEGER PRIMARY KEY,a,b TEXT,c)",
    "CREATE TABLE IF NOT EXISTS $t(id INTEGER PRIMARY KEY,a,b TEXT,c)",
    "REINDEX",
    "ALTER TABLE $t RENAME COLUMN a TO d; ALTER TABLE $t RENAME COLUMN c TO a; "
    "ALTER TABLE $t RENAME COLUMN d TO c",
    "ALTER TABLE $t RENAME TO away",
    "ALTER TABLE away RENAME TO $t",
    "ALTER TABLE away RENAME TO $t",
    "CREATE INDEX n1 ON $t(a)",
    "CREATE INDEX n2 ON $t(b) WHERE a=1",
    "CREATE INDEX n3 ON $t(c,a DESC)",
    "CREATE UNIQUE INDEX n4 ON $t(a,b)",
    "CREATE INDEX n5 ON $t(a,b) WHERE c>2",
    "CREATE INDEX n6 ON $t(b COLLATE NOCASE)",
    "CREATE INDEX n7 ON $t(lower(b))",
    "DROP INDEX n1",
    "DROP INDEX n2",
    "DROP INDEX n3",
    "DROP INDEX n4",
    "DROP INDEX n5",
    "DROP INDEX n6",
    "DROP INDEX n7",
    "DROP TABLE $t",
    "CREATE TABLE $t(id INTEGER PRIMARY KEY,a,b TEXT,c)",
    "CREATE TABLE $t(c,b,a,id)",
    "DROP TABLE $t; CREATE TABLE $t(a TEXT,id,c,b)",
    "CREATE VIEW $t AS SELECT 1 AS a,2 AS b",
    "DROP VIEW $t",
    "DROP VIEW $t",
    "DROP VIEW v",
    "ANALYZE",
    "CREATE TABLE IF NOT EXISTS missing(a,b)",
    "CREATE TRIGGER n8 AFTER UPDATE ON $t BEGIN DELETE FROM $t WHERE a=9; END",
    "DROP TRIGGER n8",
    "VACUUM",
    "DROP TRIGGER t1",
    "CREATE TABLE x1(a); DROP TABLE x1"};

constexpr std::array<const char*, 10> Changes = {"INSERT INTO $t(a,b) VALUES($v,$v)",
                                                 "UPDATE $t SET a=$v WHERE $c=$v",
                                                 "DELETE FROM $t WHERE $c=$v",
                                                 "DELETE FROM $t",
                                                 "INSERT OR REPLACE INTO $t(id,a) VALUES($v,$v)",
                                                 "BEGIN; UPDATE $t SET a=$v; ROLLBACK",
                                                 "UPDATE $t SET b=$v",
                                                 "SELECT * FROM $t",
                                                 "INSERT INTO $t(a) VALUES(1),(2),(3)",
                                                 "PRAGMA wal_checkpoint"};

Operation RunAsNeighbour(bool isProcess, const string& statements)
{
    return {(isProcess ? "other process: " : "neighbour: ") + statements, [=](Side& side) {
                side.Note("neighbour", side.RunAsNeighbour(isProcess, statements));
            }};
}

// The neighbour takes a lock, and gives it back before the operation, while it waits, between its
// attempts, or after it.
Operation WhileLocked(Draw& draw, const Operation& operation)
{
    static const std::array<const char*, 6> locks = {
        "BEGIN EXCLUSIVE",
        "BEGIN EXCLUSIVE",
        "BEGIN IMMEDIATE",
        "BEGIN; SELECT count(*) FROM sqlite_master",
        "BEGIN IMMEDIATE; UPDATE sqlite_sequence SET seq=seq",
        "BEGIN EXCLUSIVE"};
    const bool isProcess = draw.value.OneIn(4);
    const bool hasChange = draw.value.OneIn(2);
    const string change = AnyNeighbourStatement(draw);
    const string begin = string(draw.value.Of(locks)) + (hasChange ? "; " + change : "");
    const char* const end = draw.value.OneIn(4) ? "ROLLBACK" : "COMMIT";
    const std::size_t pause = 1 + draw.value.Below(3);
    const std::size_t way = draw.value.Below(4);
    static const std::array<const char*, 4> ways = {"after it", "at its pause ", "at its wait ",
                                                    "after it"};
    const string when = ways[way] + (way == 1 || way == 2 ? std::to_string(pause) : "");
    return {"{ " + begin + "; " + end + " " + when + (isProcess ? " in a process } " : " } ") +
                operation.text,
            [=](Side& side) {
                const auto unlock = [&side, isProcess, end] {
                    side.Note("unlock", side.RunAsNeighbour(isProcess, end));
                };
                side.Note("lock", side.RunAsNeighbour(isProcess, begin));
                if (way == 1) side.AtPause(pause, unlock);
                if (way == 2) side.AtWait(pause, unlock);
                operation.run(side);
                unlock();
            }};
}

// Others change something between two attempts.
Operation WhilePausing(Draw& draw, const Operation& operation)
{
    const string change = AnyNeighbourStatement(draw);
    const std::size_t pause = 1 + draw.value.Below(2);
    return {"{ at its pause " + std::to_string(pause) + " neighbour: " + change + " } " +
                operation.text,
            [=](Side& side) {
                side.AtPause(pause, [&side, change] {
                    side.Note("neighbour", side.RunAsNeighbour(false, change));
                });
                operation.run(side);
            }};
}

// The second time a statement is cached, and may have become wrong.
Operation TwiceAroundChange(Draw& draw, const Operation& operation)
{
    const bool isOwn = draw.schema.neighbour.empty() && draw.value.Below(4) != 0;
    const Operation change = isOwn
                                 ? AnySessionOperation(draw)
                                 : RunAsNeighbour(draw.value.OneIn(4), AnyNeighbourStatement(draw));
    return {operation.text + " { and again after " + change.text + " }", [=](Side& side) {
                operation.run(side);
                change.run(side);
                operation.run(side);
            }};
}

Operation AnyStatement(Random& random, const Pool& pool)
{
    const bool isKnown = !random.OneIn(5 * pool.tameness);
    const std::uint64_t shape = isKnown ? random.Of(pool.shapes) : random.Next();
    Draw draw{Random(shape), Random(random.Next()), pool.schema, pool.tameness};
    return draw.shape.OneIn(4) ? AnyTextOperation(draw) : AnyRecordOperation(draw);
}

}  // namespace

string AnyNeighbourStatement(Draw& draw)
{
    if (!draw.schema.neighbour.empty() && !draw.value.OneIn(3))
        return draw.value.Of(draw.schema.neighbour);
    const Table& table = draw.value.OneIn(2) ? draw.schema.tables.front() : AnyTable(draw);
    const char* const statement =
        draw.value.OneIn(3) ? draw.value.Of(Changes) : draw.value.Of(SchemaChanges);
    return FillIn(draw, table, statement);
}

Operation AnyOperation(Random& random, const Pool& pool)
{
    Draw draw{Random(random.Next()), Random(random.Next()), pool.schema};
    const bool hasChanges = !pool.schema.neighbour.empty() || !pool.schema.session.empty();
    if (hasChanges && random.OneIn(6)) {
        const bool isOrdered = !pool.schema.conditions.empty() && !random.OneIn(4);
        return TwiceAroundChange(
            draw, isOrdered ? AnyOrderedOperation(draw) : AnyStatement(random, pool));
    }
    const std::size_t kind = random.Below(100);
    if (kind < 67) return AnyStatement(random, pool);
    if (kind < 70) return TwiceAroundChange(draw, AnyStatement(random, pool));
    if (kind < 74) return WhileLocked(draw, AnyStatement(random, pool));
    if (kind < 77) return WhilePausing(draw, AnyStatement(random, pool));
    if (kind < 84) return AnySessionOperation(draw);
    if (kind < 89) return RunAsNeighbour(draw.value.OneIn(4), AnyNeighbourStatement(draw));
    if (kind < 99)
        return {"which locks are left?",
                [](Side& side) { side.Note("possible", side.Second().TryLocks()); }};
    return {"what is in the file?",
            [](Side& side) { side.Note("content", side.Second().ReadAll()); }};
}

}  // namespace Shapes
