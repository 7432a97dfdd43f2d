// The example node_service as a program: HTTP in, replies out, start and end. The content of the
// replies is tested with node_registry, which shares the handler.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include <orvadrcore/response.h>

#include "listener.h"
#include "node_registry.h"
#include "support/processes/await.h"
#include "support/processes/http_client.h"
#include "support/processes/program.h"

namespace {

using OrvaDRCore::Response;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::IsSupersetOf;
using ::testing::MatchesRegex;
using ::testing::StartsWith;

constexpr const char* Usage =
    "usage: node_service [--listen ADDRESS:PORT] [--threads COUNT] [--db FILE]\n"
    "                    [--status-timeout SECONDS] [--status-dir DIRECTORY]\n"
    "                    [--verbose] [--help]\n";
constexpr std::size_t MaxBody = 1'048'576;

std::string BrokenText()
{
    return FailureText(401, "request", "must be one JSON object on one line") + "\n";
}

std::string TooLargeText()
{
    return FailureText(401, "request", "must have at most 1048576 bytes") + "\n";
}

std::string NoHttpText()
{
    return FailureText(401, "request", "is no HTTP request that is understood") + "\n";
}

// The names of the nodes in the reply to a list request.
std::set<std::string> NamesOf(const std::string& reply)
{
    const Response response(reply);
    std::set<std::string> names;
    for (const Json::Value& node : response.getDataField("nodes")) {
        names.insert(node["name"].asString());
    }
    return names;
}

// Runs `body` in `count` threads, each with its number, and waits for them.
void InThreads(int count, const std::function<void(int)>& body)
{
    std::vector<std::thread> threads;
    threads.reserve(static_cast<std::size_t>(count));
    for (int number = 0; number < count; ++number) threads.emplace_back(body, number);
    for (std::thread& thread : threads) thread.join();
}

// A running service. It ends with End() or with the object.
class Service {
  public:
    explicit Service(const std::vector<std::string>& options, const std::string& address)
        : program_(Words(options, address))
    {
        const std::string line = program_.ReadLine();
        EXPECT_THAT(line, StartsWith("listening on 127.0.0.1:"));
        port_ = std::atoi(line.substr(line.rfind(':') + 1).c_str());
    }

    int Port() const { return port_; }
    std::string Address() const { return "127.0.0.1:" + std::to_string(port_); }
    pid_t Pid() const { return program_.Pid(); }
    void Kill(int signal) const { program_.Kill(signal); }

    HttpReply Ask(const std::string& request) const { return Post(port_, "/webapi", request); }

    // Ends the service. Returns what it has printed.
    ProgramResult End(int signal = SIGTERM)
    {
        program_.Kill(signal);
        return program_.Finish();
    }

    bool IsListening() const { return HttpConnection(port_).IsOpen(); }

  private:
    static std::vector<std::string> Words(const std::vector<std::string>& options,
                                          const std::string& address)
    {
        std::vector<std::string> words = {NODE_SERVICE_PROGRAM, "--listen", address};
        words.insert(words.end(), options.begin(), options.end());
        return words;
    }

    Program program_;
    int port_ = 0;
};

class NodeServiceTest : public NodeRegistryTest {
  protected:
    std::unique_ptr<Service> Start(std::vector<std::string> options = {},
                                   const std::string& address = "127.0.0.1:0") const
    {
        options.insert(options.end(), {"--db", database});
        return std::make_unique<Service>(options, address);
    }

    // Ends a service, which must have printed nothing.
    static void ExpectCleanEnd(Service& service, int signal = SIGTERM)
    {
        const ProgramResult result = service.End(signal);
        EXPECT_EQ(result.code, 0);
        EXPECT_EQ(result.out, "");
        EXPECT_EQ(result.err, "");
    }

