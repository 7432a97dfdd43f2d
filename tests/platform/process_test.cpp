// CoreLibProcForkEx() and CoreLibProcAlive().
#include <orvacore/orvacore.h>

#include <sched.h>
#include <stdio.h>
#include <sys/prctl.h>
#include <sys/single_threaded.h>
#include <sys/socket.h>
#include <sys/syscall.h>

#include <atomic>
#include <climits>
#include <csignal>
#include <cstdint>
#include <ctime>
#include <filesystem>
#include <thread>

#include "caller.h"
#include "support/fakes/real_function.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/reap.h"
#include "support/processes/rights.h"
#include "support/processes/shared_memory.h"
#include "support/processes/stat_field.h"

namespace {

// What happens instead of the fork at which the countdown reaches 0. Every child counts on from its
// copy of the countdown.
struct ForkFault {
    int forksUntil;
    void (*action)();
};
ForkFault forkFault{0, nullptr};

// A lock of the C library that a number of intermediate processes wait for, in this way.
struct LibraryLock {
    std::atomic<int> waits;
    void (*wait)();
    pid_t caller;
};
LibraryLock* libraryLock = nullptr;

// By how many seconds the monotonic clock advances whenever it is read.
std::atomic<std::time_t> clockStep{0};
std::atomic<std::time_t> clockAhead{0};

}  // namespace

// Replaces that of the C library in the test program.
extern "C" pid_t fork() noexcept
{
    if (forkFault.forksUntil > 0 && --forkFault.forksUntil == 0) {
        forkFault.action();
        return -1;
    }
    static const auto real = RealFunction<pid_t()>("fork");
    return real();
}

// Likewise. It stands for all functions that take such a lock.
extern "C" int setlogmask(int mask) noexcept
{
    if (libraryLock != nullptr && libraryLock->caller != ::getpid() && libraryLock->waits > 0) {
        --libraryLock->waits;
        libraryLock->wait();
    }
    static const auto real = RealFunction<int(int)>("setlogmask");
    return real(mask);
}

// Likewise.
extern "C" int clock_gettime(clockid_t clock, timespec* time) noexcept
{
    static const auto real = RealFunction<int(clockid_t, timespec*)>("clock_gettime");
    const int result = real(clock, time);
    if (clock == CLOCK_MONOTONIC) time->tv_sec += clockAhead += clockStep;
    return result;
}

#if __SIZEOF_LONG__ == 4
// The C++ library of a 32-bit machine may use the older function, which has 32-bit times.
struct ShortTime {
    std::int32_t seconds;
    std::int32_t nanoseconds;
};
extern "C" int ShortClock(clockid_t clock, ShortTime* time) noexcept __asm__("clock_gettime");
extern "C" int ShortClock(clockid_t clock, ShortTime* time) noexcept
{
    timespec now{};
    const int result = ::clock_gettime(clock, &now);
    *time = {static_cast<std::int32_t>(now.tv_sec), static_cast<std::int32_t>(now.tv_nsec)};
    return result;
}
#endif

