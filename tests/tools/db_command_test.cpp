// orvadr db
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <functional>
#include <string>

#include "orvadr.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/child_process.h"
#include "support/processes/rights.h"
#include "support/processes/terminal.h"

namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr const char* MakeNodes =
    "CREATE TABLE nodes(name TEXT PRIMARY KEY, port INTEGER);"
    "WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x+1 FROM c WHERE x<5000)"
    "INSERT INTO nodes SELECT 'node'||x, x FROM c;";

class Connection {
  public:
    explicit Connection(const std::string& path)
    {
        EXPECT_EQ(::sqlite3_open(path.c_str(), &connection_), SQLITE_OK);
    }
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;
    ~Connection() { ::sqlite3_close(connection_); }

    void Run(const std::string& statements) const
    {
        char* message = nullptr;
        const int result =
            ::sqlite3_exec(connection_, statements.c_str(), nullptr, nullptr, &message);
        EXPECT_EQ(result, SQLITE_OK) << message;
        ::sqlite3_free(message);
    }

  private:
    sqlite3* connection_ = nullptr;
};

class DbCommandTest : public ::testing::Test {
  protected:
    void Make(const std::string& statements) const { Connection(path).Run(statements); }

    // Looks at the database, which must not change anything in the directory.
    Json::Value Look(int code) const
    {
        const std::set<std::string> before = NamesIn(dir.Path());
        const std::string content = ReadFile(path);
        const Answer answer = Ask({"db", path});
        EXPECT_EQ(answer.code, code) << answer.err;
        EXPECT_EQ(answer.Only()["path"], path);
        EXPECT_EQ(NamesIn(dir.Path()), before);
        EXPECT_TRUE(ReadFile(path) == content);
        return answer.Only();
    }

    // A process that runs statements on the database and keeps its connection until Tell().
    ChildProcess Start(
        const std::string& statements, const std::function<void()>& atEnd = [] {}) const
    {
        return ChildProcess([this, statements, atEnd](ChildProcess::Link& link) {
            const Connection connection(path);
            connection.Run(statements);
            atEnd();
            link.Tell();
            link.Await();
        });
    }

    // The same with a process that is killed then.
    void RunAndDie(const std::string& statements) const
    {
        ChildProcess child = Start(statements);
        EXPECT_TRUE(child.Await());
        child.Kill(SIGKILL);
        EXPECT_EQ(child.Join(), 128 + SIGKILL);
    }

    void Overwrite(std::streamoff at, const std::string& bytes) const
    {
        std::fstream file(path, std::ios::in | std::ios::out | std::ios::binary);
        file.seekp(at);
        file << bytes;
    }

    TempDir dir;
    const std::string path = dir.File("nodes.db");
};

Words StringsOf(const Json::Value& array)
{
    Words words;
    for (const Json::Value& element : array) words.push_back(element.asString());
    return words;
}

// "nodes 5000" for each table.
Words TablesOf(const Json::Value& object)
{
    Words words;
    for (const Json::Value& table : object["tables"]) {
        words.push_back(table["name"].asString() + " " + table["rows"].asString());
    }
    return words;
}

TEST_F(DbCommandTest, ShowsADatabaseThatIsWhole)
{
    Make(std::string(MakeNodes) + "CREATE TABLE \"a \"\"table\"(x); CREATE VIEW v AS SELECT 1;");
    const Json::Value whole = Look(AllWell);
    EXPECT_EQ(whole["state"], "ok");
    EXPECT_EQ(whole["journal_mode"], "delete");
    EXPECT_EQ(whole["size_bytes"], Json::Int64(std::filesystem::file_size(path)));
    EXPECT_THAT(TablesOf(whole), ElementsAre("a \"table 0", "nodes 5000"));
    EXPECT_EQ(whole["problems"].size(), 0U);
    EXPECT_EQ(whole["holders"].size(), 0U);
}

TEST_F(DbCommandTest, ShowsTheSizeOfAFileOfThreeGigabytes)
{
    Make(MakeNodes);
    Lengthen(path, std::int64_t{3} << 30U);
    const Answer answer = Ask({"db", path});
    EXPECT_EQ(answer.code, AllWell) << answer.err;
    EXPECT_EQ(answer.Only()["size_bytes"], Json::Int64{std::int64_t{3} << 30U});
}

TEST_F(DbCommandTest, TakesAnEmptyFileForAnEmptyDatabase)
{
    WriteFile(path, "");
    EXPECT_EQ(Look(AllWell)["state"], "ok");
}

