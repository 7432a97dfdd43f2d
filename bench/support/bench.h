// How a family of benchmarks says what it measures.
//
//     struct Ours {
//         void Run() { text = ERR::ToString(404); }       // what is measured
//         std::string Result() const { return text; }     // what it gave, as text
//         std::string text;
//     };
//     Add<Ours>("error name", "ours");
//     ...
//     Aim({Bare}, 1.1);                                   // where we want to be
//
// An item is one task, named without characters that are special in a regular expression. Its
// contestants are "ours", "bare", "contract" and peers by name. The first contestant of an item gives
// the result that all others have to give, too. Further arguments of Add go to the contestant's
// constructor, which is not measured.
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

// The library itself; the least work by hand that gives the same result; and the least work by hand
// that does what the library's documents promise as well.
inline constexpr const char* Ours = "ours";
inline constexpr const char* Bare = "bare";
inline constexpr const char* Contract = "contract";

// What a contestant throws when it cannot do its work.
struct Failure : std::runtime_error {
    using std::runtime_error::runtime_error;
};

// Throws a Failure unless it is so.
inline void Require(bool holds, const char* what)
{
    if (!holds) throw Failure(what);
}

struct Contestant {
    std::string name;
    std::function<std::string()> result;  // of a single run
};

// Ours is to take at most `most` times as long as each of those.
struct Target {
    std::vector<std::string> of;
    double most = 0;
};

struct Item {
    std::string name;
    std::vector<Contestant> contestants;
    std::vector<Target> targets;
};

// All items, in the order in which they were added.
std::vector<Item>& Items();

// Adds a contestant to its item, which is made when it is the first.
void AddContestant(const std::string& item, Contestant contestant);

// Sets the item that was added last a target, by one contestant or by several. One that is not on
// this system does not count.
void Aim(const std::vector<std::string>& of, double most);

// The bounds that an item may set itself.
struct Bounds {
    benchmark::IterationCount iterations = 0;  // 0: as many as the minimal time needs
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

// A directory of the contestant's own, removed with all that is in it: on the disk that holds the
// working directory, or in memory.
enum class Place { Disk, Memory };

class TempDir {
  public:
    explicit TempDir(Place place);
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;
    ~TempDir();

    std::string File(const std::string& name) const { return path + "/" + name; }
    const std::string& Path() const { return path; }

  private:
    std::string path;
};

// The families.
void AddRecords();
void AddMany();
void AddTexts();
void AddJson();
void AddKeyValue();
void AddLocks();
void AddCache();
void AddMisc();
void AddCurves();

// Processes that insert into one file at the same time, in so many runs of so many seconds; prints a
// table of its own and writes it to `out`.csv and `out`.md, unless that is empty.
void RunCrowds(const std::string& out, int runs, int seconds);

// Processes that insert row by row into one file, and those that read between them, for so many
// seconds each; prints and writes as above.
void RunWriters(const std::string& out, int seconds);

}  // namespace Bench

#endif
