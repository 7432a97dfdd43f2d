// The soak's checks notice broken promises: each one is broken here by hand.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <orvadrcore/response.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/file.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "checks.h"
#include "client.h"
#include "company.h"
#include "examples/node_registry/json_line.h"
#include "findings.h"
#include "ledger.h"
#include "plan.h"
#include "process.h"
#include "support/fixtures/temp_dir.h"
#include "support/processes/await.h"
#include "support/processes/child_process.h"
#include "watch.h"

namespace {

using namespace Soak;  // NOLINT(google-build-using-namespace): what is tested
using OrvaDRCore::Response;
using ::testing::ContainsRegex;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

class SoakTest : public ::testing::Test {
  protected:
    SoakTest()
    {
        plan.directory = dir.Path();
        for (const char* name : {"data", "status", "log"}) {
            std::filesystem::create_directory(dir.File(name));
        }
    }

    static void Touch(const std::string& path) { std::ofstream(path) << "x"; }

    // The findings about a promise. There must be none about any other.
    std::vector<std::string> OnlyFindings(Promise promise) const
    {
        for (const Promise other : AllPromises) {
            if (other != promise) {
                EXPECT_THAT(findings.Of(other), IsEmpty());
            }
        }
        return findings.Of(promise);
    }

    TempDir dir;
    Plan plan;
    Findings findings;
};

// ---------------------------------------------------------------------------------- stored nodes

Ledger Told(State state)
{
    return {{"a", Account{state, "id", {1, 2}}}};
}

std::vector<std::string> ProblemsOf(const Ledger& ledger, const std::vector<Row>& rows)
{
    return Compare({&ledger}, rows).problems;
}

TEST(SoakLedgerTest, NodesAsToldAreNoProblem)
{
    EXPECT_THAT(ProblemsOf(Told(State::Stored), {{"id", "a", 1}}), IsEmpty());
    EXPECT_THAT(ProblemsOf(Told(State::Absent), {}), IsEmpty());
    EXPECT_EQ(Compare({}, {}).stored, 0);
    const Ledger ledger = Told(State::Stored);
    EXPECT_EQ(Compare({&ledger}, {{"id", "a", 2}}).stored, 1);
}

TEST(SoakLedgerTest, NodesWhoseAnswerWasLostMayBeThereOrNot)
{
    const Ledger ledger = Told(State::Unknown);
    const Comparison there = Compare({&ledger}, {{"id", "a", 2}});
    EXPECT_THAT(there.problems, IsEmpty());
    EXPECT_EQ(there.unknown, 1);
    EXPECT_EQ(there.unknownFound, 1);
    const Comparison missing = Compare({&ledger}, {});
    EXPECT_THAT(missing.problems, IsEmpty());
    EXPECT_EQ(missing.unknown, 1);
    EXPECT_EQ(missing.unknownFound, 0);
}

TEST(SoakLedgerTest, FindsNodesThatAreNotAsTold)
{
    EXPECT_THAT(ProblemsOf(Told(State::Stored), {}),
                ElementsAre("a is missing, although its creation was confirmed"));
    EXPECT_THAT(ProblemsOf(Told(State::Stored), {{"id", "a", 1}, {"id", "a", 2}}),
                ElementsAre("a is there 2 times"));
    EXPECT_THAT(ProblemsOf(Told(State::Unknown), {{"id", "a", 1}, {"id", "a", 1}}),
                ElementsAre("a is there 2 times"));
    EXPECT_THAT(ProblemsOf(Told(State::Stored), {{"id", "a", 3}}),
                ElementsAre("a has port 3, which was never requested or has been replaced"));
    EXPECT_THAT(ProblemsOf(Told(State::Stored), {{"other", "a", 1}}),
                ElementsAre("a has another id than the reply said"));
    EXPECT_THAT(ProblemsOf(Told(State::Absent), {{"id", "a", 1}}),
                ElementsAre("a is there, although it was never created or was deleted"));
    EXPECT_THAT(ProblemsOf({}, {{"id", "b", 1}}),
                ElementsAre("b is there, although nobody created it"));
}

class SoakDatabaseTest : public SoakTest {
  protected:
    SoakDatabaseTest()
    {
        Run("CREATE TABLE nodes (id TEXT, name TEXT, port INTEGER)");
        Run("CREATE INDEX names ON nodes (name)");
    }