namespace {

// Forks a detached child that runs `body` and exits. Returns its process id.
pid_t Detach(const std::function<void()>& body)
{
    const pid_t pid = CoreLibProcForkEx(CORELIB_FORK_DETACHED);
    if (pid == 0) {
        ::alarm(60);
        body();
        ::_exit(0);
    }
    EXPECT_GT(pid, 0);
    return pid;
}

void ExpectNotForked(int error)
{
    const std::set<int> before = Descriptors();
    errno = 0;
    const pid_t pid = CoreLibProcForkEx(CORELIB_FORK_DETACHED);
    const int found = errno;
    if (pid == 0) ::_exit(0);
    EXPECT_EQ(pid, -1);
    EXPECT_EQ(found, error);
    EXPECT_EQ(Descriptors(), before);
    EXPECT_FALSE(HasChildren());
}

TEST(ForkTest, TheFlagsValueIsFixed)
{
    EXPECT_EQ(CORELIB_FORK_DETACHED, 0x40);
}

TEST(ForkTest, WithoutFlagsTheCallerMustWaitForTheChild)
{
    CheckInChild([] {
        const pid_t caller = ::getpid();
        const pid_t child = CoreLibProcForkEx(0);
        if (child == 0) ::_exit(::getppid() == caller ? 5 : 6);
        EXPECT_EQ(Reap(child), 5);
    });
}

TEST(ForkTest, WithoutFlagsAFailureIsReturned)
{
    CheckInChild([] {
        forkFault = {1, [] { errno = ENOMEM; }};
        EXPECT_EQ(CoreLibProcForkEx(0), -1);
        EXPECT_EQ(errno, ENOMEM);
    });
}

TEST(DetachedForkTest, ReturnsTheIdOfTheProcessThatRunsTheChildsCode)
{
    CheckInChild([] {
        Pipe report;
        const pid_t child = Detach([&] { report.Write(std::to_string(::getpid())); });
        EXPECT_EQ(report.ReadToEnd(), std::to_string(child));
        EXPECT_NE(child, ::getpid());
    });
}

TEST(DetachedForkTest, TheCallerHasNoChildToWaitFor)
{
    CheckInChild([] {
        Pipe forked;
        Pipe report;
        const pid_t child = Detach([&] {
            forked.ReadToEnd();
            report.Write(std::to_string(::getppid()));
        });
        EXPECT_EQ(::waitpid(child, nullptr, WNOHANG), -1);
        EXPECT_EQ(errno, ECHILD);
        EXPECT_FALSE(HasChildren());
        forked.CloseWriting();
        EXPECT_NE(report.ReadToEnd(), std::to_string(::getpid()));
    });
}

TEST(DetachedForkTest, DoesNotReapOtherChildrenOfTheCaller)
{
    CheckInChild([] {
        const pid_t other = ::fork();
        if (other == 0) ::_exit(5);
        AwaitZombie(other);
        Detach([] {});
        int status = 0;
        EXPECT_EQ(::waitpid(other, &status, 0), other);
        EXPECT_EQ(WEXITSTATUS(status), 5);
        EXPECT_FALSE(HasChildren());
    });
}

TEST(DetachedForkTest, WorksWhateverTheCallerDoesWithSigchld)
{
    for (const ChildSignal& row : ChildSignals) {
        SCOPED_TRACE(row.name);
        CheckInChild([&] {
            SetSignal(SIGCHLD, row.handler, row.flags);
            for (int i = 0; i < 20; ++i) {
                Pipe report;
                const pid_t child = Detach([&] { report.Write(std::to_string(::getpid())); });
                EXPECT_EQ(report.ReadToEnd(), std::to_string(child));
                EXPECT_FALSE(HasChildren());
            }
        });
    }
}

// What a detached child inherits.
std::string Settings()
{
    const mode_t mask = ::umask(0);
    ::umask(mask);
    return std::filesystem::current_path().string() + '\n' + std::to_string(mask) + '\n' +
           SignalSettings();
}

TEST(DetachedForkTest, KeepsDirectoryUmaskAndSignals)
{
    const TempDir dir;
    CheckInChild([&] {
        EXPECT_EQ(::chdir(dir.Path().c_str()), 0);
        ::umask(0137);
        SetSignal(SIGUSR1, ReapChildren, SA_RESTART | SA_NODEFER);
        SetSignal(SIGCHLD, SIG_IGN);
        BlockSignal(SIGUSR2);
        SetSignal(SIGALRM, ReapChildren, SA_RESTART);
        BlockSignal(SIGALRM);
        Pipe report;
        Detach([&] { report.Write(Settings()); });
        EXPECT_EQ(report.ReadToEnd(), Settings());
    });
}

// Identifies the file of a descriptor.
std::string Target(const struct stat& status)
{
    return std::to_string(status.st_dev) + ' ' + std::to_string(status.st_ino) + ' ' +
           std::to_string(status.st_rdev);
}

std::string Target(int fd)
{
    struct stat status {};
    return ::fstat(fd, &status) < 0 ? "closed" : Target(status);
}

std::string Target(const std::string& path)
{
    struct stat status {};
    EXPECT_EQ(::stat(path.c_str(), &status), 0) << path;
    return Target(status);
}

// Instead of a terminal, which not every system provides.
int OpenDevice(const std::string&)
{
    return ::open("/dev/zero", O_RDWR);
}

template <int End>
int OpenPipe(const std::string&)
{
    std::array<int, 2> ends{};
    EXPECT_EQ(::pipe(ends.data()), 0);
    return ends[End];
}

template <int Family, int Type>
int OpenSocket(const std::string&)
{
    return ::socket(Family, Type, 0);
}

int OpenFifo(const std::string& path)
{
    EXPECT_EQ(::mkfifo(path.c_str(), 0600), 0);
    return ::open(path.c_str(), O_RDWR);
}

TEST(DetachedForkTest, StandardPipesAndSocketsBecomeTheNullDevice)
{
    struct Row {
        const char* name;
        int (*open)(const std::string& path);
        bool stays;
    };
    const std::array<Row, 8> rows{{
        {"reading end of a pipe", OpenPipe<0>, false},
        {"writing end of a pipe", OpenPipe<1>, false},
        {"named pipe", OpenFifo, false},
        {"local socket", OpenSocket<AF_UNIX, SOCK_DGRAM>, false},
        {"network socket", OpenSocket<AF_INET, SOCK_STREAM>, false},
        {"file", [](const std::string& path) { return OpenFile(path, O_RDWR | O_CREAT); }, true},
        {"directory", [](const std::string&) { return ::open("/", O_RDONLY); }, true},
        {"device", OpenDevice, true},
    }};
    for (const Row& row : rows) {
        for (const int fd : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
            SCOPED_TRACE(std::string(row.name) + " on " + std::to_string(fd));
            const TempDir dir;
            CheckInChild([&] {
                const int stream = row.open(dir.File("stream"));
                const std::string before = Target(stream);
                EXPECT_EQ(::dup2(stream, fd), fd);
                Pipe report;
                Detach([&] { report.Write(Target(fd)); });
                EXPECT_EQ(report.ReadToEnd(), row.stays ? before : Target("/dev/null"));
                EXPECT_EQ(Target(fd), before);
            });
        }
    }
}

TEST(DetachedForkTest, TheNullDeviceCanBeReadWrittenAndInherited)
{
    CheckInChild([] {
        const Pipe streams;
        for (const int fd : {0, 1, 2}) EXPECT_EQ(::dup2(streams.Writing(), fd), fd);
        Pipe report;
        Detach([&] {
            for (const int fd : {0, 1, 2}) {
                char byte = 'x';
                report.Write(std::to_string(::write(fd, &byte, 1)));
                report.Write(std::to_string(::read(fd, &byte, 1)));
                report.Write(std::to_string(::fcntl(fd, F_GETFD)) + " ");
            }
        });
        EXPECT_EQ(report.ReadToEnd(), "100 100 100 ");
    });
}

TEST(DetachedForkTest, ClosedStandardStreamsStayClosed)
{
    for (const std::string open : {"", "0", "1", "2", "01", "02", "12"}) {
        SCOPED_TRACE("open: " + open);
        CheckInChild([&] {
            Pipe report;
            const Pipe stream;
            for (const int fd : {0, 1, 2}) {
                if (open.find(std::to_string(fd)) == std::string::npos) {
                    ::close(fd);
                } else {
                    ::dup2(stream.Writing(), fd);
                }
            }
            Detach([&] {
                for (const int fd : {0, 1, 2}) {
                    if (Target(fd) != "closed") report.Write(std::to_string(fd));
                }
            });
            EXPECT_EQ(report.ReadToEnd(), open);
        });
    }
}

TEST(DetachedForkTest, KeepsOtherDescriptorsAndAddsNone)
{
    CheckInChild([] {
        Pipe report;
        const Pipe other;
        const std::set<int> before = Descriptors();
        Detach([&] { report.Write(Descriptors() == before ? "same" : "different"); });
        EXPECT_EQ(Descriptors(), before);
        EXPECT_EQ(report.ReadToEnd(), "same");
    });
}

TEST(DetachedForkTest, TheCallersOutputEndsWithTheCaller)
{
    Pipe output;
    Pipe never;
    CheckInChild([&] {
        ::dup2(output.Writing(), STDOUT_FILENO);
        output.CloseWriting();
        output.CloseReading();
        const pid_t child = Detach([&] { never.ReadToEnd(); });
        EXPECT_GT(::dprintf(STDOUT_FILENO, "%d", child), 0);
    });
    const Bystander child(output.ReadToEnd());
    EXPECT_EQ(CoreLibProcAlive(child.pid), 1);
}

TEST(DetachedForkTest, AFailureOfTheFirstForkIsReturned)
{
    CheckInChild([] {
        forkFault = {1, [] { errno = EAGAIN; }};
        ExpectNotForked(EAGAIN);
    });
}

TEST(DetachedForkTest, AFailureOfTheSecondForkIsReturned)
{
    CheckInChild([] {
        forkFault = {2, [] { errno = ENOMEM; }};
        ExpectNotForked(ENOMEM);
    });
}

TEST(DetachedForkTest, FailsWhenTheIntermediateProcessIsKilled)
{
    CheckInChild([] {
        forkFault = {2, [] { ::kill(::getpid(), SIGKILL); }};
        ExpectNotForked(ECHILD);
    });
}

// The end of the pipe does not show that it has ended. A caller that ignores SIGCHLD has no result
// to wait for either.
TEST(DetachedForkTest, NoticesAKilledIntermediateProcessWhosePipeIsStillOpen)
{
    for (auto* const disposition : {SIG_DFL, SIG_IGN}) {
        CheckInChild([disposition] {
            static Pipe life;  // closed at the end of the caller
            EXPECT_NE(std::signal(SIGCHLD, disposition), SIG_ERR);
            forkFault = {2, [] {
                             if (::fork() == 0) {
                                 life.ReadToEnd();
                                 ::_exit(0);
                             }
                             ::kill(::getpid(), SIGKILL);
                         }};
            ExpectNotForked(ECHILD);
        });
    }
}

// As with a mutex, and as with a spin lock.
[[noreturn]] void WaitForEver()
{
    while (true) ::pause();
}

[[noreturn]] void SpinForEver()
{
    while (true) ::sched_yield();
}

void WorkForAWhile()
{
    const std::clock_t begin = std::clock();
    while (std::clock() - begin < CLOCKS_PER_SEC / 50) {
    }
}

class LockedLibraryTest : public ::testing::Test {
  protected:
    // Makes the next intermediate processes find the lock taken; they get it if `wait` returns.
    // Starts a second thread: without one nobody could hold the lock.
    void Lock(int waits, void (*wait)())
    {
        std::thread([] { ::pause(); }).detach();
        LockForOneThread(waits, wait);
    }

