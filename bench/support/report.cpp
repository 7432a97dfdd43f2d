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
        times[run.run_name.function_name].push_back(seconds * NSecPerSec);
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
    std::printf("%-38s %9s %9s %9s %7s %9s  %s\n", "item", "ours", "bare", "contract", "/bare",
                "/contract", "peers");
}

void PrintItem(const Item& item, const Collector& collected)
{
    const auto ours = MedianOf(item.name, Ours, collected);
    const auto bare = MedianOf(item.name, Bare, collected);
    const auto contract = MedianOf(item.name, Contract, collected);
    std::string peers;
    for (const Contestant& contestant : item.contestants) {
        if (!IsPeer(contestant.name)) continue;
        if (!peers.empty()) peers += ", ";
        peers += contestant.name + " " + ToCell(MedianOf(item.name, contestant.name, collected));
    }
    std::printf("%-38s %9s %9s %9s %7s %9s  %s\n", item.name.c_str(), ToCell(ours).c_str(),
                ToCell(bare).c_str(), ToCell(contract).c_str(), ToRatio(ours, bare, "-").c_str(),
                ToRatio(ours, contract, "-").c_str(), peers.c_str());
    (void)std::fflush(stdout);
}

void WriteCsv(const std::string& path, const std::vector<Item>& items, const Collector& collected)
{
    std::FILE* file = std::fopen(path.c_str(), "we");
    Require(file != nullptr, "cannot write the CSV file");
    (void)std::fputs("item,contestant,repetitions,median_ns,min_ns,max_ns,per_bare,per_contract\n",
                     file);
    for (const Item& item : items) {
        const auto bare = MedianOf(item.name, Bare, collected);
        const auto contract = MedianOf(item.name, Contract, collected);
        for (const Contestant& contestant : item.contestants) {
            const auto found = collected.Times().find(item.name + "/" + contestant.name);
            if (found == collected.Times().end()) continue;
            const std::vector<double>& times = found->second;
            const double median = Median(times);
            const auto [least, most] = std::minmax_element(times.begin(), times.end());
            (void)std::fprintf(file, "\"%s\",%s,%zu,%.1f,%.1f,%.1f,%s,%s\n", item.name.c_str(),
                               contestant.name.c_str(), times.size(), median, *least, *most,
                               ToRatio(median, bare, "").c_str(),
                               ToRatio(median, contract, "").c_str());
        }
    }
    Require(std::fclose(file) == 0, "cannot write the CSV file");
}

}  // namespace Bench
