// The example replication_monitor as a program: request lines in, replies out, in several threads and
// processes, and as an ordinary user.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include <json/value.h>

#include <orvadrcore/file.h>
#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_db.h>

#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/program.h"

namespace {

using OrvaDRCore::File;
using OrvaDRCore::Response;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteValueList;
using ::testing::_;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::Eq;
using ::testing::HasSubstr;
using ::testing::SizeIs;

constexpr const char* Done = R"({"success":true})";
constexpr const char* NoVolume =
    R"({"error":{"code":401,"errors":"no such volume"},"success":false})";
constexpr const char* Refused =
    R"({"error":{"code":401,"errors":"taken or missing"},"success":false})";

// A request. `params`: members of a JSON object, such as "name":"a".
std::string Call(const std::string& method, const std::string& params = "")
{
    return R"({"api":"DR.Volume","version":1,"method":")" + method + '"' +
           (params.empty() ? "" : "," + params) + "}\n";
}

std::vector<std::string> Lines(const std::string& text)
{
    std::vector<std::string> lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) lines.push_back(line);
    return lines;
}

class ReplicationMonitorTest : public ::testing::Test {
  protected:
    // The replies to these requests.
    std::vector<std::string> Ask(const std::string& requests,
                                 const std::string& threads = "1") const
    {
        const ProgramResult result =
            RunProgram({REPLICATION_MONITOR_PROGRAM, directory, threads}, requests);
        EXPECT_EQ(result.code, 0);
        EXPECT_EQ(result.err, "");
        return Lines(result.out);
    }

    std::string AskOne(const std::string& method, const std::string& params = "") const
    {
        const std::vector<std::string> replies = Ask(Call(method, params));
        EXPECT_THAT(replies, SizeIs(1));
        return replies.empty() ? "" : replies.front();
    }

    // The names of the volumes that a list request finds.
    std::vector<std::string> List(const std::string& params = "") const
    {
        std::vector<std::string> names;
        const Response response(AskOne("list", params));
        EXPECT_TRUE(response.isSuccess());
        for (const Json::Value& volume : response.getData()) {
            names.push_back(volume["name"].asString());
        }
        return names;
    }

    void AddSome() const
    {
        EXPECT_THAT(
            Ask(Call("add",
                     R"("name":"O'Brien's 50%","node":"n1","bytes":5000000000,"ratio":0.75)") +
                Call("add",
                     R"("name":"50_a","node":"n2","bytes":900,"note":"'; DROP TABLE moves")") +
                Call("add", R"("name":"c:\\d","node":"n1","bytes":7000000000000)") +
                Call("add", R"("name":"","node":"n2","bytes":0,"ratio":1,"note":"")")),
            ElementsAre(Done, Done, Done, Done));
    }

    // The first row that a statement gives.
    std::string Row(const std::string& statement) const
    {
        SqliteDB db(directory + "/volumes.db", 0);
        SqliteValueList row;
        EXPECT_TRUE(db.Open() && db.SelectByCommand(statement, row));
        return row.ToStr();
    }

    // A file of this many volumes, the last of which may be incomplete.
    std::string MakeFile(int count, bool isLastComplete = true) const
    {
        Json::Value volumes(Json::arrayValue);
        for (int number = 0; number < count; ++number) {
            Json::Value volume;
            volume["name"] = "it's " + std::to_string(number);
            volume["node"] = "n" + std::to_string(number % 3);
            if (number + 1 < count || isLastComplete) volume["bytes"] = Json::Int64{1} << 33U;
            volumes.append(volume);
        }
        const std::string path = dir.File("volumes.json");
        EXPECT_TRUE(File::Replace(path, volumes));
        return R"("file":")" + path + '"';
    }

    TempDir dir;
    std::string directory = dir.File("state");
};

