#include "side.h"

#include <sqlite3.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <filesystem>

#include "base/json_helpers.h"
#include "fast_clock.h"
#include "sqlite/sqlite_connection.h"
#include "support/fakes/log_sink.h"
#include "support/fakes/pauses.h"

namespace Shapes {

namespace {

// A tenth of the time that the library waits for a lock.
constexpr int WaitMSec = 100;

const char* const FileName = "main.db";  // relative: messages show it

// During an operation: where its lines go, and who could do something while they are logged.
std::string* logged = nullptr;
Neighbour* witness = nullptr;

// After a wait that was in vain, SQLite does not wait in the next prepare either, and the
// shortcuts may need one prepare more. Any prepare ends that.
void ForgetWait(sqlite3* handle)
{
    sqlite3_stmt* none = nullptr;
    if (handle != nullptr) sqlite3_prepare_v2(handle, "", -1, &none, nullptr);
}

// Longer than a connection that had to wait pauses before its next write. That pause is no wait for a
// lock, and would be taken for one.
constexpr int TurnMSec = 1000;

// The number of the source's line does not count: "sqlite_db.cpp:81(Exec)[ERR][4242]: ...".
void CaptureLine(int priority, const char* format, std::va_list arguments)
{
    if (logged == nullptr) return;
    std::va_list again;
    va_copy(again, arguments);
    std::string line(static_cast<std::size_t>(std::vsnprintf(nullptr, 0, format, again)), ' ');
    va_end(again);
    (void)std::vsnprintf(line.data(), line.size() + 1, format, arguments);
    const std::size_t colon = line.find(':');
    line.erase(colon, line.find('(') - colon);
    *logged += "log " + std::to_string(priority) + ": " + line +
               "\npossible while it is logged: " + witness->TryLocks() + "\n";
}

int StateOfTransaction([[maybe_unused]] sqlite3* handle)
{
#if SQLITE_VERSION_NUMBER >= 3034000
    return sqlite3_txn_state(handle, "main");
#else
    return 0;
#endif
}

}  // namespace

Side::Side(const std::string& directory) : directory_(directory)
{
    std::filesystem::create_directory(directory_);
    SendLogTo(CaptureLine);
}

Side::~Side()
{
    Close();
}

void Side::Enter() const
{
    if (::chdir(directory_.c_str()) != 0) std::abort();
    OrvaDRCore::ShortcutsInUse() = shortcuts_;
}

void Side::Begin(const Schema& schema, const RetryLimits& limits,
                 const OrvaDRCore::Shortcuts& shortcuts)
{
    shortcuts_ = shortcuts;
    Enter();
    Close();
    for (const auto& file : std::filesystem::directory_iterator(directory_))
        std::filesystem::remove(file.path());
    second_.Open(FileName);
    process_.Open(directory_ + "/" + FileName);  // it is in another directory
    for (const std::string& statement : schema.setup) {
        const std::string result = second_.Run(statement);
        if (result.find("code ") == std::string::npos) continue;
        (void)std::fprintf(stderr, "%s: %s: %s\n", schema.name.c_str(), statement.c_str(),
                           result.c_str());
        std::abort();
    }
    for (std::size_t which = 0; which < ConnectionCount; ++which)
        dbs_[which].emplace(schema.file, limits[which]);
}

void Side::Close()
{
    for (auto& transaction : transactions_) transaction.reset();
    for (auto& db : dbs_) db.reset();
    second_.Close();
    process_.Close();
}

std::string Side::End()
{
    Enter();
    Close();
    std::string content;
    for (const auto& file : std::filesystem::directory_iterator(directory_)) {
        if (file.path().extension() != ".db") continue;
        second_.Open(file.path());
        content += file.path().filename().string() + ":\n" + second_.ReadAll();
        second_.Close();
    }
    return content;
}

std::string Side::Run(const Operation& operation, std::uint64_t seed)
{
    Enter();
    SeedSqlite(seed);
    AdvanceClock(TurnMSec);
    for (const auto& db : dbs_) ForgetWait(db->Connection().GetHandle());
    outcome_.clear();
    atPause_ = {};
    atWait_ = {};
    Pauses pauses;
    pauses.OnPause([this](std::size_t number) { Do(atPause_, number); });
    pauses.OnWait([this](std::size_t number) {
        AdvanceClock(WaitMSec);
        Do(atWait_, number);
    });
    logged = &outcome_;
    witness = &second_;
    operation.run(*this);
    logged = nullptr;
    Note("pauses", static_cast<std::int64_t>(pauses.Taken().size()));
    for (std::size_t which = 0; which < ConnectionCount; ++which) NoteState(which);
    return std::move(outcome_);
}

void Side::NoteState(std::size_t which)
{
    const OrvaDRCore::SqliteDB& db = *dbs_[which];
    sqlite3* const handle = db.Connection().GetHandle();
    outcome_ += "db" + std::to_string(which) + ": code " + std::to_string(db.GetErrCode()) +
                " sqlite " + std::to_string(db.GetSqliteCode()) + " rows " +
                std::to_string(db.GetAffectedRows()) + " id " +
                std::to_string(db.GetLastInsertId());
    if (handle == nullptr) {
        outcome_ += " closed";
    } else {
        outcome_ += sqlite3_get_autocommit(handle) != 0 ? " auto" : " transaction";
        outcome_ += " lock " + std::to_string(StateOfTransaction(handle));
    }
    outcome_ += " error " + OrvaDRCore::toString(db.GetErr()) + "\n";
}

OrvaDRCore::SqliteTransaction& Side::Transaction(std::size_t which)
{
    if (!transactions_[which]) transactions_[which].emplace(*dbs_[which]);
    return *transactions_[which];
}

std::string Side::RunAsNeighbour(bool isProcess, const std::string& statements)
{
    return isProcess ? process_.Run(statements) : second_.Run(statements);
}

void Side::Note(const char* name, const std::string& value)
{
    outcome_ += name;
    outcome_ += ": " + value + "\n";
}

void Side::Do(const Planned& planned, std::size_t number)
{
    if (number == planned.number) planned.action();
}

}  // namespace Shapes
