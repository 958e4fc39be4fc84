#include "summary.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <sstream>
#include <utility>

namespace kova_bench {

namespace {

std::vector<std::pair<int, SectionFn>>& sections() {
    static std::vector<std::pair<int, SectionFn>> list;
    return list;
}

std::ostringstream& preamble_stream() {
    static std::ostringstream s;
    return s;
}

Measured measured_of(const benchmark::BenchmarkReporter::Run& run) {
    Measured m;
    // GetAdjustedCPUTime is in the run's time unit; the tables work in nanoseconds.
    m.cpu_ns = run.GetAdjustedCPUTime() / benchmark::GetTimeUnitMultiplier(run.time_unit) * 1e9;
    m.real_ns = run.GetAdjustedRealTime() / benchmark::GetTimeUnitMultiplier(run.time_unit) * 1e9;
    for (const auto& [name, counter] : run.counters) m.counters[name] = counter.value;
    return m;
}

}  // namespace

CollectingReporter::CollectingReporter()
    : ConsoleReporter(isatty(STDOUT_FILENO) ? OO_ColorTabular : OO_Tabular) {}

void CollectingReporter::ReportRuns(const std::vector<Run>& runs) {
    for (const Run& run : runs) {
        if (run.error_occurred) continue;
        const std::string name = run.run_name.str();
        if (run.run_type == Run::RT_Aggregate) {
            if (run.aggregate_name != "median") continue;
            results_[name] = measured_of(run);
            has_median_[name] = true;
        } else if (!has_median_[name]) {
            results_[name] = measured_of(run);
        }
    }
    ConsoleReporter::ReportRuns(runs);
}

void add_section(int order, SectionFn fn) {
    sections().emplace_back(order, fn);
}

int print_sections(const Results& results, std::ostream& out) {
    auto list = sections();
    std::stable_sort(list.begin(), list.end(),
                     [](const auto& a, const auto& b) { return a.first < b.first; });
    int missed = 0;
    for (const auto& [order, fn] : list) missed += fn(results, out);
    return missed;
}

std::ostream& preamble() {
    return preamble_stream();
}

const std::string& preamble_text() {
    static std::string text;
    text = preamble_stream().str();
    return text;
}

const Measured* find(const Results& results, const std::string& name) {
    const auto it = results.find(name);
    return it == results.end() ? nullptr : &it->second;
}

std::string fixed(double v, int decimals) {
    char buf[64];
    std::snprintf(buf, sizeof buf, "%.*f", decimals, v);
    return buf;
}

std::string verdict(bool met) {
    return met ? "met" : "**missed**";
}

}  // namespace kova_bench
