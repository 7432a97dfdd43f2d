// A client of the registry. It asks one request after the other, notes what it is told about its
// nodes, and compares every answer with its notes.
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

// What came of a request.
struct Answer {
    // NotSent: the request has reached nobody. Lost: nobody knows whether it was done.
    enum class Outcome { NotSent, Lost, Told } outcome = Outcome::NotSent;
    Json::Value reply;
};

// Sends a request and waits for the answer.
using Ask = std::function<Answer(const std::string& request)>;

// Sends something that is no request, and tells whether the answer was what it should be; none when
// there was no answer.
using AskNonsense = std::function<std::optional<bool>(int which)>;

enum class Kind { Create, Get, Set, Delete, List, Status, Nonsense };
constexpr std::size_t Kinds = 7;
const char* NameOf(Kind kind);

// What a client has met.
struct Notes {
    std::array<std::vector<std::uint32_t>, Kinds> microseconds;  // of each answer
    std::map<int, int> givenUp;                                  // by error code
    int lost = 0;
    milliseconds longestGap{0};  // between two answers
};

class Client {
  public:
    Client(const std::string& clientName, Ask ask, AskNonsense nonsense, const Bounds& bounds,
           Findings& findings);

    // Asks one request, and waits for its answer.
    void AskOne();

    // Says that the client has not been waiting until now.
    void ForgetGap();

    const std::string& Name() const { return name; }
    const Ledger& Accounts() const { return ledger; }
    const Notes& GetNotes() const { return notes; }
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

    std::string name;
    Ask ask;
    AskNonsense nonsense;
    const Bounds& bounds;
    Findings& findings;
    Ledger ledger;
    Notes notes;
    int made = 0;
    std::mt19937 random;
    Clock::time_point lastAnswer = Clock::now();
};

}  // namespace Soak

#endif
