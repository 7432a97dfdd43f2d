// CoreLibExec().
#include <orvacore/orvacore.h>

#include <malloc.h>
#include <pthread.h>
#include <spawn.h>
#include <sys/file.h>
#include <sys/prctl.h>

#include <atomic>
#include <thread>

#include "caller.h"
#include "support/fakes/old_kernel.h"
#include "support/fakes/real_function.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/reap.h"
#include "support/processes/rights.h"

namespace {

// What happens instead of a posix_spawn(), in the process that calls it.
void (*insteadOfStarting)() = nullptr;

}  // namespace

// Replaces that of the C library in the test program.
extern "C" int posix_spawn(pid_t* pid, const char* path, const posix_spawn_file_actions_t* files,
                           const posix_spawnattr_t* attributes, char* const* arguments,
                           char* const* environment)
{
    if (insteadOfStarting != nullptr) insteadOfStarting();
    static const auto real = RealFunction<decltype(::posix_spawn)>("posix_spawn");
    return real(pid, path, files, attributes, arguments, environment);
}

namespace {

// Runs `body` in a caller whose programs are its children, and in one that ignores SIGCHLD, whose
// programs therefore have a companion.
void InBothKinds(const std::function<void()>& body)
{
    for (void (*handler)(int) : {SIG_DFL, SIG_IGN}) {
        SCOPED_TRACE(handler == SIG_DFL ? "children" : "companions");
        CheckInChild([&] {
            SetSignal(SIGCHLD, handler);
            body();
        });
    }
}

int Exec(const std::string& path, const char* argument1 = nullptr, const char* argument2 = nullptr,
         const char* argument3 = nullptr, const char* argument4 = nullptr)
{
    return CoreLibExec(path.c_str(), argument1, argument2, argument3, argument4);
}

int Shell(const std::string& script, const std::string& argument = "")
{
    return Exec("/bin/sh", "-c", script.c_str(), argument.c_str());
}

void ExpectNotStarted(const std::string& path, int error)
{
    errno = 0;
    EXPECT_EQ(Exec(path), -1) << path;
    EXPECT_EQ(errno, error) << path;
}

// Success, and all kinds of failure.
void ExpectTrueResults()
{
    EXPECT_EQ(Shell("exit 0"), 0);
    EXPECT_EQ(Shell("exit 3"), 3);
    EXPECT_EQ(Shell("kill -9 $$"), -1);
    ExpectNotStarted("/no/such/program", ENOENT);
}

// A lock whose descriptor is not closed when programs are started.
void HoldLock(const std::string& path)
{
    const int fd = ::open(path.c_str(), O_RDWR | O_CREAT, 0600);
    EXPECT_EQ(::flock(fd, LOCK_EX), 0);
}

class ProgramTest : public ::testing::Test {
  protected:
    std::string Script(const std::string& name, const std::string& text, mode_t mode) const
    {
        std::string path = dir.File(name);
        WriteFile(path, text);
        EXPECT_EQ(::chmod(path.c_str(), mode), 0);
        return path;
    }

