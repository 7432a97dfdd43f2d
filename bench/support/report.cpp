#include "support/report.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <optional>

namespace Bench {

namespace {

constexpr double NSecPerSec = 1e9;

double Median(std::vector<double> values)
{
    std::sort(values.begin(), values.end());
    const std::size_t half = values.size() / 2;
    return values.size() % 2 == 1 ? values[half] : (values[half - 1] + values[half]) / 2;
}

std::optional<double> MedianOf(const std::string& item, const std::string& contestant,
                               const Collector& collected)
{
    const auto found = collected.Times().find(item + "/" + contestant);
    if (found == collected.Times().end() || found->second.empty()) return std::nullopt;
    return Median(found->second);
}

std::string Format(const char* format, double number)
{
    std::array<char, 32> text{};
    (void)std::snprintf(text.data(), text.size(), format, number);
    return text.data();
}

std::string ToRatio(std::optional<double> time, std::optional<double> floor, const char* none)
{
    return time && floor ? Format("%.2f", *time / *floor) : none;
}

std::string ToCell(std::optional<double> time)
{
    return time ? ToTime(*time) : "-";
}

bool IsPeer(const std::string& name)
{
    return name != Ours && name != Bare && name != Contract;
}

// Our time divided by that of the fastest contestant of the target; nothing if none was measured.
std::optional<double> Reached(const Item& item, const Target& target, const Collector& collected)
{
    const auto ours = MedianOf(item.name, Ours, collected);
    std::optional<double> most;
    for (const std::string& name : target.of) {
        const auto time = MedianOf(item.name, name, collected);
        if (ours && time) most = std::max(most.value_or(0), *ours / *time);
    }
    return most;
}

// An item's row as texts, for both tables.
struct Row {
    std::string ours;
    std::string bare;
    std::string contract;
    std::string perBare;
    std::string perContract;
    std::string target;
    std::string verdict;
    std::string peers;
};

void Join(std::string& list, const std::string& next)
{
    if (!list.empty()) list += ", ";
    list += next;
}

Row MakeRow(const Item& item, const Collector& collected)
{
    const auto ours = MedianOf(item.name, Ours, collected);
    const auto bare = MedianOf(item.name, Bare, collected);
    const auto contract = MedianOf(item.name, Contract, collected);
    Row row{ToCell(ours),
            ToCell(bare),
            ToCell(contract),
            ToRatio(ours, bare, "-"),
            ToRatio(ours, contract, "-"),
            {},
            {},
            {}};
    for (const Target& target : item.targets) {
        const auto reached = Reached(item, target, collected);
        if (!reached) continue;
        Join(row.target,
             Format("%.3g ", target.most) + (target.of.size() == 1 ? target.of.front() : "peers"));
        Join(row.verdict, Format(*reached <= target.most ? "met %.3g" : "missed %.3g", *reached));
    }
    for (const Contestant& contestant : item.contestants) {
        if (!IsPeer(contestant.name)) continue;
        Join(row.peers,
             contestant.name + " " + ToCell(MedianOf(item.name, contestant.name, collected)));
    }
    return row;
}

void PrintRow(const std::string& item, const Row& row)
{
    std::printf("%-38s %9s %9s %9s %7s %9s  %-22s %-20s %s\n", item.c_str(), row.ours.c_str(),
                row.bare.c_str(), row.contract.c_str(), row.perBare.c_str(),
                row.perContract.c_str(), row.target.c_str(), row.verdict.c_str(),
                row.peers.c_str());
    (void)std::fflush(stdout);
}

}  // namespace

bool Collector::ReportContext(const Context& /*context*/)
{
    return true;
}

void Collector::ReportRuns(const std::vector<Run>& runs)
{
    for (const Run& run : runs) {
        if (run.run_type != Run::RT_Iteration) continue;
        Require(!run.error_occurred, run.error_message.c_str());
        const double seconds = run.real_accumulated_time / static_cast<double>(run.iterations);
        times_[run.run_name.function_name].push_back(seconds * NSecPerSec);
    }
}

std::string ToTime(double nanoseconds)
{
    struct Unit {
        double size;
        const char* name;
    };
    constexpr std::array<Unit, 4> Units{{{1e9, "s"}, {1e6, "ms"}, {1e3, "us"}, {1, "ns"}}};
    const auto* unit = std::find_if(Units.begin(), Units.end() - 1,
                                    [&](const Unit& one) { return nanoseconds >= one.size; });
    const double number = nanoseconds / unit->size;
    const char* format = number >= 100 ? "%.0f " : number >= 10 ? "%.1f " : "%.2f ";
    return Format(format, number) + unit->name;
}

void PrintCaption()
{
    PrintRow("item",
             {"ours", "bare", "contract", "/bare", "/contract", "target", "reached", "peers"});
}

void PrintItem(const Item& item, const Collector& collected)
{
    PrintRow(item.name, MakeRow(item, collected));
}

void WriteMarkdown(const std::string& path, const std::vector<Item>& items,
                   const Collector& collected)
{
    std::FILE* file = std::fopen(path.c_str(), "we");
    Require(file != nullptr, "cannot write the table");
    (void)std::fputs(
        "| item | ours | bare | contract | /bare | /contract | target | reached | peers |\n"
        "|---|--:|--:|--:|--:|--:|---|---|---|\n",
        file);
    for (const Item& item : items) {
        const Row row = MakeRow(item, collected);
        (void)std::fprintf(file, "| %s | %s | %s | %s | %s | %s | %s | %s | %s |\n",
                           item.name.c_str(), row.ours.c_str(), row.bare.c_str(),
                           row.contract.c_str(), row.perBare.c_str(), row.perContract.c_str(),
                           row.target.c_str(), row.verdict.c_str(), row.peers.c_str());
    }
    Require(std::fclose(file) == 0, "cannot write the table");
}

void WriteCsv(const std::string& path, const std::vector<Item>& items, const Collector& collected)
{
    std::FILE* file = std::fopen(path.c_str(), "we");
    Require(file != nullptr, "cannot write the CSV file");
    (void)std::fputs(
        "item,contestant,repetitions,median_ns,min_ns,max_ns,per_bare,per_contract,per_ours\n",
        file);
    for (const Item& item : items) {
        const auto ours = MedianOf(item.name, Ours, collected);
        const auto bare = MedianOf(item.name, Bare, collected);
        const auto contract = MedianOf(item.name, Contract, collected);
        for (const Contestant& contestant : item.contestants) {
            const auto found = collected.Times().find(item.name + "/" + contestant.name);
            if (found == collected.Times().end()) continue;
            const std::vector<double>& times = found->second;
            const double median = Median(times);
            const auto [least, most] = std::minmax_element(times.begin(), times.end());
            (void)std::fprintf(file, "\"%s\",%s,%zu,%.1f,%.1f,%.1f,%s,%s,%s\n", item.name.c_str(),
                               contestant.name.c_str(), times.size(), median, *least, *most,
                               ToRatio(median, bare, "").c_str(),
                               ToRatio(median, contract, "").c_str(),
                               (ours ? Format("%.4g", median / *ours) : "").c_str());
        }
    }
    Require(std::fclose(file) == 0, "cannot write the CSV file");
}

}  // namespace Bench
