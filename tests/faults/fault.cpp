#include "fault.h"

#include <json/value.h>
#include <sqlite3.h>
#include <sys/prctl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <climits>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <memory>
#include <new>
#include <optional>
#include <vector>

#include "base/json_helpers.h"
#include "support/fakes/allocation_faults.h"
#include "support/fakes/log_sink.h"
#include "support/fakes/pauses.h"
#include "support/fakes/process_faults.h"
#include "support/fakes/syscall_faults.h"
#include "support/fixtures/scale.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/shared_memory.h"

// In builds with the address sanitizer: looks for leaks.
extern "C" __attribute__((weak)) int __lsan_do_recoverable_leak_check();  // NOLINT

namespace {

constexpr unsigned int DeadlineSeconds = 60;  // of one trial: only ends what hangs
constexpr const char* LockDir = "/tmp/.orvadr_lock";

struct Kind {
    const char* name;
    std::vector<int> errors;
};

// The errors to try for each call: documented ones.
const std::array<Kind, static_cast<std::size_t>(Call::None)>& Kinds()
{
    static const std::array<Kind, static_cast<std::size_t>(Call::None)> kinds{{
        {"open", {EACCES, EMFILE, EINTR, ENOENT, ENOMEM, ENOSPC}},
        {"read", {EIO, EINTR, EAGAIN}},
        {"write", {ENOSPC, EINTR, EIO, EAGAIN}},
        {"fchmod", {EIO, EACCES, ENOMEM}},
        {"fsync", {EIO, ENOSPC, EINTR}},
        {"rename", {ENOSPC, EACCES, ENOENT, ENOMEM}},
        {"unlink", {EACCES, EIO, ENOENT, ENOMEM}},
        {"close", {EIO, EINTR, ENOSPC}},
        {"stat", {ENOENT, EACCES, ENOMEM}},
        {"fstat", {ENOMEM, EIO}},
        {"flock", {EINTR, EAGAIN, ENOMEM}},
        {"fcntl", {EAGAIN, EACCES, EINTR, EMFILE}},
        {"fork", {EAGAIN, ENOMEM}},
        {"clone", {EAGAIN, ENOMEM}},
        {"pipe2", {EMFILE}},
        {"dup2", {EMFILE, EINTR}},
        {"waitpid", {EINTR}},
        {"posix_spawn", {ENOENT, EACCES, ENOMEM, EIO, EMFILE, EAGAIN}},
        {"getrandom", {EINTR}},
        {"fdopen", {ENOMEM, EMFILE}},
        {"memory", {ENOMEM}},
        {"all memory", {ENOMEM}},
        // Only errors that SQLite's own file system can return.
        {"db open", {SQLITE_CANTOPEN, SQLITE_IOERR, SQLITE_NOMEM}},
        {"db access", {SQLITE_IOERR_ACCESS}},
        {"db delete", {SQLITE_IOERR_DELETE}},
        {"db read", {SQLITE_IOERR_READ, SQLITE_IOERR_CORRUPTFS}},
        {"db write", {SQLITE_FULL, SQLITE_IOERR_WRITE}},
        {"db sync", {SQLITE_IOERR_FSYNC}},
        {"db truncate", {SQLITE_IOERR_TRUNCATE}},
        {"db file size", {SQLITE_IOERR_FSTAT}},
        {"db lock", {SQLITE_BUSY, SQLITE_IOERR_LOCK}},
        {"db check lock", {SQLITE_IOERR_CHECKRESERVEDLOCK}},
        {"db shared memory", {SQLITE_IOERR_SHMMAP, SQLITE_CANTOPEN, SQLITE_NOMEM}},
        {"db shared lock", {SQLITE_BUSY, SQLITE_IOERR_SHMLOCK}},
    }};
    return kinds;
}

// Totals of all operations, printed at the end of the program.
struct Sums : ::testing::Environment {
    int operations = 0;
    int calls = 0;
    int faults = 0;