    void Run(const std::string& statement) const
    {
        sqlite3* database = nullptr;
        ASSERT_EQ(sqlite3_open(plan.Database().c_str(), &database), SQLITE_OK);
        EXPECT_EQ(sqlite3_exec(database, statement.c_str(), nullptr, nullptr, nullptr), SQLITE_OK);
        sqlite3_close(database);
    }
};

TEST_F(SoakDatabaseTest, ComparesRowsWithTheLedgers)
{
    Run("INSERT INTO nodes VALUES ('id','a',1),('id2','b',2)");
    const Ledger ledger = Told(State::Stored);
    EXPECT_EQ(CheckDatabase(plan.Database(), {&ledger}, findings).stored, 1);
    EXPECT_THAT(OnlyFindings(Promise::Stored),
                ElementsAre("b is there, although nobody created it"));
}

TEST_F(SoakDatabaseTest, FindsDamage)
{
    Run("WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i+1 FROM n WHERE i<2000) "
        "INSERT INTO nodes SELECT i, 'name' || i, i FROM n");
    std::fstream file(plan.Database(), std::ios::in | std::ios::out | std::ios::binary);
    file.seekp(3 * 4096 + 8);
    file << std::string(64, '\x7f');
    file.close();
    CheckDatabase(plan.Database(), {}, findings);
    EXPECT_THAT(findings.Of(Promise::Integrity), Not(IsEmpty()));
}

TEST_F(SoakDatabaseTest, FindsThatTheDatabaseIsMissing)
{
    CheckDatabase(dir.File("none"), {}, findings);
    EXPECT_THAT(OnlyFindings(Promise::Integrity), ElementsAre("unable to open database file"));
}

// --------------------------------------------------------------------------------------- leftovers

TEST_F(SoakTest, FindsLeftoverFiles)
{
    Touch(plan.Database());
    Touch(plan.StatusFile());
    CheckFiles(plan, findings);
    EXPECT_TRUE(findings.IsEmpty());

    const std::vector<std::string> left = {plan.Database() + "-journal", plan.StatusFile() + ".pid",
                                           plan.StatusFile() + ".tmp0"};
    for (const std::string& path : left) Touch(path);
    CheckFiles(plan, findings);
    EXPECT_THAT(OnlyFindings(Promise::LeftOvers),
                ElementsAre(left[0] + " is left", left[1] + " is left", left[2] + " is left"));
}

TEST_F(SoakTest, FindsThatTheStatusIsMissing)
{
    Touch(plan.Database());
    CheckFiles(plan, findings);
    EXPECT_THAT(OnlyFindings(Promise::LeftOvers), ElementsAre(plan.StatusFile() + " is missing"));
}

TEST_F(SoakTest, FindsAHeldLock)
{
    const std::string path = dir.File("lock");
    Touch(path);
    CheckLock(path, findings);
    EXPECT_TRUE(findings.IsEmpty());

    ChildProcess holder([&](ChildProcess::Link& link) {
        const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
        ::flock(file, LOCK_SH);
        link.Tell();
        link.Await();
    });
    ASSERT_TRUE(holder.Await());
    CheckLock(path, findings);
    const std::vector<std::string> found = OnlyFindings(Promise::LeftOvers);
    ASSERT_EQ(found.size(), 1U);
    EXPECT_THAT(found[0],
                HasSubstr(path + " is locked by process " + std::to_string(holder.Pid()) + " ["));
    holder.Tell();
    EXPECT_EQ(holder.Join(), 0);
}

// ---------------------------------------------------------------------------------------- processes

TEST_F(SoakTest, FindsAndKillsALeftoverProcess)
{
    ChildProcess left([](ChildProcess::Link& link) { link.Await(); });
    plan.bounds.end = milliseconds(1);
    CheckProcesses(plan, findings);
    const std::vector<std::string> found = OnlyFindings(Promise::Ends);
    ASSERT_EQ(found.size(), 1U);
    EXPECT_THAT(found[0], HasSubstr("still there: process " + std::to_string(left.Pid())));
    EXPECT_EQ(left.Join(), 128 + SIGKILL);
}

class SoakMemberTest : public SoakTest {
  protected:
    Member Make(const std::vector<std::string>& words, bool isWelcome = true)
    {
        const auto welcome = [isWelcome](Pipes pipes) {
            ::close(pipes.in);
            ::close(pipes.out);
            return isWelcome;
        };
        return {"it",
                {words, plan.LogFile("it"), welcome, [](pid_t /*pid*/) {}},
                plan.bounds,
                reaper,
                findings};
    }

