// Many processes that write to one database at the same time. Each has its own records and
// remembers the results of its operations.
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <ctime>
#include <functional>
#include <ostream>
#include <stdexcept>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include <orvadrcore/sqlite_command.h>
#include <orvadrcore/sqlite_condition.h>
#include <orvadrcore/sqlite_db.h>

#include "support/fakes/pauses.h"
#include "support/fakes/steady_disk.h"
#include "support/fixtures/process_test.h"
#include "support/fixtures/scale.h"
#include "support/processes/child_process.h"
#include "support/processes/crowd.h"
#include "support/processes/shared_memory.h"

namespace {

using OrvaDRCore::InsertCommand;
using OrvaDRCore::SelectCommand;
using OrvaDRCore::SqliteDB;
using OrvaDRCore::SqliteEqual;
using OrvaDRCore::SqliteTableHandler;
using OrvaDRCore::SqliteValueList;
using OrvaDRCore::UpdateCommand;
using std::chrono::milliseconds;
using Clock = std::chrono::steady_clock;

// The longest that statements may wait for other processes. Each gets one attempt more than the
// retry limit, with pauses between them, and in each attempt SQLite waits up to its time-out. It
// may wait just as long when it reads the schema, at first or again.
milliseconds LongestWait(int statements, int retryLimit)
{
    constexpr milliseconds BusyTimeout(1000);
    constexpr milliseconds LongestPause(1000);
    const milliseconds attempts = (retryLimit + 1) * BusyTimeout + retryLimit * LongestPause;
    return statements * attempts + 2 * BusyTimeout;
}

// An operation looks up its table, creates it if the lookup failed, and runs its statement.
constexpr int MostStatements = 3;

// How long the file is locked at a time: longer than one attempt waits, and longer than all
// statements of an operation wait without retries. And for how long it is free in between.
constexpr std::chrono::seconds HeldForAnAttempt(2);
constexpr std::chrono::seconds HeldForAnOperation(MostStatements + 1);
constexpr std::chrono::seconds Free(3);

constexpr int UsualLimit = 5;
constexpr int MaxWriters = 16;
constexpr int MaxRecords = 20'000;  // of one writer

const SqliteTableHandler& Jobs()
{
    static const SqliteTableHandler table("jobs", "id INTEGER PRIMARY KEY, state INTEGER");
    return table;
}

// A record's state as its writer was told; Absent when it is not there.
constexpr int Absent = 0;
constexpr int Made = 1;
constexpr int Changed = 2;

bool Insert(SqliteDB& db, int id)
{
    InsertCommand insert;
    insert.SetTable(Jobs());
    insert.AddFieldValue("id", id);
    insert.AddFieldValue("state", Made);
    return db.InsertRecord(insert);
}

struct Writer {
    std::array<std::atomic<unsigned char>, MaxRecords> states;
    std::atomic<int> records;  // inserts attempted
    std::atomic<int> done;     // operations that returned true
    std::atomic<int> failed;   // operations that returned false
    std::atomic<int> wrong;    // selects that contradicted an earlier result
    std::atomic<int> pauses;   // repeated attempts

    // In milliseconds: the longest wait of an operation, of an operation that is a single
    // statement, and the longest operation, work included.
    std::atomic<int> wait;
    std::atomic<int> statementWait;
    std::atomic<int> longest;
};

// One process at work.
class Work {
  public:
    Work(SqliteDB&& connection, int number, Writer& notes)
        : db_(std::move(connection)), firstId_(number * MaxRecords), writer_(notes)
    {
    }

    // Inserts a record, changes it and reads it back. Removes every other one.
    void DoNext()
    {
        const int record = writer_.records++;
        const int id = firstId_ + record;
        std::atomic<unsigned char>& state = writer_.states.at(static_cast<std::size_t>(record));
        if (Take([&] { return Insert(db_, id); })) state = Made;
        // Change() returns true even without such a record.
        if (Take([&] { return Change(id); }, &Writer::statementWait) && state == Made)
            state = Changed;
        Check(id, state);
        if (record % 2 == 0 && Take([&] { return Delete(id); })) state = Absent;
    }

  private:
    // Runs and measures an operation.
    template <class Operation>
    bool Take(Operation operation, std::atomic<int> Writer::*wait = &Writer::wait)
    {
        const auto begin = Clock::now();
        const Slept before = CountSlept();
        const bool done = operation();
        const Slept after = CountSlept();
        KeepLonger(writer_.longest, Clock::now() - begin);
        KeepLonger(writer_.*wait,
                   std::chrono::microseconds(after.microseconds - before.microseconds));
        writer_.pauses += after.pauses - before.pauses;
        ++(done ? writer_.done : writer_.failed);
        return done;
    }