    void TearDown() override
    {
        std::printf("[  FAULTS  ] %d operations, %d calls, %d faults\n", operations, calls, faults);
    }
};
Sums& sums = static_cast<Sums&>(*::testing::AddGlobalTestEnvironment(new Sums));

// Shared by the trials and all processes that they fork: of the calls `call` number `at`, counted
// from 1, fails with `error`.
struct Plan {
    Call call;
    int at;
    int error;
    pid_t caller;
    bool isRunning;
    bool hasEscaped;
    int faults;
    std::atomic<bool> isArmed;
    std::atomic<bool> hasStruck;
    std::atomic<int> lines;
    std::array<std::atomic<int>, static_cast<std::size_t>(Call::None)> seen;
};

Plan& ThePlan()
{
    static const SharedMemory<Plan> plan;
    return *plan;
}

const TempDir* lockPlace = nullptr;

bool AllocationFails()
{
    return Strike(Call::Memory) != 0 || Strike(Call::AllMemory) != 0;
}

// A path, below /tmp/.orvadr_lock replaced by where the test keeps the file. Allocates nothing.
struct Placed {
    explicit Placed(const char* given) : path(given)
    {
        const std::size_t length = std::strlen(LockDir);
        if (given == nullptr || std::strncmp(given, LockDir, length) != 0) return;
        (void)std::snprintf(text.data(), text.size(), "%s%s", lockPlace->Path().c_str(),
                            given + length);
        path = text.data();
    }
    Placed(const Placed&) = delete;
    Placed& operator=(const Placed&) = delete;

    std::array<char, PATH_MAX> text{};
    const char* path;
};

int OpenPlaced(const char* path, int flags, mode_t mode)
{
    return RealOpen(Placed(path).path, flags, mode);
}

int StatPlaced(const char* path, struct stat* status)
{
    return RealStat(Placed(path).path, status);
}

int SpawnPlaced(SpawnCall call)
{
    const int error = Strike(Call::Spawn);
    if (error != 0) return error;
    const Placed first(call.arguments[1]);
    const Placed second(call.arguments[1] != nullptr ? call.arguments[2] : nullptr);
    std::array<char*, 8> placed{};
    for (std::size_t i = 0; call.arguments[i] != nullptr && i + 1 < placed.size(); ++i) {
        placed[i] = call.arguments[i];
    }
    if (placed[1] != nullptr) placed[1] = const_cast<char*>(first.path);
    if (placed[2] != nullptr) placed[2] = const_cast<char*>(second.path);
    call.arguments = placed.data();
    return RealSpawn(call);
}

// Syncs nothing: no trial is about power cuts, and disks are slow.
int NoSync(int /*fd*/)
{
    return 0;
}

// The descriptor is closed even if close fails.
int CloseAnyway(int fd)
{
    const int result = RealClose(fd);
    const int error = Strike(Call::Close);
    if (error == 0) return result;
    errno = error;
    return -1;
}

void CountLine(int priority, const char* format, std::va_list arguments)
{
    DropLine(priority, format, arguments);
    ++ThePlan().lines;
}

// Makes system calls and allocations fail as planned, and sleeps take no time.
class System {
  public:
    System()
    {
        lockPlace = &locks_;
        Let(faults_.open, OpenPlaced, Call::Open);
        Let(faults_.read, RealRead, Call::Read);
        Let(faults_.write, RealWrite, Call::Write);
        Let(faults_.fchmod, RealFchmod, Call::Fchmod);
        Let(faults_.fsync, NoSync, Call::Fsync);
        Let(faults_.fdatasync, NoSync, Call::Fsync);
        Let(faults_.rename, RealRename, Call::Rename);
        Let(faults_.unlink, RealUnlink, Call::Unlink);
        Let(faults_.stat, StatPlaced, Call::Stat);
        Let(faults_.stat64, RealStat64, Call::Stat);
        Let(faults_.lstat, RealLstat, Call::Stat);
        Let(faults_.fstat, RealFstat, Call::Fstat);
        Let(faults_.flock, RealFlock, Call::Flock);
        Let(faults_.fcntl, RealFcntl, Call::Fcntl);
        Let(faults_.clone, RealClone, Call::Clone);
        Let(faults_.pipe2, RealPipe2, Call::Pipe);
        Let(faults_.dup2, RealDup2, Call::Dup);
        Let(faults_.waitpid, RealWaitpid, Call::Waitpid);
        Let(faults_.getrandom, RealGetrandom, Call::Getrandom);
        Let(faults_.fdopen, RealFdopen, Call::Fdopen);
        Let(processes_.fork, RealFork, Call::Fork);
        faults_.close = CloseAnyway;
        faults_.spawn = SpawnPlaced;
        // The C library allocates for the texts of errors once. It does so now, before we count.
        for (const Kind& kind : Kinds()) {
            for (const int error : kind.errors) {
                std::array<char, 128> text{};
                EXPECT_NE(::strerror_r(error, text.data(), text.size()), nullptr);
            }
        }
        // So does our library for JSON.
        Json::Value document;
        EXPECT_TRUE(OrvaDRCore::fromString(document, OrvaDRCore::toString(document)));
        faults_.sleep = [](unsigned int /*seconds*/) { return 0U; };
        SendLogTo(CountLine);
        AskBeforeAllocating(AllocationFails);
    }
    System(const System&) = delete;
    System& operator=(const System&) = delete;
    ~System()
    {
        AskBeforeAllocating(nullptr);
        lockPlace = nullptr;
    }