    TempDir dir;
};

TEST_F(ProgramTest, ReturnsTheExitCode)
{
    for (const int code : {0, 1, 2, 126, 127, 128, 137, 255}) {
        EXPECT_EQ(Shell("exit $0", std::to_string(code)), code);
    }
}

TEST_F(ProgramTest, AProgramEndedByASignalHasFailed)
{
    InBothKinds([] {
        for (const int signal : {SIGHUP, SIGINT, SIGTERM, SIGSEGV, SIGRTMIN}) {
            SetSignal(signal, SIG_DFL);  // it may be ignored from outside
            EXPECT_EQ(Shell("ulimit -c 0; kill -$0 $$", std::to_string(signal)), -1) << signal;
        }
        errno = 0;
        EXPECT_EQ(Shell("kill -KILL $$"), -1);
        EXPECT_EQ(errno, EINTR);
    });
}

TEST_F(ProgramTest, AProgramThatCannotBeStartedIsAnError)
{
    ExpectNotStarted(dir.File("missing"), ENOENT);
    ExpectNotStarted(dir.File("missing/program"), ENOENT);
    ExpectNotStarted("", ENOENT);
    ExpectNotStarted(Script("plain", "#!/bin/sh\n", 0644), EACCES);
    ExpectNotStarted(dir.Path(), EACCES);
    ExpectNotStarted(dir.File("plain/program"), ENOTDIR);
    ExpectNotStarted(std::string(5000, 'x'), ENAMETOOLONG);
}

TEST_F(ProgramTest, ANullPathIsAnError)
{
    errno = 0;
    EXPECT_EQ(CoreLibExec(nullptr, "argument", nullptr, nullptr, nullptr), -1);
    EXPECT_EQ(errno, EINVAL);
}

TEST_F(ProgramTest, RunsNoShell)
{
    ExpectNotStarted("/bin/true; exit 0", ENOENT);
    ExpectNotStarted("true", ENOENT);  // no search in PATH either
    ExpectNotStarted(Script("commands", "exit 0\n", 0755), ENOEXEC);
}

TEST_F(ProgramTest, PassesArgumentsUnchanged)
{
    const std::string path = Script("show", "#!/bin/sh\nprintf '[%s]' \"$@\" >\"$0.out\"\n", 0755);
    struct Row {
        std::array<const char*, 4> given;
        const char* arrived;
    };
    const std::array<Row, 7> rows{{
        {{"one", "two", "three", "four"}, "[one][two][three][four]"},
        {{"one", "two", "three", nullptr}, "[one][two][three]"},
        {{"one", nullptr, "three", "four"}, "[one]"},
        {{nullptr, nullptr, nullptr, nullptr}, "[]"},
        {{"", " ", "", nullptr}, "[][ ][]"},
        {{"a b", "$HOME `id` $(id)", "*;|&<>", "'\"\\\n\t"},
         "[a b][$HOME `id` $(id)][*;|&<>]['\"\\\n\t]"},
        {{"--", "-e", "\xc3\xa4\xff", nullptr}, "[--][-e][\xc3\xa4\xff]"},
    }};
    for (const Row& row : rows) {
        EXPECT_EQ(Exec(path, row.given[0], row.given[1], row.given[2], row.given[3]), 0);
        EXPECT_EQ(ReadFile(path + ".out"), row.arrived);
    }
}

TEST_F(ProgramTest, KeepsEnvironmentAndDirectory)
{
    InBothKinds([&] {
        EXPECT_EQ(::chdir(dir.Path().c_str()), 0);
        // NOLINTNEXTLINE(concurrency-mt-unsafe): there is no other thread
        EXPECT_EQ(::setenv("ORVADR_TEST", "some value", 1), 0);
        EXPECT_EQ(Shell("test \"$ORVADR_TEST\" = 'some value' && test \"$(pwd -P)\" = \"$0\"",
                        std::filesystem::canonical(dir.Path()).string()),
                  0);
    });
}

// The descriptors that a program inherits, listed by itself.
std::string InheritedDescriptors(const TempDir& dir)
{
    const int file = ::open(dir.File("out").c_str(), O_RDWR | O_CREAT | O_TRUNC, 0600);
    for (const int fd : {0, 1, 2, 3, 4, 5, 63, 64, 200}) ::dup2(file, fd);
    EXPECT_EQ(Exec("/bin/ls", "/proc/self/fd"), 0);
    return ReadFile(dir.File("out"));
}

constexpr const char* StandardDescriptors = "0\n1\n2\n3\n";  // 3 is the directory that ls reads

TEST_F(ProgramTest, InheritsOnlyTheStandardDescriptors)
{
    InBothKinds([&] { EXPECT_EQ(InheritedDescriptors(dir), StandardDescriptors); });
}

TEST_F(ProgramTest, InheritsOnlyTheStandardDescriptorsOnOldKernels)
{
    for (const OldKernel& kernel : OldKernels) {
        SCOPED_TRACE(kernel.name);
        InBothKinds([&] {
            ASSERT_TRUE(kernel.pretend());
            EXPECT_EQ(InheritedDescriptors(dir), StandardDescriptors);
            ExpectTrueResults();
        });
    }
}

TEST_F(ProgramTest, ClosedStandardDescriptorsStayClosed)
{
    for (const std::string open : {"", "0", "1", "2", "01", "02", "12", "012"}) {
        InBothKinds([&] {
            for (const int fd : {0, 1, 2}) {
                if (open.find(std::to_string(fd)) == std::string::npos) ::close(fd);
            }
            const std::set<int> before = Descriptors();
            EXPECT_EQ(Shell("for fd in 0 1 2; do test -e /proc/$$/fd/$fd && seen=$seen$fd; done; "
                            "test \"$seen\" = \"$0\"",
                            open),
                      0);
            ExpectTrueResults();
            EXPECT_EQ(Descriptors(), before);
        });
    }
}

TEST_F(ProgramTest, ALockEndsWithItsHolderAlthoughAProgramItStartedLivesOn)
{
    const std::string lock = dir.File("lock");
    const std::string background = dir.File("background");
    InBothKinds([&] {
        HoldLock(lock);
        EXPECT_EQ(Shell("sleep 60 >/dev/null 2>&1 & echo $! >\"$0\"", background), 0);
        EXPECT_TRUE(IsLocked(lock));
    });
    const Bystander sleeper(ReadFile(background));
    EXPECT_EQ(CoreLibProcAlive(sleeper.pid), 1);
    EXPECT_FALSE(IsLocked(lock));
}

TEST_F(ProgramTest, AKilledCallerFreesItsLockWhileTheProgramRuns)
{
    const std::string lock = dir.File("lock");
    Pipe output;
    ChildProcess caller([&](ChildProcess::Link&) {
        HoldLock(lock);
        ::dup2(output.Writing(), STDOUT_FILENO);
        Shell("echo $$; exec sleep 60");
    });
    const Bystander program(output.ReadLine());
    EXPECT_TRUE(IsLocked(lock));
    caller.Kill(SIGTERM);
    EXPECT_EQ(caller.Join(), 128 + SIGTERM);
    EXPECT_EQ(CoreLibProcAlive(program.pid), 1);
    EXPECT_FALSE(IsLocked(lock));
}

TEST_F(ProgramTest, ReturnsTheResultWhateverTheCallerDoesWithSigchld)
{
    for (const ChildSignal& row : ChildSignals) {
        SCOPED_TRACE(row.name);
        CheckInChild([&] {
            SetSignal(SIGCHLD, row.handler, row.flags);
            for (int i = 0; i < 10; ++i) ExpectTrueResults();
            EXPECT_FALSE(HasChildren());
        });
    }
}

// A thread that waits for all children as long as this object lives.
class Reaper {
  public:
    Reaper()
        : thread_([this] {
              while (!done_) {
                  ReapChildren(0);
                  ::sched_yield();
              }
          })
    {
    }
    Reaper(const Reaper&) = delete;
    Reaper& operator=(const Reaper&) = delete;
    ~Reaper()
    {
        done_ = true;
        thread_.join();
    }

