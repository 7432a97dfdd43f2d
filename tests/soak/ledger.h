// What a client was told about its nodes. No other client changes nodes with these names.
#ifndef ORVADRCORE_TESTS_SOAK_LEDGER_H
#define ORVADRCORE_TESTS_SOAK_LEDGER_H

#include <map>
#include <set>
#include <string>
#include <vector>

namespace Soak {

// Unknown: the last request to create or delete the node got no answer.
enum class State { Absent, Stored, Unknown };

struct Account {
    State state = State::Absent;
    std::string id;       // empty until a reply has told it
    std::set<int> ports;  // the node has one of these; several after a lost answer
};

using Ledger = std::map<std::string, Account>;  // by name

// A node in the database.
struct Row {
    std::string id;
    std::string name;
    int port;
};

struct Comparison {
    std::vector<std::string> problems;
    int stored = 0;        // nodes that must be there, and are
    int unknown = 0;       // nodes that may be there or not
    int unknownFound = 0;  // those of them that are there
};

// Checks that the database holds every node that the clients were told of, once, and no others.
Comparison Compare(const std::vector<const Ledger*>& ledgers, const std::vector<Row>& rows);

}  // namespace Soak

#endif
