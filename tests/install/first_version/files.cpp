#include <fcntl.h>
#include <orvadrcore/errors.h>
#include <orvadrcore/file.h>
#include <orvadrcore/file_lock.h>
#include <orvadrcore/utils.h>
#include <unistd.h>

#include <chrono>
#include <map>
#include <vector>

#include "show.h"

namespace {

using OrvaDRCore::Container;
using OrvaDRCore::ERR;
using OrvaDRCore::File;
using OrvaDRCore::FileLock;
using OrvaDRCore::FileLockState;

constexpr int NewFileMode = 0644;
constexpr int NewDirMode = 0755;
constexpr auto NoPatience = std::chrono::milliseconds(0);

void ShowDocuments(const std::string& dir)
{
    const std::string path = dir + "/document.json";
    Json::Value document;
    Show{"write", File::Write(path, Json::Value("text")), File::Read(path, document), document};
    const int out = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, NewFileMode);
    Show{"regular", File::IsRegularFile(out), File::IsRegularFile(-1)};
    Show{"write to a descriptor", File::Write(out, Json::Value(17))};
    const int in = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    Show{"read from a descriptor", File::Read(in, document), document};
    Show{"replace",
         File::Replace(path, Json::Value(true)),
         File::Read(path, document),
         document,
         File::Replace(path, std::string("1")),
         File::Replace(path, "[2]"),
         File::Read(path, document),
         document};
}

template <class Value>
void ShowPairs(const std::string& path)
{
    std::map<std::string, Value> pairs;
    Show{"pairs", File::Read(path, pairs)};
    for (const auto& [key, value] : pairs) Show{"  " + key, value};
}

void ShowDirectories(const std::string& dir)
{
    Show{"directory", File::CreateDir(dir + "/a/b", NewDirMode), File::RemoveDir(dir + "/a"),
         File::GetParentDir("/etc/hosts")};
    const std::string path = dir + "/pairs";
    File::Replace(path, "one=1\ntwo=2.5\n");
    ShowPairs<std::string>(path);
    ShowPairs<int>(path);
    ShowPairs<double>(path);
    int number = 0;
    Show{"to a number", File::toType(std::string("17 x"), number, 3), number};
}

template <class Lock>
void ShowLock(const std::string& dir)
{
    Lock lock("name", dir);
    Lock other("name", dir);
    Show{"lock", lock.openLockedFile(), lock.lock(LOCK_EX | LOCK_NB, 0),
         other.tryLock(LOCK_EX | LOCK_NB), static_cast<int>(other.acquire(LOCK_SH, NoPatience))};
    lock.unlock();
    Show{"unlocked", other.tryLock(LOCK_EX | LOCK_NB),
         static_cast<int>(lock.acquire(LOCK_SH, NoPatience)),
         static_cast<int>(lock.acquire(0, NoPatience))};
    Lock named("caller");
    Lock unnamed;
    Show{"named", named.checkLockDir(), unnamed.setLockFile("caller"), unnamed.setLockFile("")};
}

void ShowErrors()
{
    for (int code = ERR::ERR_DR_MIN; code <= ERR::ERR_DR_MAX; ++code) {
        const std::string name = ERR::ToString(code);
        if (name.front() != '<') Show{"error", code, name};
    }
    Show{"errors", ERR::BAD_PARAMETER, ERR::ERR_NULL_POINTER, ERR::ERR_DATABASE_OPERATION,
         ERR::ToString(0)};
}

// Numbers become characters, some of which cannot be printed.
template <class Value>
void ShowVector(const std::vector<Value>& values)
{
    const std::string text = Container::ToString<Value>(values, ",");
    Show{"vector", Container::ToJsonArray<Value>(values), text.size(), int{text.front()}};
}

}  // namespace

void CallFiles(const std::string& dir)
{
    ShowDocuments(dir);
    ShowDirectories(dir);
    ShowLock<FileLock>(dir);
    ShowLock<Derived<FileLock>>(dir);
    Show{"lock file", FileLock::getLockFilePath("name"), static_cast<int>(FileLockState::Taken)};
    ShowErrors();
    ShowVector<std::string>({"a", "b"});
    ShowVector<int>({65, 66});
    ShowVector<bool>({true});
    ShowVector<double>({65.5});
    Show{"path", OrvaDRCore::Validator::IsVolPath("/volume1"), OrvaDRCore::GenerateUUID().size(),
         OrvaDRCore::RandomSleepInMSec(1, 2), OrvaDRCore::RandomSleepInMSec(2, 2)};
}
