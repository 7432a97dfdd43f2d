// A cache that threads and processes share: one of them asks the nodes, the others get its answer.
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <string>
#include <thread>
#include <vector>

#include <json/value.h>

#include <orvadrcore/cache.h>

using OrvaDRCore::Cache;
using OrvaDRCore::CacheState;

namespace {

// [cache]
class NodeStatus : public Cache {
  public:
    // Its lock is in a directory of its own, so that any user can use it.
    explicit NodeStatus(const std::string& dir) : Cache(dir, "status", 30, false, 2, dir + "/locks")
    {
    }

    Json::Value GetInfo() const override { return "node status"; }

    // May run in a child process, so it uses nothing that the caller has open.
    bool GetUpdatedData(Json::Value& data) const override
    {
        std::cout << "asking the nodes" << std::endl;
        data["backup-01"] = "reachable";
        return true;
    }

    bool IsValidData(const Json::Value& data) const override { return data.isObject(); }
};
// [/cache]

// [within]
// Asks in each thread by an object of its own, for half a minute at most. Returns how many got an answer.
int AskInThreads(const std::string& dir, std::size_t count)
{
    std::atomic<int> answers{0};
    std::vector<std::thread> threads;
    threads.reserve(count);
    for (std::size_t i = 0; i < count; ++i) {
        threads.emplace_back([&] {
            const NodeStatus status(dir);
            Json::Value nodes;
            if (status.ReadWithin(std::chrono::seconds(30), nodes) == CacheState::Fresh) ++answers;
        });
    }
    for (std::thread& thread : threads) thread.join();
    return answers;
}
// [/within]

void Tell(const std::string& who, const NodeStatus& status)
{
    // [read]
    const Json::Value data = status.Read();
    std::cout << who << ": " << data["backup-01"].asString() << std::endl;
    // [/read]
}

void TellAll(const NodeStatus& status)
{
    // [view]
    const Json::Value& nodes = status.View();
    for (const std::string& name : nodes.getMemberNames()) {
        std::cout << name << " is " << nodes[name].asString() << std::endl;
    }
    // [/view]
}

}  // namespace

int main()
{
    const std::string dir = std::filesystem::current_path();
    const NodeStatus status(dir);
    std::cout << AskInThreads(dir, 8) << " threads have the status" << std::endl;
    Tell("parent", status);
    TellAll(status);

    const pid_t child = ::fork();
    if (child == 0) {
        Tell("child", NodeStatus(dir));
        ::_exit(EXIT_SUCCESS);
    }
    int code = 0;
    return child > 0 && ::waitpid(child, &code, 0) == child && code == 0 ? EXIT_SUCCESS
                                                                         : EXIT_FAILURE;
}