TEST_F(DbCommandTest, ShowsWhatIsDamaged)
{
    Make(MakeNodes);
    constexpr std::streamoff SecondPage = 4096;
    Overwrite(SecondPage + 8, "\xff\xff\xff\xff");  // a page number
    const Json::Value damaged = Look(NotWell);
    EXPECT_EQ(damaged["state"], "damaged");
    EXPECT_GE(damaged["problems"].size(), 1U);
    EXPECT_THAT(StringsOf(damaged["problems"]), ::testing::Contains(HasSubstr("page")));
    EXPECT_THAT(RunOrvadr({"db", path}).out, HasSubstr(damaged["problems"][0].asString()));
}

TEST_F(DbCommandTest, ShowsThatAFileWasCutOff)
{
    Make(MakeNodes);
    const auto size = static_cast<off_t>(std::filesystem::file_size(path));
    for (const off_t length : {size / 2, off_t{4096}, off_t{4000}, off_t{50}}) {
        ASSERT_EQ(::truncate(path.c_str(), length), 0);
        EXPECT_EQ(Look(NotWell)["state"], "damaged") << length;
    }
}

TEST_F(DbCommandTest, ShowsThatAFileIsNoDatabase)
{
    WriteFile(path, "This is a text and no database. It is longer than a header.");
    const Json::Value damaged = Look(NotWell);
    EXPECT_EQ(damaged["state"], "damaged");
    EXPECT_TRUE(damaged["journal_mode"].isNull());
    EXPECT_THAT(StringsOf(damaged["problems"]), ElementsAre("file is not a database"));
}

TEST_F(DbCommandTest, FindsDamageThatOnlyCountingMeets)
{
    // The row of a table names a page that belongs to nothing.
    Make(std::string(MakeNodes) +
         "PRAGMA writable_schema=1; UPDATE sqlite_master SET rootpage=9999 WHERE name='nodes';");
    EXPECT_EQ(Look(NotWell)["state"], "damaged");
}

TEST_F(DbCommandTest, DoesNotCallADatabaseDamagedThatNeedsMoreThanSqlite)
{
    Make(std::string(MakeNodes) +
         "PRAGMA writable_schema=1; INSERT INTO sqlite_master VALUES('table','v','v',0,"
         "'CREATE VIRTUAL TABLE v USING no_such_module');");
    const Json::Value look = Look(AllWell);
    EXPECT_THAT(TablesOf(look), ElementsAre("nodes 5000", "v "));
    EXPECT_THAT(RunOrvadr({"db", path}).out, HasSubstr("v ?"));
}

TEST_F(DbCommandTest, TellsWhatKeepsItFromChecking)
{
    Make(std::string(MakeNodes) +
         "PRAGMA writable_schema=1;"
         "UPDATE sqlite_master SET sql='CREATE TABLE nodes(name TEXT "
         "COLLATE nobody PRIMARY KEY, port INTEGER)' WHERE type='table';");
    const Answer answer = Ask({"db", path});
    EXPECT_EQ(answer.code, NotSeen);
    EXPECT_EQ(answer.Only()["state"], "unreadable");
    EXPECT_EQ(answer.err, "orvadr: " + path + ": no such collation sequence: nobody\n");
}

TEST_F(DbCommandTest, DoesNotRemoveAJournalThatSqliteWouldRemove)
{
    WriteFile(path, "");
    WriteFile(path + "-journal", "of a database that is empty now");
    WriteFile(path + "-wal", "");
    Look(AllWell);
    EXPECT_TRUE(std::filesystem::exists(path + "-journal"));
}

TEST_F(DbCommandTest, ShowsWhoHasADatabaseOpen)
{
    Make(MakeNodes);
    const ChildProcess user = Start("SELECT * FROM nodes LIMIT 1");
    ASSERT_TRUE(user.Await());
    const Json::Value open = Look(AllWell);
    ASSERT_EQ(open["holders"].size(), 1U);
    EXPECT_EQ(open["holders"][0]["pid"], user.Pid());
    EXPECT_THAT(open["holders"][0]["command"].asString(), HasSubstr("tool_tests"));
}

TEST_F(DbCommandTest, ShowsWhoHasLockedADatabase)
{
    Make(MakeNodes);
    const ChildProcess reader = Start("SELECT * FROM nodes LIMIT 1");
    ASSERT_TRUE(reader.Await());
    const ChildProcess writer = Start("BEGIN EXCLUSIVE");
    ASSERT_TRUE(writer.Await());
    const Json::Value locked = Look(NotWell);
    EXPECT_EQ(locked["state"], "locked");
    ASSERT_EQ(locked["holders"].size(), 1U) << "the reader keeps nobody out";
    EXPECT_EQ(locked["holders"][0]["pid"], writer.Pid());
    EXPECT_EQ(locked["tables"].size(), 0U);
}

