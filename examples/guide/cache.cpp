// A cache that two processes share: the first reader asks the nodes, the other gets stored data.
// Needs root.
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <string>

#include <json/value.h>

#include <orvadrcore/cache.h>

using OrvaDRCore::Cache;

namespace {

// [cache]
class NodeStatus : public Cache {
  public:
    explicit NodeStatus(const std::string& dir) : Cache(dir, "status", 30, false, 2) {}

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
    Tell("first", status);
    Tell("again", status);
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