    Reaper reaper;
};

TEST_F(SoakMemberTest, FindsAProgramThatEndsByItself)
{
    Member member = Make({"/bin/false"});
    member.Start();
    const pid_t first = member.Pid();
    EXPECT_TRUE(reaper.AwaitEnd(first, seconds(60)));
    member.Tend();
    EXPECT_THAT(OnlyFindings(Promise::Ends), ElementsAre("it ended by itself: exit code 1"));
    EXPECT_NE(member.Pid(), first);
}

TEST_F(SoakMemberTest, RestartsAKilledProgram)
{
    Member member = Make({"/bin/sleep", "60"});
    member.Start();
    const pid_t first = member.Pid();
    member.Kill();
    EXPECT_TRUE(reaper.AwaitEnd(first, seconds(60)));
    member.Tend();
    EXPECT_TRUE(findings.IsEmpty());
    EXPECT_NE(member.Pid(), first);
    EXPECT_EQ(member.Kills(), 1);
    member.Kill();
}

TEST_F(SoakMemberTest, FindsAndKillsAProgramThatDoesNotEnd)
{
    plan.bounds.end = milliseconds(1);
    Member member = Make({"/bin/sleep", "60"});
    member.Start();
    member.End();
    const std::vector<std::string> found = OnlyFindings(Promise::Ends);
    ASSERT_EQ(found.size(), 1U);
    EXPECT_THAT(found[0], HasSubstr("it does not end: process"));
    EXPECT_TRUE(reaper.AwaitEnd(member.Pid(), seconds(60)));
}

TEST_F(SoakMemberTest, FindsAWrongExitCode)
{
    Member member = Make({"/bin/false"});
    member.Start();
    member.End();
    EXPECT_THAT(OnlyFindings(Promise::Ends), ElementsAre("it ended with exit code 1"));
}

TEST_F(SoakMemberTest, FindsAProgramThatCannotBeStarted)
{
    plan.bounds.start = milliseconds(1);
    Member member = Make({"/bin/true"}, false);
    member.Start();
    EXPECT_THAT(OnlyFindings(Promise::Ends), ElementsAre("it cannot be started again"));
}

TEST_F(SoakTest, FindsGrowthOfSurvivors)
{
    plan.length = LongEnoughForMemory;
    const std::vector<Usage> before = {{"one", 1, 1000, 10}, {"two", 2, 1000, 10}};
    CompareUsages(plan, before, before, findings);
    CompareUsages(plan, before, {{"one", 3, 9000, 99}, {"two", 4, 9000, 99}}, findings);
    EXPECT_TRUE(findings.IsEmpty());
    CompareUsages(plan, before, {{"one", 1, 1000, 11}, {"two", 2, 5097, 10}}, findings);
    EXPECT_THAT(OnlyFindings(Promise::Growth),
                ElementsAre("one had 10 open descriptors, and has 11",
                            "two had 1000 KiB of memory, and has 5097"));
}

TEST_F(SoakTest, MeasuresAProcess)
{
    const Usage usage = UsageOf("this", ::getpid());
    const int more = ::open("/dev/null", O_RDONLY | O_CLOEXEC);
    EXPECT_EQ(UsageOf("this", ::getpid()).descriptors, usage.descriptors + 1);
    ::close(more);
    EXPECT_GT(usage.kiBytes, 100);
}

// ------------------------------------------------------------------------------------------ the status

TEST_F(SoakTest, CountsRefreshes)
{
    const RefreshWatch watch(
        plan, [] { return false; }, findings);
    for (int refresh = 1; refresh <= 3; ++refresh) {
        Touch(plan.StatusFile() + ".new");
        std::filesystem::rename(plan.StatusFile() + ".new", plan.StatusFile());
        EXPECT_TRUE(AwaitUntil([&] { return watch.Refreshes() == refresh; }));
    }
    EXPECT_TRUE(findings.IsEmpty());
}

TEST_F(SoakTest, FindsARefreshThatHangs)
{
    plan.bounds.stale = milliseconds(20);
    std::ofstream(plan.StatusFile() + ".pid") << ::getpid() << "\n";
    const RefreshWatch watch(
        plan, [] { return false; }, findings);
    EXPECT_TRUE(AwaitUntil([&] { return !findings.IsEmpty(); }));
    EXPECT_THAT(
        OnlyFindings(Promise::Refreshes)[0],
        HasSubstr("for 20 ms; marked as refreshing: process " + std::to_string(::getpid())));
}

TEST_F(SoakTest, AcceptsAnUnchangedStatusWhileTheDiskIsFull)
{
    plan.bounds.stale = milliseconds(20);
    std::atomic<bool> isFull{true};
    std::atomic<int> looks{0};
    const RefreshWatch watch(
        plan, [&] { return ++looks, isFull.load(); }, findings);
    EXPECT_TRUE(AwaitUntil([&] { return looks > 50; }));
    EXPECT_TRUE(findings.IsEmpty());
    isFull = false;
    EXPECT_TRUE(AwaitUntil([&] { return !findings.IsEmpty(); }));
}

// ------------------------------------------------------------------------------------------ clients

// A registry that does what it is asked, and may give wrong answers or none.
class FakeRegistry {
  public:
    using Falsify = std::function<void(const std::string& method, Answer& answer)>;

