// A cache whose producer may fail. After each failure it waits longer before it asks again.
// Needs root, like every cache; exits with 77 otherwise.
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <functional>
#include <iostream>
#include <string>
#include <utility>

#include <json/json.h>

#include <orvadrcore/cache.h>

using OrvaDRCore::Cache;

namespace {

constexpr int ExitSkipped = 77;

// [cache]
// Holds {"value": the last good one or null, "failures": in a row, "retry_at": seconds}. A failure
// is stored like a value, so that every process learns of it.
class NodeStatus : public Cache {
  public:
    using Producer = std::function<bool(Json::Value& ret_value)>;
    using Clock = std::function<std::time_t()>;

    NodeStatus(const std::string& dir, Producer produce, Clock clock)
        : Cache(dir, "status", TimeoutSeconds, true, SingleAttempt),
          produce_(std::move(produce)),
          clock_(std::move(clock))
    {
    }

    Json::Value GetInfo() const override { return "status of the node"; }

    bool GetUpdatedData(Json::Value& data) const override
    {
        const Json::Value last = GetCachedData();
        Json::Value value;
        int failures = 0;
        if (!produce_(value)) {
            failures = 1;
            if (IsValidData(last)) {
                failures = std::min(last["failures"].asInt() + 1, MostFailures);
                value = last["value"];
            }
        }
        data = Json::Value(Json::objectValue);
        data["value"] = value;
        data["failures"] = failures;
        data["retry_at"] = Json::Int64{clock_() + (PauseSeconds << failures)};
        return true;
    }

    // A failure is valid data, or each read would ask again.
    bool IsValidData(const Json::Value& data) const override
    {
        return data.isObject() && data.isMember("value") && data["failures"].isInt() &&
               data["retry_at"].isInt64();
    }

    // After a failure, ask again as soon as the pause is over.
    bool IsNeedUpdate(const Json::Value& data) const override
    {
        return data["failures"].asInt() > 0 && clock_() >= data["retry_at"].asInt64();
    }

  private:
    static constexpr std::time_t PauseSeconds = 5;  // doubled by each failure: 10, 20, ...
    static constexpr int MostFailures = 5;          // ... 160
    static constexpr long TimeoutSeconds = 300;     // must be longer than the longest pause
    static constexpr int SingleAttempt = -1;

    Producer produce_;
    Clock clock_;
};
// [/cache]

}  // namespace

int main()
{
    if (::geteuid() != 0) return ExitSkipped;
    const std::string dir = std::filesystem::current_path();
    std::time_t now = 1700000000;  // a clock that the program can advance
    bool isUp = false;
    int asked = 0;
    const auto ask = [&](Json::Value& ret_value) {
        ++asked;
        if (isUp) ret_value = "reachable";
        return isUp;
    };
    const NodeStatus status(dir, ask, [&] { return now; });
    const auto read = [&](const char* what) {
        const Json::Value data = status.Read();
        std::cout << what << ": value " << data["value"] << ", failures " << data["failures"]
                  << ", asked " << asked << '\n';
    };

    read("first read, node is down");
    read("again");
    now += 10;
    read("after 10 seconds");
    now += 10;
    read("after 10 more");
    now += 10;
    isUp = true;
    read("after 20, node is up");
    read("again");
    return asked == 3 ? EXIT_SUCCESS : EXIT_FAILURE;
}
