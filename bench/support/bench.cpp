#include "support/bench.h"

#include <filesystem>
#include <system_error>

namespace Bench {

std::vector<Item>& Items()
{
    static std::vector<Item> items;
    return items;
}

void AddContestant(const std::string& item, Contestant contestant)
{
    std::vector<Item>& items = Items();
    if (items.empty() || items.back().name != item) items.push_back({item, {}, {}});
    items.back().contestants.push_back(std::move(contestant));
}

void Aim(const std::vector<std::string>& of, double most)
{
    Items().back().targets.push_back({of, most});
}

TempDir::TempDir(Place place)
    : path_(place == Place::Disk ? "./orvadr-bench-XXXXXX" : "/dev/shm/orvadr-bench-XXXXXX")
{
    Require(::mkdtemp(path_.data()) != nullptr, "cannot make a directory");
}

TempDir::~TempDir()
{
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
}

}  // namespace Bench
