// Answers requests about replicated volumes, line by line, in any number of threads and processes.
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <orvadrcore/cache.h>
#include <orvadrcore/errors.h>
#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_row.h>
#include <orvadrcore/sqlite_transaction.h>
#include <orvadrcore/utils.h>

using namespace OrvaDRCore;  // NOLINT(google-build-using-namespace): this program is all about it

namespace {

constexpr std::chrono::seconds Patience{5};

SqliteValue Text(const Json::Value& text)
{
    return text.isString() ? SqliteValue::Text(text.asString()) : SqliteValue::Null();
}

SqliteValue Number(const Json::Value& number)
{
    if (number.isInt64()) return SqliteValue::Integer(number.asInt64());
    return number.isNumeric() ? SqliteValue::Real(number.asDouble()) : SqliteValue::Null();
}

SqliteValueList Record(const std::map<std::string, SqliteValue>& values)
{
    SqliteValueList record;
    for (const auto& [field, value] : values) record.AddValue(field, value);
    return record;
}

// What is missing or of another type becomes NULL, which the table may refuse.
SqliteValueList ToRecord(const Json::Value& json)
{
    const Json::Value volume = json.isObject() ? json : Json::Value();
    return Record({{"name", Text(volume["name"])},
                   {"node", Text(volume["node"])},
                   {"bytes", Number(volume["bytes"])},
                   {"ratio", Number(volume["ratio"])},
                   {"note", Text(volume["note"])}});
}

Json::Value ToJson(const SqliteRow& row)
{
    Json::Value volume;
    std::string text;
    std::int64_t bytes = 0;
    double ratio = 0;
    for (const char* column : {"name", "node", "note"}) {
        if (!row.IsNull(column) && row.GetValue(column, text)) volume[column] = text;
    }
    if (row.GetValue("bytes", bytes)) volume["bytes"] = Json::Int64{bytes};
    if (!row.IsNull("ratio") && row.GetValue("ratio", ratio)) volume["ratio"] = ratio;
    return volume;
}

// Empty if a condition cannot be written, because of a zero byte for instance.
std::string ToCondition(const Json::Value& params)
{
    const Json::Value& part = params["contains"];
    const Json::Value& least = params["at_least"];
    const SqliteContains contains("name", part.isString() ? part.asString() : "");
    const SqliteGreaterEqual isLarge("bytes", Number(least.isInt64() ? least : Json::Value(0)));
    const SqliteNotEqual isNoted("note", SqliteValue::Null());
    const SqliteAnd both(contains.GetCondition(), isLarge.GetCondition());
    if (params["noted"] != true) return both.GetCondition();
    return SqliteAnd(both.GetCondition(), isNoted.GetCondition()).GetCondition();
}

Json::Value BadParameter(const std::string& reason)
{
    return Response::Failure(ERR::BAD_PARAMETER, reason);
}

// What each node has. All threads and processes share one report, which is made every ten seconds.
class Report : public Cache {
  public:
    explicit Report(const std::string& directory)
        : Cache(directory, "report", 10, true, 2, directory + "/locks"), directory_(directory)
    {
    }

    Json::Value GetInfo() const override { return "replication report"; }
    bool IsValidData(const Json::Value& data) const override { return data.isObject(); }

    bool GetUpdatedData(Json::Value& data) const override
    {
        data["id"] = GenerateUUID();
        bool isWhole = true;
        const auto add = [&](const SqliteRow& row) {
            std::string node;
            std::int64_t bytes = 0;
            double ratio = 0;
            isWhole = row.GetValue("node", node) && row.GetValue("bytes", bytes);
            Json::Value& sums = data["nodes"][node];
            sums["bytes"] = Json::Int64{bytes};
            if (!row.IsNull("ratio") && row.GetValue("ratio", ratio)) sums["ratio"] = ratio;
            return isWhole;
        };
        SqliteDB db(directory_ + "/volumes.db", 2);
        const char* const select =
            "SELECT node, sum(bytes) AS bytes, avg(ratio) AS ratio FROM volumes GROUP BY node";
        return db.Open() && db.SelectEachByCommand(select, add) && isWhole;
    }

