// Benchmark program: every figure of the library is measured next to its peer in the same run;
// the tables at the end give the ratios. Usage: kova_bench [google benchmark flags]
#include <benchmark/benchmark.h>

#include <iostream>

#include "bench_registry.h"
#include "summary.h"

int main(int argc, char** argv) {
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;

    kova_bench::preamble() << "Output checks:\n";
    kova_bench::register_resample_benchmarks();
    kova_bench::register_ringbuffer_benchmarks();
    kova_bench::register_generate_benchmarks();
    kova_bench::register_paced_benchmarks();
    kova_bench::report_memory();
    kova_bench::report_registry_wait();
    kova_bench::report_latency();
    std::cout << kova_bench::preamble_text() << std::endl;

    kova_bench::CollectingReporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    benchmark::Shutdown();

    std::cout << "\n## Summary (medians when repeated; CPU time of one core)\n\n"
              << kova_bench::preamble_text();
    const int missed = kova_bench::print_sections(reporter.results(), std::cout);
    std::cout << "\nTargets missed: " << missed << "\n";
    return 0;
}
