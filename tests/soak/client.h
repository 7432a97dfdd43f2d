// A client of the registry. It makes one request after the other, keeps a ledger of what it is told
// about its nodes, and compares every answer with the ledger.
#ifndef ORVADRCORE_TESTS_SOAK_CLIENT_H
#define ORVADRCORE_TESTS_SOAK_CLIENT_H

#include <array>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include <json/value.h>

#include "findings.h"
#include "ledger.h"
#include "plan.h"

namespace Soak {

// The result of a request.
struct Answer {
    // NotSent: the request reached nobody. Lost: nobody knows whether it was done. Told: there is a
    // reply.
    enum class Outcome { NotSent, Lost, Told } outcome = Outcome::NotSent;
    Json::Value reply;
};

// Sends a request and waits for the answer.
using Ask = std::function<Answer(const std::string& request)>;

// Sends something that is not a request. Returns whether the answer was right; nothing without an
// answer.
using AskNonsense = std::function<std::optional<bool>(int which)>;

enum class Kind { Create, Get, Set, Delete, List, Status, Nonsense };
constexpr std::size_t Kinds = 7;
const char* NameOf(Kind kind);

// A client's statistics.
struct Notes {
    std::array<std::vector<std::uint32_t>, Kinds> microseconds;  // until each answer
    std::map<int, int> givenUp;                                  // by error code
    int lost = 0;
    milliseconds longestGap{0};  // between two answers
};

class Client {
  public:
    Client(const std::string& clientName, Ask ask, AskNonsense nonsense, const Bounds& bounds,
           Findings& findings);

    // Makes one request and waits for the answer.
    void AskOne();

    // From now on counts the time without an answer anew: the client was paused.
    void ForgetGap();

    const std::string& Name() const { return name_; }
    const Ledger& Accounts() const { return ledger_; }
    const Notes& GetNotes() const { return notes_; }
    std::size_t CountAnswers() const;

  private:
    using Node = Ledger::value_type;

    void Create();
    void CreateAs(Node& node);
    void Get(const Node& node);
    void Set(Node& node);
    void Delete(Node& node);
    void ListSome();
    void Status();
    void Nonsense();

    Node* PickStored();
    Answer Request(Kind kind, const std::string& method, const Json::Value& parameters);
    template <class Operation>
    Answer Measure(Kind kind, Operation operation);
    bool IsGivenUp(const Answer& answer);
    void ReportWrong(const std::string& what, const Answer& answer);
    int Random(int most);

    std::string name_;
    Ask ask_;
    AskNonsense nonsense_;
    const Bounds& bounds_;
    Findings& findings_;
    Ledger ledger_;
    Notes notes_;
    int made_ = 0;
    std::mt19937 random_;
    Clock::time_point lastAnswer_ = Clock::now();
};

}  // namespace Soak

#endif
