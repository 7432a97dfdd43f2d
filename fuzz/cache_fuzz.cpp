// A cache whose file holds any bytes. The first input line says how it is read: "stale",
// "required". The rest is the file.
#include <fcntl.h>
#include <orvadrcore/cache.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <filesystem>
#include <fstream>

#include "base/json_helpers.h"
#include "support/fakes/process_faults.h"
#include "support/fakes/syscall_faults.h"
#include "support/fixtures/temp_dir.h"
#include "support/fuzz.h"

using OrvaDRCore::Cache;

namespace {

constexpr long Timeout = 100'000;

class AnyCache : public Cache {
  public:
    using Cache::Cache;

    Json::Value GetInfo() const override { return "any"; }
    bool GetUpdatedData(Json::Value& data) const override
    {
        data = "new";
        return true;
    }
    bool IsValidData(const Json::Value& data) const override { return !data.isNull(); }
};

// A directory with the cache and its lock. Syncing does nothing, and forking fails.
struct Surroundings {
    Surroundings()
    {
        std::filesystem::create_directories(Place(lockDir + dir.Path()));
        std::ofstream(Place(lockDir + path + ".lock")).flush();
        files.open = [this](const char* name, int flags, mode_t mode) {
            return RealOpen(Place(name).c_str(), flags, mode);
        };
        files.stat = [this](const char* name, struct stat* status) {
            return RealStat(Place(name).c_str(), status);
        };
        files.fsync = [](int /*fd*/) { return 0; };
        processes.fork = Failing(EAGAIN);
    }

    std::string Place(const std::string& name) const
    {
        const bool isLock = name.compare(0, lockDir.size(), lockDir) == 0;
        return isLock ? dir.Path() + "/lock" + name.substr(lockDir.size()) : name;
    }

    void Write(const std::string& content, bool isStale) const
    {
        std::ofstream(path, std::ios::binary) << content;
        if (!isStale) return;
        const std::array<timespec, 2> longAgo{};
        Expect(::utimensat(AT_FDCWD, path.c_str(), longAgo.data(), 0) == 0, "a file can be aged");
    }

    const std::string lockDir = "/tmp/.orvadr_lock";
    TempDir dir;
    std::string path = dir.File("any.cached");
    SyscallFaults files;
    ProcessFaults processes;
};

// What the cache must read from a file.
struct Model {
    explicit Model(const std::string& content)
    {
        Json::Value document;
        isRead = OrvaDRCore::fromString(document, content);
        if (!document.isObject()) return;
        data = document.get("cached_data", Json::Value());
        const Json::Value longest = document.get("max_updated_time", 0);
        if (longest.isInt() && longest.type() != Json::realValue) maxUpdateTime = longest.asInt();
    }

    bool isRead = false;
    Json::Value data;
    int maxUpdateTime = 0;
};

void CheckUntouched(const AnyCache& cache, const Model& model, bool isStale)
{
    Expect(cache.Load() == model.isRead, "a JSON document is loaded");
    Expect(cache.GetCachedData() == model.data, "the data is the file's");
    Expect(cache.GetMaxUpdateTime() == model.maxUpdateTime, "the longest refresh is the file's");
    Expect(cache.IsTimeout() == isStale, "the file's age counts");
}

}  // namespace

void Fuzz(const std::string& input)
{
    static const Surroundings surroundings;
    Pieces pieces(input);
    const std::string how = pieces.Until('\n');
    const std::string content = pieces.Rest();
    const bool isStale = how.find("stale") != std::string::npos;
    const bool isRequired = how.find("required") != std::string::npos;
    const Model model(content);
    surroundings.Write(content, isStale);

    const AnyCache cache(surroundings.dir.Path(), "any", Timeout, isRequired, 0);
    CheckUntouched(cache, model, isStale);

    // Invalid data is refreshed at once, and so is stale data if fresh data is required. Other
    // stale data stays, since there is no child to refresh it.
    const bool isRefreshed = model.data.isNull() || (isStale && isRequired);
    const Json::Value expected = isRefreshed ? Json::Value("new") : model.data;
    Expect(cache.Read() == expected, "fresh data is read");
    Expect(cache.View() == expected, "and seen without a copy");
    if (!isRefreshed) return CheckUntouched(cache, model, isStale);

    Expect(!cache.IsTimeout() && cache.Load() && cache.GetCachedData() == expected,
           "the file is new");
    Expect(cache.GetMaxUpdateTime() >= std::max(0, model.maxUpdateTime),
           "no refresh makes the longest shorter");
}
