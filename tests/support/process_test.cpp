#include "process_test.h"

#include <fcntl.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <syslog.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <ctime>
#include <filesystem>
#include <system_error>
#include <utility>

#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>

#include "await.h"
#include "child_process.h"
#include "rights.h"

using OrvaDRCore::File;
using OrvaDRCore::FileLock;

namespace {

constexpr std::size_t Sizes = 1000;  // documents come in as many sizes, of up to 100,000 bytes
constexpr std::size_t SizeStep = 100;

std::string TextOf(int number)
{
    const std::size_t size = static_cast<std::size_t>(number) % Sizes * SizeStep;
    return std::string(size, static_cast<char>('a' + number % 26));
}

}  // namespace

Json::Value DocumentOf(int number)
{
    Json::Value document;
    document["number"] = number;
    document["text"] = TextOf(number);
    return document;
}

int NumberOf(const Json::Value& data)
{
    if (!data.isObject() || !data["number"].isInt()) return NoDocument;
    const int number = data["number"].asInt();
    return data == DocumentOf(number) ? number : NoDocument;
}

Producer Gives(int number)
{
    return [number](Json::Value& data) {
        data = DocumentOf(number);
        return true;
    };
}

TestCache::TestCache(const std::string& dir, const std::string& name, Mode mode, Producer producer)
    : Cache(dir, name, TimeoutSeconds, mode == Mode::Blocking, SingleTry),
      produce(std::move(producer))
{
}

bool TestCache::IsValidData(const Json::Value& data) const
{
    return NumberOf(data) != NoDocument;
}

ProcessTest::ProcessTest()
{
    // The library's lines have their tests elsewhere; the machine's log is spared them.
    ::setlogmask(LOG_MASK(LOG_EMERG));  // NOLINT(concurrency-mt-unsafe)
    // Detached processes become the test's own children, which it can wait for.
    ::prctl(PR_SET_CHILD_SUBREAPER, 1);
}

void ProcessTest::TearDown()
{
    AwaitDescendants();
    RemoveLocks();
}

bool ProcessTest::HasLocks()
{
    static const bool isRoot = BecomeRoot();
    if (isRoot) return true;

    // Nobody but root can open a lock file twice: there always seems to be another updater.
    FileLock first(LockName());
    (void)first.openLockedFile();
    FileLock second(LockName());
    EXPECT_FALSE(second.openLockedFile());
    WriteStale(1);
    EXPECT_EQ(NumberOf(MakeCache(Mode::Background, Gives(2)).Read()), 1);
    AwaitDescendants();
    EXPECT_EQ(Productions(), 0);
    EXPECT_EQ(NumberInFile(), 1);
    return false;
}

TestCache ProcessTest::MakeCache(Mode mode, const Producer& produce, const std::string& name)
{
    std::atomic<int>& count = *productions;
    return {dir.Path(), name, mode, [&count, produce](Json::Value& data) {
                ++count;
                return produce(data);
            }};
}

Reading ProcessTest::ReadElsewhere(Mode mode, const Producer& produce, const std::string& name)
{
    using Clock = std::chrono::steady_clock;
    const SharedMemory<Reading> reading;
    ChildProcess reader([&](ChildProcess::Link& /*link*/) {
        ::prctl(PR_SET_CHILD_SUBREAPER, 1);
        const auto begin = Clock::now();
        reading->number = NumberOf(MakeCache(mode, produce, name).Read());
        reading->took = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - begin);
        reading->startedProcesses = ::waitpid(-1, nullptr, WNOHANG | __WALL) >= 0;
    });
    EXPECT_EQ(reader.Join(), 0);
    return *reading;
}

void ProcessTest::WriteStale(int number, const std::string& name)
{
    ASSERT_TRUE(MakeCache(Mode::Background, nullptr, name).UpdateWithData(DocumentOf(number)));
    MakeStale(name);
}

void ProcessTest::MakeStale(const std::string& name) const
{
    const std::time_t old = std::time(nullptr) - 2 * TestCache::TimeoutSeconds;
    const std::array<timespec, 2> times{{{old, 0}, {old, 0}}};
    ASSERT_EQ(::utimensat(AT_FDCWD, CacheFile(name).c_str(), times.data(), 0), 0);
}

int ProcessTest::NumberInFile(const std::string& name) const
{
    Json::Value file;
    return File::Read(CacheFile(name), file) && file.isObject() ? NumberOf(file["cached_data"])
                                                                : NoDocument;
}

std::vector<std::string> ProcessTest::Files() const
{
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(dir.Path())) {
        names.push_back(entry.path().filename());
    }
    std::sort(names.begin(), names.end());
    return names;
}

void ProcessTest::AwaitDescendants()
{
    EXPECT_TRUE(AwaitUntil([] {
        pid_t pid = 0;
        do {
            pid = ::waitpid(-1, nullptr, WNOHANG | __WALL);
        } while (pid > 0);
        return pid < 0 && errno == ECHILD;
    })) << "a process does not end";
}

void ProcessTest::RemoveLocks() const
{
    std::error_code ignored;
    std::filesystem::remove_all(FileLock::getLockFilePath(dir.Path()), ignored);
}
