// Several statements that happen all or not at all, also when one of them fails.
#include <cstdlib>
#include <functional>
#include <iostream>
#include <string>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SqliteCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

namespace {

// [transaction]
// Runs `work` in a transaction. `work` uses single tries only: DoExecSqliteCommand,
// DoSelectSqliteRecord, DoSelectSqliteRecords. On failure all is as it was, and `ret_error` holds
// what SQLite said.
bool InTransaction(SqliteDB& db, const std::function<bool()>& work, Json::Value& ret_error)
{
    if (!db.Open()) return false;
    const bool isBegun = db.Exec("BEGIN IMMEDIATE");
    if (isBegun && work() && db.Exec("COMMIT")) return true;
    ret_error = db.GetErr();  // before the rollback replaces it
    // SQLite may have rolled back by itself, and then refuses. Closing ends what is left.
    if (isBegun && !db.DoExecSqliteCommand("ROLLBACK")) db.Close();
    return false;
}

// One try. A command that is not valid has an empty text, which SQLite would take for done.
bool RunOnce(SqliteDB& db, const SqliteCommand& command)
{
    return command.IsValid() && db.DoExecSqliteCommand(command.GetCommand());
}
// [/transaction]

// [work]
bool MoveVolume(SqliteDB& db, const std::string& volume, const std::string& node,
                Json::Value& ret_error)
{
    UpdateCommand move;
    move.SetTable(SqliteTableHandler("volumes", ""));
    move.AddFieldValue("node", SqliteValue::EscapeText(node));
    move.SetCondition(SqliteEqual("name", SqliteValue::EscapeText(volume)));

    InsertCommand note;
    note.SetTable(SqliteTableHandler("moves", ""));
    note.AddFieldValue("volume", SqliteValue::EscapeText(volume));
    note.AddFieldValue("node", SqliteValue::EscapeText(node));

    return InTransaction(
        db, [&] { return RunOnce(db, move) && RunOnce(db, note); }, ret_error);
}
// [/work]

bool Print(SqliteDB& db)
{
    SqliteValueList row;
    if (!db.SelectByCommand("SELECT node, (SELECT count(*) FROM moves) AS moves FROM volumes",
                            row)) {
        return false;
    }
    std::cout << row.ToStr() << '\n';
    return true;
}

}  // namespace

int main()
{
    // [tables]
    SqliteDB db("recipe_transaction.db", 3);
    const bool isReady =
        db.Open() &&
        db.CreateTable(SqliteTableHandler("volumes", "name TEXT PRIMARY KEY, node TEXT")) &&
        db.CreateTable(SqliteTableHandler("moves", "volume TEXT, node TEXT UNIQUE"));
    // [/tables]
    if (!isReady || !db.Exec("INSERT INTO volumes VALUES ('replica', 'backup-01')")) {
        return EXIT_FAILURE;
    }
    Json::Value error;
    if (!MoveVolume(db, "replica", "backup-02", error) || !Print(db)) return EXIT_FAILURE;
    if (!db.Exec("UPDATE volumes SET node='backup-03'")) return EXIT_FAILURE;

    // The second statement of this one is refused; the first must not stay.
    if (MoveVolume(db, "replica", "backup-02", error)) return EXIT_FAILURE;
    std::cout << error["sqlite_errmsg"].asString() << '\n';
    if (!Print(db)) return EXIT_FAILURE;

    // The connection is as good as before.
    if (!MoveVolume(db, "replica", "backup-04", error) || !Print(db)) return EXIT_FAILURE;
    return EXIT_SUCCESS;
}
