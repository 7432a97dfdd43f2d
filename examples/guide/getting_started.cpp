// A failure: an insert that the schema refuses, and what the connection says about it.
#include <cstdlib>
#include <iostream>

#include <orvadrcore/errors.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::ERR;
using OrvaDRCore::InsertCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;

int main()
{
    SqliteDB db("getting_started.db", 0);
    InsertCommand insert;
    insert.SetTable(SqliteTableHandler("nodes", "name TEXT PRIMARY KEY, port INTEGER"));
    insert.AddFieldValue("name", "backup-01");
    insert.AddFieldValue("port", 5001);
    if (!db.InsertRecord(insert)) return EXIT_FAILURE;

    // [failure]
    if (!db.InsertRecord(insert)) {
        std::cout << "code " << db.GetErrCode() << ", " << ERR::ToString(db.GetErrCode()) << '\n';
        for (const Json::Value& attempt : db.GetErr()) {
            const Json::Value& message = attempt["err_msg"]["sqlite_errmsg"];
            std::cout << "SQLite says: " << message.asString() << '\n';
        }
    }
    // [/failure]
    return db.GetErrCode() == ERR::ERR_DATABASE_OPERATION ? EXIT_SUCCESS : EXIT_FAILURE;
}