    static void KeepLonger(std::atomic<int>& longest, std::chrono::nanoseconds time)
    {
        const auto count = std::chrono::duration_cast<milliseconds>(time).count();
        longest = std::max<int>(longest, static_cast<int>(count));
    }

    // Without a schema there is no table lookup.
    bool Change(int id)
    {
        UpdateCommand update;
        update.SetTable(SqliteTableHandler(Jobs().GetName(), ""));
        update.AddFieldValue("state", Changed);
        update.SetCondition(SqliteEqual("id", id));
        return db_.UpdateRecord(update);
    }

    bool Delete(int id) { return db_.DeleteRecord(SqliteEqual("id", id).GetCondition(), Jobs()); }

    void Check(int id, int expected)
    {
        SelectCommand select;
        select.SetTable(Jobs());
        select.AddField("state");
        select.SetCondition(SqliteEqual("id", id));
        std::vector<SqliteValueList> rows;
        if (!Take([&] { return db_.SelectRecords(select, rows); })) return;
        int state = Absent;
        // An attempt that failed halfway may have left its rows in front.
        if (!rows.empty() && !rows.back().GetValue("state", state)) state = -1;
        if (state != expected) ++writer_.wrong;
    }

    SqliteDB db_;
    int firstId_;
    Writer& writer_;
};

class ContentionTest : public ProcessTest {
  protected:
    using Writers = std::array<Writer, MaxWriters>;

    std::string Path() const { return disk.File("jobs.db"); }

    // Lets many processes work for a time, and checks that the file holds what they were told.
    void Run(int retryLimit, std::chrono::seconds time, const std::function<void()>& onStart);

    // The same while another process locks the file now and then.
    void RunBesideHolder(int retryLimit, std::chrono::seconds time, std::chrono::seconds held);

    // A process that locks the database and reports it. After Tell() it unlocks and locks it by
    // turns.
    ChildProcess StartHolder(std::chrono::seconds time, std::chrono::seconds held);

    // The file holds exactly the records that the writers were told it does.
    void ExpectFileMatchesResults() const;

    int Sum(std::atomic<int> Writer::*number) const
    {
        int sum = 0;
        for (const Writer& writer : *writers) sum += writer.*number;
        return sum;
    }

    int Most(std::atomic<int> Writer::*number) const
    {
        int most = 0;
        for (const Writer& writer : *writers) most = std::max<int>(most, writer.*number);
        return most;
    }