    std::set<std::string> Files() const { return NamesIn(dir.Path()); }
};

// ------------------------------------------------------------------------------------ requests

TEST_F(NodeServiceTest, CreatesGetsAndListsNodes)
{
    const auto service = Start();
    const HttpReply created = service->Ask(CreateCall("a"));
    EXPECT_EQ(created.status, 200);
    EXPECT_THAT(created.head, HasSubstr("\r\nContent-Type: application/json\r\n"));
    const std::string id = Response(created.body).getDataFieldtoStr("id");
    EXPECT_EQ(created.body, IdText(id) + "\n");
    EXPECT_EQ(service->Ask(Call("get", Text("id", id))).body,
              SuccessText(NodeText(id, "a")) + "\n");
    EXPECT_EQ(service->Ask(Call("list")).body,
              SuccessText(R"({"nodes":[)" + NodeText(id, "a") + "]}") + "\n");
    ExpectCleanEnd(*service);
}

TEST_F(NodeServiceTest, AConnectionCarriesOneRequest)
{
    const auto service = Start();
    const HttpConnection connection(service->Port());
    const std::string request = HttpRequest("POST", "/webapi", Call("list"));
    connection.Send(request + request);
    const HttpReply reply = connection.Receive();
    EXPECT_THAT(reply.head, HasSubstr("\r\nConnection: close\r\n"));
    EXPECT_EQ(reply.body, SuccessText(R"({"nodes":[]})") + "\n");
}

TEST_F(NodeServiceTest, FailuresOfTheRegistryAreRepliesWithStatus200)
{
    const auto service = Start();
    const HttpReply missing = service->Ask(Call("get", R"("name":"a")"));
    EXPECT_EQ(missing.status, 200);
    EXPECT_EQ(missing.body, FailureText(507, "name", "belongs to no node") + "\n");
    const HttpReply unknown = service->Ask(Call("drop"));
    EXPECT_EQ(unknown.status, 200);
    EXPECT_EQ(unknown.body, FailureText(526, "method", "is unknown") + "\n");
}

TEST_F(NodeServiceTest, MalformedBodiesGetTheReplyOfAMalformedLine)
{
    const auto service = Start();
    for (const std::string& body :
         {std::string(), std::string("{"), std::string("7"), Call("list") + "x",
          std::string("{\0}", 3), std::string(MaxBody, ' '), std::string(MaxBody, '[')}) {
        const HttpReply reply = service->Ask(body);
        EXPECT_EQ(reply.status, 200) << body.substr(0, 100);
        EXPECT_EQ(reply.body, BrokenText()) << body.substr(0, 100);
    }
    EXPECT_THAT(Files(), IsEmpty());
    ExpectCleanEnd(*service);
}

// The service reads and discards up to 8 MiB, so that a client that reads only after sending gets
// the reply.
TEST_F(NodeServiceTest, OversizedBodiesAreRefused)
{
    const auto service = Start();
    for (const std::size_t size : {MaxBody + 1, 8 * MaxBody, 8 * MaxBody + 1}) {
        const HttpReply reply = service->Ask(std::string(size, ' '));
        EXPECT_EQ(reply.status, 413) << size;
        EXPECT_EQ(reply.body, TooLargeText()) << size;
    }
    EXPECT_THAT(Files(), IsEmpty());
    ExpectCleanEnd(*service);
}

TEST_F(NodeServiceTest, ChunkedBodiesThatGrowTooLargeAreRefused)
{
    const auto service = Start();
    const HttpConnection connection(service->Port());
    connection.Send("POST /webapi HTTP/1.1\r\nTransfer-Encoding: chunked\r\n\r\n");
    const std::string chunk = "10000\r\n" + std::string(65536, ' ') + "\r\n";
    for (std::size_t sent = 0; sent <= MaxBody; sent += 65536) connection.Send(chunk);
    connection.Send("0\r\n\r\n");
    const HttpReply reply = connection.Receive();
    EXPECT_EQ(reply.status, 413);
    EXPECT_EQ(reply.body, TooLargeText());
    EXPECT_THAT(Files(), IsEmpty());
}

TEST_F(NodeServiceTest, ClientsThatExpectAContinueAreRefusedAtOnce)
{
    const auto service = Start();
    const HttpConnection connection(service->Port());
    connection.Send(
        "POST /webapi HTTP/1.1\r\nExpect: 100-continue\r\nContent-Length: 2000000\r\n\r\n");
    const HttpReply reply = connection.Receive();
    EXPECT_EQ(reply.status, 413);
    EXPECT_EQ(reply.body, TooLargeText());
}

TEST_F(NodeServiceTest, OtherPathsAndMethodsAreUnknown)
{
    const auto service = Start();
    const std::string path = FailureText(526, "path", "is unknown") + "\n";
    const std::string method = FailureText(526, "method", "must be POST") + "\n";
    const struct {
        std::string method;
        std::string path;
        int status;
        std::string body;
    } rows[] = {
        {"POST", "/", 404, path},           {"POST", "/webapi/", 404, path},
        {"POST", "/webapi2", 404, path},    {"GET", "/../etc/passwd", 404, path},
        {"DELETE", "/x", 404, path},        {"GET", "/webapi", 405, method},
        {"PUT", "/webapi", 405, method},    {"PATCH", "/webapi", 405, method},
        {"DELETE", "/webapi", 405, method}, {"OPTIONS", "/webapi", 405, method},
    };
    for (const auto& row : rows) {
        const HttpConnection connection(service->Port());
        connection.Send(HttpRequest(row.method, row.path, CreateCall("a")));
        const HttpReply reply = connection.Receive();
        EXPECT_EQ(reply.status, row.status) << row.method << row.path;
        EXPECT_EQ(reply.body, row.body) << row.method << row.path;
        EXPECT_THAT(reply.head, HasSubstr("\r\nContent-Type: application/json\r\n"));
    }
    EXPECT_EQ(Post(service->Port(), "/webapi?x=1", Call("list")).status, 200);
    ExpectCleanEnd(*service);
}

TEST_F(NodeServiceTest, MalformedHttpGetsAReply)
{
    const auto service = Start();
    for (const std::string text :
         {"NONSENSE\r\n\r\n", "POST /webapi HTTP/1.1\r\nTransfer-Encoding: chunked\r\n\r\nzz\r\n",
          "BREW /webapi HTTP/1.1\r\n\r\n"}) {
        const HttpConnection connection(service->Port());
        connection.Send(text);
        const HttpReply reply = connection.Receive();
        EXPECT_EQ(reply.status, 400) << text;
        EXPECT_EQ(reply.body, NoHttpText()) << text;
    }
    const HttpConnection connection(service->Port());
    connection.Send(HttpRequest("GET", "/" + std::string(9000, 'a'), ""));
    EXPECT_EQ(connection.Receive().status, 414);
    EXPECT_THAT(Files(), IsEmpty());
}

TEST_F(NodeServiceTest, MultipartFormsAreRefused)
{
    const auto service = Start();
    const HttpConnection connection(service->Port());
    connection.Send(
        "POST /webapi HTTP/1.1\r\nContent-Type: multipart/form-data; boundary=b\r\n"
        "Content-Length: 6\r\n\r\n--b--\n");
    const HttpReply reply = connection.Receive();
    EXPECT_EQ(reply.status, 415);
    EXPECT_EQ(reply.body,
              FailureText(401, "request", "must be one JSON object, no form with files") + "\n");
}

// ------------------------------------------------------------------------------------- many clients

TEST_F(NodeServiceTest, ManyClientsCreateNodesAtTheSameTime)
{
    constexpr int Clients = 32;
    constexpr int Nodes = 5;
    const auto service = Start({"--threads", "4"});
    InThreads(Clients, [&](int client) {
        for (int node = 0; node < Nodes; ++node) {
            const std::string name = std::to_string(client) + "-" + std::to_string(node);
            const HttpReply reply = service->Ask(CreateCall(name));
            EXPECT_TRUE(Response(reply.body).isSuccess()) << reply.status << reply.body;
        }
    });
    EXPECT_EQ(NamesOf(service->Ask(Call("list")).body).size(), Clients * Nodes);
    ExpectCleanEnd(*service);
}

TEST_F(NodeServiceTest, SilentClientsAreDropped)
{
    const auto service = Start({"--threads", "1"});
    const HttpConnection silent(service->Port());
    EXPECT_EQ(service->Ask(Call("list")).status, 200);
    EXPECT_EQ(silent.Receive().status, 0);
    ExpectCleanEnd(*service);
}

TEST_F(NodeServiceTest, ClientsThatLeaveBeforeTheReplyDoNoHarm)
{
    const auto service = Start();
    for (int client = 0; client < 20; ++client) {
        HttpConnection(service->Port()).Send(HttpRequest("POST", "/webapi", Call("list")));
        HttpConnection(service->Port()).Send("POST /webapi HTTP/1.1\r\nContent-Length: 9\r\n\r\n{");
    }
    EXPECT_EQ(service->Ask(Call("list")).status, 200);
    ExpectCleanEnd(*service);
}

TEST_F(NodeServiceTest, TwoServicesShareADatabase)
{
    const auto one = Start();
    const auto other = Start();
    std::thread client([&] {
        for (const char* name : {"a", "b", "c"}) {
            EXPECT_TRUE(Response(one->Ask(CreateCall(name)).body).isSuccess());
        }
    });
    for (const char* name : {"d", "e", "f"}) {
        EXPECT_TRUE(Response(other->Ask(CreateCall(name)).body).isSuccess());
    }
    client.join();
    const std::set<std::string> all = {"a", "b", "c", "d", "e", "f"};
    EXPECT_EQ(NamesOf(one->Ask(Call("list")).body), all);
    EXPECT_EQ(NamesOf(other->Ask(Call("list")).body), all);
    EXPECT_EQ(Response(other->Ask(CreateCall("a")).body).getErrCode(), 508);
    ExpectCleanEnd(*one);
    ExpectCleanEnd(*other);
}

TEST_F(NodeServiceTest, LogsEachRequestInOneLine)
{
    const auto service = Start({"--verbose"});
    service->Ask(Call("list"));
    Post(service->Port(), "/a%0ab", "");
    const std::vector<std::string> lines = Lines(service->End().err);
    const std::string prefix = R"(node_service\[[0-9]+\]: 127\.0\.0\.1 POST )";
    EXPECT_THAT(lines, ElementsAre(MatchesRegex(prefix + "/webapi 200"),
                                   MatchesRegex(prefix + R"(/a\?b 404)")));
}

// -------------------------------------------------------------------------------------------- status

class NodeServiceStatusTest : public NodeServiceTest {
  protected:
    static constexpr int SilentNodes = 50;  // their probes take fifteen seconds

