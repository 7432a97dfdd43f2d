// Engines: our library, SQLite's C interface by hand, and other libraries. All have the same operations
// on the table `nodes`, and keep what they select in the form that their users get.
#ifndef ORVADRCORE_BENCH_SUPPORT_ENGINES_H
#define ORVADRCORE_BENCH_SUPPORT_ENGINES_H

#include <map>
#include <memory>
#include <string>
#include <vector>

#include <json/value.h>
#include <orvadrcore/sqlite_db.h>

#include "support/by_hand.h"

namespace Bench {

inline constexpr const char* NodesSchema =
    "id INTEGER PRIMARY KEY, name TEXT, address TEXT, port INTEGER, state INTEGER";

// A row of the table `nodes`.
struct Node {
    int id = 0;
    std::string name;
    std::string address;
    int port = 0;
    int state = 0;
};

Node MakeNode(int id);
std::string ToText(const Node& node);
std::string ToText(const std::vector<Node>& nodes);

// Rows for users who do not know the columns: values of any type by column name.
using NamedRows = std::vector<std::map<std::string, Json::Value>>;
std::string ToText(const NamedRows& rows);

// Creates a database with nodes 1 to `rows`, and `tables` - 1 other tables, half of them before it.
void FillNodes(const std::string& path, int rows, int tables = 1);

// All nodes of a file as text, ordered by id.
std::string DumpNodes(const std::string& path);

class OurEngine {
  public:
    // The retry limit of the connection.
    explicit OurEngine(const std::string& path, unsigned int retries = 0);
    void Exec(const char* statement);
    void Insert(const Node& node);
    void Select(int id);
    void SelectAll();
    void Update(int id, int state);
    void Delete(int id);
    std::string Selected() const;

  private:
    OrvaDRCore::SqliteTableHandler table_;
    OrvaDRCore::SqliteDB db_;
    std::vector<OrvaDRCore::SqliteValueList> rows_;
};

// Prepares statements once; rows are structs.
class BareEngine {
  public:
    explicit BareEngine(const std::string& path, int busyTimeoutMSec = BusyTimeoutMSec);
    void Exec(const char* statement);
    void Insert(const Node& node);
    void Select(int id);
    void SelectAll();
    void Update(int id, int state);
    void Delete(int id);
    std::string Selected() const { return ToText(rows_); }

  private:
    Database handle_;
    Statement insert_;
    Statement select_;
    Statement selectAll_;
    Statement update_;
    Statement remove_;
    std::vector<Node> rows_;
};

// By hand, what our documents promise: a table lookup before each statement, by a query that stays
// prepared; statements as text with literals; rows as values by column name.
class ContractEngine {
  public:
    explicit ContractEngine(const std::string& path);
    void Exec(const char* statement);
    void Insert(const Node& node);
    void Select(int id);
    void SelectAll();
    void Update(int id, int state);
    void Delete(int id);
    std::string Selected() const;

  private:
    void FindTable();
    void Collect(const std::string& text);

    Database handle_;
    std::string name_ = "nodes";
    Statement find_;
    std::vector<std::map<std::string, Value>> rows_;
};

// Another library. Each has its own source, because the headers of two of them cannot be included
// together.
template <class Library>
class Peer {
  public:
    explicit Peer(const std::string& path, int busyTimeoutMSec = BusyTimeoutMSec);
    ~Peer();
    Peer(const Peer&) = delete;
    Peer& operator=(const Peer&) = delete;
    void Exec(const char* statement);
    void Insert(const Node& node);
    void Select(int id);
    void SelectAll();
    void Update(int id, int state);
    void Delete(int id);
    std::string Selected() const;

  private:
    std::unique_ptr<Library> library_;
};

template <class Library>
Peer<Library>::Peer(const std::string& path, int busyTimeoutMSec)
    : library_(std::make_unique<Library>(path, busyTimeoutMSec))
{
}

template <class Library>
Peer<Library>::~Peer() = default;

template <class Library>
void Peer<Library>::Exec(const char* statement)
{
    library_->Exec(statement);
}

template <class Library>
void Peer<Library>::Insert(const Node& node)
{
    library_->Insert(node);
}

template <class Library>
void Peer<Library>::Select(int id)
{
    library_->Select(id);
}

template <class Library>
void Peer<Library>::SelectAll()
{
    library_->SelectAll();
}

template <class Library>
void Peer<Library>::Update(int id, int state)
{
    library_->Update(id, state);
}

template <class Library>
void Peer<Library>::Delete(int id)
{
    library_->Delete(id);
}

template <class Library>
std::string Peer<Library>::Selected() const
{
    return ToText(library_->rows);
}

// Each library with structs, and with values by column name.
struct SqliteCpp;
struct SqliteCppByName;
struct Soci;
struct SociByName;
extern template class Peer<SqliteCpp>;
extern template class Peer<SqliteCppByName>;
extern template class Peer<Soci>;
extern template class Peer<SociByName>;

}  // namespace Bench

#endif
