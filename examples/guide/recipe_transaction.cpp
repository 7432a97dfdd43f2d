// Several operations that happen all or not at all, even if one of them fails.
#include <cstddef>
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_transaction.h>

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteTransaction;
using OrvaDRCore::SqliteValue;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;

namespace {

// [work]
// Moves a volume and records the move. On failure nothing has changed; db.GetErr() says why.
bool MoveVolume(SqliteDB& db, const std::string& volume, const std::string& node)
{
    UpdateCommand move;
    move.SetTable(SqliteTableHandler("volumes", ""));
    move.AddFieldValue("node", SqliteValue::Text(node));
    move.SetCondition(SqliteEqual("name", SqliteValue::Text(volume)));

    InsertCommand note;
    note.SetTable(SqliteTableHandler("moves", ""));
    note.AddFieldValue("volume", SqliteValue::Text(volume));
    note.AddFieldValue("node", SqliteValue::Text(node));

    SqliteTransaction transaction(db);
    return transaction.Begin() && db.UpdateRecord(move) && db.InsertRecord(note) &&
           transaction.Commit();
    // Without a commit, the destructor rolls back here.
}
// [/work]

// [decide]
// Moves all volumes away from a node, unless it has more than `most`.
bool Evacuate(SqliteDB& db, const std::string& from, const std::string& to, std::size_t most)
{
    SqliteTransaction transaction(db);
    if (!transaction.Begin()) return false;
    std::vector<SqliteValueList> rows;
    const std::string isThere = SqliteEqual("node", SqliteValue::Text(from)).GetCondition();
    if (!db.SelectByCommand("SELECT name FROM volumes WHERE " + isThere, rows)) return false;
    if (rows.size() > most) {
        transaction.Rollback();  // now, so that others can write while we continue
        std::cout << "too many volumes: " << rows.size() << '\n';
        return false;
    }
    UpdateCommand move;
    move.SetTable(SqliteTableHandler("volumes", ""));
    move.AddFieldValue("node", SqliteValue::Text(to));
    move.SetCondition(isThere);
    return db.UpdateRecord(move) && transaction.Commit();
}
// [/decide]

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
    if (!MoveVolume(db, "replica", "backup-02") || !Print(db)) return EXIT_FAILURE;
    if (!db.Exec("UPDATE volumes SET node='backup-03'")) return EXIT_FAILURE;

    // Its second operation is refused, so its first must be undone.
    // [fails]
    if (MoveVolume(db, "replica", "backup-02")) return EXIT_FAILURE;
    std::cout << db.GetErr()[0]["err_msg"]["sqlite_errmsg"].asString() << '\n';
    // [/fails]
    if (!Print(db)) return EXIT_FAILURE;

    // The connection can be used as before.
    if (!MoveVolume(db, "replica", "backup-04") || !Print(db)) return EXIT_FAILURE;
    if (Evacuate(db, "backup-04", "backup-05", 0) || !Print(db)) return EXIT_FAILURE;
    if (!Evacuate(db, "backup-04", "backup-05", 1) || !Print(db)) return EXIT_FAILURE;
    return EXIT_SUCCESS;
}