  private:
    template <class Result, class... Arguments>
    static void Let(std::function<Result(Arguments...)>& answer, Result (*real)(Arguments...),
                    Call call)
    {
        answer = [real, call](Arguments... arguments) -> Result {
            const int error = Strike(call);
            if (error == 0) return real(arguments...);
            errno = error;
            if constexpr (std::is_pointer_v<Result>) {
                return nullptr;
            } else {
                return -1;
            }
        };
    }

    TempDir locks_;
    SyscallFaults faults_;
    ProcessFaults processes_;
};

void AwaitChildren()
{
    int status = 0;
    pid_t child = 0;
    while ((child = RealWaitpid(-1, &status, __WALL)) > 0 || errno == EINTR) {
        // A process that waits for a program ends as the program did: by this signal.
        EXPECT_TRUE(child < 0 || !WIFSIGNALED(status) || WTERMSIG(status) == SIGKILL)
            << "a child was ended by signal " << WTERMSIG(status);
    }
}

// Runs the trial as planned. Whatever it leaves behind is a failure.
void RunTrial(const std::function<void()>& trial)
{
    Plan& plan = ThePlan();
    plan.isRunning = true;
    plan.hasStruck = false;
    plan.caller = ::getpid();
    ::alarm(DeadlineSeconds);
    EXPECT_EQ(::prctl(PR_SET_CHILD_SUBREAPER, 1), 0);
    const std::size_t descriptors = CountDescriptors();
    const long allocations = CountLiveAllocations();
    {
        const Pauses pauses;
        trial();
    }
    if (!::testing::Test::HasFailure()) {
        EXPECT_EQ(CountLiveAllocations(), allocations) << "memory leaks";
        EXPECT_EQ(CountDescriptors(), descriptors) << "descriptors leak";
        EXPECT_FALSE(plan.hasEscaped) << "a child went on with its parent's work";
    }
    ::alarm(0);
    plan.isRunning = false;
}

// The number of the next call to fail. There are many allocations: after the first 30 only some
// fail, unless the test is a long one.
int Next(Call call, int at)
{
    constexpr int Always = 30;
    const bool isAllocation = call == Call::Memory || call == Call::AllMemory;
    return isAllocation && at > Always ? at + Scaled(7, 1) : at + 1;
}

std::string Describe(const std::string& operation)
{
    const Plan& plan = ThePlan();
    return operation + " with " + Kinds()[static_cast<std::size_t>(plan.call)].name + " number " +
           std::to_string(plan.at) + " failing with error " + std::to_string(plan.error);
}

// Makes each call of a kind fail with each of these errors. Runs in a child process.
void Sweep(const std::string& operation, Call call, const std::vector<int>& errors,
           const std::function<void()>& trial)
{
    Plan& plan = ThePlan();
    plan.call = call;
    for (const int error : errors) {
        plan.error = error;
        for (plan.at = 1;; plan.at = Next(call, plan.at)) {
            RunTrial(trial);
            if (::testing::Test::HasFailure()) {
                ADD_FAILURE() << Describe(operation);
                return;
            }
            if (!plan.hasStruck) break;
            ++plan.faults;
        }
    }
    if (&__lsan_do_recoverable_leak_check != nullptr) {
        EXPECT_EQ(__lsan_do_recoverable_leak_check(), 0) << Describe(operation);
    }
}

// The errors to try: two of them, unless the test is a long one.
std::vector<int> ErrorsOf(Call call)
{
    std::vector<int> errors = Kinds()[static_cast<std::size_t>(call)].errors;
    const auto count = static_cast<std::size_t>(Scaled(2, INT_MAX));
    errors.resize(std::min(errors.size(), count));
    return errors;
}

void EveryCallFails(const std::string& operation, Call first, Call end,
                    const std::function<void()>& trial)
{
    const System system;
    Plan& plan = ThePlan();
    plan.call = Call::None;
    plan.faults = 0;
    RunTrial(trial);
    // The second run no longer allocates what is allocated once per process.
    RunTrial(trial);
    if (::testing::Test::HasFailure()) return;

    int calls = 0;
    std::string list;
    std::vector<int> seen(plan.seen.begin(), plan.seen.end());
    for (auto kind = static_cast<std::size_t>(first); kind < static_cast<std::size_t>(end);
         ++kind) {
        if (seen[kind] == 0) continue;
        const Call call = static_cast<Call>(kind);
        const int before = plan.faults;
        CheckInChild([&] { Sweep(operation, call, ErrorsOf(call), trial); });
        if (plan.isRunning) ADD_FAILURE() << Describe(operation) << ": the process died";
        list += std::string(", ") + Kinds()[kind].name + " " + std::to_string(seen[kind]) + "/" +
                std::to_string(plan.faults - before);
        calls += seen[kind];
        if (::testing::Test::HasFailure()) break;
    }
    std::printf("[  FAULTS  ] %s: %d calls, %d faults (%s)\n", operation.c_str(), calls,
                plan.faults, list.empty() ? "" : list.c_str() + 2);
    ++sums.operations;
    sums.calls += calls;
    sums.faults += plan.faults;
    ::testing::Test::RecordProperty("calls", calls);
    ::testing::Test::RecordProperty("faults", plan.faults);
}

}  // namespace

