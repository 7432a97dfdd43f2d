// The fixture of the tests of Cache: a cache whose subclass's part is scripted, in a directory of
// the test's own, with its lock below another one instead of below /tmp/.orvadr_lock. Pauses and
// sleeps are counted and not waited for.
#ifndef ORVADRCORE_TESTS_CACHE_FIXTURE_H
#define ORVADRCORE_TESTS_CACHE_FIXTURE_H

#include <json/value.h>
#include <json/writer.h>  // for the words of failed checks
#include <orvadrcore/cache.h>

#include <ctime>
#include <functional>
#include <string>
#include <vector>

#include "child_process.h"
#include "log_capture.h"
#include "pauses.h"
#include "process_faults.h"
#include "syscall_faults.h"
#include "temp_dir.h"

// A cache that notes which of its virtual operations are called and answers with functions that
// tests replace. Those that are not set answer as the library's own.
class TestCache : public OrvaDRCore::Cache {
  public:
    using Cache::Cache;

    std::function<Json::Value()> info = [] { return Json::Value("test cache"); };
    std::function<Json::Value()> defaultValue;
    std::function<bool(Json::Value&)> produce = [](Json::Value& data) {
        data = "new";
        return true;
    };
    std::function<bool(const Json::Value&)> isValid = [](const Json::Value& data) {
        return !data.isNull();
    };
    std::function<bool(const Json::Value&)> isNeedUpdate;
    std::function<bool()> isRequired;

    Json::Value GetInfo() const override;
    Json::Value GetDefaultValue() const override;
    bool GetUpdatedData(Json::Value& data) const override;
    bool IsValidData(const Json::Value& data) const override;
    bool IsNeedUpdate(const Json::Value& data) const override;
    bool IsUpdatedDataRequired() const override;

    // The operations called since the last TakeCalls, by name and in order; of one alone, how
    // often.
    std::vector<std::string> TakeCalls();
    std::size_t CountCalls(const std::string& operation) const;

  private:
    mutable std::vector<std::string> calls;
};

// A flock of this process, which excludes those of the library as another process's would.
class HeldLock {
  public:
    HeldLock(const std::string& path, int operation);
    HeldLock(const HeldLock&) = delete;
    HeldLock& operator=(const HeldLock&) = delete;
    ~HeldLock() { Free(); }

    void Free();

  private:
    int fd;
};

class CacheFixture : public LoggedTest {
  protected:
    static constexpr long Timeout = 60;

    CacheFixture();

    // Where a path that all processes share, below the lock directory or the default cache's, lies.
    std::string Place(const std::string& name) const;

    // Another object of the same cache.
    TestCache Another(bool updatedRequired, int retries = 0, long timeout = Timeout) const;

    // A cache file that holds this data and nothing else, as old as now or as given.
    void WriteCache(const Json::Value& data) const;
    void WriteCache(const Json::Value& data, std::time_t modifyTime) const;
    void WriteStale(const Json::Value& data = "old") const;

    // How often the library has opened a file since the last call of ForgetOpened.
    std::size_t CountOpened(const std::string& name) const;
    void ForgetOpened() { opened.clear(); }

    // The library's pauses since the last call are so many, of `shortest` to a million
    // microseconds.
    void ExpectPauses(std::size_t count, unsigned int shortest);

    // The sleeps between tries of a lock since the last call are so many, of a second each.
    void ExpectSleeps(std::size_t count);

    // From now on notes the attempts to lock the lock file.
    void NoteLocking();
    bool IsLockFile(int fd) const;

    // A process that is marked as updater and lives until it is told to end.
    ChildProcess Updater() const;

    // From now on every fork fails with this error.
    void FailForks(int error) { processes.fork = Failing(error); }

    // Runs checks in a process of their own that adopts its refreshes in the background. These
    // begin when the checks let them.
    void CheckInBackground(const std::function<void()>& checks);
    void LetRefresh() const { refreshGate.Tell(); }

    // Lets the refresh begin, if it was not let already, and waits for its end. The exit code; 128
    // plus the number of the signal that ended it.
    int AwaitRefresh() const;

    // Lines that many cases expect.
    LogLine NoData() const;
    LogLine Unreadable() const;
    LogLine UsesDefault() const;
    LogLine UsesOldData() const;
    LogLine Start() const;
    LogLine Finish() const;
    LogLine StartWait() const;
    LogLine FinishWait() const;

    TempDir dir;
    TempDir shared;
    SyscallFaults faults;
    ProcessFaults processes;
    Pauses pauses;
    std::vector<int> locking;

    const std::string path = dir.File("status.cached");
    const std::string pidPath = path + ".pid";
    const std::string lockPath = "/tmp/.orvadr_lock/" + path + ".lock";
    const std::string lockFile = Place(lockPath);

    TestCache cache{dir.Path(), "status", Timeout, false, 0};

  private:
    std::vector<std::string> opened;
    std::vector<unsigned int> sleeps;
    std::size_t pausesSeen = 0;
    ChildProcess::Link refreshGate{-1, -1};
};

// For processes to wait for each other: what one tells, another awaits.
ChildProcess::Link MakeGate();

#endif
