// What the repetitions gave: a table on the screen and one for a page, and a CSV file for programs.
#ifndef ORVADRCORE_BENCH_SUPPORT_REPORT_H
#define ORVADRCORE_BENCH_SUPPORT_REPORT_H

#include <benchmark/benchmark.h>

#include <map>
#include <string>
#include <vector>

#include "support/bench.h"

namespace Bench {

// Keeps the time of each repetition, in nanoseconds for one run, by the name "item/contestant".
class Collector : public benchmark::BenchmarkReporter {
  public:
    bool ReportContext(const Context& context) override;
    void ReportRuns(const std::vector<Run>& runs) override;

    const std::map<std::string, std::vector<double>>& Times() const { return times; }

  private:
    std::map<std::string, std::vector<double>> times;
};

// The caption of the table, and an item's row: medians, their ratios to the floors, the target and
// whether it is met, the peers.
void PrintCaption();
void PrintItem(const Item& item, const Collector& collected);

// The same table in Markdown.
void WriteMarkdown(const std::string& path, const std::vector<Item>& items,
                   const Collector& collected);

// Every contestant with its median, fastest and slowest repetition and its ratios to the floors and
// to ours.
void WriteCsv(const std::string& path, const std::vector<Item>& items, const Collector& collected);

// A time with three digits and its unit.
std::string ToTime(double nanoseconds);

}  // namespace Bench

#endif
