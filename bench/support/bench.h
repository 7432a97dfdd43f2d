// How to define a benchmark.
//
//     struct Ours {
//         void Run() { text = ERR::ToString(404); }       // what is measured
//         std::string Result() const { return text; }     // its result, as text
//         std::string text;
//     };
//     Add<Ours>("error name", "ours");
//     ...
//     Aim({Bare}, 1.1);                                   // the target
//
// An item is one task; its name must not contain special characters of regular expressions. Its
// contestants are "ours", "bare", "contract" and other libraries by name. All must give the result of
// the first. Further arguments of Add go to the contestant's constructor, which is not measured.
#ifndef ORVADRCORE_BENCH_SUPPORT_BENCH_H
#define ORVADRCORE_BENCH_SUPPORT_BENCH_H

#include <benchmark/benchmark.h>

#include <cstdlib>
#include <functional>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace Bench {

// The library; the least work by hand that gives the same result; and the least work by hand that
// also keeps the promises of the library's documents.
inline constexpr const char* Ours = "ours";
inline constexpr const char* Bare = "bare";
inline constexpr const char* Contract = "contract";

// Thrown by a contestant that cannot do its work.
struct Failure : std::runtime_error {
    using std::runtime_error::runtime_error;
};

// Throws a Failure unless `holds`.
inline void Require(bool holds, const char* what)
{
    if (!holds) throw Failure(what);
}

struct Contestant {
    std::string name;
    std::function<std::string()> result;  // of one run
};

// We may take at most `most` times as long as each of these contestants.
struct Target {
    std::vector<std::string> of;
    double most = 0;
};

struct Item {
    std::string name;
    std::vector<Contestant> contestants;
    std::vector<Target> targets;
};

// All items, in the order of Add.
std::vector<Item>& Items();

// Adds a contestant to an item. The first one creates the item.
void AddContestant(const std::string& item, Contestant contestant);

// Sets the target of the last item, compared with one or more contestants. Those that are not
// installed do not count.
void Aim(const std::vector<std::string>& of, double most);

// Limits that an item may set.
struct Bounds {
    benchmark::IterationCount iterations = 0;  // 0: as many as the minimum time takes
};

template <class Type, class... Arguments>
void AddBounded(const Bounds& bounds, const std::string& item, const std::string& name,
                Arguments... arguments)
{
    AddContestant(item, {name, [arguments...] {
                             Type contestant(arguments...);
                             contestant.Run();
                             return contestant.Result();
                         }});
    const auto measure = [arguments...](benchmark::State& state) {
        Type contestant(arguments...);
        Type* seen = &contestant;
        benchmark::DoNotOptimize(seen);
        while (state.KeepRunning()) {
            contestant.Run();
            benchmark::ClobberMemory();
        }
    };
    auto* made = benchmark::RegisterBenchmark((item + "/" + name).c_str(), measure);
    made->UseRealTime();
    if (bounds.iterations > 0) made->Iterations(bounds.iterations);
}

template <class Type, class... Arguments>
void Add(const std::string& item, const std::string& name, Arguments... arguments)
{
    AddBounded<Type>(Bounds{}, item, name, arguments...);
}

// A temporary directory, removed with its content: on the disk of the working directory, or in
// memory.
enum class Place { Disk, Memory };

class TempDir {
  public:
    explicit TempDir(Place place);
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;
    ~TempDir();

    std::string File(const std::string& name) const { return path_ + "/" + name; }
    const std::string& Path() const { return path_; }

  private:
    std::string path_;
};

// The families.
void AddRecords();
void AddWide();
void AddMany();
void AddVolumes();
void AddTexts();
void AddJson();
void AddKeyValue();
void AddLocks();
void AddCache();
void AddMisc();
void AddCurves();

// Processes that insert into one file at the same time: `runs` runs of `seconds` each. Prints a table
// and, unless `out` is empty, writes it to `out`.csv and `out`.md.
void RunCrowds(const std::string& out, int runs, int seconds);

// Processes that insert row by row into one file, with and without readers, for `seconds` each. Prints
// and writes as above.
void RunWriters(const std::string& out, int seconds);

}  // namespace Bench

#endif
