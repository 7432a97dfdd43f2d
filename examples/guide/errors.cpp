// Error codes, their names, and a connection's error record.
#include <cstdlib>
#include <iostream>
#include <string>

#include <json/value.h>
#include <json/writer.h>

#include <orvadrcore/errors.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_db.h>

using OrvaDRCore::ERR;
using OrvaDRCore::InsertCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteTableHandler;

namespace {

void Print(const Json::Value& value)
{
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    std::cout << Json::writeString(builder, value) << '\n';
}

}  // namespace

int main()
{
    // [names]
    std::cout << ERR::ERR_NODE_EXIST << ' ' << ERR::ToString(ERR::ERR_NODE_EXIST) << '\n';
    std::cout << 0 << ' ' << ERR::ToString(0) << '\n';
    // [/names]

    // [record]
    SqliteDB db("nodes.db", 1);  // one retry after a failed attempt
    InsertCommand insert;
    insert.SetTable(SqliteTableHandler("nodes", "name TEXT PRIMARY KEY"));
    insert.AddFieldValue("name", "backup-01");
    if (!db.InsertRecord(insert)) return EXIT_FAILURE;
    std::cout << db.GetErrCode() << ' ' << (db.GetErr().isNull() ? "null" : "?") << '\n';

    if (db.InsertRecord(insert)) return EXIT_FAILURE;  // the name exists already
    std::cout << db.GetErrCode() << ", " << db.GetErr().size() << " attempts\n";
    Print(db.GetErr()[0]);
    // [/record]

    // [single]
    if (db.DoExecSqliteCommand("DELETE FROM nobody")) return EXIT_FAILURE;
    Print(db.GetErr());
    // [/single]
    return EXIT_SUCCESS;
}