  private:
    std::string directory_;
};

// Each thread has one of its own. All share the directory.
class Monitor {
  public:
    explicit Monitor(const std::string& directory)
        : locks_(directory + "/locks"), db_(directory + "/volumes.db", 5), report_(directory)
    {
    }

    // Makes the database, or brings one of an earlier version up to date.
    bool Open()
    {
        return db_.Upgrade(
            {"CREATE TABLE volumes (name TEXT NOT NULL PRIMARY KEY, node TEXT NOT NULL,"
             " bytes INTEGER NOT NULL CHECK (typeof(bytes)='integer'))",
             "ALTER TABLE volumes ADD COLUMN ratio REAL; ALTER TABLE volumes ADD COLUMN note TEXT;"
             "CREATE TABLE moves (id INTEGER PRIMARY KEY, volume TEXT, source TEXT, target TEXT)"});
    }

    Json::Value Answer(const std::string& line)
    {
        static const std::map<std::string, Json::Value (Monitor::*)(const Json::Value&)> methods = {
            {"DR.Volume/add/1", &Monitor::Add},       {"DR.Volume/list/1", &Monitor::List},
            {"DR.Volume/move/1", &Monitor::Move},     {"DR.Volume/remove/1", &Monitor::Remove},
            {"DR.Volume/import/1", &Monitor::Import}, {"DR.Volume/export/1", &Monitor::Export},
            {"DR.Volume/report/1", &Monitor::Sum}};
        Request request;
        if (!Request::FromText(line, request)) return BadParameter("request");
        const auto method = methods.find(request.toStr());
        if (method == methods.end()) return Response::Failure(ERR::ERR_NO_SUCH_API);
        return (this->*method->second)(request.getParams());
    }

  private:
    Json::Value Add(const Json::Value& params)
    {
        InsertCommand insert;
        insert.SetTable(volumes_);
        insert.SetFieldValues(ToRecord(params));
        SqliteTransaction transaction(db_);  // in here, what the table refuses is not tried again
        const bool isDone = transaction.Begin() && db_.InsertRecord(insert) && transaction.Commit();
        return isDone ? Response::Success() : DbFailure();
    }

    Json::Value List(const Json::Value& params)
    {
        SelectCommand select;
        Json::Value volumes;
        if (!select.SetCondition(ToCondition(params))) return BadParameter("contains");
        if (params["largest_first"] == true) select.OrderBy("bytes", SqliteOrder::Descending);
        const Json::Value& rows = params["limit"];
        const Json::Value offset = params.get("offset", 0);
        if (rows.isUInt64() && offset.isUInt64()) select.Limit(rows.asUInt64(), offset.asUInt64());
        return Select(select, volumes) ? Response::Success(volumes) : DbFailure();
    }

    bool Select(SelectCommand& select, Json::Value& volumes)
    {
        volumes = Json::Value(Json::arrayValue);
        select.SetTable(volumes_);
        select.SelectAll();
        select.OrderBy("name");
        return db_.SelectEach(select, [&volumes](const SqliteRow& row) {
            volumes.append(ToJson(row));
            return true;
        });
    }

    // Either the volume is moved and the move is recorded, or nothing has happened.
    Json::Value Move(const Json::Value& params)
    {
        const SqliteEqual isVolume("name", Text(params["name"]));
        SelectCommand select;
        select.SetCondition(isVolume);
        UpdateCommand update;
        update.SetTable(volumes_);
        update.SetFieldValues(Record({{"node", Text(params["node"])}}));
        update.SetCondition(isVolume);

        Json::Value found;
        SqliteTransaction transaction(db_);
        if (!transaction.Begin() || !Select(select, found)) return DbFailure();
        if (found.empty()) return BadParameter("no such volume");
        InsertCommand insert;
        insert.SetTable(SqliteTableHandler("moves", ""));
        insert.SetFieldValues(Record({{"volume", Text(params["name"])},
                                      {"source", Text(found[0]["node"])},
                                      {"target", Text(params["node"])}}));
        if (!db_.UpdateRecord(update) || !db_.InsertRecord(insert)) return DbFailure();
        const Json::Value number = Json::Int64{db_.GetLastInsertId()};
        return transaction.Commit() ? Response::Success(number) : DbFailure();
    }