    explicit FakeRegistry(Falsify how = [](const std::string& /*method*/, Answer& /*answer*/) {})
        : falsify_(std::move(how))
    {
    }

    Answer Ask(const std::string& text)
    {
        Json::Value request;
        EXPECT_TRUE(NodeRegistry::ParseLine(text, request));
        const std::string method = request["method"].asString();
        Answer answer{Answer::Outcome::Told, Do(method, request)};
        falsify_(method, answer);
        return answer;
    }

    std::vector<Row> Rows() const
    {
        std::vector<Row> rows;
        for (const auto& [name, node] : nodes_) {
            rows.push_back({node["id"].asString(), name, node["port"].asInt()});
        }
        return rows;
    }

  private:
    Json::Value Do(const std::string& method, const Json::Value& request)
    {
        const std::string name = request["name"].asString();
        if (method == "status") return Response::Success();
        if (method == "list") return List(request["filter"]["ids"]);
        const bool isThere = nodes_.count(name) == 1;
        if (method == "create") return isThere ? Response::Failure(508) : Create(request);
        if (!isThere) return Response::Failure(507);
        if (method == "set") nodes_[name]["port"] = request["port"];
        const Json::Value node = nodes_[name];
        if (method == "delete") nodes_.erase(name);
        return Response::Success(node);
    }

    Json::Value Create(const Json::Value& request)
    {
        Json::Value node = request;
        node["id"] = "id" + std::to_string(++made_);
        return Response::Success(nodes_[request["name"].asString()] = node);
    }

    Json::Value List(const Json::Value& ids) const
    {
        Json::Value data(Json::objectValue);
        data["nodes"] = Json::Value(Json::arrayValue);
        for (const Json::Value& id : ids) {
            for (const auto& [name, node] : nodes_) {
                if (node["id"] == id) data["nodes"].append(node);
            }
        }
        return Response::Success(data);
    }

    Falsify falsify_;
    std::map<std::string, Json::Value> nodes_;
    int made_ = 0;
};

class SoakClientTest : public SoakTest {
  protected:
    // A client makes many requests. Its ledger is compared with the registry at the end.
    void AskOften(FakeRegistry& registry, const std::optional<bool>& nonsense = true)
    {
        constexpr int Requests = 2000;
        Client client(
            "c", [&](const std::string& request) { return registry.Ask(request); },
            [&](int /*which*/) { return nonsense; }, plan.bounds, findings);
        for (int request = 0; request < Requests; ++request) client.AskOne();
        answers = client.CountAnswers();
        for (const auto& [code, times] : client.GetNotes().givenUp) givenUp += times;
        problems = ProblemsOf(client.Accounts(), registry.Rows());
    }

    // What a client reports about a registry that falsifies its answers to a method.
    std::string FindingOf(const std::string& method,
                          const std::function<void(Json::Value&)>& change)
    {
        FakeRegistry registry([&](const std::string& asked, Answer& answer) {
            if (asked == method) change(answer.reply);
        });
        Findings own;
        Client client(
            "c", [&](const std::string& request) { return registry.Ask(request); },
            [](int /*which*/) { return true; }, plan.bounds, own);
        for (int request = 0; request < 300; ++request) client.AskOne();
        const std::vector<std::string> found = own.Of(Promise::Answers);
        return found.empty() ? "nothing" : found[0];
    }

