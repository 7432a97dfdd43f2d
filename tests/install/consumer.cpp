// A caller of the installed library: uses a bit of each family and prints what came of it.
#include <cstdlib>
#include <iostream>
#include <string>
#include <vector>

#include <orvadrcore/cache.h>
#include <orvadrcore/errors.h>
#include <orvadrcore/file.h>
#include <orvadrcore/request.h>
#include <orvadrcore/sqlite_db.h>

namespace {

class Answer : public OrvaDRCore::Cache {
  public:
    explicit Answer(const std::string& dir) : Cache(dir, "answer", 30, false, 0) {}

    Json::Value GetInfo() const override { return "answer"; }
    bool GetUpdatedData(Json::Value& data) const override
    {
        data = 42;
        return true;
    }
    bool IsValidData(const Json::Value& data) const override { return data.isInt(); }
};

std::string StoredNode(const std::string& dir)
{
    OrvaDRCore::SqliteDB db(dir + "/nodes.db", 0);
    OrvaDRCore::InsertCommand insert;
    insert.SetTable(OrvaDRCore::SqliteTableHandler("nodes", "name TEXT"));
    insert.AddFieldValue("name", "backup-01");
    OrvaDRCore::SelectCommand select;
    select.SetTable(OrvaDRCore::SqliteTableHandler("nodes", "name TEXT"));
    select.SelectAll();
    std::vector<OrvaDRCore::SqliteValueList> rows;
    if (!db.InsertRecord(insert) || !db.SelectRecords(select, rows) || rows.empty()) return "none";
    return rows.front().ToStr();
}

}  // namespace

int main(int, char* argv[])
{
    const std::string dir = argv[1];
    Json::Value document;
    const bool written = OrvaDRCore::File::Write(dir + "/document.json", Json::Value("text"));
    const Answer answer(dir);
    std::cout << "record " << StoredNode(dir) << '\n'
              << "file " << (written && OrvaDRCore::File::Read(dir + "/document.json", document))
              << ' ' << document.asString() << '\n'
              << "cache " << answer.UpdateWithData(42) << ' ' << answer.GetCachedData().asInt()
              << '\n'
              << "request " << OrvaDRCore::Request("DR.Node", 1, "get", Json::Value()).toStr()
              << '\n'
              << "error " << OrvaDRCore::ERR::ToString(404) << '\n';
    return EXIT_SUCCESS;
}
