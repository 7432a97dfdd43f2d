// Inserting rows of many columns in a transaction.
#include <sqlite3.h>

#include <orvadrcore/sqlite_db.h>

#include "support/bench.h"
#include "support/by_hand.h"

namespace Bench {

namespace {

constexpr int Columns = 100;

// Names of columns, schema and values of one row: numbers and texts in turn.
struct WideTable {
    WideTable()
    {
        for (int column = 0; column < Columns; ++column) {
            const bool isNumber = column % 2 == 0;
            names.push_back("c" + std::to_string(column));
            schema += (column > 0 ? "," : "") + names.back() + (isNumber ? " INTEGER" : " TEXT");
            texts.push_back("text-" + std::to_string(column));
        }
    }

    std::vector<std::string> names;
    std::vector<std::string> texts;
    std::string schema;
};

struct WideInsert {
    std::string Dump() const
    {
        const Database db = OpenDatabase(path);
        const Statement select = Prepare(db.get(), "SELECT * FROM wide");
        std::string text;
        while (sqlite3_step(select.get()) == SQLITE_ROW) {
            for (int column = 0; column < Columns; ++column) {
                text += ColumnText(select.get(), column) + "|";
            }
        }
        return text;
    }

    TempDir dir{Place::Memory};
    std::string path = dir.File("wide.db");
    WideTable table;
};

struct OurInsert : WideInsert {
    OurInsert()
    {
        Require(db.Open() && db.CreateTable(handler) && db.Exec("BEGIN"), "cannot begin");
    }
    void Run()
    {
        OrvaDRCore::InsertCommand command;
        command.SetTable(handler);
        for (std::size_t column = 0; column < table.names.size(); column += 2) {
            command.AddFieldValue(table.names[column], static_cast<int>(column));
            command.AddFieldValue(table.names[column + 1], table.texts[column + 1]);
        }
        Require(db.InsertRecord(command), "an insert failed");
    }
    std::string Result()
    {
        Require(db.Exec("COMMIT"), "cannot commit");
        return Dump();
    }

    OrvaDRCore::SqliteTableHandler handler{"wide", table.schema};
    OrvaDRCore::SqliteDB db{path, 0};
};

struct BareInsert : WideInsert {
    BareInsert()
    {
        ExecText(db.get(), "CREATE TABLE wide (" + table.schema + ")");
        std::string text = "INSERT INTO wide VALUES (?";
        for (int column = 1; column < Columns; ++column) text += ",?";
        insert = Prepare(db.get(), text + ")");
        ExecText(db.get(), "BEGIN");
    }
    void Run()
    {
        for (int column = 0; column < Columns; column += 2) {
            const std::string& text = table.texts[static_cast<std::size_t>(column) + 1];
            sqlite3_bind_int(insert.get(), column + 1, column);
            sqlite3_bind_text(insert.get(), column + 2, text.data(), static_cast<int>(text.size()),
                              SQLITE_STATIC);
        }
        const int code = sqlite3_step(insert.get());
        sqlite3_reset(insert.get());
        Require(code == SQLITE_DONE, "an insert failed");
    }
    std::string Result()
    {
        ExecText(db.get(), "COMMIT");
        return Dump();
    }

    Database db = OpenDatabase(path);
    Statement insert;
};

}  // namespace

void AddWide()
{
    Add<OurInsert>("insert of 100 columns, transaction", Ours);
    Add<BareInsert>("insert of 100 columns, transaction", Bare);
}

}  // namespace Bench