  private:
    std::atomic<bool> done_{false};
    std::thread thread_;
};

TEST_F(ProgramTest, ACompanionHidesTheResultFromAThreadThatReapsAllChildren)
{
    CheckInChild([] {
        SetSignal(SIGCHLD, ReapChildren, SA_RESTART);
        const Reaper reaper;
        for (int i = 0; i < 10; ++i) ExpectTrueResults();
    });
}

TEST_F(ProgramTest, AResultThatAnotherThreadGotIsNotKnown)
{
    CheckInChild([] {
        SetSignal(SIGCHLD, SIG_DFL);
        const Reaper reaper;
        for (int i = 0; i < 10; ++i) {
            errno = 0;
            const int result = Shell("exit 3");
            EXPECT_TRUE(result == 3 || (result == -1 && errno == ECHILD)) << result << ' ' << errno;
        }
    });
}

TEST_F(ProgramTest, ACompanionSendsNoSignalToTheCaller)
{
    CheckInChild([] {
        SetSignal(SIGCHLD, ReapChildren);
        BlockSignal(SIGCHLD);
        ExpectTrueResults();
        sigset_t pending;
        EXPECT_EQ(::sigpending(&pending), 0);
        EXPECT_EQ(::sigismember(&pending, SIGCHLD), 0);
    });
}

// The end of the pipe does not show that the companion has ended: somebody else holds it open.
TEST_F(ProgramTest, FailsWhenTheCompanionIsKilled)
{
    CheckInChild([] {
        SetSignal(SIGCHLD, SIG_IGN);
        static Pipe life;  // closed at the end of the caller
        insteadOfStarting = [] {
            if (::fork() == 0) {
                life.ReadToEnd();
                ::_exit(0);
            }
            ::kill(::getpid(), SIGKILL);
        };
        ExpectNotStarted("/bin/true", ECHILD);
        EXPECT_FALSE(HasChildren());
    });
}

TEST_F(ProgramTest, DoesNotReapOtherChildrenOfTheCaller)
{
    CheckInChild([] {
        const pid_t child = ::fork();
        if (child == 0) ::_exit(5);
        AwaitZombie(child);
        ExpectTrueResults();
        EXPECT_EQ(Reap(child), 5);
    });
}

TEST_F(ProgramTest, KeepsTheCallersSignalSettings)
{
    CheckInChild([] {
        SetSignal(SIGUSR1, ReapChildren, SA_RESTART | SA_NODEFER);
        SetSignal(SIGUSR2, SIG_IGN);
        SetSignal(SIGCHLD, ReapChildren, SA_NOCLDWAIT);
        BlockSignal(SIGTERM);
        const std::string before = SignalSettings();
        ExpectTrueResults();
        EXPECT_EQ(SignalSettings(), before);
    });
}

// The signals in a line of /proc/PID/status.
unsigned long long SignalsIn(const std::string& status, const std::string& line)
{
    const std::size_t at = status.find("\n" + line + ":");
    return std::strtoull(status.substr(at + line.size() + 2).c_str(), nullptr, 16);
}

TEST_F(ProgramTest, TheProgramHasTheCallersMaskAndIgnoredSignalsButNoHandlers)
{
    const auto bit = [](int signal) { return 1ULL << (signal - 1); };
    for (void (*handler)(int) : {SIG_DFL, SIG_IGN, ReapChildren}) {
        CheckInChild([&] {
            SetSignal(SIGUSR1, ReapChildren);
            SetSignal(SIGTERM, ReapChildren);
            SetSignal(SIGUSR2, SIG_IGN);
            SetSignal(SIGCHLD, handler);
            BlockSignal(SIGUSR1);
            BlockSignal(SIGINT);
            const int file = ::open(dir.File("status").c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
            ::dup2(file, STDOUT_FILENO);
            EXPECT_EQ(Exec("/bin/cat", "/proc/self/status"), 0);
        });
        const std::string status = ReadFile(dir.File("status"));
        EXPECT_EQ(SignalsIn(status, "SigBlk"), bit(SIGUSR1) | bit(SIGINT));
        EXPECT_EQ(SignalsIn(status, "SigCgt"), 0U);
        const unsigned long long ignored = SignalsIn(status, "SigIgn");
        EXPECT_NE(ignored & bit(SIGUSR2), 0U);
        EXPECT_EQ(ignored & bit(SIGCHLD), 0U) << "programs wait for children of their own";
        EXPECT_EQ(ignored & (bit(SIGUSR1) | bit(SIGTERM)), 0U);
    }
}

volatile sig_atomic_t signalsSeen = 0;

void CountSignal(int)
{
    signalsSeen = signalsSeen + 1;
}

TEST_F(ProgramTest, TheCallersHandlersRunWhileItWaits)
{
    InBothKinds([] {
        SetSignal(SIGUSR1, CountSignal);  // without SA_RESTART it interrupts the wait
        for (int run = 1; run <= 10; ++run) {
            EXPECT_EQ(Shell("kill -USR1 $0; exit 7", std::to_string(::getpid())), 7);
            EXPECT_EQ(signalsSeen, run);
        }
    });
}

TEST_F(ProgramTest, ASignalForTheWholeGroupDoesNotLoseTheResult)
{
    InBothKinds([] {
        EXPECT_EQ(::setpgid(0, 0), 0);
        SetSignal(SIGTERM, CountSignal);
        EXPECT_EQ(Shell("trap '' TERM; kill -TERM 0; exit 7"), 7);
        EXPECT_EQ(signalsSeen, 1);
    });
}

TEST_F(ProgramTest, TheOutputEndsWithTheProgramAlone)
{
    InBothKinds([] {
        Pipe input;
        ::dup2(input.Reading(), STDIN_FILENO);
        FILE* stream = CoreLibPopen("/bin/sh", "r", "-c", "echo said; exec >/dev/null; read x",
                                    static_cast<char*>(nullptr));
        ASSERT_NE(stream, nullptr);
        std::array<char, 16> line{};
        EXPECT_STREQ(std::fgets(line.data(), line.size(), stream), "said\n");
        EXPECT_EQ(std::fgets(line.data(), line.size(), stream), nullptr);
        input.Write("\n");
        EXPECT_EQ(CoreLibPclose(stream), 0);
    });
}

TEST_F(ProgramTest, ManyThreadsRunProgramsAtOnce)
{
    constexpr int Threads = 8;
    constexpr int Runs = 50;
    std::atomic<int> right{0};
    std::vector<std::thread> threads;
    threads.reserve(Threads);
    for (int thread = 0; thread < Threads; ++thread) {
        threads.emplace_back([&right, thread] {
            for (int run = 0; run < Runs; ++run) {
                const int code = (thread * Runs + run) % 256;
                if (Shell("exit $0", std::to_string(code)) == code) ++right;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(right, Threads * Runs);
}

TEST_F(ProgramTest, AThreadWithASmallStackRunsPrograms)
{
    pthread_attr_t attributes;
    ASSERT_EQ(::pthread_attr_init(&attributes), 0);
    ASSERT_EQ(::pthread_attr_setstacksize(&attributes, std::size_t{64} * 1024), 0);
    const auto run = [](void* result) -> void* {
        *static_cast<int*>(result) = CoreLibExec("/bin/sh", "-c", "exit 3", nullptr, nullptr);
        return nullptr;
    };
    pthread_t thread{};
    int result = 0;
    ASSERT_EQ(::pthread_create(&thread, &attributes, run, &result), 0);
    EXPECT_EQ(::pthread_join(thread, nullptr), 0);
    EXPECT_EQ(result, 3);
    ::pthread_attr_destroy(&attributes);
}

TEST_F(ProgramTest, AChildNeedsNoFreeDescriptors)
{
    CheckInChild([] {
        SetSignal(SIGCHLD, SIG_DFL);
        LeaveDescriptors(0);
        EXPECT_EQ(Exec("/bin/true"), 0);
    });
}

TEST_F(ProgramTest, WithoutDescriptorsForACompanionNoProgramIsStarted)
{
    for (int spare = 0; spare < 2; ++spare) {
        CheckInChild([spare] {
            SetSignal(SIGCHLD, SIG_IGN);
            LeaveDescriptors(spare);
            ExpectNotStarted("/bin/true", EMFILE);
            EXPECT_FALSE(HasChildren());
        });
    }
}

TEST_F(ProgramTest, WhenNoProcessCanBeMadeNoProgramIsStarted)
{
    InBothKinds([] {
        EXPECT_TRUE(LoseRights());
        const std::set<int> before = Descriptors();
        const rlimit none{0, 0};
        EXPECT_EQ(::setrlimit(RLIMIT_NPROC, &none), 0);
        ExpectNotStarted("/bin/true", EAGAIN);
        EXPECT_EQ(Descriptors(), before);
    });
}

TEST_F(ProgramTest, RunsLeaveNothingBehind)
{
    InBothKinds([] {
        const auto pages = [] { return Number(ReadFile("/proc/self/statm")); };
        const auto run = [](int times) {
            for (int i = 0; i < times; i += 2) {
                EXPECT_EQ(Exec("/bin/true"), 0);
                ExpectNotStarted("/no/such/program", ENOENT);
            }
        };
        run(10);
        const std::set<int> descriptors = Descriptors();
        const std::size_t allocatedBefore = ::mallinfo2().uordblks;
        const long pagesBefore = pages();
        run(300);
        // For each run, less than the smallest allocation, and less than one page.
        EXPECT_LT(::mallinfo2().uordblks, allocatedBefore + std::size_t{300} * 16);
        EXPECT_LT(pages(), pagesBefore + 200);
        EXPECT_EQ(Descriptors(), descriptors);
        EXPECT_FALSE(HasChildren());
    });
}

}  // namespace
