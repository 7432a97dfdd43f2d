#include <orvadrcore/cache.h>

#include <chrono>
#include <memory>

#include "show.h"

namespace {

using OrvaDRCore::Cache;
using OrvaDRCore::CacheState;

constexpr auto Patience = std::chrono::seconds(10);
constexpr long Timeout = 3600;

class Answer : public Cache {
  public:
    using Cache::Cache;

    Json::Value GetInfo() const override { return "answer"; }
    bool GetUpdatedData(Json::Value& data) const override
    {
        data = 42;
        return true;
    }
    bool IsValidData(const Json::Value& data) const override { return data.isInt(); }
};

void ShowReads(const Cache& cache)
{
    Json::Value data;
    Show{"before", cache.IsTimeout(), cache.GetCachedData()};
    const CacheState state = cache.ReadWithin(Patience, data);
    Show{"within", state == CacheState::Fresh, data};
    Show{"read",       cache.Read(),     cache.View(), cache.GetCachedData(),
         cache.Load(), cache.IsTimeout()};
}

void ShowUpdates(const Cache& cache)
{
    Show{"update",
         cache.Update(),
         cache.DoUpdate(),
         cache.UpdateWithData(43),
         cache.UpdateWithData("refused"),
         cache.UpdateWithData(44, 10, 17),
         cache.GetCachedData(),
         cache.GetMaxUpdateTime()};
}

// Private operations, which the first version exports.
void ShowMark(const Cache& cache)
{
    Show{"mark", cache.IsUpdating(), cache.SetUpdating(), cache.IsUpdating()};
    cache.UnsetUpdating();
    Show{"mark", cache.IsUpdating()};
}

}  // namespace

void CallCache(const std::string& dir)
{
    const Answer answer(dir, "answer", Timeout, true, 0, dir);
    ShowReads(answer);
    ShowUpdates(answer);
    ShowMark(answer);
    Show{"path", EndsWith(answer.GetPath(), "/answer.cached")};
    Show{"defaults", answer.GetDefaultValue(), answer.IsNeedUpdate(42),
         answer.IsUpdatedDataRequired()};
    const Answer named(dir, "answer", 0, false, -1);
    Answer copy(answer);
    copy = named;
    Show{"states", static_cast<int>(copy.ReadWithin(Patience, *std::make_unique<Json::Value>())),
         static_cast<int>(CacheState::Stale), static_cast<int>(CacheState::None)};
    const std::unique_ptr<Cache> owned = std::make_unique<Answer>(copy);
    Show{"removed", owned->Remove(), owned->Remove(), owned->Load()};
}