TEST_F(ReplicationMonitorTest, EveryKindOfValueComesBack)
{
    AddSome();
    EXPECT_EQ(AskOne("add", R"("name":"largest","node":"n3","bytes":9223372036854775807)"), Done);
    EXPECT_EQ(AskOne("list"),
              R"({"data":[{"bytes":0,"name":"","node":"n2","note":"","ratio":1.0},)"
              R"({"bytes":900,"name":"50_a","node":"n2","note":"'; DROP TABLE moves"},)"
              R"({"bytes":5000000000,"name":"O'Brien's 50%","node":"n1","ratio":0.75},)"
              R"({"bytes":7000000000000,"name":"c:\\d","node":"n1"},)"
              R"({"bytes":9223372036854775807,"name":"largest","node":"n3"}],"success":true})");
}

TEST_F(ReplicationMonitorTest, AListIsFilteredSortedAndLimited)
{
    AddSome();
    EXPECT_THAT(List(R"("contains":"%")"), ElementsAre("O'Brien's 50%"));
    EXPECT_THAT(List(R"("contains":"_")"), ElementsAre("50_a"));
    EXPECT_THAT(List(R"("contains":"\\")"), ElementsAre("c:\\d"));
    EXPECT_THAT(List(R"("contains":"'")"), ElementsAre("O'Brien's 50%"));
    EXPECT_THAT(List(R"("at_least":900)"), ElementsAre("50_a", "O'Brien's 50%", "c:\\d"));
    EXPECT_THAT(List(R"("at_least":901,"contains":"5")"), ElementsAre("O'Brien's 50%"));
    EXPECT_THAT(List(R"("noted":true)"), ElementsAre("", "50_a"));
    EXPECT_THAT(List(R"("largest_first":true)"), ElementsAre("c:\\d", "O'Brien's 50%", "50_a", ""));
    EXPECT_THAT(List(R"("largest_first":true,"limit":2,"offset":1)"),
                ElementsAre("O'Brien's 50%", "50_a"));
    EXPECT_THAT(List(R"("limit":0)"), ElementsAre());
    // A text that no condition can hold must not select everything.
    EXPECT_FALSE(Response(AskOne("list", R"("contains":"a\u0000b")")).isSuccess());
}

TEST_F(ReplicationMonitorTest, AMoveIsRecordedAndARefusedOneChangesNothing)
{
    AddSome();
    EXPECT_THAT(
        Ask(Call("move", R"("name":"50_a","node":"n3")") +
            Call("move", R"("name":"O'Brien's 50%","node":"n3")") +
            Call("move", R"("name":"none","node":"n3")") + Call("move", R"("name":"50_a")")),
        ElementsAre(R"({"data":1,"success":true})", R"({"data":2,"success":true})", NoVolume,
                    Refused));
    EXPECT_EQ(Row("SELECT group_concat(source||'>'||target) AS moves FROM moves"),
              "moves:'n2>n3,n1>n3'");
    EXPECT_EQ(Row("SELECT node FROM volumes WHERE name='50_a'"), "node:'n3'");
}

TEST_F(ReplicationMonitorTest, ARefusedRequestIsAnsweredAtOnceAndTheNextOneIsServed)
{
    AddSome();
    EXPECT_THAT(
        Ask(Call("add", R"("name":"50_a","node":"n1","bytes":1)") +
            Call("add", R"("name":"new","node":"n1")") + Call("add", R"("name":7,"node":[]})") +
            "no request\n" + Call("list", "\"limit\":-1,\"noted\":[]") + Call("shrink") +
            Call("remove", R"("name":"50_a")") + Call("remove", R"("name":"50_a")")),
        ElementsAre(Refused, Refused, _, _, HasSubstr("50_a"),
                    R"({"error":{"code":526},"success":false})", Done, NoVolume));
}

TEST_F(ReplicationMonitorTest, AFileOfTheFirstVersionIsUpgradedOnceByManyPrograms)
{
    std::filesystem::create_directory(directory);
    {
        SqliteDB old(directory + "/volumes.db", 0);
        ASSERT_TRUE(old.Open());
        ASSERT_TRUE(
            old.Exec("CREATE TABLE volumes (name TEXT NOT NULL PRIMARY KEY, node TEXT NOT "
                     "NULL, bytes INTEGER NOT NULL CHECK (typeof(bytes)='integer'));"
                     "INSERT INTO volumes VALUES ('old','n1',5000000000);"
                     "PRAGMA user_version=1"));
    }
    std::vector<std::unique_ptr<Program>> programs;
    for (int number = 0; number < 8; ++number) {
        programs.push_back(std::make_unique<Program>(
            std::vector<std::string>{REPLICATION_MONITOR_PROGRAM, directory, "2"}));
        programs.back()->Send(Call("list"));
    }
    for (const auto& program : programs) {
        EXPECT_EQ(program->Finish().out,
                  R"({"data":[{"bytes":5000000000,"name":"old","node":"n1"}],"success":true})"
                  "\n");
    }
    EXPECT_EQ(AskOne("add", R"("name":"new","node":"n1","bytes":1,"note":"n")"), Done);
}

TEST_F(ReplicationMonitorTest, TenThousandVolumesAreImportedByProgramsThatTakeTurns)
{
    constexpr int Many = 10'000;
    const std::string file = MakeFile(Many);
    Program other({REPLICATION_MONITOR_PROGRAM, directory});
    other.Send(Call("import", file));
    const std::string reply = R"({"data":10000,"success":true})";
    EXPECT_EQ(AskOne("import", file), reply);
    EXPECT_EQ(other.Finish().out, reply + "\n");
    EXPECT_THAT(List(), SizeIs(Many));
}

TEST_F(ReplicationMonitorTest, OfAFileWithABadVolumeNothingIsImported)
{
    EXPECT_EQ(AskOne("import", MakeFile(10, false)), Refused);
    EXPECT_FALSE(Response(AskOne("import", R"("file":"/nonexistent")")).isSuccess());
    EXPECT_FALSE(Response(AskOne("import")).isSuccess());
    EXPECT_THAT(List(), ElementsAre());
}

TEST_F(ReplicationMonitorTest, AnExportCanBeImportedAgain)
{
    AddSome();
    const std::string file = R"("file":")" + dir.File("export.json") + '"';
    const std::string before = AskOne("list");
    EXPECT_THAT(
        Ask(Call("export", file) + Call("remove", R"("name":"50_a")") + Call("import", file)),
        ElementsAre(R"({"data":4,"success":true})", Done, R"({"data":4,"success":true})"));
    EXPECT_EQ(AskOne("list"), before);
    EXPECT_FALSE(Response(AskOne("export", R"("file":"/nonexistent/x")")).isSuccess());
}

TEST_F(ReplicationMonitorTest, AllThreadsAndProgramsReadOneReport)
{
    AddSome();
    std::string requests;
    for (int number = 0; number < 16; ++number) requests += Call("report");
    Program other({REPLICATION_MONITOR_PROGRAM, directory, "8"});
    other.Send(requests);
    std::vector<std::string> replies = Ask(requests, "8");
    for (const std::string& reply : Lines(other.Finish().out)) replies.push_back(reply);
    ASSERT_THAT(replies, SizeIs(32));
    EXPECT_THAT(replies, Each(Eq(replies.front())));
    const Response report(replies.front());
    EXPECT_EQ(report.getDataField("nodes")["n2"]["bytes"].asInt64(), 900);
    EXPECT_EQ(report.getDataField("nodes")["n2"]["ratio"].asDouble(), 1.0);
}

TEST_F(ReplicationMonitorTest, AnOrdinaryUserCanDoAllThat)
{
    const std::string file = MakeFile(10);
    std::filesystem::permissions(dir.File("volumes.json"), std::filesystem::perms{0644});
    CheckAsOrdinaryUser(dir, [&] {
        AddSome();
        EXPECT_THAT(Ask(Call("import", file) + Call("remove", R"("name":"50_a")")),
                    ElementsAre(R"({"data":10,"success":true})", Done));
        EXPECT_TRUE(Response(AskOne("report")).isSuccess());
        EXPECT_TRUE(Response(AskOne("report")).isSuccess());
    });
}

}  // namespace