    Json::Value Remove(const Json::Value& params)
    {
        const SqliteEqual isVolume("name", Text(params["name"]));
        if (!db_.DeleteRecord(isVolume.GetCondition(), volumes_)) return DbFailure();
        return db_.GetAffectedRows() > 0 ? Response::Success() : BadParameter("no such volume");
    }

    // Takes all volumes of a file or none. They replace those of the same names.
    Json::Value Import(const Json::Value& params)
    {
        FileLock lock("import", locks_);
        if (lock.acquire(LOCK_EX, Patience) != FileLockState::Taken) return BadParameter("later");
        Json::Value volumes;
        const Json::Value& file = params["file"];
        if (!file.isString() || !File::Read(file.asString(), volumes) || !volumes.isArray()) {
            return BadParameter("file");
        }
        std::vector<SqliteValueList> records;
        for (const Json::Value& volume : volumes) records.push_back(ToRecord(volume));
        SqliteTransaction transaction(db_);
        const bool isDone = transaction.Begin() && db_.InsertRecords(volumes_, records, true) &&
                            transaction.Commit();
        return isDone ? Response::Success(volumes.size()) : DbFailure();
    }

    Json::Value Export(const Json::Value& params)
    {
        SelectCommand all;
        Json::Value volumes;
        if (!Select(all, volumes)) return DbFailure();
        const Json::Value& file = params["file"];
        const bool isDone = file.isString() && File::Replace(file.asString(), volumes);
        return isDone ? Response::Success(volumes.size()) : BadParameter("file");
    }

    Json::Value Sum(const Json::Value& /*params*/)
    {
        Json::Value report;
        const bool isFresh = report_.ReadWithin(Patience, report) == CacheState::Fresh;
        return isFresh ? Response::Success(report) : Response::Failure(ERR::ERR_UNKNOWN);
    }

    Json::Value DbFailure() const  // the log says more, which is not for whoever asks
    {
        if (db_.GetSqliteCode() % 256 == 19) return BadParameter("taken or missing");  // constraint
        return Response::Failure(db_.GetErrCode(), ERR::ToString(db_.GetErrCode()));
    }

    const SqliteTableHandler volumes_{"volumes", ""};  // Upgrade() makes the tables
    std::string locks_;
    SqliteDB db_;
    Report report_;
};

// Answers lines until there are none. With several threads replies come in any order.
void Serve(const std::string& directory)
{
    static std::mutex input;
    static std::mutex output;
    Monitor monitor(directory);
    if (!monitor.Open()) return;
    for (std::string line;;) {
        std::unique_lock<std::mutex> reading(input);
        if (!std::getline(std::cin, line)) return;
        reading.unlock();
        const Response reply(monitor.Answer(line));
        const std::lock_guard<std::mutex> writing(output);
        std::cout << reply.toLine() << std::endl;
    }
}

}  // namespace

int main(int argc, char** argv)
{
    if (argc < 2) return EXIT_FAILURE;  // DIRECTORY [THREADS]
    const std::string directory = std::filesystem::absolute(argv[1]);
    std::filesystem::create_directories(directory);
    std::vector<std::thread> threads;
    for (long left = argc > 2 ? std::strtol(argv[2], nullptr, 10) : 1; left > 0; --left) {
        threads.emplace_back(Serve, directory);
    }
    for (std::thread& thread : threads) thread.join();
}
