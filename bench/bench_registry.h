// Each benchmark file registers its benchmarks and its summary section through one of these.
#ifndef KOVA_BENCH_REGISTRY_H
#define KOVA_BENCH_REGISTRY_H

namespace kova_bench {

void register_resample_benchmarks();
void register_ringbuffer_benchmarks();
void register_generate_benchmarks();
void register_paced_benchmarks();
// Not timed: heap figures per instance, written into the preamble.
void report_memory();
// Not timed by the framework: strokes of 20 instances starting at once, waits on the registry
// lock, written into the preamble.
void report_registry_wait();
// Not timed by the framework: event-to-device latency through a started stream, in real time.
void report_latency();

}  // namespace kova_bench

#endif