    std::size_t answers = 0;
    int givenUp = 0;
    std::vector<std::string> problems;
};

TEST_F(SoakClientTest, AcceptsRightAnswers)
{
    FakeRegistry registry;
    AskOften(registry);
    EXPECT_TRUE(findings.IsEmpty());
    EXPECT_THAT(problems, IsEmpty());
    EXPECT_EQ(answers, 2000U);
    EXPECT_GT(registry.Rows().size(), 3U);
    EXPECT_LE(registry.Rows().size(), static_cast<std::size_t>(LiveNodes));
}

TEST_F(SoakClientTest, AcceptsLostAnswers)
{
    int count = 0;
    FakeRegistry registry([&](const std::string& /*method*/, Answer& answer) {
        if (++count % 3 == 0) answer = {Answer::Outcome::Lost, {}};
    });
    AskOften(registry);
    EXPECT_TRUE(findings.IsEmpty());
    EXPECT_THAT(problems, IsEmpty());
    EXPECT_LT(answers, 2000U);
}

TEST_F(SoakClientTest, CountsFailuresOfTheRegistry)
{
    FakeRegistry registry([](const std::string& method, Answer& answer) {
        if (method == "get") answer.reply = Response::Failure(404);
    });
    AskOften(registry, std::nullopt);
    EXPECT_TRUE(findings.IsEmpty());
    EXPECT_GT(givenUp, 100);
}

TEST_F(SoakClientTest, FindsWrongAnswers)
{
    const auto fails = [](Json::Value& reply) { reply = Response::Failure(507); };
    EXPECT_THAT(FindingOf("create", [](Json::Value& reply) { reply = Response::Failure(508); }),
                HasSubstr("c: create c-1 got the reply"));
    EXPECT_THAT(FindingOf("create", [](Json::Value& reply) { reply["data"]["id"] = "other"; }),
                HasSubstr("c: get c-"));
    EXPECT_THAT(FindingOf("get", fails), HasSubstr("c: get c-"));
    EXPECT_THAT(FindingOf("get", [](Json::Value& reply) { reply["data"]["port"] = 0; }),
                HasSubstr("c: get c-"));
    EXPECT_THAT(FindingOf("get", [](Json::Value& reply) { reply["data"]["name"] = "b"; }),
                HasSubstr("c: get c-"));
    EXPECT_THAT(FindingOf("set", fails), HasSubstr("c: set c-"));
    EXPECT_THAT(FindingOf("delete", fails), HasSubstr("c: delete c-"));
    EXPECT_THAT(FindingOf("list", [](Json::Value& reply) { reply["data"]["nodes"].append(1); }),
                HasSubstr("c: list of "));
    EXPECT_THAT(FindingOf("status", fails), HasSubstr("c: status got the reply"));
}

TEST_F(SoakClientTest, FindsWrongAnswersToNonsense)
{
    FakeRegistry registry;
    AskOften(registry, false);
    EXPECT_THAT(OnlyFindings(Promise::Answers)[0], "c: nonsense got a wrong answer");
}

TEST_F(SoakClientTest, FindsLostCreatesAtTheEnd)
{
    FakeRegistry registry;
    AskOften(registry);
    Client client(
        "d", [&](const std::string& request) { return registry.Ask(request); },
        [](int /*which*/) { return true; }, plan.bounds, findings);
    for (int request = 0; request < 50; ++request) client.AskOne();
    EXPECT_THAT(ProblemsOf(client.Accounts(), {}), Not(IsEmpty()));
}

TEST_F(SoakClientTest, FindsSlowAnswers)
{
    plan.bounds.wait = milliseconds(-1);
    FakeRegistry registry;
    AskOften(registry);
    const std::vector<std::string> found = OnlyFindings(Promise::Waits);
    ASSERT_EQ(found.size(), 9U);
    EXPECT_THAT(found[0], ContainsRegex(" took [0-9]+ ms$"));
    EXPECT_EQ(found[8], "... and 1992 more");
}

TEST_F(SoakTest, FindsStarvingClients)
{
    CheckGap(plan, "c", plan.bounds.gap, findings);
    EXPECT_TRUE(findings.IsEmpty());
    CheckGap(plan, "c", plan.bounds.gap + milliseconds(1), findings);
    EXPECT_THAT(OnlyFindings(Promise::Starvation), ElementsAre("c got no answer for 15001 ms"));
}

TEST_F(SoakTest, FindsUnequalShares)
{
    FakeRegistry registry;
    const auto ask = [&](const std::string& request) { return registry.Ask(request); };
    const auto nonsense = [](int /*which*/) { return true; };
    Client poor("poor", ask, nonsense, plan.bounds, findings);
    Client rich("rich", ask, nonsense, plan.bounds, findings);
    for (int request = 0; request < 100; ++request) poor.AskOne();
    for (int request = 0; request < 300; ++request) rich.AskOne();
    CheckShares(plan, {&poor, &rich}, findings);
    EXPECT_TRUE(findings.IsEmpty());
    rich.AskOne();
    rich.AskOne();
    CheckShares(plan, {&poor, &rich}, findings);
    EXPECT_THAT(OnlyFindings(Promise::Starvation),
                ElementsAre("poor got 100 answers, where the average is 201"));
}

}  // namespace
