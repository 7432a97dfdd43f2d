// Compiled twice; ORVADR_CALLER names the result: see caller.h.
#include "callers/caller.h"

#include <orvadrcore/cache.h>
#include <orvadrcore/errors.h>
#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>
#include <orvadrcore/sqlite_row.h>
#include <orvadrcore/sqlite_transaction.h>
#include <orvadrcore/sqlite_value.h>
#include <orvadrcore/utils.h>
#include <sys/file.h>
#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <ctime>
#include <map>

using namespace OrvaDRCore;  // NOLINT(google-build-using-namespace): nearly every name is used

namespace {

// What a caller derives from the library's classes gets members after theirs.
class Status : public Cache {
  public:
    explicit Status(const std::string& dir) : Cache(dir, "status", Timeout, true, -1, dir) {}

    Json::Value GetInfo() const override { return "status"; }
    bool GetUpdatedData(Json::Value& data) const override
    {
        data["produced"] = Json::Int64{marker_};
        return true;
    }
    bool IsValidData(const Json::Value& data) const override { return data.isObject(); }

  private:
    static constexpr std::int64_t Timeout = 5'000'000'000;
    std::int64_t marker_ = 4'294'967'297;
};

class Node : public SqliteRecord {
  public:
    SqliteValueList BuildRecord(const std::vector<std::string>& /*fields*/) const override
    {
        SqliteValueList record;
        record.AddValue("id", SqliteValue::Integer(id_));
        return record;
    }
    std::vector<std::string> GetRecordFields() const override { return {"id"}; }

  private:
    std::int64_t id_ = 5'000'000'000;
};

template <class T>
std::string Layout(const std::string& name)
{
    return name + " " + std::to_string(sizeof(T)) + " " + std::to_string(alignof(T));
}

std::vector<std::string> Layouts()
{
    return {Layout<Cache>("Cache"),
            Layout<Status>("a Cache of the caller's"),
            Layout<FileLock>("FileLock"),
            Layout<InsertCommand>("InsertCommand"),
            Layout<Node>("a SqliteRecord of the caller's"),
            Layout<Request>("Request"),
            Layout<Response>("Response"),
            Layout<SelectCommand>("SelectCommand"),
            Layout<SqliteDB>("SqliteDB"),
            Layout<SqliteEqual>("SqliteEqual"),
            Layout<SqliteRow>("SqliteRow"),
            Layout<SqliteTableHandler>("SqliteTableHandler"),
            Layout<SqliteTransaction>("SqliteTransaction"),
            Layout<SqliteValue>("SqliteValue"),
            Layout<SqliteValueList>("SqliteValueList"),
            Layout<UpdateCommand>("UpdateCommand"),
            Layout<UploadFileDescription>("UploadFileDescription")};
}

std::string Text(const Json::Value& value)
{
    return value.toStyledString();
}

void UseDatabase(const std::string& dir, std::vector<std::string>& results)
{
    const SqliteTableHandler table("nodes", "id INTEGER, name TEXT");
    SqliteDB db(dir + "/nodes.db", 0);
    SqliteTransaction transaction(db);
    results.push_back("begun " + std::to_string(transaction.Begin()));
    InsertCommand insert;
    insert.SetTable(table);
    insert.AddFieldValue("id", SqliteValue::Integer(4'294'967'297));
    insert.AddFieldValue("name", SqliteValue::Text("it's"));
    results.push_back("inserted " + std::to_string(db.InsertRecord(insert)));
    results.push_back("committed " + std::to_string(transaction.Commit()));
    results.push_back("record " + Node().ToSqliteRecord().ToStr());

    SelectCommand select;
    select.SetTable(table);
    select.SelectAll();
    select.Limit(5'000'000'000, 0);
    select.SetCondition(SqliteEqual("name", SqliteValue::Text("it's")));
    results.push_back(select.GetCommand());
    const bool isRead = db.SelectEach(select, [&](const SqliteRow& row) {
        std::int64_t id = 0;
        const bool isId = row.GetValue("id", id);
        results.push_back("id " + std::to_string(isId) + " " + std::to_string(id));
        return true;
    });
    results.push_back("read " + std::to_string(isRead) + " " +
                      std::to_string(db.GetLastInsertId()));
}

void UseCache(const std::string& dir, std::vector<std::string>& results)
{
    const Status status(dir);
    Json::Value data;
    const CacheState state = status.ReadWithin(std::chrono::minutes(1), data);
    results.push_back("state " + std::to_string(static_cast<int>(state)) + Text(data));
    constexpr std::int64_t In2040 = 2'208'988'800;
    data["year"] = 2040;
    results.push_back("stored " +
                      std::to_string(status.UpdateWithData(data, In2040, In2040 + 3000)));
    Json::Value document;
    const bool isRead = File::Read(status.GetPath(), document);
    results.push_back("file " + std::to_string(isRead) + Text(document));
    results.push_back("longest " + std::to_string(status.GetMaxUpdateTime()));
}

void UseFiles(const std::string& dir, std::vector<std::string>& results)
{
    const std::string path = dir + "/pairs";
    results.push_back("replaced " + std::to_string(File::Replace(path, "a=1\nb=2\n")));
    std::map<std::string, int> pairs;
    const int count = File::Read(path, pairs);
    results.push_back("pairs " + std::to_string(count) + " " + std::to_string(pairs["b"]));
    FileLock lock("lock", dir);
    const FileLockState state = lock.acquire(LOCK_EX, std::chrono::milliseconds(0));
    results.push_back("lock " + std::to_string(static_cast<int>(state)));
}

void UseEnvelope(std::vector<std::string>& results)
{
    Request request;
    const bool isRequest = Request::FromText(R"({"api":"A.B","timeout":7})", request);
    results.push_back("request " + std::to_string(isRequest) + " " +
                      std::to_string(request.getTimeout()) + Text(request.toJson()));
    results.push_back(Response(Response::Failure(ERR::ERR_DATABASE_OPERATION)).toLine());
    results.push_back(ERR::ToString(ERR::ERR_DATABASE_OPERATION));
}

std::vector<std::string> Results(const std::string& dir)
{
    std::vector<std::string> results;
    UseDatabase(dir, results);
    UseCache(dir, results);
    UseFiles(dir, results);
    UseEnvelope(results);
    return results;
}

}  // namespace

const Caller ORVADR_CALLER{sizeof(std::time_t), sizeof(off_t), Layouts, Results};
