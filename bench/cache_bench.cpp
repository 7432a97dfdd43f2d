// Reading a cache with fresh data, and writing new data.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <ctime>
#include <fstream>

#include <orvadrcore/cache.h>

#include "support/bench.h"
#include "support/by_hand.h"

#if BENCH_HAS_GLIB
#include <glib.h>
#endif

namespace Bench {

namespace {

constexpr long TimeoutSeconds = 1'000'000;

class Status : public OrvaDRCore::Cache {
  public:
    explicit Status(const std::string& dir) : Cache(dir, "status", TimeoutSeconds, true, 0) {}
    Json::Value GetInfo() const override { return "status"; }
    bool GetUpdatedData(Json::Value& /*data*/) const override { return false; }
    bool IsValidData(const Json::Value& data) const override { return data.isObject(); }
};

// The cache file in the library's format.
Json::Value MakeCacheFile(const Json::Value& data)
{
    Json::Value document(Json::objectValue);
    document["timeout"] = Json::Int64{TimeoutSeconds};
    document["info"] = "status";
    document["cached_data"] = data;
    document["begin_time_to_update"] = 0;
    document["finish_time_to_update"] = 0;
    document["updated_time"] = 0.0;
    document["max_updated_time"] = 0;
    return document;
}

struct CacheFile {
    CacheFile(Place place, std::size_t bytes) : dir(place), data(MakeDocument(bytes))
    {
        WriteFile(path, ToLine(MakeCacheFile(data)));
    }

    TempDir dir;
    std::string path = dir.File("status.cached");
    Json::Value data;
};

struct ReadCache : CacheFile {
    explicit ReadCache(std::size_t bytes) : CacheFile(Place::Memory, bytes) {}
    std::string Result() const { return Flatten(read); }

    Json::Value read;
};

struct OurRead : ReadCache {
    using ReadCache::ReadCache;
    void Run() { read = cache.Read(); }

    Status cache{dir.Path()};
};

// Whether the file has not changed since it was read and is not too old.
bool IsFresh(const std::string& path, std::time_t loaded)
{
    struct stat status {};
    return ::stat(path.c_str(), &status) == 0 && status.st_mtime == loaded &&
           std::time(nullptr) - status.st_mtime <= TimeoutSeconds;
}

std::time_t ModifyTime(const std::string& path)
{
    struct stat status {};
    return ::stat(path.c_str(), &status) == 0 ? status.st_mtime : -1;
}

// Returns the document in memory, not a copy.
struct BareRead : ReadCache {
    using ReadCache::ReadCache;
    void Run() { given = IsFresh(path, loaded) ? &data : nullptr; }
    std::string Result() const { return Flatten(*given); }

    std::time_t loaded = ModifyTime(path);
    const Json::Value* given = nullptr;
};

struct OurView : ReadCache {
    using ReadCache::ReadCache;
    void Run() { given = &cache.View(); }
    std::string Result() const { return Flatten(*given); }

    Status cache{dir.Path()};
    const Json::Value* given = nullptr;
};

struct ContractRead : ReadCache {
    using ReadCache::ReadCache;
    void Run()
    {
        Require(IsFresh(path, loaded), "not fresh");
        read = Json::Value(data);
    }

    std::time_t loaded = ModifyTime(path);
};

// Without a cache: reads the file each time.
struct StreamRead : ReadCache {
    using ReadCache::ReadCache;
    void Run()
    {
        Json::Value document;
        std::ifstream(path) >> document;
        read.swap(document["cached_data"]);
    }
};

struct WriteCache : CacheFile {
    WriteCache(Place place, std::size_t bytes) : CacheFile(place, bytes) {}
    std::string Result() const { return Flatten(Parse(ReadFile(path))); }
};

struct OurWrite : WriteCache {
    using WriteCache::WriteCache;
    void Run() { Require(cache.UpdateWithData(data), "cannot write"); }