int Strike(Call call)
{
    Plan& plan = ThePlan();
    if (!plan.isArmed) return 0;
    const int number = ++plan.seen[static_cast<std::size_t>(call)];
    if (call != plan.call) return 0;
    if (call == Call::AllMemory ? number < plan.at : number != plan.at) return 0;
    plan.hasStruck = true;
    return plan.error;
}

bool IsFailing(Call call)
{
    return ThePlan().call == call;
}

Outcome WithFault(const std::function<bool()>& operation)
{
    Plan& plan = ThePlan();
    for (auto& count : plan.seen) count = 0;
    plan.lines = 0;
    Outcome outcome{};
    bool isOurs = true;
    plan.isArmed = true;
    try {
        outcome.succeeded = operation();
    } catch (const std::bad_alloc&) {
        outcome.threw = true;
    } catch (const Json::RuntimeError&) {
        outcome.threw = true;  // jsoncpp's exception when it cannot allocate a text
    } catch (...) {
        isOurs = false;
    }
    if (::getpid() != plan.caller) {
        plan.hasEscaped = true;
        ::_exit(1);
    }
    AwaitChildren();
    plan.isArmed = false;
    outcome.lines = plan.lines;
    const bool isOfMemory = plan.call == Call::Memory || plan.call == Call::AllMemory;
    EXPECT_TRUE(isOurs && (isOfMemory || !outcome.threw)) << "an unexpected exception escaped";
    return outcome;
}

std::string PlaceOfLock(const std::string& path)
{
    std::string place = Placed(path.c_str()).path;
    std::filesystem::create_directories(std::filesystem::path(place).parent_path());
    return place;
}

void EveryCallFails(const std::string& operation, const std::function<void()>& trial)
{
    EveryCallFails(operation, Call::Open, Call::DbOpen, trial);
}

void EveryDatabaseCallFails(const std::string& operation, const std::function<void()>& trial)
{
    EveryCallFails(operation, Call::DbOpen, Call::None, trial);
}
