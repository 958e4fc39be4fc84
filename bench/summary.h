// Collects what every benchmark measured in this run and prints, at the end, the comparison
// tables: each figure of the library next to its peer's and the ratio between the two.
#ifndef KOVA_BENCH_SUMMARY_H
#define KOVA_BENCH_SUMMARY_H

#include <benchmark/benchmark.h>

#include <map>
#include <ostream>
#include <string>
#include <vector>

namespace kova_bench {

// One benchmark's result: the median over repetitions when there were several, else the run.
struct Measured {
    double cpu_ns = 0;   // CPU time per iteration
    double real_ns = 0;  // wall (or manual) time per iteration
    std::map<std::string, double> counters;
};

using Results = std::map<std::string, Measured>;

// Console output as usual, and every result kept for the summary.
class CollectingReporter : public benchmark::ConsoleReporter {
   public:
    // Colours only on a terminal (a reporter passed in does not see --benchmark_color).
    CollectingReporter();
    void ReportRuns(const std::vector<Run>& runs) override;
    const Results& results() const { return results_; }

   private:
    Results results_;
    std::map<std::string, bool> has_median_;
};

// A summary section: prints its table (Markdown) from the results. Returns the number of targets
// it found missed.
using SectionFn = int (*)(const Results&, std::ostream&);
void add_section(int order, SectionFn fn);
// Runs every section in order; returns the total number of missed targets.
int print_sections(const Results& results, std::ostream& out);

// Text shown before the benchmarks run (output checks, memory figures); printed again with the
// summary so that the final report is in one place.
std::ostream& preamble();
const std::string& preamble_text();

// The measured figure of a benchmark, or nullptr when it did not run (filtered out).
const Measured* find(const Results& results, const std::string& name);

// Formatting helpers for the tables.
std::string fixed(double v, int decimals);
std::string verdict(bool met);

}  // namespace kova_bench

#endif