TEST_F(DbCommandTest, ReadsBesideATransactionThatHasNotWrittenYet)
{
    Make(MakeNodes);
    const ChildProcess writer = Start("BEGIN IMMEDIATE; DELETE FROM nodes");
    ASSERT_TRUE(writer.Await());
    const Json::Value open = Look(AllWell);
    EXPECT_THAT(TablesOf(open), ElementsAre("nodes 5000"));
    EXPECT_EQ(open["holders"][0]["pid"], writer.Pid());
}

TEST_F(DbCommandTest, NamesAHolderThatMayNotBeLookedAt)
{
    Make(MakeNodes);
    ASSERT_EQ(::chmod(dir.Path().c_str(), 0755), 0);
    const ChildProcess writer =
        Start("BEGIN EXCLUSIVE", [] { ::prctl(PR_SET_DUMPABLE, 0, 0, 0, 0); });
    ASSERT_TRUE(writer.Await());
    CheckInChild([&] {
        ASSERT_TRUE(LoseCapabilities());
        const Json::Value locked = Look(NotWell);
        EXPECT_EQ(locked["state"], "locked");
        ASSERT_EQ(locked["holders"].size(), 1U);
        EXPECT_EQ(locked["holders"][0]["pid"], writer.Pid());
        EXPECT_EQ(locked["holders"][0]["command"], "not permitted");
    });
}

TEST_F(DbCommandTest, TellsThatATransactionWasInterrupted)
{
    Make("CREATE TABLE t(a)");
    RunAndDie(std::string("PRAGMA cache_size=1; BEGIN IMMEDIATE;") + MakeNodes);
    ASSERT_TRUE(std::filesystem::exists(path + "-journal"));
    const Answer answer = Ask({"db", path});
    EXPECT_EQ(answer.code, NotSeen);
    EXPECT_EQ(answer.Only()["state"], "unreadable");
    EXPECT_THAT(answer.err, HasSubstr("a transaction was interrupted"));
    EXPECT_TRUE(std::filesystem::exists(path + "-journal"));
}

// ---------------------------------------------------------------------------- write-ahead logging

TEST_F(DbCommandTest, MakesNoLogForADatabaseThatNobodyHasOpen)
{
    Make(std::string("PRAGMA journal_mode=WAL;") + MakeNodes);
    ASSERT_THAT(NamesIn(dir.Path()), ElementsAre("nodes.db"));
    const Json::Value whole = Look(AllWell);
    EXPECT_EQ(whole["journal_mode"], "wal");
    EXPECT_THAT(TablesOf(whole), ElementsAre("nodes 5000"));
}

TEST_F(DbCommandTest, ReadsTheLogOfALivingWriter)
{
    const ChildProcess writer =
        Start(std::string("PRAGMA journal_mode=WAL; PRAGMA wal_autocheckpoint=0;") + MakeNodes);
    ASSERT_TRUE(writer.Await());
    const Json::Value open = Look(AllWell);
    EXPECT_EQ(open["journal_mode"], "wal");
    EXPECT_THAT(TablesOf(open), ElementsAre("nodes 5000"));
    EXPECT_EQ(open["holders"][0]["pid"], writer.Pid());
}

TEST_F(DbCommandTest, ReadsTheLogThatACrashLeft)
{
    RunAndDie(std::string("PRAGMA journal_mode=WAL;") + MakeNodes);
    EXPECT_THAT(TablesOf(Look(AllWell)), ElementsAre("nodes 5000"));
    std::filesystem::remove(path + "-shm");
    EXPECT_THAT(TablesOf(Look(AllWell)), ElementsAre("nodes 5000")) << "without shared memory";
}

TEST_F(DbCommandTest, ReadsALogInADirectoryThatMayNotBeWritten)
{
    RunAndDie(std::string("PRAGMA journal_mode=WAL;") + MakeNodes);
    std::filesystem::remove(path + "-shm");
    ASSERT_EQ(::chmod(dir.Path().c_str(), 0555), 0);
    CheckInChild([&] {
        ASSERT_TRUE(LoseCapabilities());
        EXPECT_THAT(TablesOf(Look(AllWell)), ElementsAre("nodes 5000"));
    });
    ASSERT_EQ(::chmod(dir.Path().c_str(), 0755), 0);
    std::filesystem::remove(path + "-wal");
    ASSERT_EQ(::chmod(dir.Path().c_str(), 0555), 0);
    CheckInChild([&] {
        ASSERT_TRUE(LoseCapabilities());
        EXPECT_EQ(Look(AllWell)["journal_mode"], "wal");
    });
    ASSERT_EQ(::chmod(dir.Path().c_str(), 0755), 0);
}

