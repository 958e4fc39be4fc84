// Monotonic clock in seconds and sleeping until a point on it, for the benchmarks that pace
// events in real time.
#ifndef KOVA_BENCH_CLOCK_H
#define KOVA_BENCH_CLOCK_H

#include <time.h>

namespace kova_bench {

inline double now_s() {
    timespec t{};
    clock_gettime(CLOCK_MONOTONIC, &t);
    return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_nsec) / 1e9;
}

inline void sleep_until_s(double at) {
    timespec t{};
    t.tv_sec = static_cast<time_t>(at);
    t.tv_nsec = static_cast<long>((at - static_cast<double>(t.tv_sec)) * 1e9);
    while (clock_nanosleep(CLOCK_MONOTONIC, TIMER_ABSTIME, &t, nullptr) != 0) {
    }
}

}  // namespace kova_bench

#endif
