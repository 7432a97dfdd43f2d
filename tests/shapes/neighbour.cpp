#include "neighbour.h"

#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <cstdlib>

namespace Shapes {

namespace {

// Types are shown, because 1, 1.0 and '1' differ.
void AddValue(sqlite3_stmt* statement, int column, std::string& rows)
{
    constexpr std::array<const char*, 6> Types = {"?", "i", "r", "t", "b", "n"};
    rows += Types[static_cast<std::size_t>(sqlite3_column_type(statement, column))];
    const void* const bytes = sqlite3_column_blob(statement, column);
    const int length = sqlite3_column_bytes(statement, column);
    if (bytes != nullptr)
        rows.append(static_cast<const char*>(bytes), static_cast<std::size_t>(length));
    rows += ',';
}

// A message that is sent between processes: its length, an order, and a text.
bool ReadWhole(int socket, void* bytes, std::size_t length)
{
    return ::recv(socket, bytes, length, MSG_WAITALL) == static_cast<ssize_t>(length);
}

bool Send(int socket, char order, const std::string& text)
{
    const auto length = static_cast<std::uint32_t>(text.size());
    std::string message(reinterpret_cast<const char*>(&length), sizeof length);
    message += order + text;
    return ::send(socket, message.data(), message.size(), MSG_NOSIGNAL) ==
           static_cast<ssize_t>(message.size());
}

bool Receive(int socket, char& order, std::string& text)
{
    std::uint32_t length = 0;
    if (!ReadWhole(socket, &length, sizeof length) || !ReadWhole(socket, &order, 1)) return false;
    text.resize(length);
    return length == 0 || ReadWhole(socket, text.data(), length);
}

// The other process, until this one ends.
void Serve(int socket)
{
    Neighbour neighbour;
    char order = ' ';
    std::string text;
    while (Receive(socket, order, text)) {
        std::string answer;
        if (order == 'o') neighbour.Open(text);
        if (order == 'c') neighbour.Close();
        if (order == 'r') {
            SeedSqlite(text.size());
            answer = neighbour.Run(text);
        }
        if (!Send(socket, order, answer)) break;
    }
}

}  // namespace

void SeedSqlite([[maybe_unused]] std::uint64_t seed)
{
#ifdef SQLITE_TESTCTRL_PRNG_SEED
    sqlite3_test_control(SQLITE_TESTCTRL_PRNG_SEED, static_cast<int>(seed | 1U), nullptr);
#endif
}

void Neighbour::Open(const std::string& path)
{
    Close();
    if (sqlite3_open_v2(path.c_str(), &handle_, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE,
                        nullptr) != SQLITE_OK)
        std::abort();
    sqlite3_extended_result_codes(handle_, 1);
}

void Neighbour::Close()
{
    sqlite3_close_v2(handle_);
    handle_ = nullptr;
}

std::string Neighbour::Run(const std::string& statements)
{
    std::string rows;
    int code = SQLITE_OK;
    for (const char* at = statements.c_str(); *at != '\0' && code == SQLITE_OK;) {
        sqlite3_stmt* statement = nullptr;
        code = sqlite3_prepare_v2(handle_, at, -1, &statement, &at);
        while (statement != nullptr && (code = sqlite3_step(statement)) == SQLITE_ROW) {
            const int columns = sqlite3_column_count(statement);
            for (int column = 0; column < columns; ++column) AddValue(statement, column, rows);
            rows += '\n';
        }
        if (code == SQLITE_DONE) code = SQLITE_OK;
        if (code != SQLITE_OK)
            rows += "code " + std::to_string(code) + ": " + sqlite3_errmsg(handle_) + "\n";
        sqlite3_finalize(statement);
    }
    return rows;
}

std::string Neighbour::ReadAll()
{
    std::string all =
        Run("BEGIN; SELECT * FROM sqlite_master ORDER BY rowid; PRAGMA user_version; "
            "PRAGMA encoding;");
    const std::string names =
        Run("SELECT CAST('\"'||replace(name,'\"','\"\"')||'\"' AS BLOB) FROM sqlite_master "
            "WHERE type='table'");
    for (std::size_t at = 0, end = 0; (end = names.find(",\n", at)) != std::string::npos;
         at = end + 2) {
        const std::string name = names.substr(at + 1, end - at - 1);
        all += name + ":\n" + Run("SELECT * FROM " + name);
    }
    return all + Run("PRAGMA quick_check; ROLLBACK");
}

std::string Neighbour::TryLocks()
{
    for (const char* begin : {"EXCLUSIVE", "IMMEDIATE"}) {
        if (Run(std::string("BEGIN ") + begin).empty()) return begin + Run("ROLLBACK");
    }
    return Run("SELECT count(*) FROM sqlite_master").front() == 'i' ? "READ" : "NOTHING";
}

NeighbourProcess::NeighbourProcess()
{
    std::array<int, 2> sockets{};
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets.data()) != 0) std::abort();
    pid_ = ::fork();
    if (pid_ < 0) std::abort();
    if (pid_ == 0) {
        ::close(sockets[0]);
        Serve(sockets[1]);
        ::_exit(EXIT_SUCCESS);
    }
    ::close(sockets[1]);
    socket_ = sockets[0];
}

NeighbourProcess::~NeighbourProcess()
{
    ::close(socket_);
    ::waitpid(pid_, nullptr, 0);
}

void NeighbourProcess::Open(const std::string& path)
{
    Ask('o', path);
}

void NeighbourProcess::Close()
{
    Ask('c', "");
}

std::string NeighbourProcess::Run(const std::string& statements)
{
    return Ask('r', statements);
}

std::string NeighbourProcess::Ask(char order, const std::string& text) const
{
    std::string answer;
    if (!Send(socket_, order, text) || !Receive(socket_, order, answer)) std::abort();
    return answer;
}

}  // namespace Shapes
