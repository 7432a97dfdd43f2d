// The example node_registry as a program: request lines in, replies out, several programs on one
// file.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <memory>
#include <string>
#include <vector>

#include <orvadrcore/response.h>
#include <orvadrcore/sqlite_db.h>

#include "listener.h"
#include "node_registry.h"
#include "support/processes/program.h"

namespace {

using OrvaDRCore::Response;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::MatchesRegex;
using ::testing::StartsWith;

constexpr const char* ProgramFile = NODE_REGISTRY_PROGRAM;
constexpr const char* Usage =
    "usage: node_registry [--db FILE] [--status-timeout SECONDS]\n"
    "                     [--status-dir DIRECTORY] [--verbose] [--pretty] [--help]\n"
    "                     [INPUT]\n";
constexpr const char* Injection = "x'; DROP TABLE nodes; --";
constexpr const char* UnknownId = "00000000-0000-4000-8000-000000000000";

std::string NoJson()
{
    return FailureText(401, "request", "must be one JSON object on one line");
}

std::string NoRequest()
{
    return FailureText(401, "request", "must have an api, a method and a version above 0");
}

std::string NameTaken()
{
    return FailureText(508, "name", "belongs to another node");
}

// ------------------------------------------------------------------------------------- the demo

// The text with the port `from` replaced in all requests and nodes.
std::string WithPort(std::string text, int from, int to)
{
    const auto member = [](int port) { return "\"port\":" + std::to_string(port); };
    for (std::size_t at = text.find(member(from)); at != std::string::npos;
         at = text.find(member(from), at + 1)) {
        text.replace(at, member(from).size(), member(to));
    }
    return text;
}

// The demo. Its paths are relative to the top of the sources, and one port is that of a reachable
// node. For an ordinary user only the output before the first status is compared.
TEST_F(NodeRegistryTest, ADaysRequestsPrintTheExpectedOutput)
{
    constexpr int DemoPort = 15001;
    const std::string folder = NODE_REGISTRY_DIR;
    const Listener node;
    std::filesystem::create_directory_symlink(folder + "/..", dir.File("examples"));
    std::filesystem::create_directories(dir.File("build/demo"));
    WriteFile(dir.File("requests"),
              WithPort(ReadFile(folder + "/requests.jsonl"), DemoPort, node.Port()));

    const ProgramResult day =
        RunInShell(R"(cd "${1%/*}" && exec "$0" --pretty --db "$1" --status-timeout 0 requests)");
    EXPECT_EQ(day.code, 0);
    const bool isRoot = ::geteuid() == 0;
    if (isRoot) {
        EXPECT_EQ(day.err, "");
    }
    const ProgramResult normal = RunProgram({"/bin/sed", "-f", folder + "/normalise.sed"},
                                            WithPort(day.out, node.Port(), DemoPort));
    const std::string expected = ReadFile(folder + "/expected_output.txt");
    const std::size_t compared = isRoot ? std::string::npos : expected.find("DR.Node/status/1");
    EXPECT_EQ(normal.out.substr(0, compared), expected.substr(0, compared));
}

// -------------------------------------------------------------------------------------- methods

TEST_F(NodeRegistryTest, CreateReturnsANewUuid)
{
    const std::string uuid = "[0-9a-f]{8}-[0-9a-f]{4}-[0-9a-f]{4}-[0-9a-f]{4}-[0-9a-f]{12}";
    const std::string first = Create("a");
    const std::string second = Create("b");
    EXPECT_THAT(first, MatchesRegex(uuid));
    EXPECT_THAT(second, MatchesRegex(uuid));
    EXPECT_NE(first, second);
}

TEST_F(NodeRegistryTest, GetFindsTheNodeByIdAndByName)
{
    const std::string id = Create("a");
    EXPECT_EQ(Ask(Call("get", Text("id", id))), SuccessText(NodeText(id, "a")));
    EXPECT_EQ(Ask(Call("get", R"("name":"a")")), SuccessText(NodeText(id, "a")));
}

TEST_F(NodeRegistryTest, CreateAcceptsValuesAtTheLimits)
{
    const std::string name(64, 'n');
    const std::string address(253, 'a');
    const std::string volume = "/volume" + std::string(4096 - 7, 'v');
    const Response created(
        Ask(Call("create", Text("name", name) + "," + Text("address", address) +
                               R"(,"port":65535,"enabled":false,)" + Text("volume", volume))));
    const std::string id = created.getDataFieldtoStr("id");
    EXPECT_EQ(Ask(Call("get", Text("name", name))),
              SuccessText(NodeText(id, name, address, 65535, volume, false)));
    EXPECT_EQ(Ask(Call("set", R"("id":")" + id + R"(","name":"n","port":1)")), IdText(id));
}

TEST_F(NodeRegistryTest, SetChangesOnlyTheGivenFields)
{
    const std::string id = Create("a");
    const std::string byId = R"("id":")" + id + R"(",)";
    const std::string byName = R"("name":"b",)";
    const struct {
        std::string params;
        std::string node;
    } steps[] = {
        {byId + R"("name":"b")", NodeText(id, "b")},
        {byName + R"("address":"c.example")", NodeText(id, "b", "c.example")},
        {byId + R"("port":5002)", NodeText(id, "b", "c.example", 5002)},
        {byName + R"("volume":"/volume2")", NodeText(id, "b", "c.example", 5002, "/volume2")},
        {byId + R"("enabled":false)", NodeText(id, "b", "c.example", 5002, "/volume2", false)},
        {byId + R"("name":"d","address":"d","port":1,"volume":"/volume3","enabled":true)",
         NodeText(id, "d", "d", 1, "/volume3")},
    };
    for (const auto& step : steps) {
        EXPECT_EQ(Ask(Call("set", step.params)), IdText(id)) << step.params;
        EXPECT_EQ(Ask(Call("get", Text("id", id))), SuccessText(step.node)) << step.params;
    }
}

TEST_F(NodeRegistryTest, DeleteRemovesTheNodeByIdAndByName)
{
    const std::string first = Create("a");
    const std::string second = Create("b");
    Create("c");
    EXPECT_EQ(Ask(Call("delete", Text("id", first))), IdText(first));
    EXPECT_EQ(Ask(Call("delete", R"("name":"b")")), IdText(second));
    EXPECT_THAT(List(), ElementsAre("c"));
}

TEST_F(NodeRegistryTest, ListSortsNamesByTheirBytes)
{
    for (const char* name : {"b", "Zürich", "a", "B", "\u00e4"}) Create(name);
    EXPECT_THAT(List(), ElementsAre("B", "Zürich", "a", "b", "\u00e4"));
}

TEST_F(NodeRegistryTest, ListReturnsWholeNodes)
{
    EXPECT_EQ(Ask(Call("list")), SuccessText(R"({"nodes":[]})"));
    const std::string id = Create("a");
    EXPECT_EQ(Ask(Call("list")), SuccessText(R"({"nodes":[)" + NodeText(id, "a") + "]}"));
}

TEST_F(NodeRegistryTest, FiltersSelectTheListedNodes)
{
    const std::string a = '"' + Create("a") + '"';
    const std::string b = '"' + Create("b") + '"';
    const std::string c = '"' + Create("c") + '"';
    Ask(Call("set", R"("name":"c","enabled":false)"));
    const struct {
        std::string filter;
        std::vector<std::string> names;
    } rows[] = {
        {R"({"ids":[)" + a + "," + c + "]}", {"a", "c"}},
        {R"({"ids":[]})", {}},
        {R"({"ids":["none"]})", {}},
        {R"({"not_ids":[)" + a + "," + c + "]}", {"b"}},
        {R"({"not_ids":[]})", {"a", "b", "c"}},
        {R"({"enabled":true})", {"a", "b"}},
        {R"({"enabled":false})", {"c"}},
        {R"({"not_enabled":true})", {"c"}},
        {R"({"not_enabled":false})", {"a", "b"}},
        {R"({"and":[{"enabled":true},{"not_ids":[)" + a + "]}]}", {"b"}},
        {R"({"and":[{"enabled":true},{"not_ids":[)" + a + R"(]},{"ids":[)" + a + "]}]}", {}},
        {R"({"or":[{"ids":[)" + b + R"(]},{"enabled":false}]})", {"b", "c"}},
        {R"({"or":[{"ids":[)" + a + R"(]},{"and":[{"enabled":true},{"ids":[)" + b + "]}]}]}",
         {"a", "b"}},
        {R"({"and":[{"or":[{"ids":[)" + a + R"(]},{"ids":[)" + c + R"(]}]},{"enabled":false}]})",
         {"c"}},
        {R"({"or":[{"and":[{"enabled":false}]}]})", {"c"}},
    };
    for (const auto& row : rows) {
        EXPECT_EQ(List(R"("filter":)" + row.filter), row.names) << row.filter;
    }
}

// This is the deepest condition that reaches SQLite. One more filter is refused before.
TEST_F(NodeRegistryTest, AFilterMayHaveThirtyTwoParts)
{
    Create("a");
    const auto nested = [](int joins, std::string filter) {
        for (int count = 0; count < joins; ++count) {
            filter.insert(0, R"({"and":[{"enabled":true},)").append("]}");
        }
        return R"("filter":)" + filter;
    };
    const std::string leaf = R"({"not_ids":["x"]})";
    const std::string innermost = R"({"or":[)" + leaf + "]}";
    EXPECT_THAT(List(nested(15, innermost)), ElementsAre("a"));
    EXPECT_EQ(Response(Ask(Call("list", nested(16, leaf)))).getErrCode(), 401);

    std::string leaves = leaf;
    for (int count = 1; count < 31; ++count) leaves += "," + leaf;
    EXPECT_THAT(List(R"("filter":{"or":[)" + leaves + "]}"), ElementsAre("a"));
    leaves += "," + leaf;
    EXPECT_EQ(Response(Ask(Call("list", R"("filter":{"or":[)" + leaves + "]}"))).getErrCode(), 401);
}

TEST_F(NodeRegistryTest, ParametersMayComeInAnyOrderAndWithBlanks)
{
    const std::string id = Create("a");
    EXPECT_EQ(
        Ask("\t{ \"name\" : \"a\", \"method\":\"get\", \"version\":1,\"api\":\"DR.Node\" } \r"),
        SuccessText(NodeText(id, "a")));
}

// ------------------------------------------------------------------------------------- refusals

// Each value is refused by create and by set.
TEST_F(NodeRegistryTest, BadFieldsAreNamed)
{
    const std::string nameRule = "must be a text of 1 to 64 bytes without control characters";
    const std::string addressRule =
        "must be a text of 1 to 253 bytes without blanks and control characters";
    const std::string portRule = "must be an integer from 1 to 65535";
    const std::string volumeRule =
        "must be a path that begins with /volume, of at most 4096 bytes without control characters";
    const std::string enabledRule = "must be true or false";
    const struct {
        std::string field;
        std::string value;
        std::string reason;
    } rows[] = {
        {"name", R"("")", nameRule},
        {"name", "7", nameRule},
        {"name", "null", nameRule},
        {"name", R"(["a"])", nameRule},
        {"name", R"({"a":"a"})", nameRule},
        {"name", '"' + std::string(65, 'n') + '"', nameRule},
        {"name", '"' + std::string(1'000'000, 'n') + '"', nameRule},
        {"name", R"("a\u0000b")", nameRule},
        {"name", R"("a\nb")", nameRule},
        {"name", "\"a\tb\"", nameRule},
        {"name", R"("a\u007f")", nameRule},
        {"name", R"("a\u009b")", nameRule},
        {"name", R"("a\udc00")", nameRule},
        {"name", "\"a\xff\"", nameRule},
        {"name", "\"a\x80\"", nameRule},
        {"name", "\"a\xc0\xaf\"", nameRule},
        {"name", "\"a\xe0\x80\xaf\"", nameRule},
        {"name", "\"a\xf0\x80\x80\xaf\"", nameRule},
        {"name", "\"a\xf4\x90\x80\x80\"", nameRule},
        {"name", "\"a\xe2\x82\"", nameRule},
        {"address", R"("")", addressRule},
        {"address", R"("a b")", addressRule},
        {"address", R"("a\u0000")", addressRule},
        {"address", "\"a\xff\"", addressRule},
        {"address", "7", addressRule},
        {"address", '"' + std::string(254, 'a') + '"', addressRule},
        {"port", "0", portRule},
        {"port", "-1", portRule},
        {"port", "65536", portRule},
        {"port", "4294967297", portRule},
        {"port", "1.5", portRule},
        {"port", R"("1")", portRule},
        {"port", "true", portRule},
        {"port", "null", portRule},
        {"volume", R"("")", volumeRule},
        {"volume", R"("/volum")", volumeRule},
        {"volume", R"("volume1")", volumeRule},
        {"volume", R"("/volume1\u0000")", volumeRule},
        {"volume", "\"/volume1\xff\"", volumeRule},
        {"volume", "7", volumeRule},
        {"volume", "\"/volume" + std::string(4090, 'v') + '"', volumeRule},
        {"enabled", "1", enabledRule},
        {"enabled", R"("true")", enabledRule},
        {"enabled", "null", enabledRule},
    };
    Program handler({ProgramFile, "--db", database});
    for (const auto& row : rows) {
        const std::string refusal = FailureText(401, row.field, row.reason);
        const std::string given = '"' + row.field + "\":" + row.value;
        std::string created = given;
        for (const std::string field :
             {R"("name":"a")", R"("address":"a")", R"("port":1)", R"("volume":"/volume1")"}) {
            const bool isGiven = field.find('"' + row.field + '"') == 0;
            if (!isGiven) created += "," + field;
        }
        handler.Send(Call("create", created) + "\n");
        EXPECT_EQ(handler.ReadLine(), refusal) << given.substr(0, 200);
        handler.Send(Call("set", R"("id":"a",)" + given) + "\n");
        EXPECT_EQ(handler.ReadLine(), refusal) << given.substr(0, 200);
    }
    handler.Send(Call("list") + "\n");
    EXPECT_EQ(handler.ReadLine(), SuccessText(R"({"nodes":[]})"));
    EXPECT_EQ(handler.Finish().code, 0);
}

TEST_F(NodeRegistryTest, MissingAndUnknownParametersAreNamed)
{
    const std::string keyRule = "must be a text of 1 to 64 bytes without control characters";
    const std::string noKey = "is missing; an id or a name is needed";
    const std::string only = "only these can be given: ";
    const std::string nothing = "nothing is given that could be changed";
    ExpectRefused({
        {"create", "", "name", "is missing"},
        {"create", R"("name":"a","port":1,"volume":"/volume1")", "address", "is missing"},
        {"create", R"("name":"a","address":"a","volume":"/volume1")", "port", "is missing"},
        {"create", R"("name":"a","address":"a","port":1)", "volume", "is missing"},
        {"create", R"("id":"a","name":"a")", "parameters",
         only + "name, address, port, volume, enabled"},
        {"get", "", "id", noKey},
        {"get", R"("id":7)", "id", keyRule},
        {"get", R"("id":"")", "id", keyRule},
        {"get", R"("name":"a\u0000")", "name", keyRule},
        {"get", R"("id":"a","name":"a")", "parameters", only + "id"},
        {"get", R"("name":"a","port":1)", "parameters", only + "name"},
        {"set", R"("port":1)", "id", noKey},
        {"set", R"("id":"a")", "parameters", nothing},
        {"set", R"("name":"a")", "parameters", nothing},
        {"set", R"("name":"a","prot":1)", "parameters",
         only + "id, name, address, port, volume, enabled"},
        {"delete", "", "id", noKey},
        {"delete", R"("name":[])", "name", keyRule},
        {"delete", R"("id":"a","name":"a")", "parameters", only + "id"},
        {"list", R"("ids":["a"])", "parameters", only + "filter"},
    });
}

TEST_F(NodeRegistryTest, BadFiltersAreRefused)
{
    for (const char* filter :
         {"null", "[]", "{}", R"({"nodes":[]})", R"({"enabled":true,"ids":[]})", R"({"enabled":1})",
          R"({"not_enabled":"true"})", R"({"ids":"a"})", R"({"ids":[1]})", R"({"ids":[""]})",
          R"({"ids":["a\u0000"]})", R"({"not_ids":[null]})", R"({"and":[]})", R"({"or":{}})",
          R"({"or":[{"enabled":true},{}]})"}) {
        EXPECT_EQ(Ask(Call("list", R"("filter":)" + std::string(filter))),
                  FailureText(401, "filter",
                              "must be an object with one of and, or, ids, not_ids, enabled, "
                              "not_enabled, holding at most 32 filters in all"))
            << filter;
    }
}

TEST_F(NodeRegistryTest, BadLinesGetAReplyAndTheNextLineIsServed)
{
    const std::string good = Call("list");
    const struct {
        std::string line;
        std::string reply;
    } rows[] = {
        {"", NoJson()},
        {"   ", NoJson()},
        {"[]", NoJson()},
        {"[" + good + "]", NoJson()},
        {"7", NoJson()},
        {"null", NoJson()},
        {"\"text\"", NoJson()},
        {"list", NoJson()},
        {good.substr(0, good.size() - 1), NoJson()},
        {good + good, NoJson()},
        {good + " x", NoJson()},
        {good + ",", NoJson()},
        {good + "// comment", NoJson()},
        {"/* comment */" + good, NoJson()},
        {R"({"api":"DR.Node","version":1,"method":"list",})", NoJson()},
        {R"({"api":"DR.Node","version":1,"method":"list","method":"get"})", NoJson()},
        {good + std::string(1, '\0'), NoJson()},
        {good + std::string("\0{}", 3), NoJson()},
        {R"({"api":"DR.Node","version":1,"method":"li)" + std::string(1, '\0') + R"(st"})",
         NoJson()},
        {std::string(1, '\0'), NoJson()},
        {std::string(100'000, '['), NoJson()},
        {Call("list", R"("filter":)" + std::string(100'000, '[') + std::string(100'000, ']')),
         NoJson()},
        {std::string(1'000'000, '\xff'), NoJson()},
        {"\xff" + good, NoJson()},
        {"{}", NoRequest()},
        {R"({"api":"DR.Node","method":"list"})", NoRequest()},
        {R"({"api":"DR.Node","version":1})", NoRequest()},
        {R"({"version":1,"method":"list"})", NoRequest()},
        {R"({"api":"","version":1,"method":"list"})", NoRequest()},
        {R"({"api":7,"version":1,"method":"list"})", NoRequest()},
        {R"({"api":"DR.Node","version":"1","method":"list"})", NoRequest()},
        {R"({"api":"DR.Node","version":0,"method":"list"})", NoRequest()},
        {R"({"api":"DR.Node","version":-1,"method":"list"})", NoRequest()},
        {R"({"api":"DR.Node","version":4294967297,"method":"list"})", NoRequest()},
    };
    Program handler({ProgramFile, "--db", database});
    for (const auto& row : rows) {
        handler.Send(row.line + "\n" + good + "\n");
        EXPECT_EQ(handler.ReadLine(), row.reply) << row.line.substr(0, 200);
        EXPECT_EQ(handler.ReadLine(), SuccessText(R"({"nodes":[]})")) << row.line.substr(0, 200);
    }
    EXPECT_EQ(handler.Finish().code, 0);
}

TEST_F(NodeRegistryTest, TheLastLineNeedsNoNewline)
{
    EXPECT_EQ(Run({}, Call("list")).out, SuccessText(R"({"nodes":[]})") + "\n");
    EXPECT_EQ(Run({}, "\n\n").out, NoJson() + "\n" + NoJson() + "\n");
    EXPECT_EQ(Run({}, "").out, "");
}

TEST_F(NodeRegistryTest, UnknownApisVersionsAndMethodsAreRefused)
{
    const struct {
        std::string line;
        std::string what;
    } rows[] = {
        {R"({"api":"DR.Task","version":1,"method":"list"})", "api"},
        {R"({"api":"dr.node","version":1,"method":"list"})", "api"},
        {"{\"api\":\"\xff\",\"version\":1,\"method\":\"list\"}", "api"},
        {R"({"api":"DR.Node","version":2,"method":"list"})", "version"},
        {R"({"api":"DR.Node","version":1,"method":"List"})", "method"},
        {R"({"api":"DR.Node","version":1,"method":"reboot"})", "method"},
        {R"({"api":"DR.Node","version":1,"method":"list\u0000"})", "method"},
    };
    for (const auto& row : rows) {
        EXPECT_EQ(Ask(row.line), FailureText(526, row.what, "is unknown")) << row.line;
    }
}

TEST_F(NodeRegistryTest, UnknownNodesAreRefused)
{
    Create("a");
    const std::string byId = Text("id", UnknownId);
    for (const std::string method : {"get", "set", "delete"}) {
        const std::string change = method == "set" ? R"(,"port":1)" : "";
        EXPECT_EQ(Ask(Call(method, byId + change)), FailureText(507, "id", "belongs to no node"));
        EXPECT_EQ(Ask(Call(method, R"("name":"A")" + change)),
                  FailureText(507, "name", "belongs to no node"));
    }
    EXPECT_THAT(List(), ElementsAre("a"));
}

TEST_F(NodeRegistryTest, ATakenNameIsRefused)
{
    const std::string a = Create("a");
    const std::string b = Create("b");
    EXPECT_EQ(Ask(CreateCall("a")), NameTaken());
    EXPECT_EQ(Ask(Call("set", R"("id":")" + b + R"(","name":"a","port":1)")), NameTaken());
    EXPECT_EQ(Ask(Call("get", R"("name":"b")")), SuccessText(NodeText(b, "b")));
    // The program looked for the name first: no statement failed.
    EXPECT_EQ(Run({"--verbose"}, CreateCall("a")).err, "");
    EXPECT_EQ(Ask(Call("set", R"("id":")" + a + R"(","name":"a")")), IdText(a));
    EXPECT_NE(Create("A"), "");
    EXPECT_THAT(List(), ElementsAre("A", "a", "b"));
}

// ------------------------------------------------------------------------------------ injection

TEST_F(NodeRegistryTest, TextsThatLookLikeSqlAreStoredUnchanged)
{
    const std::string volume = "/volume1/" + std::string(Injection);
    const std::string address = "x';DROP/**/TABLE/**/nodes;--";  // blanks are not allowed there
    const std::string name = Text("name", Injection);
    const std::string fields =
        name + "," + Text("address", address) + R"(,"port":1,)" + Text("volume", volume);
    const std::string id = Response(Ask(Call("create", fields))).getDataFieldtoStr("id");
    EXPECT_EQ(Ask(Call("get", name)), SuccessText(NodeText(id, Injection, address, 1, volume)));

    const std::string other = Create("other");
    const std::string byId = Text("id", other) + ",";
    EXPECT_EQ(Ask(Call("set", byId + fields)), NameTaken());
    EXPECT_EQ(Ask(Call("delete", name)), IdText(id));
    EXPECT_EQ(Ask(Call("set", byId + fields)), IdText(other));
    EXPECT_EQ(Ask(Call("get", name)), SuccessText(NodeText(other, Injection, address, 1, volume)));
    EXPECT_EQ(Ask(Call("set", name + R"(,"address":"'","volume":"/volume'--")")), IdText(other));
    EXPECT_EQ(
        Ask(Call("list")),
        SuccessText(R"({"nodes":[)" + NodeText(other, Injection, "'", 1, "/volume'--") + "]}"));
}

TEST_F(NodeRegistryTest, KeysAndListsNeverChangeTheMeaningOfAStatement)
{
    Create("a");
    Create("b");
    for (const std::string text : {"x'; DROP TABLE nodes; --", "' OR '1'='1", "') OR (1=1", "a' --",
                                   R"(\\' OR 1=1 --)", "''", "'", "x','y') OR enabled IN (1"}) {
        for (const std::string field : {"id", "name"}) {
            const std::string key = Text(field, text);
            const std::string unknown = FailureText(507, field, "belongs to no node");
            EXPECT_EQ(Ask(Call("get", key)), unknown) << text;
            EXPECT_EQ(Ask(Call("set", key + R"(,"enabled":false)")), unknown) << text;
            EXPECT_EQ(Ask(Call("delete", key)), unknown) << text;
        }
        const std::string ids = R"({"ids":["none",")" + text + R"("]})";
        const std::string notIds = R"({"not_ids":["none",")" + text + R"("]})";
        EXPECT_THAT(List(R"("filter":)" + ids), ElementsAre()) << text;
        EXPECT_THAT(List(R"("filter":)" + notIds), ElementsAre("a", "b")) << text;
        EXPECT_THAT(List(R"("filter":{"or":[{"enabled":false},)" + ids + "]}"), ElementsAre())
            << text;
        EXPECT_THAT(List(R"("filter":{"and":[{"enabled":true},)" + notIds + "]}"),
                    ElementsAre("a", "b"))
            << text;
        EXPECT_EQ(Response(Ask(Call(text))).getErrCode(), 526) << text;
    }
    EXPECT_THAT(List(), ElementsAre("a", "b"));
}

// ----------------------------------------------------------------------------- database failures

TEST_F(NodeRegistryTest, ADatabaseThatCannotBeOpenedIsReportedAtOnce)
{
    database = dir.Path();
    EXPECT_EQ(Ask(Call("list")), R"({"error":{"code":404},"success":false})");
}

// This test waits for the pauses between the attempts.
TEST_F(NodeRegistryTest, AFileThatIsNoDatabaseIsReportedWithEveryAttempt)
{
    WriteFile(database, std::string(1000, 'x'));
    const ProgramResult result = Run({}, Call("get", R"("name":"a")"));
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.err, "");
    const Response response(result.out);
    EXPECT_EQ(response.getErrCode(), 404);
    const Json::Value tries = response.getErrMsg();
    ASSERT_TRUE(tries.isArray());
    ASSERT_EQ(tries.size(), 6U);
    for (const Json::Value& each : tries) {
        EXPECT_EQ(each["err_code"], 404);
        EXPECT_EQ(each["err_code_str"], "ERR_DATABASE_OPERATION");
        EXPECT_EQ(each["err_msg"]["sqlite_errcode"], 26);
        EXPECT_EQ(each["err_msg"]["sqlite_errmsg"], "file is not a database");
    }
}

TEST_F(NodeRegistryTest, ADamagedRowIsReported)
{
    Create("a");
    Create("b");
    {
        OrvaDRCore::SqliteDB db(database, 0);
        ASSERT_TRUE(db.Open() && db.Exec("UPDATE nodes SET enabled=7 WHERE name='a'"));
    }
    EXPECT_EQ(Ask(Call("get", R"("name":"a")")),
              FailureText(513, "name", "belongs to a row that is damaged"));
    EXPECT_EQ(Ask(Call("list")), FailureText(515, "nodes", "hold a row that is damaged"));
    EXPECT_THAT(List(R"("filter":{"enabled":true})"), ElementsAre("b"));
}

// The program that generates ids cannot start, because its library is an empty file.
TEST_F(NodeRegistryTest, ANodeWithoutAnIdIsNotCreated)
{
    WriteFile(dir.File("libuuid.so.1"), "");
    const ProgramResult result =
        RunInShell(R"(LD_LIBRARY_PATH="${1%/*}" exec "$0" --db "$1")", CreateCall("b"));
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.out, FailureText(510, "id", "cannot be made") + "\n");
    EXPECT_THAT(List(), ElementsAre());
}

// ---------------------------------------------------------------------- options, input and output

TEST_F(NodeRegistryTest, WrongOptionsPrintTheUsage)
{
    const std::vector<std::string> rows[] = {
        {"--nothing"},
        {"-x"},
        {"--db"},
        {"--db", ""},
        {"one", "two"},
        {"-", "-"},
        {"--help", "-v"},
        {"--status-timeout"},
        {"--status-timeout", ""},
        {"--status-timeout", "-1"},
        {"--status-timeout", "1s"},
        {"--status-timeout", "99999999999"},
        {"--status-timeout", "0x10"},
        {"--status-timeout=1s"},
        {"--db="},
        {"--status-dir"},
        {"--status-dir", ""},
    };
    for (const std::vector<std::string>& options : rows) {
        const ProgramResult result = Run(options);
        EXPECT_EQ(result.code, 2) << options[0];
        EXPECT_EQ(result.out, "") << options[0];
        EXPECT_EQ(result.err, Usage) << options[0];
    }
}

TEST_F(NodeRegistryTest, AValueMayFollowAnEqualsSignAndTheLastOneCounts)
{
    const std::string other = dir.File("other.db");
    EXPECT_EQ(Run({"--db=" + other}, CreateCall("a")).code, 0);
    EXPECT_TRUE(std::filesystem::exists(other));
    EXPECT_FALSE(std::filesystem::exists(database));
}

TEST_F(NodeRegistryTest, NumbersAreDecimalEvenWithLeadingZeros)
{
    EXPECT_EQ(Run({"--status-timeout", "08"}, Call("list")).code, 0);
}

TEST_F(NodeRegistryTest, HelpListsOptionsMethodsAndCodes)
{
    const ProgramResult result = Run({"--help"}, Call("list"));
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.err, "");
    EXPECT_THAT(result.out, StartsWith(Usage));
    for (const char* word : {"--db FILE",
                             "--status-timeout SECONDS",
                             "--status-dir DIRECTORY",
                             "--verbose",
                             "--pretty",
                             "--help",
                             "create",
                             "get",
                             "set",
                             "delete",
                             "list",
                             "status",
                             "import",
                             "export",
                             "restore",
                             "filter",
                             "not_ids",
                             "not_enabled",
                             "\"and\"",
                             "\"or\"",
                             "401 BAD_PARAMETER",
                             "404 ERR_DATABASE_OPERATION",
                             "507 ERR_NODE_NOT_EXIST",
                             "508 ERR_NODE_EXIST",
                             "510 ERR_NODE_CREATE",
                             "513 ERR_NODE_GET",
                             "514 ERR_NODE_SET",
                             "515 ERR_NODE_LIST",
                             "525 ERR_NO_PERMISSION",
                             "526 ERR_NO_SUCH_API",
                             "Exit codes:"}) {
        EXPECT_THAT(result.out, HasSubstr(word));
    }
}

TEST_F(NodeRegistryTest, ReadsRequestsFromAFileOrFromStandardInput)
{
    const std::string input = dir.File("input");
    WriteFile(input, Call("list") + "\n");
    const std::string reply = SuccessText(R"({"nodes":[]})") + "\n";
    EXPECT_EQ(Run({input}, "not read").out, reply);
    EXPECT_EQ(Run({"-"}, Call("list")).out, reply);
    EXPECT_EQ(Run({}, Call("list")).out, reply);
}

TEST_F(NodeRegistryTest, TheDatabaseIsInTheWorkingDirectoryByDefault)
{
    const ProgramResult result = RunInShell(R"(cd "${1%/*}" && exec "$0")", CreateCall("a"));
    EXPECT_EQ(result.code, 0);
    database = dir.File("node_registry.db");
    EXPECT_THAT(List(), ElementsAre("a"));
}

TEST_F(NodeRegistryTest, UnreadableInputIsAFailure)
{
    const ProgramResult missing = Run({dir.File("none")});
    EXPECT_EQ(missing.code, 1);
    EXPECT_EQ(missing.err, "node_registry: " + dir.File("none") + ": No such file or directory\n");
    const ProgramResult directory = Run({dir.Path()});
    EXPECT_EQ(directory.code, 1);
    EXPECT_EQ(directory.err, "node_registry: " + dir.Path() + ": Is a directory\n");
    const ProgramResult redirected = RunInShell(R"(exec "$0" --db "$1" < /)");
    EXPECT_EQ(redirected.code, 1);
    EXPECT_EQ(redirected.err, "node_registry: -: Is a directory\n");
}

// When a socket is closed with unread data, its peer gets a reset.
TEST_F(NodeRegistryTest, ALineCutOffByAFailedReadGetsNoReply)
{
    std::array<int, 2> sockets{};  // inherited by the program
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM, 0, sockets.data()), 0);
    const std::string lines = CreateCall("a") + "\n" + CreateCall("b");
    ASSERT_EQ(::write(sockets[0], "unread", 6), 6);
    ASSERT_EQ(::write(sockets[1], lines.data(), lines.size()), static_cast<ssize_t>(lines.size()));
    ::close(sockets[1]);
    const ProgramResult result =
        RunInShell(R"(exec "$0" --db "$1" <&)" + std::to_string(sockets[0]));
    ::close(sockets[0]);
    EXPECT_EQ(result.code, 1);
    EXPECT_EQ(result.err, "node_registry: -: Connection reset by peer\n");
    EXPECT_THAT(List(), ElementsAre("a"));
}

TEST_F(NodeRegistryTest, UnwritableOutputIsAFailure)
{
    const std::string message = "node_registry: standard output: No space left on device\n";
    for (const std::string option : {"", " --pretty", " --help"}) {
        const ProgramResult result =
            RunInShell(R"(exec "$0" --db "$1")" + option + " > /dev/full", Call("list"));
        EXPECT_EQ(result.code, 1) << option;
        EXPECT_EQ(result.err, message) << option;
    }
}

TEST_F(NodeRegistryTest, AReaderThatClosesThePipeIsAFailure)
{
    Program handler({ProgramFile, "--db", database});
    handler.Send(Call("list") + "\n");
    EXPECT_EQ(handler.ReadLine(), SuccessText(R"({"nodes":[]})"));
    handler.CloseOutput();
    handler.Send(Call("list") + "\n");
    const ProgramResult result = handler.Finish();
    EXPECT_EQ(result.code, 1);
    EXPECT_EQ(result.err, "node_registry: standard output: Broken pipe\n");
}

TEST_F(NodeRegistryTest, SendsEachReplyBeforeItReadsTheNextRequest)
{
    Program handler({ProgramFile, "--db", database});
    for (const char* name : {"a", "b", "c"}) {
        handler.Send(CreateCall(name) + "\n");
        EXPECT_TRUE(Response(handler.ReadLine()).isSuccess());
    }
    EXPECT_EQ(handler.Finish().code, 0);
}

TEST_F(NodeRegistryTest, VerbosePrintsTheLogToStandardError)
{
    database = dir.Path();
    const ProgramResult result = Run({"--verbose"}, Call("list"));
    EXPECT_EQ(result.code, 0);
    const std::vector<std::string> lines = Lines(result.err);
    ASSERT_EQ(lines.size(), 2U);
    const std::string prefix = R"(node_registry\[[0-9]+\]: sqlite_db\.cpp:[0-9]+)";
    EXPECT_THAT(lines[0], MatchesRegex(prefix + R"(\(Open\)\[WARN\]\[[0-9]+\]: Failed to open db)" +
                                       R"(\[)" + database + R"(\])"));
    EXPECT_THAT(lines[1],
                MatchesRegex(prefix + R"(\(SelectRecords\)\[ERR\]\[[0-9]+\]: Failed to open db )" +
                             R"(\[)" + database + R"(\])"));
}

TEST_F(NodeRegistryTest, PrettyPrintsRequestsAndTheNamesOfErrors)
{
    const struct {
        std::string line;
        std::string request;
        std::string answer;
    } rows[] = {
        {"", "(no request) ", NoJson() + " (BAD_PARAMETER)"},
        {"\x1b[31mred\xff", "(no request) ?[31mred?", NoJson() + " (BAD_PARAMETER)"},
        {"{\"api\":\"\xc2\x9b\",\"version\":3,\"method\":\"m\"}", "?\?/m/3",
         FailureText(526, "api", "is unknown") + " (ERR_NO_SUCH_API)"},
        {std::string(1'000'000, '['), "(no request) " + std::string(147, '[') + "...",
         NoJson() + " (BAD_PARAMETER)"},
        {std::string(146, 'x') + "ü", "(no request) " + std::string(146, 'x') + "...",
         NoJson() + " (BAD_PARAMETER)"},
        {Call("get", R"("name":"Zürich")"), R"(DR.Node/get/1 {"name":"Zürich"})",
         FailureText(507, "name", "belongs to no node") + " (ERR_NODE_NOT_EXIST)"},
        {Call("list"), "DR.Node/list/1", SuccessText(R"({"nodes":[]})")},
    };
    for (const auto& row : rows) {
        const ProgramResult result = Run({"--pretty"}, row.line + "\n");
        EXPECT_EQ(result.out, row.request + "\n  <- " + row.answer + "\n");
    }
}

// ------------------------------------------------------------------- several programs on one file

class NodeRegistriesTest : public NodeRegistryTest {
  protected:
    void Start(int count)
    {
        for (int index = 0; index < count; ++index) {
            handlers.push_back(
                std::make_unique<Program>(std::vector<std::string>{ProgramFile, "--db", database}));
        }
    }

    std::vector<std::unique_ptr<Program>> handlers;
};

TEST_F(NodeRegistriesTest, EightProgramsCreateNodesAtTheSameTime)
{
    constexpr int Nodes = 200;
    Start(8);
    int start = 0;
    for (const auto& handler : handlers) {
        for (int node = start; node < start + Nodes; ++node) {
            handler->Send(CreateCall("node-" + std::to_string(node)) + "\n");
        }
        start += Nodes;
    }
    for (const auto& handler : handlers) {
        for (int node = 0; node < Nodes; ++node) {
            const std::string reply = handler->ReadLine();
            EXPECT_TRUE(Response(reply).isSuccess()) << reply;
        }
        EXPECT_EQ(handler->Finish().code, 0);
    }
    EXPECT_EQ(List().size(), 1600U);
}

// A program that finds the name free but inserts second is refused by the schema, after all
// attempts: that takes some seconds a round.
TEST_F(NodeRegistriesTest, OneOfEightProgramsGetsTheName)
{
    Start(8);
    for (const std::string name : {"a", "b", "c"}) {
        for (const auto& handler : handlers) handler->Send(CreateCall(name) + "\n");
        int winners = 0;
        for (const auto& handler : handlers) {
            const std::string reply = handler->ReadLine();
            if (Response(reply).isSuccess()) {
                ++winners;
            } else {
                EXPECT_EQ(reply, NameTaken());
            }
        }
        EXPECT_EQ(winners, 1) << name;
    }
    for (const auto& handler : handlers) EXPECT_EQ(handler->Finish().code, 0);
    EXPECT_THAT(List(), ElementsAre("a", "b", "c"));
}

// An index that ignores case refuses a name that looked free, as if another program had just taken
// it.
TEST_F(NodeRegistriesTest, TheSchemaDecidesWhetherANameIsTaken)
{
    Create("a");
    const std::string b = Create("b");
    {
        OrvaDRCore::SqliteDB db(database, 0);
        ASSERT_TRUE(db.Open() &&
                    db.Exec("CREATE UNIQUE INDEX any_case ON nodes(name COLLATE NOCASE)"));
    }
    Start(2);
    handlers[0]->Send(CreateCall("A") + "\n");
    handlers[1]->Send(Call("set", R"("id":")" + b + R"(","name":"A")") + "\n");
    for (const auto& handler : handlers) {
        EXPECT_EQ(handler->ReadLine(), NameTaken());
        EXPECT_EQ(handler->Finish().code, 0);
    }
    EXPECT_THAT(List(), ElementsAre("a", "b"));
}

}  // namespace