    const SteadyDisk disk;
    SharedMemory<Writers> writers;
    SharedMemory<std::atomic<int>> holds;
};

void ContentionTest::Run(int retryLimit, std::chrono::seconds time,
                         const std::function<void()>& onStart)
{
    const int count = std::min(Scaled(8, MaxWriters), MaxWriters);
    const Crowd crowd(count, [&](int number) {
        const Clock::time_point end = Clock::now() + time;
        Writer& writer = writers->at(static_cast<std::size_t>(number));
        Work work(SqliteDB(Path(), static_cast<unsigned int>(retryLimit)), number, writer);
        while (Clock::now() < end && writer.records < MaxRecords) work.DoNext();
    });
    ASSERT_TRUE(crowd.Start());
    onStart();
    EXPECT_TRUE(crowd.Join());

    ExpectFileMatchesResults();
    EXPECT_LE(Most(&Writer::statementWait), LongestWait(1, retryLimit).count());
    EXPECT_LE(Most(&Writer::wait), LongestWait(MostStatements, retryLimit).count());
    EXPECT_GT(Sum(&Writer::done), 0);
    ReportCount("writers", count);
    ReportCount("operations", Sum(&Writer::done));
    ReportCount("operations_per_second", Sum(&Writer::done) / static_cast<int>(time.count()));
    ReportCount("operations_given_up", Sum(&Writer::failed));
    ReportCount("repeated_tries", Sum(&Writer::pauses));
    ReportCount("longest_statement_wait_msec", Most(&Writer::statementWait));
    ReportCount("longest_wait_msec", Most(&Writer::wait));
    ReportCount("longest_operation_msec", Most(&Writer::longest));
}

void ContentionTest::RunBesideHolder(int retryLimit, std::chrono::seconds time,
                                     std::chrono::seconds held)
{
    ChildProcess holder = StartHolder(time, held);
    ASSERT_TRUE(holder.Await());
    Run(retryLimit, time, [&holder] { holder.Tell(); });
    EXPECT_EQ(holder.Join(), 0);
    EXPECT_GT(*holds, 0);
    ReportCount("holds", *holds);
}

ChildProcess ContentionTest::StartHolder(std::chrono::seconds time, std::chrono::seconds held)
{
    constexpr unsigned int DeadlineSeconds = 600;
    return ChildProcess([this, time, held](ChildProcess::Link& link) {
        ::alarm(DeadlineSeconds);
        SqliteDB db(Path(), UsualLimit);
        if (!db.Open() || !db.Exec("BEGIN EXCLUSIVE")) return;
        link.Tell();
        link.Await();
        const Clock::time_point end = Clock::now() + time;
        do {
            std::this_thread::sleep_for(held);
            if (db.Exec("COMMIT")) ++*holds;
            std::this_thread::sleep_for(Free);
            while (Clock::now() < end && !db.Exec("BEGIN EXCLUSIVE")) {
            }
        } while (Clock::now() < end);
    });
}

void ContentionTest::ExpectFileMatchesResults() const
{
    EXPECT_EQ(Sum(&Writer::wrong), 0);
    SqliteDB db(Path(), 0);
    ASSERT_TRUE(db.Open());
    SqliteValueList verdict;
    EXPECT_TRUE(db.SelectByCommand("PRAGMA integrity_check", verdict));
    EXPECT_EQ(verdict.ToStr(), "integrity_check:'ok'");
    std::vector<SqliteValueList> rows;
    ASSERT_TRUE(db.SelectByCommand("SELECT id, state FROM jobs", rows));

    int expected = 0;
    for (const Writer& writer : *writers) {
        expected += static_cast<int>(std::count_if(writer.states.begin(), writer.states.end(),
                                                   [](int state) { return state != Absent; }));
    }
    EXPECT_EQ(static_cast<int>(rows.size()), expected);
    for (const SqliteValueList& row : rows) {
        int id = 0;
        int state = Absent;
        ASSERT_TRUE(row.GetValue("id", id) && row.GetValue("state", state));
        const Writer& writer = writers->at(static_cast<std::size_t>(id / MaxRecords));
        ASSERT_EQ(state, writer.states.at(static_cast<std::size_t>(id % MaxRecords)))
            << "record " << id;
    }
}

TEST_F(ContentionTest, TheFileHoldsExactlyWhatSucceeded)
{
    Run(UsualLimit, std::chrono::seconds(Scaled(3, 60)), [] {});
    EXPECT_EQ(Sum(&Writer::failed), 0);
}

TEST_F(ContentionTest, WritersWaitForAProcessThatHoldsTheLockForLong)
{
    RunBesideHolder(UsualLimit, std::chrono::seconds(Scaled(4, 60)), HeldForAnAttempt);
    EXPECT_EQ(Sum(&Writer::failed), 0);
    EXPECT_GT(Sum(&Writer::pauses), 0);
}

TEST_F(ContentionTest, FailedOperationsChangeNothing)
{
    RunBesideHolder(0, std::chrono::seconds(Scaled(6, 60)), HeldForAnOperation);
    EXPECT_EQ(Sum(&Writer::pauses), 0);
    EXPECT_GT(Sum(&Writer::failed), 0);
}

// ---------------------------------------------------------------------------------- no starvation

struct Participant {
    std::atomic<int> served;
    std::atomic<int> failed;
    std::atomic<int> wait;  // the longest, in milliseconds
};

// Writers that insert row by row into one file as fast as they can, and readers among them.
struct Queue {
    int writers;
    int readers;
    int rowsPerWriter;  // enough that nobody gets less than a tenth of its share by chance
    int longestWaitSeconds;
};

std::ostream& operator<<(std::ostream& out, const Queue& queue)
{
    return out << queue.writers << " writers and " << queue.readers << " readers";
}

class QueueTest : public ProcessTest,
                  public ::testing::WithParamInterface<std::tuple<std::string, Queue>> {
  protected:
    static constexpr int MaxParticipants = 80;
    static constexpr std::chrono::seconds Deadline{120};

    static int Goal(const Queue& queue) { return queue.writers * queue.rowsPerWriter; }
    static int Least(const Queue& queue) { return queue.rowsPerWriter / 10; }

    // Shared by the processes.
    struct Board {
        std::array<Participant, MaxParticipants> participants;
        std::atomic<int> ready;
        std::atomic<int> rows;
    };

    bool IsOver(const Queue& queue) const;
    void TakePart(const Queue& queue, int number) const;
    bool DoOnce(SqliteDB& db, bool isWriter, int id) const;

    const SteadyDisk disk;
    const std::string path = disk.File("jobs.db");
    SharedMemory<Board> board;
};

bool QueueTest::DoOnce(SqliteDB& db, bool isWriter, int id) const
{
    if (isWriter) return Insert(db, id);
    SelectCommand select;
    select.SetTable(Jobs());
    select.SelectAll();
    select.SetCondition(SqliteEqual("id", id));
    SqliteValueList row;
    return db.SelectRecord(select, row);
}

// Whether all rows are stored, and nobody starves. Writers may begin late on a busy machine.
bool QueueTest::IsOver(const Queue& queue) const
{
    const Participant* const begin = board->participants.data();
    return board->rows >= Goal(queue) &&
           std::all_of(begin, begin + queue.writers,
                       [&](const Participant& writer) { return writer.served >= Least(queue); });
}

void QueueTest::TakePart(const Queue& queue, int number) const
{
    SqliteDB db(path, UsualLimit);
    if (!db.Open()) throw std::runtime_error("cannot open");
    Participant& participant = board->participants.at(static_cast<std::size_t>(number));
    const bool isWriter = number < queue.writers;
    const Clock::time_point deadline = Clock::now() + Deadline;
    ++board->ready;
    while (board->ready < queue.writers + queue.readers && Clock::now() < deadline) {
        std::this_thread::sleep_for(milliseconds(1));
    }
    for (int turn = 0; !IsOver(queue) && Clock::now() < deadline; ++turn) {
        const long long before = CountSlept().microseconds;
        const bool done = DoOnce(db, isWriter, number * 1'000'000 + turn);
        const auto wait = static_cast<int>((CountSlept().microseconds - before) / 1000);
        participant.wait = std::max<int>(participant.wait, wait);
        ++(done ? participant.served : participant.failed);
        if (isWriter && done) ++board->rows;
        if (!isWriter) std::this_thread::sleep_for(milliseconds(5));
    }
}

TEST_P(QueueTest, EveryWriterIsServedAndNoOperationFails)
{
    const auto& [journal, queue] = GetParam();
    {
        SqliteDB db(path, 0);
        SqliteValueList mode;
        ASSERT_TRUE(db.Open() && db.CreateTable(Jobs()) &&
                    db.SelectByCommand("PRAGMA journal_mode=" + journal, mode));
    }
    const Crowd crowd(queue.writers + queue.readers,
                      [this](int number) { TakePart(std::get<Queue>(GetParam()), number); });
    ASSERT_TRUE(crowd.Start());
    EXPECT_TRUE(crowd.Join());

    int least = board->rows;
    int longestWait = 0;
    for (int number = 0; number < queue.writers + queue.readers; ++number) {
        const Participant& participant = board->participants.at(static_cast<std::size_t>(number));
        EXPECT_EQ(participant.failed, 0);
        longestWait = std::max<int>(longestWait, participant.wait);
        if (number < queue.writers) least = std::min<int>(least, participant.served);
    }
    EXPECT_GE(board->rows, Goal(queue));
    EXPECT_GE(least, Least(queue));
    EXPECT_LE(longestWait, queue.longestWaitSeconds * 1000);
    ReportCount("rows", board->rows);
    ReportCount("rows_of_the_least_served", least);
    ReportCount("longest_wait_msec", longestWait);
}

const int RowsOf16 = Scaled(200, 1000);
const int RowsOf64 = Scaled(120, 400);

INSTANTIATE_TEST_SUITE_P(
    Journals, QueueTest,
    ::testing::Combine(::testing::Values(std::string("delete"), std::string("wal")),
                       ::testing::Values(Queue{16, 0, RowsOf16, 5}, Queue{16, 4, RowsOf16, 5},
                                         Queue{64, 0, RowsOf64, 10}, Queue{64, 16, RowsOf64, 10})));

TEST_F(ContentionTest, WaitingCostsLittleProcessorTime)
{
    constexpr int MostOfASecond = 100;  // milliseconds
    SqliteDB holder(Path(), 0);
    ASSERT_TRUE(holder.Open() && holder.CreateTable(Jobs()) && holder.Exec("BEGIN IMMEDIATE"));
    const SharedMemory<std::atomic<int>> processorMSec;
    ChildProcess waiting([&](ChildProcess::Link&) {
        SqliteDB db(Path(), 0);
        if (!db.Open()) throw std::runtime_error("cannot open");
        const std::clock_t before = std::clock();
        const bool isDone = db.DoExecSqliteCommand("INSERT INTO jobs VALUES (1,1)");
        *processorMSec = static_cast<int>((std::clock() - before) * 1000 / CLOCKS_PER_SEC);
        if (isDone) throw std::runtime_error("the lock does not hold");
    });
    EXPECT_EQ(waiting.Join(), 0);
    EXPECT_LE(*processorMSec, MostOfASecond);
    ReportCount("processor_msec", *processorMSec);
}

}  // namespace
