#include "database.h"

#include <sqlite3.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <filesystem>
#include <memory>
#include <new>
#include <sstream>
#include <string_view>
#include <system_error>
#include <utility>

#include "base/file_io.h"
#include "reading_vfs.h"
#include "text.h"

namespace Orvadr {

namespace {

constexpr int BusyTimeoutMSec = 1000;
constexpr int StepsPerProgress = 20'000;  // of SQLite's machine: some milliseconds
constexpr int MaxAttempts = 4;            // if the file changes while it is read without locks
constexpr std::string_view Magic("SQLite format 3\0", 16);  // how a database begins
constexpr std::size_t ReadVersionAt = 19;
constexpr char WalVersion = 2;

// What changes whenever somebody writes to a file.
struct Stamp {
    bool exists = false;
    ino_t inode = 0;
    off_t size = 0;
    timespec modified{};

    bool operator==(const Stamp& other) const
    {
        return exists == other.exists && inode == other.inode && size == other.size &&
               modified.tv_sec == other.modified.tv_sec &&
               modified.tv_nsec == other.modified.tv_nsec;
    }
};

Stamp StampOf(const std::string& path)
{
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0) return {};
    return {true, status.st_ino, status.st_size, status.st_mtim};
}

// The database, its log and the log's shared memory.
using Stamps = std::array<Stamp, 3>;

Stamps StampsOf(const std::string& path)
{
    return {StampOf(path), StampOf(path + "-wal"), StampOf(path + "-shm")};
}

Way ChooseWay(const Stamps& stamps, bool isWal)
{
    const auto& [database, log, sharedMemory] = stamps;
    if (log.exists) return sharedMemory.exists ? Way::SharedWal : Way::PrivateWal;
    return isWal ? Way::Immutable : Way::Locked;
}

struct CloseStatement {
    void operator()(sqlite3_stmt* statement) const { ::sqlite3_finalize(statement); }
};
using Statement = std::unique_ptr<sqlite3_stmt, CloseStatement>;

struct CloseConnection {
    void operator()(sqlite3* connection) const { ::sqlite3_close(connection); }
};

using RowTaker = std::function<void(sqlite3_stmt*)>;

// A connection that reads, and what it has found.
class DatabaseReader {
  public:
    DatabaseReader(const std::string& path, Way way, DatabaseLook& look, const Progress& progress);

    // Fills in what the look is for.
    void Read();

  private:
    static int OnProgress(void* reader);
    int Run(
        const std::string& sql, const RowTaker& takeRow = [](sqlite3_stmt*) {});
    bool RunOrNote(const std::string& sql, const RowTaker& takeRow);
    void Configure();
    void CheckIntegrity();
    void CountRows();
    void CountRows(TableLook& table);
    void NoteFailure();

