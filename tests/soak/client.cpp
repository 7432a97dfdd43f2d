#include "client.h"

#include <algorithm>
#include <thread>
#include <utility>

#include <orvadrcore/errors.h>
#include <orvadrcore/response.h>

#include "examples/node_registry/json_line.h"

namespace Soak {

using OrvaDRCore::ERR;
using OrvaDRCore::Response;

namespace {

// The share of each kind among a client's requests.
struct Share {
    Kind kind;
    int percent;
};
constexpr Share Shares[] = {{Kind::Create, 30}, {Kind::Get, 35}, {Kind::Set, 10},
                            {Kind::Delete, 10}, {Kind::List, 5}, {Kind::Status, 8},
                            {Kind::Nonsense, 2}};

constexpr int MaxPort = 65535;
constexpr milliseconds TryAgain{5};  // when nobody listens

Kind KindAt(int percent)
{
    for (const Share& share : Shares) {
        percent -= share.percent;
        if (percent < 0) return share.kind;
    }
    return Kind::Get;
}

Json::Value Named(const std::string& name)
{
    Json::Value parameters(Json::objectValue);
    parameters["name"] = name;
    return parameters;
}

// Half of the nodes with an unknown state are created again, the other half is left alone until the
// end.
bool IsToBeRetried(const Ledger::value_type& node)
{
    const auto& [name, account] = node;
    return account.state == State::Unknown && (name.back() - '0') % 2 == 0;
}

bool IsTold(const Answer& answer)
{
    return answer.outcome == Answer::Outcome::Told;
}

}  // namespace

const char* NameOf(Kind kind)
{
    constexpr std::array<const char*, Kinds> Names = {"create", "get",    "set",     "delete",
                                                      "list",   "status", "nonsense"};
    return Names.at(static_cast<std::size_t>(kind));
}

Client::Client(const std::string& clientName, Ask how, AskNonsense howNonsense,
               const Bounds& limits, Findings& where)
    : name_(clientName),
      ask_(std::move(how)),
      nonsense_(std::move(howNonsense)),
      bounds_(limits),
      findings_(where),
      random_(static_cast<unsigned int>(std::hash<std::string>()(clientName)))
{
}

void Client::ForgetGap()
{
    lastAnswer_ = Clock::now();
}

std::size_t Client::CountAnswers() const
{
    std::size_t count = 0;
    for (const auto& times : notes_.microseconds) count += times.size();
    return count;
}

void Client::AskOne()
{
    Node* node = PickStored();
    switch (KindAt(Random(99))) {
        case Kind::Create: return Create();
        case Kind::Get: return node != nullptr ? Get(*node) : Create();
        case Kind::Set: return node != nullptr ? Set(*node) : Create();
        case Kind::Delete: return node != nullptr ? Delete(*node) : Create();
        case Kind::List: return ListSome();
        case Kind::Status: return Status();
        case Kind::Nonsense: return Nonsense();
    }
}

// Creates a new node, or one again whose state is unknown.
void Client::Create()
{
    const auto unknown = std::find_if(ledger_.begin(), ledger_.end(), IsToBeRetried);
    if (unknown != ledger_.end() && Random(1) == 0) return CreateAs(*unknown);

    const auto isStored = [](const Node& node) { return node.second.state == State::Stored; };
    if (std::count_if(ledger_.begin(), ledger_.end(), isStored) >= LiveNodes) {
        return Delete(*PickStored());
    }
    const auto [node, isNew] = ledger_.try_emplace(name_ + "-" + std::to_string(++made_));
    node->second.ports = {Random(MaxPort - 1) + 1};
    CreateAs(*node);
}

void Client::CreateAs(Node& node)
{
    auto& [nodeName, account] = node;
    Json::Value parameters = Named(nodeName);
    parameters["address"] = "127.0.0.1";
    parameters["port"] = *account.ports.begin();
    parameters["volume"] = "/volume1/replica";
    parameters["enabled"] = Random(9) == 0;
    const Answer answer = Request(Kind::Create, "create", parameters);
    if (answer.outcome == Answer::Outcome::Lost) account = {State::Unknown, "", account.ports};
    if (!IsTold(answer) || IsGivenUp(answer)) return;

    const Response reply(answer.reply);
    const bool wasUnknown = account.state == State::Unknown;
    if (reply.isSuccess()) {
        account = {State::Stored, reply.getDataFieldtoStr("id"), {parameters["port"].asInt()}};
    } else if (reply.getErrCode() == ERR::ERR_NODE_EXIST && wasUnknown) {
        account.state = State::Stored;  // created by the request whose answer was lost
    } else {
        ReportWrong("create " + nodeName, answer);
    }
}

void Client::Get(const Node& node)
{
    const auto& [nodeName, account] = node;
    const Answer answer = Request(Kind::Get, "get", Named(nodeName));
    if (!IsTold(answer) || IsGivenUp(answer)) return;

    const Response reply(answer.reply);
    const Json::Value& found = reply.getData();
    const bool isRight = reply.isSuccess() && found["name"] == nodeName &&
                         account.ports.count(found["port"].asInt()) == 1 &&
                         (account.id.empty() || found["id"] == account.id);
    if (!isRight) ReportWrong("get " + nodeName, answer);
}

void Client::Set(Node& node)
{
    auto& [nodeName, account] = node;
    Json::Value parameters = Named(nodeName);
    const int port = Random(MaxPort - 1) + 1;
    parameters["port"] = port;
    const Answer answer = Request(Kind::Set, "set", parameters);
    if (answer.outcome == Answer::Outcome::Lost) account.ports.insert(port);
    if (!IsTold(answer) || IsGivenUp(answer)) return;
    if (!Response(answer.reply).isSuccess()) return ReportWrong("set " + nodeName, answer);
    account.ports = {port};
}

void Client::Delete(Node& node)
{
    auto& [nodeName, account] = node;
    const Answer answer = Request(Kind::Delete, "delete", Named(nodeName));
    if (answer.outcome == Answer::Outcome::Lost) account.state = State::Unknown;
    if (!IsTold(answer) || IsGivenUp(answer)) return;
    if (!Response(answer.reply).isSuccess()) return ReportWrong("delete " + nodeName, answer);
    account.state = State::Absent;
}

// Lists the stored nodes of this client by id. The reply must have them all and no others.
void Client::ListSome()
{
    Json::Value ids(Json::arrayValue);
    for (const auto& [nodeName, account] : ledger_) {
        if (account.state == State::Stored && !account.id.empty()) ids.append(account.id);
    }
    Json::Value parameters(Json::objectValue);
    parameters["filter"]["ids"] = ids;
    const Answer answer = Request(Kind::List, "list", parameters);
    if (!IsTold(answer) || IsGivenUp(answer)) return;
    const Response reply(answer.reply);
    if (!reply.isSuccess() || reply.getDataField("nodes").size() != ids.size()) {
        ReportWrong("list of " + std::to_string(ids.size()), answer);
    }
}

void Client::Status()
{
    const Answer answer = Request(Kind::Status, "status", Json::Value());
    if (!IsTold(answer) || IsGivenUp(answer)) return;
    if (!Response(answer.reply).isSuccess()) ReportWrong("status", answer);
}

void Client::Nonsense()
{
    Measure(Kind::Nonsense, [this]() -> Answer {
        const std::optional<bool> isRight = nonsense_(Random(3));
        if (!isRight) return {};
        if (!*isRight) findings_.Add(Promise::Answers, name_ + ": nonsense got a wrong answer");
        return {Answer::Outcome::Told, {}};
    });
}

Client::Node* Client::PickStored()
{
    std::vector<Node*> stored;
    for (Node& node : ledger_) {
        if (node.second.state == State::Stored) stored.push_back(&node);
    }
    if (stored.empty()) return nullptr;
    return stored.at(static_cast<std::size_t>(Random(static_cast<int>(stored.size()) - 1)));
}

Answer Client::Request(Kind kind, const std::string& method, const Json::Value& parameters)
{
    Json::Value request = parameters;
    request["api"] = "DR.Node";
    request["version"] = 1;
    request["method"] = method;
    return Measure(kind, [&] { return ask_(NodeRegistry::ToLine(request)); });
}

template <class Operation>
Answer Client::Measure(Kind kind, Operation operation)
{
    const auto start = Clock::now();
    Answer answer = operation();
    const auto end = Clock::now();
    if (answer.outcome == Answer::Outcome::NotSent) std::this_thread::sleep_for(TryAgain);
    if (answer.outcome == Answer::Outcome::Lost) ++notes_.lost;
    if (!IsTold(answer)) return answer;

    const auto took = std::chrono::duration_cast<std::chrono::microseconds>(end - start);
    notes_.microseconds.at(static_cast<std::size_t>(kind))
        .push_back(static_cast<std::uint32_t>(took.count()));
    if (took > bounds_.wait) {
        const auto waited = std::chrono::duration_cast<milliseconds>(took);
        findings_.Add(Promise::Waits, name_ + ": " + NameOf(kind) + " took " +
                                          std::to_string(waited.count()) + " ms");
    }
    notes_.longestGap =
        std::max(notes_.longestGap, std::chrono::duration_cast<milliseconds>(end - lastAnswer_));
    lastAnswer_ = end;
    return answer;
}

// The registry reported that it failed. Then nothing has changed.
bool Client::IsGivenUp(const Answer& answer)
{
    const int code = Response(answer.reply).getErrCode();
    if (code != ERR::ERR_DATABASE_OPERATION && code != ERR::ERR_NODE_CREATE &&
        code != ERR::ERR_NODE_GET && code != ERR::ERR_NO_PERMISSION) {
        return false;
    }
    ++notes_.givenUp[code];
    return true;
}

void Client::ReportWrong(const std::string& what, const Answer& answer)
{
    findings_.Add(Promise::Answers,
                  name_ + ": " + what + " got the reply " + NodeRegistry::ToLine(answer.reply));
}

int Client::Random(int most)
{
    return std::uniform_int_distribution<int>(0, most)(random_);
}

}  // namespace Soak
