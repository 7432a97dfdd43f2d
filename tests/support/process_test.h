// The fixture of tests in which processes meet at a cache or a lock, as the library's callers meet:
// in the shared library, with real files, locks, signals and, where the protocol pauses, real time.
//
// What a cache holds here are documents with a number. One that is not whole, or none at all, has
// the number NoDocument.
#ifndef ORVADRCORE_TESTS_PROCESS_TEST_H
#define ORVADRCORE_TESTS_PROCESS_TEST_H

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <string>
#include <vector>

#include <json/value.h>
#include <orvadrcore/cache.h>

#include "shared_memory.h"
#include "temp_dir.h"

constexpr int NoDocument = -1;

Json::Value DocumentOf(int number);
int NumberOf(const Json::Value& data);

// What GetUpdatedData() does.
using Producer = std::function<bool(Json::Value&)>;
Producer Gives(int number);

// Who refreshes: a child, or the reader itself.
enum class Mode { Background, Blocking };

// A cache of documents. What it gives when it has none is no document.
class TestCache : public OrvaDRCore::Cache {
  public:
    static constexpr long TimeoutSeconds = 3600;
    static constexpr int SingleTry = -1;

    TestCache(const std::string& dir, const std::string& name, Mode mode, Producer producer);

    Json::Value GetInfo() const override { return "a cache of documents"; }
    Json::Value GetDefaultValue() const override { return "no document"; }
    bool GetUpdatedData(Json::Value& data) const override { return produce(data); }
    bool IsValidData(const Json::Value& data) const override;

  private:
    Producer produce;
};

// What a process got from Read().
struct Reading {
    int number;  // of the document
    std::chrono::milliseconds took;
    bool startedProcesses;
};

class ProcessTest : public ::testing::Test {
  protected:
    ProcessTest();

    // Waits for all processes that were started, detached ones too, and removes the locks.
    void TearDown() override;

    // Whether lock files can be opened as root opens them. If not, asserts what an ordinary user
    // gets instead.
    bool HasLocks();

    // The test's cache, or one of its caches. Productions are counted over all processes.
    TestCache MakeCache(Mode mode, const Producer& produce, const std::string& name = "x");
    int Productions() const { return *productions; }

    // Reads a cache in a process of its own.
    Reading ReadElsewhere(Mode mode, const Producer& produce, const std::string& name = "x");

    std::string CacheFile(const std::string& name = "x") const
    {
        return dir.File(name + ".cached");
    }
    std::string PidFile() const { return CacheFile() + ".pid"; }
    std::string LockName() const { return CacheFile() + ".lock"; }

    // Makes the cache file hold a document and be older than the time-out.
    void WriteStale(int number, const std::string& name = "x");
    void MakeStale(const std::string& name = "x") const;

    // The number of the document in the cache file.
    int NumberInFile(const std::string& name = "x") const;

    // The names of all files of the test, in order: "x.cached" alone when no refresh runs.
    std::vector<std::string> Files() const;

    static void AwaitDescendants();

    // Removes the lock files of the test.
    void RemoveLocks() const;

    TempDir dir;

  private:
    SharedMemory<std::atomic<int>> productions;
};

#endif