    void LockForOneThread(int waits, void (*wait)())
    {
        lock->waits = waits;
        lock->wait = wait;
        lock->caller = ::getpid();
        libraryLock = &*lock;
    }

    static void ExpectForked()
    {
        Pipe report;
        const pid_t child = Detach([&] { report.Write(std::to_string(::getpid())); });
        EXPECT_EQ(report.ReadToEnd(), std::to_string(child));
        EXPECT_FALSE(HasChildren());
    }

    SharedMemory<LibraryLock> lock;
};

TEST_F(LockedLibraryTest, TheCallerForksAgainUntilTheLockIsFree)
{
    for (void (*wait)() : {&WaitForEver, &SpinForEver}) {
        CheckInChild([&] {
            Lock(3, wait);
            ExpectForked();
            EXPECT_EQ(lock->waits, 0);
        });
    }
}

TEST_F(LockedLibraryTest, ASlowProcessIsNotTakenForOneThatWaits)
{
    CheckInChild([this] {
        Lock(INT_MAX, WorkForAWhile);
        ExpectForked();
    });
}

TEST_F(LockedLibraryTest, WithoutOtherThreadsNoLockIsTested)
{
    CheckInChild([this] {
        __libc_single_threaded = 1;  // other tests of this program had threads
        LockForOneThread(INT_MAX, WaitForEver);
        ExpectForked();
        EXPECT_EQ(lock->waits, INT_MAX);
    });
}

TEST_F(LockedLibraryTest, ALockThatIsNeverFreeIsAFailure)
{
    CheckInChild([this] {
        Lock(INT_MAX, WaitForEver);
        ExpectNotForked(EDEADLK);
        EXPECT_LT(lock->waits, INT_MAX - 10);
    });
}

// On a machine where forks are slow, five seconds may be too short for a lock to become free.
TEST_F(LockedLibraryTest, FiftyAttemptsAreMadeHoweverLongTheyTake)
{
    CheckInChild([this] {
        Lock(INT_MAX, WaitForEver);
        clockStep = 3600;
        forkFault = {1000, nullptr};  // counts the forks
        ExpectNotForked(EDEADLK);
        EXPECT_EQ(forkFault.forksUntil, 1000 - 50);
    });
}

TEST(DetachedForkTest, WithoutDescriptorsNothingIsForked)
{
    for (int spare = 0; spare < 2; ++spare) {
        CheckInChild([spare] {
            const std::set<int> before = Descriptors();
            rlimit limits{};
            ::getrlimit(RLIMIT_NOFILE, &limits);
            LeaveDescriptors(spare);
            errno = 0;
            EXPECT_EQ(CoreLibProcForkEx(CORELIB_FORK_DETACHED), -1);
            EXPECT_EQ(errno, EMFILE);
            ::setrlimit(RLIMIT_NOFILE, &limits);
            EXPECT_EQ(Descriptors(), before);
            EXPECT_FALSE(HasChildren());
        });
    }
}

TEST(DetachedForkTest, ManyForksLeaveNothingBehind)
{
    CheckInChild([] {
        const std::set<int> before = Descriptors();
        for (int i = 0; i < 300; ++i) Detach([] {});
        EXPECT_EQ(Descriptors(), before);
        EXPECT_FALSE(HasChildren());
    });
}

TEST(DetachedForkTest, ThreadsForkAtOnce)
{
    constexpr int Threads = 4;
    constexpr int Forks = 10;
    CheckInChild([] {
        Pipe report;
        std::array<std::set<pid_t>, Threads> returned;
        std::vector<std::thread> threads;
        threads.reserve(Threads);
        for (std::set<pid_t>& children : returned) {
            threads.emplace_back([&] {
                for (int i = 0; i < Forks; ++i) {
                    children.insert(
                        Detach([&] { ::dprintf(report.Writing(), "%d\n", ::getpid()); }));
                }
            });
        }
        for (std::thread& thread : threads) thread.join();
        std::set<pid_t> all;
        for (std::set<pid_t>& children : returned) all.merge(children);
        std::set<pid_t> seen;
        std::istringstream lines(report.ReadToEnd());
        for (pid_t pid = 0; lines >> pid;) seen.insert(pid);
        EXPECT_EQ(seen.size(), static_cast<std::size_t>(Threads * Forks));
        EXPECT_EQ(seen, all);
        EXPECT_FALSE(HasChildren());
    });
}

TEST(AliveTest, ThisProcessIsAlive)
{
    EXPECT_EQ(CoreLibProcAlive(::getpid()), 1);
}

TEST(AliveTest, NumbersOfNoProcessAreNotAlive)
{
    for (const pid_t pid : {0, -1, -2, INT_MIN, INT_MAX}) EXPECT_EQ(CoreLibProcAlive(pid), 0);
    EXPECT_EQ(CoreLibProcAlive(-::getpgrp()), 0);  // nor is a process group
}

TEST(AliveTest, AProcessOfAnotherUserIsAlive)
{
    CheckInChild([] {
        EXPECT_TRUE(LoseRights());
        EXPECT_EQ(CoreLibProcAlive(1), 1);
    });
}

TEST(AliveTest, AStoppedProcessIsAlive)
{
    ChildProcess process([](ChildProcess::Link& link) { link.Await(); });
    process.Kill(SIGSTOP);
    siginfo_t info{};
    const auto id = static_cast<id_t>(process.Pid());
    EXPECT_EQ(::waitid(P_PID, id, &info, WSTOPPED), 0);
    EXPECT_EQ(CoreLibProcAlive(process.Pid()), 1);
    process.Kill(SIGCONT);
    process.Tell();
    EXPECT_EQ(process.Join(), 0);
}

TEST(AliveTest, ZombiesAndEndedProcessesAreNotAliveWhateverTheirName)
{
    for (const char* name : {"name", ") Z (", ") S (", ")", "", "a b\n1 2", "0123456789abcdef"}) {
        SCOPED_TRACE(name);
        ChildProcess process([name](ChildProcess::Link& link) {
            ::prctl(PR_SET_NAME, name);
            link.Tell();
            link.Await();
        });
        EXPECT_TRUE(process.Await());
        const pid_t pid = process.Pid();
        EXPECT_EQ(CoreLibProcAlive(pid), 1);

        process.Tell();
        AwaitZombie(pid);
        EXPECT_EQ(::kill(pid, 0), 0);
        EXPECT_EQ(CoreLibProcAlive(pid), 0);

        EXPECT_EQ(process.Join(), 0);
        EXPECT_EQ(CoreLibProcAlive(pid), 0);
    }
}

TEST(AliveTest, TheIdOfAThreadIsNotAlive)
{
    pid_t thread = 0;
    int alive = -1;
    std::thread([&] {
        thread = static_cast<pid_t>(::syscall(SYS_gettid));
        alive = CoreLibProcAlive(thread);
    }).join();
    EXPECT_NE(thread, ::getpid());
    EXPECT_EQ(alive, 0);
}

TEST(AliveTest, AProcessIsAliveAsLongAsOneOfItsThreads)
{
    ChildProcess process([](ChildProcess::Link& link) {
        std::thread([&link] {
            while (StatField(::getpid(), 3) != "Z") ::sched_yield();
            link.Tell();
            link.Await();
            ::_exit(0);
        }).detach();
        ::syscall(SYS_exit, 0);  // ends the first thread only
    });
    EXPECT_TRUE(process.Await());
    EXPECT_EQ(CoreLibProcAlive(process.Pid()), 1);
    process.Tell();
    EXPECT_EQ(process.Join(), 0);
}

}  // namespace
