// Reports the results: a table on the screen, one in Markdown, and a CSV file.
#ifndef ORVADRCORE_BENCH_SUPPORT_REPORT_H
#define ORVADRCORE_BENCH_SUPPORT_REPORT_H

#include <benchmark/benchmark.h>

#include <map>
#include <string>
#include <vector>

#include "support/bench.h"

namespace Bench {

// Collects the time of each repetition, in nanoseconds per run, by "item/contestant".
class Collector : public benchmark::BenchmarkReporter {
  public:
    bool ReportContext(const Context& context) override;
    void ReportRuns(const std::vector<Run>& runs) override;

    const std::map<std::string, std::vector<double>>& Times() const { return times_; }

  private:
    std::map<std::string, std::vector<double>> times_;
};

// The table's caption, and an item's row: medians, their ratios to the work by hand, the target and
// whether it is met, other libraries.
void PrintCaption();
void PrintItem(const Item& item, const Collector& collected);

// The same table in Markdown.
void WriteMarkdown(const std::string& path, const std::vector<Item>& items,
                   const Collector& collected);

// Each contestant's median, fastest and slowest repetition, and its ratios to the work by hand and to
// us.
void WriteCsv(const std::string& path, const std::vector<Item>& items, const Collector& collected);

// A time as text: three digits and a unit.
std::string ToTime(double nanoseconds);

}  // namespace Bench

#endif