    // Whether this user may use the status, as root may. If not, checks what others get.
    bool HasStatus() const
    {
        if (::geteuid() == 0) return true;
        EXPECT_EQ(Response(Start()->Ask(Call("status")).body).getErrCode(), 525);
        return false;
    }

    // Starts a refresh that outlasts the test, because its nodes do not answer. Returns its
    // process.
    pid_t StartRefresh(const Service& service, const SilentListener& silent) const
    {
        service.Ask(Call("status"));
        std::string lines;
        for (int node = 0; node < SilentNodes; ++node) {
            lines += "n" + std::to_string(node) + " = 127.0.0.1:" + std::to_string(silent.Port());
            lines += "\n";
        }
        WriteFile(dir.File("nodes"), lines);
        service.Ask(Call("import", Text("file", dir.File("nodes"))));
        service.Ask(Call("status"));
        pid_t updater = 0;
        EXPECT_TRUE(AwaitUntil([&] {
            std::ifstream(database + ".status.cached.pid") >> updater;
            return updater > 0 && updater != service.Pid();
        }));
        return updater;
    }
};

TEST_F(NodeServiceStatusTest, ThreadsShareOneStatus)
{
    if (!HasStatus()) return;
    Listener node;
    const auto service = Start();
    const std::string params = R"("name":"a","address":"127.0.0.1","port":)" +
                               std::to_string(node.Port()) + R"(,"volume":"/volume1")";
    service->Ask(Call("create", params));
    InThreads(8, [&](int /*client*/) {
        const Response status(service->Ask(Call("status")).body);
        EXPECT_EQ(status.getDataField("probes")["a"], "reachable");
    });
    ExpectCleanEnd(*service);
    EXPECT_THAT(Files(), ElementsAre("nodes.db", "nodes.db.status.cached"));
}

// The refresh must not inherit the service's sockets.
TEST_F(NodeServiceStatusTest, ThePortOfAKilledServiceIsFreeWhileARefreshRuns)
{
    if (!HasStatus()) return;
    const SilentListener silent;
    const auto service = Start({"--status-timeout", "0"});
    const pid_t updater = StartRefresh(*service, silent);
    service->End(SIGKILL);
    EXPECT_TRUE(AwaitUntil([&] { return !service->IsListening(); }));
    EXPECT_EQ(::waitpid(updater, nullptr, WNOHANG), 0) << "the refresh has ended already";
    const auto next = Start({}, service->Address());
    EXPECT_EQ(next->Ask(Call("get", R"("name":"n0")")).status, 200);
    ::kill(updater, SIGKILL);
    ExpectCleanEnd(*next);
}

// The service blocks SIGTERM and waits for it. Its child must unblock it.
TEST_F(NodeServiceStatusTest, SigtermEndsARefresh)
{
    if (!HasStatus()) return;
    const SilentListener silent;
    const auto service = Start({"--status-timeout", "0"});
    const pid_t updater = StartRefresh(*service, silent);
    ::kill(updater, SIGTERM);
    int status = 0;
    EXPECT_TRUE(AwaitUntil([&] { return ::waitpid(updater, &status, WNOHANG) == updater; }));
    EXPECT_TRUE(WIFSIGNALED(status));
    ExpectCleanEnd(*service);
}

// ------------------------------------------------------------------------------------ start and end

TEST_F(NodeServiceTest, SigtermAndSigintEndTheService)
{
    for (const int signal : {SIGTERM, SIGINT}) {
        const auto service = Start();
        service->Ask(CreateCall("a"));
        ExpectCleanEnd(*service, signal);
        EXPECT_FALSE(service->IsListening());
        EXPECT_THAT(Files(), ElementsAre("nodes.db"));
    }
}

TEST_F(NodeServiceTest, SigtermRightAfterTheStartIsNotLost)
{
    for (int round = 0; round < 20; ++round) ExpectCleanEnd(*Start());
}

// "100 Continue" shows that the service has begun the request.
TEST_F(NodeServiceTest, RequestsInProgressAreAnsweredAfterSigterm)
{
    const auto service = Start({"--threads", "8"});
    const std::string body = CreateCall("a");
    const HttpConnection connection(service->Port());
    connection.Send("POST /webapi HTTP/1.1\r\nExpect: 100-continue\r\nContent-Length: " +
                    std::to_string(body.size()) + "\r\n\r\n");
    EXPECT_EQ(connection.ReceiveSome(), "HTTP/1.1 100 Continue\r\n\r\n");
    service->Kill(SIGTERM);
    EXPECT_TRUE(AwaitUntil([&] { return !service->IsListening(); }));
    connection.Send(body);
    EXPECT_TRUE(Response(connection.Receive().body).isSuccess());
    ExpectCleanEnd(*service);
    EXPECT_THAT(List(), ElementsAre("a"));
}

TEST_F(NodeServiceTest, SigtermUnderLoadLosesNoAnsweredCreate)
{
    const auto service = Start({"--threads", "4"});
    std::vector<std::set<std::string>> created(8);
    std::thread clients([&] {
        InThreads(8, [&](int client) {
            for (int node = 0;; ++node) {
                const std::string name = std::to_string(client) + "-" + std::to_string(node);
                const HttpReply reply = service->Ask(CreateCall(name));
                if (reply.status == 0) return;
                EXPECT_TRUE(Response(reply.body).isSuccess()) << reply.body;
                created.at(static_cast<std::size_t>(client)).insert(name);
            }
        });
    });
    EXPECT_TRUE(AwaitUntil([&] { return std::filesystem::exists(database); }));
    ExpectCleanEnd(*service);
    clients.join();
    const std::vector<std::string> names = List();
    for (const auto& ofClient : created) EXPECT_THAT(names, IsSupersetOf(ofClient));
    EXPECT_THAT(Files(), ElementsAre("nodes.db"));
}

TEST_F(NodeServiceTest, ATakenAddressIsAFailure)
{
    const auto service = Start();
    const ProgramResult taken = RunProgram(
        {NODE_SERVICE_PROGRAM, "--listen", service->Address(), "--db", dir.File("other.db")});
    EXPECT_EQ(taken.code, 1);
    EXPECT_EQ(taken.out, "");
    EXPECT_EQ(taken.err, "node_service: cannot listen on " + service->Address() +
                             ": Address already in use\n");
    const ProgramResult foreign =
        RunProgram({NODE_SERVICE_PROGRAM, "--listen", "192.0.2.1:0", "--db", dir.File("other.db")});
    EXPECT_EQ(foreign.code, 1);
    EXPECT_EQ(foreign.err,
              "node_service: cannot listen on 192.0.2.1:0: Cannot assign requested address\n");
    EXPECT_THAT(Files(), IsEmpty());
}

TEST_F(NodeServiceTest, UnwritableOutputIsAFailure)
{
    for (const std::string option : {"--listen 127.0.0.1:0", "--help"}) {
        const ProgramResult result = RunProgram(
            {"/bin/sh", "-c", "exec \"$0\" " + option + " > /dev/full", NODE_SERVICE_PROGRAM});
        EXPECT_EQ(result.code, 1) << option;
        EXPECT_EQ(result.err, "node_service: standard output cannot be written\n") << option;
    }
}

TEST_F(NodeServiceTest, WrongOptionsPrintTheUsage)
{
    const std::vector<std::string> rows[] = {
        {"--nothing"},
        {"x"},
        {"-"},
        {"--db"},
        {"--db", ""},
        {"--listen"},
        {"--listen", ""},
        {"--listen", "127.0.0.1"},
        {"--listen", ":80"},
        {"--listen", "::1:80"},
        {"--listen", "[]:80"},
        {"--listen", "127.0.0.1:"},
        {"--listen", "127.0.0.1:x"},
        {"--listen", "127.0.0.1:-1"},
        {"--listen", "127.0.0.1:65536"},
        {"--threads"},
        {"--threads", "0"},
        {"--threads", "257"},
        {"--threads", "4x"},
        {"--threads", "0400"},
        {"--status-timeout", "-1"},
        {"--status-dir", ""},
    };
    for (const std::vector<std::string>& options : rows) {
        std::vector<std::string> words = {NODE_SERVICE_PROGRAM};
        words.insert(words.end(), options.begin(), options.end());
        const ProgramResult result = RunProgram(words);
        EXPECT_EQ(result.code, 2) << options.back();
        EXPECT_EQ(result.out, "") << options.back();
        EXPECT_EQ(result.err, Usage) << options.back();
    }
}

TEST_F(NodeServiceTest, HelpListsOptionsMethodsAndCodes)
{
    const ProgramResult result = RunProgram({NODE_SERVICE_PROGRAM, "--help"});
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.err, "");
    EXPECT_THAT(result.out, StartsWith(Usage));
    for (const char* word :
         {"--listen ADDRESS:PORT", "--threads COUNT", "--db FILE", "--status-timeout SECONDS",
          "--status-dir DIRECTORY", "--verbose", "--help", "/webapi", "413", "create", "restore",
          "526 ERR_NO_SUCH_API", "Exit codes:"}) {
        EXPECT_THAT(result.out, HasSubstr(word));
    }
}

}  // namespace
