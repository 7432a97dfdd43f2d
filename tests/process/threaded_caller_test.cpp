// Caches in a program with other threads: these may hold locks of the C and C++ libraries at the
// moment of a fork, and they start programs, which inherit descriptors.
#include <gtest/gtest.h>
#include <signal.h>
#include <spawn.h>
#include <sys/file.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <functional>
#include <locale>
#include <memory>
#include <sstream>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include <orvadrcore/file_lock.h>

#include "support/fakes/global_locale.h"
#include "support/fixtures/process_test.h"
#include "support/fixtures/scale.h"
#include "support/processes/await.h"
#include "support/processes/child_process.h"
#include "support/processes/reap.h"

namespace {

using OrvaDRCore::FileLock;

constexpr int Old = 1;
constexpr int New = 2;

// Threads that repeat some work all the time, with short pauses.
class BusyThreads {
  public:
    BusyThreads(int count, const std::function<void()>& work)
    {
        for (int i = 0; i < count; ++i) {
            threads_.emplace_back([this, work] {
                while (!done_) {
                    for (int turn = 0; turn < Turns; ++turn) work();
                    std::this_thread::sleep_for(std::chrono::milliseconds(1));
                }
            });
        }
    }
    BusyThreads(const BusyThreads&) = delete;
    BusyThreads& operator=(const BusyThreads&) = delete;
    ~BusyThreads()
    {
        done_ = true;
        for (std::thread& thread : threads_) thread.join();
    }

  private:
    static constexpr int Turns = 50;

    std::atomic<bool> done_{false};
    std::vector<std::thread> threads_;
};

void Log()
{
    ::syslog(LOG_DEBUG, "a line of another thread");
}

void FormatTimes()
{
    const std::time_t now = std::time(nullptr);
    std::tm parts{};
    ::localtime_r(&now, &parts);
    std::array<char, 64> text{};
    (void)std::strftime(text.data(), text.size(), "%c", &parts);
}

void CopyLocales()
{
    const std::locale copy;
    std::ostringstream() << 1.5;
}

void TranslateErrors()
{
    std::array<char, 128> text{};
    [[maybe_unused]] const char* const translated = ::strerror_r(EAGAIN, text.data(), text.size());
}

void ChangeLocale()
{
    static_cast<void>(std::setlocale(LC_MESSAGES, "C"));  // NOLINT(concurrency-mt-unsafe)
}

void Allocate()
{
    for (std::size_t size = 16; size < 5000; size *= 3) std::make_unique<char[]>(size);
}

void WriteToStdio()
{
    static FILE* const stream = std::fopen("/dev/null", "w");
    static_cast<void>(std::fprintf(stream, "a line of another thread\n"));
    static_cast<void>(std::fflush(stream));
}

class ThreadedCallerTest : public ProcessTest {
  protected:
    // Refreshes a cache in the background `times` times. Returns what went wrong; empty on success.
    std::string Refresh(int times)
    {
        const DocumentCache cache = MakeCache(Mode::Background, Gives(New));
        for (int i = 0; i < times; ++i) {
            MakeStale();
            if (!cache.Update()) return "no child was made";
            if (!AwaitUntil([&] { return !cache.IsTimeout(); })) return "nothing was written";
            if (!AwaitUntil([&] { return ::access(PidFile().c_str(), F_OK) != 0; })) {
                return "the mark was not removed";
            }
            FileLock lock(LockName());
            if (!AwaitUntil([&] { return lock.tryLock(LOCK_EX | LOCK_NB); })) {
                return "the lock was not freed";
            }
        }
        return "";
    }

    // The same in a child with `count` threads that repeat `work`.
    void ExpectRefreshesBeside(int count, const std::function<void()>& work, int times)
    {
        ChildProcess process([&](ChildProcess::Link& /*link*/) {
            constexpr unsigned int DeadlineSeconds = 3000;
            ::alarm(DeadlineSeconds);
            const GlobalLocale locale(new std::numpunct<char>);  // no longer the classic one
            std::string failure;
            {
                const BusyThreads threads(count, work);
                failure = Refresh(times);
            }
            EXPECT_EQ(failure, "");
            if (HasFailure()) ::_exit(2);
        });
        EXPECT_EQ(process.Join(), 0);
        ReapAll();
        EXPECT_EQ(NumberInFile(), New);
        ReportCount("refreshes", times);
    }
};

TEST_F(ThreadedCallerTest, BackgroundRefreshesDoNotHangBesideThreadsOfOneKind)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    const std::vector<std::pair<const char*, void (*)()>> rows{
        {"log", Log},
        {"format times", FormatTimes},
        {"copy locales", CopyLocales},
        {"translate errors", TranslateErrors},
        {"change the locale", ChangeLocale},
        {"allocate", Allocate},
        {"write to stdio", WriteToStdio},
    };
    for (const auto& [name, work] : rows) {
        SCOPED_TRACE(name);
        ExpectRefreshesBeside(4, work, Scaled(20, 1000));
        if (HasFailure()) return;
    }
}

TEST_F(ThreadedCallerTest, BackgroundRefreshesDoNotHangBesideThreadsThatDoEverything)
{
    if (!HasLocks()) return;
    WriteStale(Old);
    const auto work = [] {
        for (void (*each)() : {Log, FormatTimes, CopyLocales, TranslateErrors, ChangeLocale,
                               Allocate, WriteToStdio}) {
            each();
        }
    };
    ExpectRefreshesBeside(8, work, Scaled(50, 10'000));
}

// Programs that inherit all open descriptors, and run until End().
class Sleepers {
  public:
    Sleepers() = default;
    Sleepers(const Sleepers&) = delete;
    Sleepers& operator=(const Sleepers&) = delete;
    ~Sleepers() { End(); }

    void Start()
    {
        std::array<char*, 3> arguments{const_cast<char*>("sleep"), const_cast<char*>("60"),
                                       nullptr};
        pid_t pid = 0;
        if (::posix_spawn(&pid, "/bin/sleep", nullptr, nullptr, arguments.data(), environ) == 0) {
            pids_.push_back(pid);
        }
    }

    void End()
    {
        for (const pid_t pid : std::exchange(pids_, {})) {
            ::kill(pid, SIGKILL);
            ::waitpid(pid, nullptr, 0);
        }
    }

  private:
    std::vector<pid_t> pids_;
};

TEST_F(ThreadedCallerTest, ProgramsStartedDuringAnUpdateDoNotKeepTheCachesLock)
{
    constexpr int ProgramsAtOnce = 20;
    if (!HasLocks()) return;
    const DocumentCache cache = MakeCache(Mode::Blocking, Gives(New));
    const int updates = Scaled(30, 1000);
    for (int i = 0; i < updates && !HasFailure(); ++i) {
        Sleepers sleepers;
        std::thread starter([&sleepers] {
            for (int program = 0; program < ProgramsAtOnce; ++program) sleepers.Start();
        });
        for (int update = 0; update < ProgramsAtOnce; ++update) EXPECT_TRUE(cache.Update());
        starter.join();
        EXPECT_TRUE(FileLock(LockName()).tryLock(LOCK_EX | LOCK_NB)) << "a program holds the lock";
    }
    ReportCount("updates", updates * ProgramsAtOnce);
}

}  // namespace
