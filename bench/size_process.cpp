// Prints how much memory a process has that no other process shares, in bytes. Built three times: with the
// library, with the same work on SQLite and jsoncpp, and without work.
//
//   size_process DATABASE
#include <cstdio>
#include <fstream>
#include <string>

#if defined(WITH_LIBRARY)
#include <orvadrcore/file.h>
#include <orvadrcore/sqlite_db.h>
#elif defined(WITH_PARTS)
#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>
#include <sqlite3.h>
#endif

namespace {

#if defined(WITH_LIBRARY)

bool Work(const std::string& path)
{
    OrvaDRCore::SqliteDB db(path, 0);
    OrvaDRCore::InsertCommand insert;
    insert.SetTable(OrvaDRCore::SqliteTableHandler("nodes", "name TEXT"));
    insert.AddFieldValue("name", "node 1");
    Json::Value document("text");
    return db.InsertRecord(insert) && OrvaDRCore::File::Write(path + ".json", document) &&
           OrvaDRCore::File::Read(path + ".json", document);
}

#elif defined(WITH_PARTS)

bool Work(const std::string& path)
{
    sqlite3* db = nullptr;
    bool isDone = sqlite3_open(path.c_str(), &db) == SQLITE_OK;
    for (const char* text :
         {"CREATE TABLE nodes (name TEXT)", "INSERT INTO nodes (name) VALUES ('node 1')"}) {
        isDone = isDone && sqlite3_exec(db, text, nullptr, nullptr, nullptr) == SQLITE_OK;
    }
    std::ofstream(path + ".json") << Json::Value("text");
    Json::Value document;
    std::ifstream(path + ".json") >> document;
    sqlite3_close(db);
    return isDone && document.isString();
}

#else

bool Work(const std::string& /*path*/)
{
    return true;
}

#endif

}  // namespace

int main(int, char* argv[])
{
    constexpr long BytesPerKiB = 1024;
    if (!Work(argv[1])) return 1;
    std::ifstream maps("/proc/self/smaps_rollup");
    long own = 0;
    for (std::string word; maps >> word;) {
        if (word == "Private_Dirty:") maps >> own;
    }
    std::printf("%ld\n", own * BytesPerKiB);
}