    std::unique_ptr<sqlite3, CloseConnection> connection_;
    Way way_;
    DatabaseLook& look_;
    const Progress& progress_;
    std::int64_t pages_ = 0;
};

std::string TextAt(sqlite3_stmt* row, int column)
{
    const auto* const bytes = static_cast<const char*>(::sqlite3_column_blob(row, column));
    const auto size = static_cast<std::size_t>(::sqlite3_column_bytes(row, column));
    return bytes == nullptr ? std::string() : std::string(bytes, size);
}

std::string Quote(const std::string& name)
{
    std::string quoted = "\"";
    for (const char character : name) quoted.append(character == '"' ? 2 : 1, character);
    return quoted + '"';
}

DatabaseReader::DatabaseReader(const std::string& path, Way way, DatabaseLook& look,
                               const Progress& progress)
    : way_(way), look_(look), progress_(progress)
{
    sqlite3* connection = nullptr;
    const int flags = SQLITE_OPEN_READONLY | SQLITE_OPEN_URI;
    (void)::sqlite3_open_v2(UriOf(path, way).c_str(), &connection, flags, nullptr);
    connection_.reset(connection);
}

void DatabaseReader::Read()
{
    sqlite3* const connection = connection_.get();
    if (connection == nullptr) throw std::bad_alloc();
    if (::sqlite3_errcode(connection) != SQLITE_OK) return NoteFailure();
    Configure();
    look_.state = DatabaseState::Ok;
    // One transaction, so that no writer comes in between where that would be noticed.
    (void)Run("BEGIN");
    const bool isReadable = RunOrNote(
        "PRAGMA page_count", [&](sqlite3_stmt* row) { pages_ = ::sqlite3_column_int64(row, 0); });
    if (!isReadable) return;
    CheckIntegrity();
    CountRows();
}

void DatabaseReader::Configure()
{
    sqlite3* const connection = connection_.get();
    ::sqlite3_busy_timeout(connection, BusyTimeoutMSec);
    ::sqlite3_progress_handler(connection, StepsPerProgress, OnProgress, this);
    // A schema made by somebody else runs no code of its own. The log is not written back.
    ::sqlite3_db_config(connection, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
    ::sqlite3_db_config(connection, SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
    ::sqlite3_db_config(connection, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 1, nullptr);
    (void)Run("PRAGMA temp_store=MEMORY");
    // Makes SQLite keep the index of the log in memory of its own.
    if (way_ == Way::PrivateWal) (void)Run("PRAGMA locking_mode=EXCLUSIVE");
}

// Runs a statement. Returns SQLITE_DONE after a success.
int DatabaseReader::Run(const std::string& sql, const RowTaker& takeRow)
{
    sqlite3_stmt* prepared = nullptr;
    int result = ::sqlite3_prepare_v2(connection_.get(), sql.c_str(), -1, &prepared, nullptr);
    const Statement statement(prepared);
    if (result == SQLITE_OK) {
        while ((result = ::sqlite3_step(prepared)) == SQLITE_ROW) takeRow(prepared);
    }
    return result;
}

bool DatabaseReader::RunOrNote(const std::string& sql, const RowTaker& takeRow)
{
    const bool hasSucceeded = Run(sql, takeRow) == SQLITE_DONE;
    if (!hasSucceeded) NoteFailure();
    return hasSucceeded;
}

void DatabaseReader::CheckIntegrity()
{
    std::vector<std::string>& problems = look_.problems;
    const int result = Run("PRAGMA integrity_check", [&](sqlite3_stmt* row) {
        // One row may tell several problems.
        std::istringstream lines(TextAt(row, 0));
        for (std::string line; std::getline(lines, line);) {
            if (line != "*** in database main ***") problems.push_back(line);
        }
    });
    if (problems == std::vector<std::string>{"ok"}) problems.clear();
    if (!problems.empty()) {
        look_.state = DatabaseState::Damaged;
    } else if (result != SQLITE_DONE) {
        NoteFailure();
    }
}

void DatabaseReader::CountRows()
{
    // A virtual table, which has no page of its own, would need its module.
    (void)Run(
        "SELECT name, rootpage FROM sqlite_master WHERE type='table' "
        "AND name NOT LIKE 'sqlite\\_%' ESCAPE '\\' ORDER BY name",
        [&](sqlite3_stmt* row) {
            look_.tables.push_back({TextAt(row, 0), std::nullopt});
            if (::sqlite3_column_int64(row, 1) > 0) CountRows(look_.tables.back());
        });
}

void DatabaseReader::CountRows(TableLook& table)
{
    (void)Run("SELECT count(*) FROM " + Quote(table.name),
              [&](sqlite3_stmt* row) { table.rows = ::sqlite3_column_int64(row, 0); });
}

void DatabaseReader::NoteFailure()
{
    sqlite3* const connection = connection_.get();
    const int code = ::sqlite3_extended_errcode(connection);
    switch (code & 0xff) {
        case SQLITE_BUSY:
        case SQLITE_LOCKED: look_.state = DatabaseState::Locked; break;
        case SQLITE_CORRUPT:
        case SQLITE_NOTADB:
            look_.state = DatabaseState::Damaged;
            look_.problems.emplace_back(::sqlite3_errmsg(connection));
            break;
        default:
            look_.state = DatabaseState::Unreadable;
            look_.reason = code == SQLITE_READONLY_ROLLBACK
                               ? "a transaction was interrupted, and the next writer must undo it"
                               : ::sqlite3_errmsg(connection);
    }
}

int DatabaseReader::OnProgress(void* reader)
{
    const auto& self = *static_cast<DatabaseReader*>(reader);
    int misses = 0;
    int highest = 0;
    constexpr std::int64_t Percent = 100;
    (void)::sqlite3_db_status(self.connection_.get(), SQLITE_DBSTATUS_CACHE_MISS, &misses, &highest,
                              0);
    // Some pages are read more than once.
    const std::int64_t read = self.pages_ > 0 ? Percent * misses / self.pages_ : 0;
    self.progress_(static_cast<int>(std::min(read, Percent - 1)));
    return 0;
}

bool IsWithoutLocks(Way way)
{
    return way == Way::PrivateWal || way == Way::Immutable;
}

// Looks once. None if somebody has changed the files meanwhile, or removed those that were chosen.
std::optional<DatabaseLook> LookOnce(const std::string& path, const DatabaseLook& start,
                                     bool isLastAttempt, const Progress& progress)
{
    DatabaseLook look = start;
    std::string header;
    const Stamps before = StampsOf(path);
    if (!OrvaDRCore::ReadRegularFile(path, header, ReadVersionAt + 1)) {
        look.reason = ErrorText(errno);
        return look;
    }
    const bool hasHeader =
        header.size() > ReadVersionAt && header.compare(0, Magic.size(), Magic) == 0;
    const bool isWal = hasHeader && header[ReadVersionAt] == WalVersion;
    if (hasHeader || header.empty()) look.journalMode = isWal ? "wal" : "delete";
    const Way way = ChooseWay(before, isWal);
    DatabaseReader(path, way, look, progress).Read();
    const bool isSame = StampsOf(path) == before;
    if (isSame || isLastAttempt) {
        const bool isDoubtful = !isSame && IsWithoutLocks(way);
        if (!isDoubtful) return look;
        look = start;                                               // GCOVR_EXCL_LINE: needs a
        look.reason = "changed again and again while it was read";  // GCOVR_EXCL_LINE: writer in
        return look;                                                // GCOVR_EXCL_LINE: each moment
    }
    const bool isCertain = !IsWithoutLocks(way) && look.state != DatabaseState::Unreadable;
    return isCertain ? std::optional<DatabaseLook>(look) : std::nullopt;
}

}  // namespace

DatabaseLook LookAtDatabase(const std::string& path, const Progress& progress)
{
    DatabaseLook start;
    struct stat status {};
    std::error_code error;
    // SQLite puts the log beside the file that a symbolic link leads to.
    const std::string real = std::filesystem::canonical(path, error).string();
    if (error || ::stat(real.c_str(), &status) != 0) {
        const bool isMissing =
            error == std::errc::no_such_file_or_directory || error == std::errc::not_a_directory;
        start.state = isMissing ? DatabaseState::Missing : DatabaseState::Unreadable;
        start.reason = error.message();
        return start;
    }
    start.size = status.st_size;
    if (!S_ISREG(status.st_mode)) {
        start.reason = "no regular file";
        return start;
    }
    for (int attempt = 1;; ++attempt) {
        const auto look = LookOnce(real, start, attempt == MaxAttempts, progress);
        if (look) return *look;
    }
}

}  // namespace Orvadr
