// The example node_registry: the status of all nodes, and nodes in files.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <array>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <string>
#include <utility>
#include <vector>

#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_db.h>

#include "listener.h"
#include "node_registry.h"
#include "support/processes/await.h"
#include "support/processes/program.h"

namespace {

using OrvaDRCore::File;
using OrvaDRCore::FileLock;
using OrvaDRCore::Response;
using ::testing::AnyOf;
using ::testing::ElementsAre;

constexpr const char* Injection = "x';DROP/**/TABLE/**/nodes;--";  // a single word
constexpr const char* FileRule = "must be a path of at most 4095 bytes without control characters";
constexpr const char* VolumeRule =
    "must be a path that begins with /volume, of at most 4096 bytes without control characters";
constexpr const char* NotAlone = "is held by another handler, or may not be opened";

std::string CountText(int count)
{
    return SuccessText(R"({"count":)" + std::to_string(count) + "}");
}

std::string ImportText(int created, const std::string& refused = "")
{
    return SuccessText(R"({"created":)" + std::to_string(created) + R"(,"refused":{)" + refused +
                       "}}");
}

std::string DocumentText(const std::string& nodes)
{
    return R"({"nodes":[)" + nodes + R"(],"version":1})";
}

std::string NoStatusLock()
{
    return FailureText(525, "status", "has no directory or no lock that may be used");
}

std::string Colon(const std::string& name, int port)
{
    return name + ":" + std::to_string(port);
}

class NodeFilesTest : public NodeRegistryTest {
  protected:
    NodeFilesTest() : file(dir.File("file")), fileParam(Text("file", file)) {}

    // Whether this process may open lock files as root may. If not, checks what others get.
    bool HasLocks() const
    {
        if (::geteuid() == 0) return true;
        EXPECT_EQ(Run({}, Call("status")).out, NoStatusLock() + "\n");
        return false;
    }

    std::string ImportLines(const std::string& lines, const std::string& params = "") const
    {
        WriteFile(file, lines);
        return Ask(Call("import", fileParam + params));
    }

    void ExecSql(const std::string& statement) const
    {
        OrvaDRCore::SqliteDB db(database, 3);
        ASSERT_TRUE(db.Open() && db.Exec(statement)) << statement;
    }

    std::string file;
    std::string fileParam;
};

class NodeStatusTest : public NodeFilesTest {
  protected:
    NodeStatusTest() : cacheFile(database + ".status.cached") {}

    // The status in a reply.
    static Json::Value StatusOf(const std::string& reply)
    {
        const Response response(reply);
        EXPECT_TRUE(response.isSuccess()) << reply;
        return response.getData();
    }

    Json::Value AskStatus() const { return StatusOf(Ask(Call("status"))); }

    // The total in the status that a program returns.
    static int TotalBy(Program& handler)
    {
        handler.Send(Call("status") + "\n");
        return StatusOf(handler.ReadLine())["total"].asInt();
    }

    // The total in the cached status; -1 without one.
    int TotalInCache() const
    {
        Json::Value document;
        return File::Read(cacheFile, document) && document.isObject()
                   ? document["cached_data"]["total"].asInt()
                   : -1;
    }

    // The command line of a program to which every status is old.
    std::vector<std::string> WithoutTimeout() const
    {
        return {NODE_REGISTRY_PROGRAM, "--db", database, "--status-timeout", "0"};
    }