TEST_F(DbCommandTest, ReadsBesideAWriterThatNeverStops)
{
    Make(std::string("PRAGMA journal_mode=WAL;") + MakeNodes);
    const ChildProcess writer([&](ChildProcess::Link& link) {
        link.Tell();
        while (true) {
            // Each connection makes the log and the shared memory anew and removes both.
            const Connection connection(path);
            connection.Run("UPDATE nodes SET port=port+1 WHERE name='node1'");
        }
    });
    ASSERT_TRUE(writer.Await());
    for (int round = 0; round < 20; ++round) {
        const Answer answer = Ask({"db", path});
        const std::string state = answer.Only()["state"].asString();
        EXPECT_TRUE(state == "ok" || state == "unreadable" || state == "locked") << answer.err;
        EXPECT_EQ(answer.Only()["problems"].size(), 0U);
    }
}

// ------------------------------------------------------------------------- what cannot be looked at

TEST_F(DbCommandTest, ShowsThatADatabaseIsMissingAndMakesNone)
{
    const Json::Value missing = Look(NotWell);
    EXPECT_EQ(missing["state"], "missing");
    EXPECT_TRUE(missing["size_bytes"].isNull());
    EXPECT_EQ(Ask({"db", path + "/below"}).Only()["state"], "missing");
}

TEST_F(DbCommandTest, OpensNothingButFiles)
{
    const std::string pipe = dir.File("pipe");
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    std::filesystem::create_symlink("loop", dir.File("loop"));
    for (const std::string& file : {pipe, dir.Path(), dir.File("loop")}) {
        const Answer answer = Ask({"db", file});
        EXPECT_EQ(answer.code, NotSeen);
        EXPECT_EQ(answer.Only()["state"], "unreadable");
        EXPECT_THAT(answer.err, HasSubstr(file + ": "));
    }
}

TEST_F(DbCommandTest, TellsWhatItMayNotRead)
{
    Make(MakeNodes);
    ASSERT_EQ(::chmod(dir.Path().c_str(), 0755), 0);
    ASSERT_EQ(::chmod(path.c_str(), 0), 0);
    CheckInChild([&] {
        ASSERT_TRUE(LoseCapabilities());
        const Answer answer = Ask({"db", path});
        EXPECT_EQ(answer.code, NotSeen);
        EXPECT_EQ(answer.Only()["state"], "unreadable");
        EXPECT_EQ(answer.err, "orvadr: " + path + ": Permission denied\n");
    });
}

TEST_F(DbCommandTest, OpensFilesOfAnyName)
{
    const std::string name = "a ?#%&\n.db";
    Connection(dir.File(name)).Run(MakeNodes);
    std::filesystem::create_symlink(name, path);
    EXPECT_THAT(TablesOf(Look(AllWell)), ElementsAre("nodes 5000"));
    EXPECT_EQ(Ask({"db", "/" + dir.File(name)}).Only()["state"], "ok");
    EXPECT_THAT(RunOrvadr({"db", dir.File(name)}).out, HasSubstr("/a ?#%&\\n.db  nodes 5000\n"));
}

// -------------------------------------------------------------------------------------- progress

// A database whose check takes seconds on any machine, because the index's condition is slow to evaluate.
constexpr const char* MakeSlow =
    "CREATE TABLE slow(a INTEGER PRIMARY KEY);"
    "CREATE INDEX never ON slow(a) WHERE length(hex(zeroblob(30000 + a % 2))) = 0;"
    "WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x+1 FROM c WHERE x<60000)"
    "INSERT INTO slow SELECT x FROM c;";

TEST_F(DbCommandTest, ShowsProgressOnATerminalUntilItIsInterrupted)
{
    Make(MakeSlow);
    const ProgramResult whole = RunInTerminal(CommandLine({"db", path}), 80, {"NO_COLOR=1"});
    EXPECT_EQ(whole.code, AllWell);
    EXPECT_THAT(whole.out, HasSubstr("checking " + path + ": "));
    EXPECT_THAT(whole.out, HasSubstr("slow 60000"));

    const ProgramResult interrupted = RunInTerminal(
        CommandLine({"db", path}), 80, {}, [](const std::string& output) -> std::string {
            return output.find("checking ") != std::string::npos ? "\x03" : "";
        });
    EXPECT_EQ(interrupted.code, 128 + SIGINT);
    EXPECT_THAT(interrupted.out, Not(HasSubstr("STATE")));
    EXPECT_THAT(NamesIn(dir.Path()), ElementsAre("nodes.db"));

    EXPECT_THAT(RunOrvadr({"db", path}).err, IsEmpty()) << "progress in a pipe";
}

}  // namespace