    Status cache{dir.Path()};
};

// Replaces the file: writes a new one, flushes it to disk and renames it.
void Replace(const std::string& path, const std::string& text)
{
    const std::string temporary = path + ".new";
    const int fd = ::open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    Require(fd >= 0, "cannot make a temporary file");
    const bool written =
        ::write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size()) &&
        ::fsync(fd) == 0;
    ::close(fd);
    Require(written && std::rename(temporary.c_str(), path.c_str()) == 0, "cannot replace");
}

struct BareWrite : WriteCache {
    using WriteCache::WriteCache;
    void Run() { Replace(path, ToLine(MakeCacheFile(data))); }
};

// What every writer has to do, with a text that is made already.
struct Replacing : WriteCache {
    using WriteCache::WriteCache;
    void Run() { Replace(path, text); }

    std::string text = ReadFile(path);
};

// Keeps the old file's permissions and longest refresh time, and the new document in memory.
struct ContractWrite : WriteCache {
    using WriteCache::WriteCache;
    void Run()
    {
        Json::Value document = MakeCacheFile(data);
        document["max_updated_time"] = Parse(ReadFile(path))["max_updated_time"].asInt();
        struct stat status {};
        Require(::stat(path.c_str(), &status) == 0, "no old file");
        Replace(path, ToLine(document));
        ::chmod(path.c_str(), status.st_mode & 07777U);
        kept.swap(document["cached_data"]);
    }

    Json::Value kept;
};

#if BENCH_HAS_GLIB
struct GlibWrite : WriteCache {
    using WriteCache::WriteCache;
    void Run()
    {
        const std::string text = ToLine(MakeCacheFile(data));
        const auto flags = static_cast<GFileSetContentsFlags>(G_FILE_SET_CONTENTS_CONSISTENT |
                                                              G_FILE_SET_CONTENTS_DURABLE);
        Require(
            g_file_set_contents_full(path.c_str(), text.data(), static_cast<gssize>(text.size()),
                                     flags, 0600, nullptr) != 0,
            "GLib cannot replace");
    }
};
#endif

void AddRead(const std::string& size, std::size_t bytes)
{
    constexpr double OfStatAndCopy = 1.15;
    const std::string item = "cache read, fresh, " + size;
    Add<OurRead>(item, Ours, bytes);
    Add<BareRead>(item, Bare, bytes);
    Add<ContractRead>(item, Contract, bytes);
    Add<StreamRead>(item, "jsoncpp stream", bytes);
    Aim({Contract}, OfStatAndCopy);
}

void AddView(const std::string& size, std::size_t bytes)
{
    constexpr double OfStat = 1.5;
    const std::string item = "cache view, fresh, " + size;
    Add<OurView>(item, Ours, bytes);
    Add<BareRead>(item, Bare, bytes);
    Aim({Bare}, OfStat);
}

void AddWrite(const std::string& where, Place place, const std::string& size, std::size_t bytes)
{
    constexpr double OfReplacing = 1.05;
    constexpr double OfContract = 1.1;
    constexpr const char* Replaced = "write-flush-rename";
    const std::string item = "cache write, " + where + ", " + size;
    Add<OurWrite>(item, Ours, place, bytes);
    Add<BareWrite>(item, Bare, place, bytes);
    Add<ContractWrite>(item, Contract, place, bytes);
    Add<Replacing>(item, Replaced, place, bytes);
#if BENCH_HAS_GLIB
    Add<GlibWrite>(item, "jsoncpp and GLib", place, bytes);
#endif
    if (place == Place::Disk) {
        Aim({Replaced}, OfReplacing);
        Aim({Bare}, OfReplacing);
    } else {
        Aim({Contract}, OfContract);
    }
}

}  // namespace

void AddCache()
{
    AddRead("1 KB", 1000);
    AddRead("100 KB", 100'000);
    AddView("100 KB", 100'000);
    AddWrite("disk", Place::Disk, "1 KB", 1000);
    AddWrite("disk", Place::Disk, "100 KB", 100'000);
    AddWrite("memory", Place::Memory, "1 KB", 1000);
    AddWrite("memory", Place::Memory, "100 KB", 100'000);
}

}  // namespace Bench
