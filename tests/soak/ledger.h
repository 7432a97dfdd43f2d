// What a client was told about its nodes. Names belong to one client each, so that nobody else
// changes them.
#ifndef ORVADRCORE_TESTS_SOAK_LEDGER_H
#define ORVADRCORE_TESTS_SOAK_LEDGER_H

#include <map>
#include <set>
#include <string>
#include <vector>

namespace Soak {

// Unknown: the last request that could have made or removed the node got no answer.
enum class State { Absent, Stored, Unknown };

struct Account {
    State state = State::Absent;
    std::string id;       // empty as long as nobody has told it
    std::set<int> ports;  // those that the node may have: more than one after a lost answer
};

using Ledger = std::map<std::string, Account>;  // by name

// A node as the database holds it.
struct Row {
    std::string id;
    std::string name;
    int port;
};

struct Comparison {
    std::vector<std::string> problems;
    int stored = 0;        // nodes that had to be there, and are
    int unknown = 0;       // nodes that could be there or not
    int unknownFound = 0;  // those of them that are
};

// Whether the database holds what the clients were told, once each, and nothing else.
Comparison Compare(const std::vector<const Ledger*>& ledgers, const std::vector<Row>& rows);

}  // namespace Soak

#endif