    std::string cacheFile;
};

// --------------------------------------------------------------------------------------- status

TEST_F(NodeStatusTest, AStatusHasCountsVolumesAndProbes)
{
    if (!HasLocks()) return;
    const Listener node;
    const SilentListener silent;
    EXPECT_EQ(ImportLines(Colon("a = 127.0.0.1", node.Port()) + "\n" +
                          Colon("b = localhost", node.Port()) + "\n" +
                          Colon("c = 127.0.0.1", silent.Port()) + "\n" +
                          "d = 127.0.0.1:1\ne = [::1]:1\nf = f.example:1\ng = 127.0.0.1:1\n"),
              ImportText(7));
    Ask(Call("set", R"("name":"g","enabled":false)"));
    ExecSql("UPDATE nodes SET volume='/volume-none'");
    ExecSql("UPDATE nodes SET volume='/proc' WHERE name='b'");
    ExecSql("UPDATE nodes SET volume='" + dir.Path() + "' WHERE name='g'");

    const std::time_t begin = std::time(nullptr);
    Json::Value status = AskStatus();
    EXPECT_GE(status["age"].asInt64(), 0);
    EXPECT_LE(status["age"].asInt64(), std::time(nullptr) - begin);
    EXPECT_GE(status["time"].asInt64(), begin);
    EXPECT_LE(status["time"].asInt64(), std::time(nullptr));
    EXPECT_EQ(status["total"], 7);
    EXPECT_EQ(status["enabled"], 6);

    const Json::Value& probes = status["probes"];
    EXPECT_THAT(probes.getMemberNames(), ElementsAre("a", "b", "c", "d", "e", "f"));
    EXPECT_EQ(probes["a"], "reachable");
    EXPECT_EQ(probes["b"], "reachable");
    EXPECT_EQ(probes["c"], "unreachable");
    EXPECT_EQ(probes["d"], "unreachable");
    EXPECT_EQ(probes["e"], "unreachable");
    EXPECT_TRUE(probes["f"].isNull());

    const Json::Value& volumes = status["volumes"];
    EXPECT_THAT(volumes.getMemberNames(), ElementsAre("/proc", dir.Path(), "/volume-none"));
    EXPECT_EQ(volumes["/proc"]["used"], 0);
    EXPECT_EQ(volumes["/proc"]["free"], 0);
    EXPECT_TRUE(volumes["/volume-none"].isNull());
    struct statvfs space {};
    ASSERT_EQ(::statvfs(dir.Path().c_str(), &space), 0);
    const Json::Value& here = volumes[dir.Path()];
    EXPECT_GT(here["used"].asUInt64(), 0U);
    EXPECT_GT(here["free"].asUInt64(), 0U);
    EXPECT_LE(here["used"].asUInt64() + here["free"].asUInt64(), space.f_blocks * space.f_frsize);
}

TEST_F(NodeStatusTest, NodesThatListenOnIpv6AreReached)
{
    if (!HasLocks()) return;
    sockaddr_in6 address{};
    address.sin6_family = AF_INET6;
    address.sin6_addr = in6addr_loopback;
    socklen_t size = sizeof address;
    auto* any = reinterpret_cast<sockaddr*>(&address);
    const int fd = ::socket(AF_INET6, SOCK_STREAM | SOCK_CLOEXEC, 0);
    // Without IPv6 on this machine nothing is reachable through it.
    const bool isListening =
        ::bind(fd, any, size) == 0 && ::listen(fd, 1) == 0 && ::getsockname(fd, any, &size) == 0;
    const int port = isListening ? ntohs(address.sin6_port) : 1;
    EXPECT_EQ(ImportLines(Colon("a = [::1]", port)), ImportText(1));
    EXPECT_EQ(AskStatus()["probes"]["a"], isListening ? "reachable" : "unreachable");
    ::close(fd);
}

TEST_F(NodeStatusTest, WithoutNodesThereIsAStatus)
{
    if (!HasLocks()) return;
    Json::Value status = AskStatus();
    EXPECT_EQ(status["total"], 0);
    EXPECT_TRUE(status["probes"].isObject());
    EXPECT_TRUE(status["volumes"].isObject());
}

TEST_F(NodeStatusTest, AStatusIsCachedUntilItIsOld)
{
    if (!HasLocks()) return;
    EXPECT_EQ(AskStatus()["total"], 0);
    Create("a");
    EXPECT_EQ(AskStatus()["total"], 0);
    EXPECT_EQ(TotalInCache(), 0);

    const std::time_t old = std::time(nullptr) - 60;
    const std::array<timespec, 2> times{{{old, 0}, {old, 0}}};
    ASSERT_EQ(::utimensat(AT_FDCWD, cacheFile.c_str(), times.data(), 0), 0);
    // The new status if the child is faster than its parent.
    EXPECT_THAT(AskStatus()["total"].asInt(), AnyOf(0, 1));
    EXPECT_TRUE(AwaitUntil([&] { return TotalInCache() == 1; }));
    EXPECT_EQ(AskStatus()["total"], 1);
}

TEST_F(NodeStatusTest, TheAgeIsCountedFromTheTimeInTheStatus)
{
    if (!HasLocks()) return;
    AskStatus();
    Json::Value document;
    ASSERT_TRUE(File::Read(cacheFile, document));
    for (const Json::Int64 ago : {1000, -1000}) {
        const Json::Int64 time = Json::Int64{std::time(nullptr)} - ago;
        document["cached_data"]["time"] = time;
        ASSERT_TRUE(File::Write(cacheFile, document));
        const Json::Int64 age = AskStatus()["age"].asInt64();
        EXPECT_GE(age, std::max(ago, Json::Int64{0}));
        EXPECT_LE(age, std::max(Json::Int64{std::time(nullptr)} - time, Json::Int64{0}));
    }
}

// Two programs share one child. It probes the first node at once and then waits for silent ones.
TEST_F(NodeStatusTest, RequestsGetTheLastStatusWhileOneChildRefreshesIt)
{
    if (!HasLocks()) return;
    constexpr int SilentNodes = 100;  // half a minute
    Listener counter;
    const SilentListener silent;
    EXPECT_EQ(ImportLines(Colon("a = 127.0.0.1", counter.Port())), ImportText(1));
    Program one(WithoutTimeout());
    EXPECT_EQ(TotalBy(one), 1);  // the first request waits for the status
    EXPECT_EQ(counter.Count(), 1);
    std::string lines;
    for (int node = 0; node < SilentNodes; ++node) {
        lines += Colon("b-" + std::to_string(node) + " = 127.0.0.1", silent.Port()) + "\n";
    }
    EXPECT_EQ(ImportLines(lines), ImportText(SilentNodes));

    Program other(WithoutTimeout());
    EXPECT_EQ(TotalBy(one), 1);
    EXPECT_TRUE(AwaitUntil([&] { return counter.Count() == 2; }));
    for (int request = 0; request < 3; ++request) {
        EXPECT_EQ(TotalBy(other), 1);
        EXPECT_EQ(TotalBy(one), 1);
    }
    EXPECT_EQ(counter.Count(), 2);
    pid_t updater = 0;
    std::ifstream(cacheFile + ".pid") >> updater;
    ASSERT_GT(updater, 0);
    ::kill(updater, SIGKILL);
    EXPECT_EQ(one.Finish().code, 0);
    EXPECT_EQ(other.Finish().code, 0);
}

TEST_F(NodeStatusTest, TwoProgramsThatNeedTheFirstStatusBothGetIt)
{
    if (!HasLocks()) return;
    const SilentListener silent;
    EXPECT_EQ(ImportLines(Colon("a = 127.0.0.1", silent.Port())), ImportText(1));
    Program one({NODE_REGISTRY_PROGRAM, "--db", database});
    Program other({NODE_REGISTRY_PROGRAM, "--db", database});
    for (Program* handler : {&one, &other}) handler->Send(Call("status") + "\n");
    for (Program* handler : {&one, &other}) {
        EXPECT_EQ(StatusOf(handler->ReadLine())["probes"]["a"], "unreachable");
        EXPECT_EQ(handler->Finish().code, 0);
    }
}

// A child of a process with threads must not use SQLite: see StatusCache::GetUpdatedData(). While
// the child works, the file with the database's name is not a database.
TEST_F(NodeStatusTest, TheChildUsesNoDatabase)
{
    if (!HasLocks()) return;
    Program handler(WithoutTimeout());
    EXPECT_EQ(TotalBy(handler), 0);
    handler.Send(CreateCall("a") + "\n");
    EXPECT_TRUE(Response(handler.ReadLine()).isSuccess());
    std::filesystem::rename(database, dir.File("moved.db"));
    WriteFile(database, "no database, but long enough to be taken for a damaged one");

    EXPECT_THAT(TotalBy(handler), AnyOf(0, 1));  // 1 if the child is faster than its parent
    EXPECT_TRUE(AwaitUntil([&] { return TotalInCache() == 1; }));
    EXPECT_EQ(handler.Finish().code, 0);
}

TEST_F(NodeStatusTest, TheStatusIsCachedInTheGivenDirectory)
{
    if (!HasLocks()) return;
    const std::string place = dir.File("status");
    std::filesystem::create_directory(place);
    const ProgramResult result = Run({"--status-dir", place}, Call("status"));
    EXPECT_EQ(StatusOf(result.out)["total"], 0);
    EXPECT_FALSE(std::filesystem::exists(cacheFile));
    EXPECT_TRUE(std::filesystem::exists(place + "/nodes.db.status.cached"));
    EXPECT_EQ(Run({"--status-dir", dir.File("none")}, Call("status")).out, NoStatusLock() + "\n");
    EXPECT_FALSE(std::filesystem::exists(dir.File("none")));
}

// The children of a process, zombies included.
std::vector<pid_t> ChildrenOf(pid_t pid)
{
    std::vector<pid_t> children;
    for (const auto& entry : std::filesystem::directory_iterator("/proc")) {
        const std::string status = ReadFile(entry.path() / "status");
        if (status.find("\nPPid:\t" + std::to_string(pid) + "\n") != std::string::npos) {
            children.push_back(std::stoi(entry.path().filename()));
        }
    }
    return children;
}

TEST_F(NodeStatusTest, LeavesNoZombies)
{
    if (!HasLocks()) return;
    Program handler(WithoutTimeout());
    const std::vector<pid_t> handlers = ChildrenOf(::getpid());
    ASSERT_EQ(handlers.size(), 1U);
    EXPECT_EQ(TotalBy(handler), 0);
    for (int total = 1; total <= 3; ++total) {
        Create("node-" + std::to_string(total));
        EXPECT_EQ(TotalBy(handler), total - 1);
        EXPECT_TRUE(AwaitUntil([&] { return TotalInCache() == total; }));
    }
    EXPECT_THAT(ChildrenOf(handlers[0]), ElementsAre());
    EXPECT_EQ(handler.Finish().code, 0);
}

TEST_F(NodeStatusTest, ACacheFileWithoutAStatusIsReplaced)
{
    if (!HasLocks()) return;
    for (const std::string data :
         {"{}", "7", "[]", R"({"time":"now","total":0,"enabled":0,"volumes":{},"probes":{}})",
          R"({"time":1,"total":-1,"enabled":0,"volumes":{},"probes":{}})",
          R"({"time":1,"total":0,"enabled":0,"volumes":[],"probes":{}})"}) {
        WriteFile(cacheFile, R"({"cached_data":)" + data + "}");
        EXPECT_GT(AskStatus()["time"].asInt64(), 1) << data;
        EXPECT_EQ(TotalInCache(), 0) << data;
    }
    WriteFile(cacheFile, "no JSON");
    EXPECT_EQ(AskStatus()["total"], 0);
}

TEST_F(NodeStatusTest, AStatusThatCannotBeTakenIsReported)
{
    if (!HasLocks()) return;
    Create("a");
    ExecSql("UPDATE nodes SET enabled=7");
    EXPECT_EQ(Ask(Call("status")), FailureText(515, "nodes", "hold a row that is damaged"));
    ExecSql("UPDATE nodes SET enabled=1");
    database = dir.File("none/nodes.db");
    EXPECT_EQ(Ask(Call("status")), NoStatusLock());
    EXPECT_FALSE(std::filesystem::exists(dir.File("none")));
}

TEST_F(NodeStatusTest, AStatusThatCannotBeStoredIsReturned)
{
    if (!HasLocks()) return;
    std::filesystem::create_directory(cacheFile);
    EXPECT_EQ(AskStatus()["total"], 0);
    Create("a");
    EXPECT_EQ(AskStatus()["total"], 1);
    EXPECT_TRUE(std::filesystem::is_directory(cacheFile));
}

// A user who cannot open a lock file twice would wait for a status forever.
TEST_F(NodeStatusTest, AUserWhoMayNotOpenLocksGetsAnError)
{
    WriteFile(file, DocumentText(""));
    const std::string lines = Call("status") + "\n" + Call("export", fileParam) + "\n" +
                              Call("export", fileParam) + "\n" + Call("restore", fileParam) + "\n";
    // Root without capabilities can create lock files, but not open them again.
    const std::string become =
        ::geteuid() == 0 ? "setpriv --inh-caps=-all --bounding-set=-all " : "";
    const ProgramResult result = RunInShell("exec " + become + R"("$0" --db "$1")", lines);
    const std::vector<std::string> replies = Lines(result.out);
    ASSERT_EQ(replies.size(), 4U);
    EXPECT_EQ(replies[0], NoStatusLock());
    EXPECT_EQ(replies[2], FailureText(513, "lock", NotAlone));
    EXPECT_EQ(replies[3], FailureText(514, "lock", NotAlone));
}

// ------------------------------------------------------------------------------------ parameters

TEST_F(NodeFilesTest, BadParametersAreNamed)
{
    const std::string good = R"("file":"f")";
    ExpectRefused({
        {"status", R"("name":"a")", "parameters", "none can be given"},
        {"import", good + R"(,"name":"a")", "parameters", "only these can be given: file, volume"},
        {"import", good + R"(,"volume":"/etc")", "volume", VolumeRule},
        {"import", good + R"(,"volume":7)", "volume", VolumeRule},
        {"export", good + R"(,"volume":"/volume1")", "parameters", "only these can be given: file"},
        {"restore", good + R"(,"name":"a")", "parameters", "only these can be given: file"},
    });
    for (const std::string method : {"import", "export", "restore"}) {
        EXPECT_EQ(Ask(Call(method)), FailureText(401, "file", "is missing"));
        for (const std::string bad : {"7", "null", R"("")", R"("f\u0000")", R"(["f"])"}) {
            EXPECT_EQ(Ask(Call(method, R"("file":)" + bad)), FailureText(401, "file", FileRule));
        }
        EXPECT_EQ(Ask(Call(method, Text("file", std::string(4096, 'f')))),
                  FailureText(401, "file", FileRule));
    }
}

// Reading a device might never end.
TEST_F(NodeFilesTest, ReadsOnlyRegularFiles)
{
    for (const std::string method : {"import", "restore"}) {
        for (const std::string& path : {dir.File("none"), dir.Path(), std::string("/dev/zero")}) {
            EXPECT_EQ(Ask(Call(method, Text("file", path))),
                      FailureText(401, "file", "cannot be read"))
                << method << " " << path;
        }
    }
}

// ---------------------------------------------------------------------------------------- import

TEST_F(NodeFilesTest, AnImportCreatesTheNodesOfAFile)
{
    EXPECT_EQ(ImportLines("b = b.example:5001\n\n# no pair\n a=[::1]:1 more\nb = c.example:5002\n"
                          "c = [c.example]:65535"),
              ImportText(3));
    const Json::Value nodes = Response(Ask(Call("list"))).getDataField("nodes");
    ASSERT_EQ(nodes.size(), 3U);
    const std::string volume = "/volume1/replica";
    const std::pair<std::string, std::string> expected[] = {
        {"a", NodeText(nodes[0]["id"].asString(), "a", "::1", 1, volume)},
        {"b", NodeText(nodes[1]["id"].asString(), "b", "b.example", 5001, volume)},
        {"c", NodeText(nodes[2]["id"].asString(), "c", "c.example", 65535, volume)},
    };
    for (const auto& [name, node] : expected) {
        EXPECT_EQ(Ask(Call("get", Text("name", name))), SuccessText(node));
    }
}

TEST_F(NodeFilesTest, AnImportGivesAllNodesTheGivenVolume)
{
    EXPECT_EQ(ImportLines("a = a:1\nb = b:1", R"(,"volume":"/volume2/it's")"), ImportText(2));
    for (const Json::Value& node : Response(Ask(Call("list"))).getDataField("nodes")) {
        EXPECT_EQ(node["volume"], "/volume2/it's");
    }
    EXPECT_EQ(ImportLines(""), ImportText(0));
}

TEST_F(NodeFilesTest, AnImportReportsWhichNodesItRefusesAndWhy)
{
    const std::string port = "port must be an integer from 1 to 65535";
    const std::string address =
        "address must be a text of 1 to 253 bytes without blanks and control characters";
    const std::string name = "name must be a text of 1 to 64 bytes without control characters";
    const std::string brackets = "address must be in brackets when it has colons";
    const struct {
        std::string line;
        std::string name;
        std::string reason;
    } rows[] = {
        {"taken = a:1", "taken", "name belongs to another node"},
        {"a = a", "a", "port is missing"},
        {"a = ", "a", address},
        {"a = a:", "a", port},
        {"a = a:0", "a", port},
        {"a = a:65536", "a", port},
        {"a = a:99999999999", "a", port},
        {"a = a:+1", "a", port},
        {"a = a:1x", "a", port},
        {"a = :1", "a", address},
        {"a = []:1", "a", address},
        {"a = ::1:5001", "a", brackets},
        {"a = [::1", "a", brackets},
        {"a = " + std::string(254, 'a') + ":1", "a", address},
        {" = a:1", "", name},
        {std::string(65, 'n') + " = a:1", std::string(64, 'n') + "...", name},
        {"a\xff\x1b = a:1", "a??", name},
    };
    Create("taken");
    for (const auto& row : rows) {
        EXPECT_EQ(ImportLines(row.line + "\n"), ImportText(0, Text(row.name, row.reason)))
            << row.line;
    }
    EXPECT_EQ(ImportLines("a =\n"), ImportText(0));  // not a pair
    EXPECT_THAT(List(), ElementsAre("taken"));
    EXPECT_EQ(ImportLines("a = a:0\nb = b:1\nc = c"),
              ImportText(1, Text("a", port) + "," + Text("c", "port is missing")));
    EXPECT_THAT(List(), ElementsAre("b", "taken"));
}

TEST_F(NodeFilesTest, AnImportStopsWhenTheDatabaseFails)
{
    database = dir.Path();
    EXPECT_EQ(ImportLines("a = a:1\n"), R"({"error":{"code":404},"success":false})");
}

TEST_F(NodeFilesTest, ImportedTextsThatLookLikeSqlAreStoredUnchanged)
{
    Create("a");
    const std::string text = Injection;
    EXPECT_EQ(ImportLines(text + " = " + text + ":1\n", R"(,"volume":"/volume'")"), ImportText(1));
    const Json::Value node = Response(Ask(Call("get", Text("name", text)))).getData();
    EXPECT_EQ(Ask(Call("get", Text("name", text))),
              SuccessText(NodeText(node["id"].asString(), text, text, 1, "/volume'")));
    EXPECT_THAT(List(), ElementsAre("a", text));
}

// ---------------------------------------------------------------------------- export and restore

TEST_F(NodeFilesTest, AnExportIsOneDocumentWithAllNodes)
{
    if (!HasLocks()) return;
    EXPECT_EQ(Ask(Call("export", fileParam)), CountText(0));
    EXPECT_EQ(ReadFile(file), DocumentText(""));
    const std::string b = Create("b");
    const std::string a = Create("a");
    Ask(Call("set", R"("name":"b","enabled":false)"));
    EXPECT_EQ(Ask(Call("export", fileParam)), CountText(2));
    EXPECT_EQ(ReadFile(file),
              DocumentText(NodeText(a, "a") + "," +
                           NodeText(b, "b", "a.example", 5001, "/volume1/r", false)));
}

TEST_F(NodeFilesTest, ARestoreBringsBackTheExportedNodes)
{
    if (!HasLocks()) return;
    const std::string text = "x'; DROP TABLE nodes; --";
    for (const std::string& name : {std::string("a"), std::string("Zürich"), text}) Create(name);
    const std::string before = Ask(Call("list"));
    EXPECT_EQ(Ask(Call("export", fileParam)), CountText(3));
    Ask(Call("delete", R"("name":"a")"));
    Ask(Call("set", Text("name", text) + R"(,"port":1)"));
    Create("new");
    EXPECT_NE(Ask(Call("list")), before);
    EXPECT_EQ(Ask(Call("restore", fileParam)), CountText(3));
    EXPECT_EQ(Ask(Call("list")), before);

    database = dir.File("other.db");
    EXPECT_EQ(Ask(Call("restore", fileParam)), CountText(3));
    EXPECT_EQ(Ask(Call("list")), before);
    WriteFile(file, DocumentText(""));
    EXPECT_EQ(Ask(Call("restore", fileParam)), CountText(0));
    EXPECT_THAT(List(), ElementsAre());
}

TEST_F(NodeFilesTest, ARestoredTextNeverChangesTheMeaningOfAStatement)
{
    if (!HasLocks()) return;
    const std::string text = Injection;
    const std::string node = NodeText(text, text, text, 1, "/volume1/" + text);
    WriteFile(file, DocumentText(node));
    EXPECT_EQ(Ask(Call("restore", fileParam)), CountText(1));
    EXPECT_EQ(Ask(Call("get", Text("id", text))), SuccessText(node));
}

TEST_F(NodeFilesTest, ARestoreOfABadDocumentChangesNothing)
{
    if (!HasLocks()) return;
    const std::string noDocument = "holds no document of nodes in version 1";
    const std::string second = "holds a bad node, number 2: ";
    const std::string good = NodeText("1", "one");
    const struct {
        std::string text;
        std::string reason;
    } rows[] = {
        {"", "cannot be read, or is no JSON document"},
        {DocumentText(good) + "x", "cannot be read, or is no JSON document"},
        {"null", noDocument},
        {"[]", noDocument},
        {"{}", noDocument},
        {R"({"version":1})", noDocument},
        {R"({"version":1,"nodes":{}})", noDocument},
        {R"({"version":2,"nodes":[]})", noDocument},
        {R"({"version":"1","nodes":[]})", noDocument},
        {R"({"nodes":[]})", noDocument},
        {DocumentText(good + ",7"), second + "is no object"},
        {DocumentText(good + ",[]"), second + "is no object"},
        {DocumentText(good + ",{}"), second + "id is missing"},
        {DocumentText(good + "," + NodeText("2", "")),
         second + "name must be a text of 1 to 64 bytes without control characters"},
        {DocumentText(good + "," + NodeText("2", "two", "a", 0)),
         second + "port must be an integer from 1 to 65535"},
        {DocumentText(good + "," + NodeText("2", "two", "a", 1, "/etc")),
         second + "volume " + VolumeRule},
        {DocumentText(good + R"(,{"id":"2","extra":1})"),
         second + "parameters only these can be given: id, name, address, port, volume, enabled"},
        {DocumentText(good + "," + NodeText("1", "two")),
         second + "has the id or the name of another one"},
        {DocumentText(good + "," + NodeText("2", "one")),
         second + "has the id or the name of another one"},
    };
    Create("a");
    const std::string before = Ask(Call("list"));
    for (const auto& row : rows) {
        WriteFile(file, row.text);
        EXPECT_EQ(Ask(Call("restore", fileParam)), FailureText(401, "file", row.reason))
            << row.text;
        EXPECT_EQ(Ask(Call("list")), before) << row.text;
    }
}

// The index refuses the second node after the first one is inserted. The attempts take some
// seconds.
TEST_F(NodeFilesTest, ARestoreThatFailsHalfwayIsRolledBack)
{
    if (!HasLocks()) return;
    Create("a");
    const std::string before = Ask(Call("list"));
    ExecSql("CREATE UNIQUE INDEX any_case ON nodes(name COLLATE NOCASE)");
    WriteFile(file, DocumentText(NodeText("1", "b") + "," + NodeText("2", "B")));
    Program handler({NODE_REGISTRY_PROGRAM, "--db", database});
    handler.Send(Call("restore", fileParam) + "\n" + Call("list") + "\n" + CreateCall("c") + "\n");
    EXPECT_EQ(handler.ReadLine(), FailureText(508, "name", "belongs to another node"));
    EXPECT_EQ(handler.ReadLine(), before);
    EXPECT_TRUE(Response(handler.ReadLine()).isSuccess());
    EXPECT_EQ(handler.Finish().code, 0);
    EXPECT_THAT(List(), ElementsAre("a", "c"));
}

TEST_F(NodeFilesTest, ADatabaseFailureIsReported)
{
    if (!HasLocks()) return;
    WriteFile(file, DocumentText(""));
    database = dir.File("directory");
    std::filesystem::create_directory(database);
    const std::string failure = R"({"error":{"code":404},"success":false})";
    EXPECT_EQ(Ask(Call("restore", fileParam)), failure);
    EXPECT_EQ(Ask(Call("export", fileParam)), failure);
    EXPECT_EQ(ReadFile(file), DocumentText(""));
}

TEST_F(NodeFilesTest, AnExportOverwritesFilesButNotTheDatabase)
{
    if (!HasLocks()) return;
    Create("a");
    const std::string reason = "is the database, or no regular file";
    std::filesystem::create_symlink(database, dir.File("link"));
    for (const std::string& path :
         {database, dir.File("link"), dir.Path(), std::string("/dev/full")}) {
        EXPECT_EQ(Ask(Call("export", Text("file", path))), FailureText(401, "file", reason));
    }
    EXPECT_EQ(Ask(Call("export", Text("file", dir.File("none/file")))),
              FailureText(513, "file", "cannot be written"));
    EXPECT_THAT(List(), ElementsAre("a"));
    WriteFile(file, std::string(100'000, 'x'));
    EXPECT_EQ(Ask(Call("export", fileParam)), CountText(1));
    EXPECT_LT(ReadFile(file).size(), 1000U);
}

// The same database under another name has the same lock.
TEST_F(NodeFilesTest, OneExportOrRestoreWorksAtATime)
{
    if (!HasLocks()) return;
    WriteFile(file, DocumentText(""));
    Create("a");
    Program exporter({NODE_REGISTRY_PROGRAM, "--db", database});
    Program restorer({NODE_REGISTRY_PROGRAM, "--db", dir.Path() + "/./nodes.db"});
    {
        FileLock lock(std::filesystem::canonical(database).string() + ".lock");
        ASSERT_TRUE(lock.lock(LOCK_EX | LOCK_NB, 0));
        exporter.Send(Call("export", fileParam) + "\n");
        restorer.Send(Call("restore", fileParam) + "\n");
        EXPECT_EQ(exporter.ReadLine(), FailureText(513, "lock", NotAlone));
        EXPECT_EQ(restorer.ReadLine(), FailureText(514, "lock", NotAlone));
    }
    EXPECT_EQ(ReadFile(file), DocumentText(""));
    EXPECT_THAT(List(), ElementsAre("a"));
    exporter.Send(Call("export", fileParam) + "\n");
    EXPECT_EQ(exporter.ReadLine(), CountText(1));
    restorer.Send(Call("restore", fileParam) + "\n");
    EXPECT_EQ(restorer.ReadLine(), CountText(1));
    EXPECT_EQ(exporter.Finish().code, 0);
    EXPECT_EQ(restorer.Finish().code, 0);
}

// Each restore must read a complete export, however many programs are at work.
TEST_F(NodeFilesTest, ExportsAndRestoresAtTheSameTimeLoseNoNodes)
{
    if (!HasLocks()) return;
    std::string lines;
    for (int node = 0; node < 50; ++node) lines += "node-" + std::to_string(node) + " = a:1\n";
    EXPECT_EQ(ImportLines(lines), ImportText(50));
    const std::string before = Ask(Call("list"));
    EXPECT_EQ(Ask(Call("export", fileParam)), CountText(50));
    Program one({NODE_REGISTRY_PROGRAM, "--db", database});
    Program other({NODE_REGISTRY_PROGRAM, "--db", database});
    constexpr int Rounds = 5;
    for (int round = 0; round < Rounds; ++round) {
        one.Send(Call("export", fileParam) + "\n");
        other.Send(Call("restore", fileParam) + "\n");
    }
    for (int round = 0; round < Rounds; ++round) {
        EXPECT_EQ(one.ReadLine(), CountText(50));
        EXPECT_EQ(other.ReadLine(), CountText(50));
    }
    EXPECT_EQ(one.Finish().code, 0);
    EXPECT_EQ(other.Finish().code, 0);
    EXPECT_EQ(Ask(Call("list")), before);
}

TEST_F(NodeFilesTest, FilesMayBeRelativeToTheWorkingDirectory)
{
    if (!HasLocks()) return;
    const std::string relative = R"("file":"file")";
    const std::string command = R"(cd "${1%/*}" && exec "$0" --db nodes.db)";
    EXPECT_EQ(RunInShell(command, Call("export", relative)).out, CountText(0) + "\n");
    EXPECT_EQ(ReadFile(file), DocumentText(""));
    EXPECT_EQ(RunInShell(command, Call("status")).code, 0);
    EXPECT_TRUE(std::filesystem::exists(database + ".status.cached"));
}

}  // namespace
