// SPDX-License-Identifier: Apache-2.0
// Test signals and small helpers shared by the benchmark files.
#ifndef KOVA_BENCH_SIGNAL_H
#define KOVA_BENCH_SIGNAL_H

#include <cstddef>
#include <cstdint>
#include <vector>

namespace kova_bench {

// Interleaved stereo 16-bit noise-like PCM (low-passed pseudo-random, about -20 dBFS), the same
// sequence for the same seed on every run.
std::vector<int16_t> noise_pcm(std::size_t samples, uint32_t seed);

// FNV-1a over a byte range, chained through `h` (start with kFnvBasis).
constexpr uint64_t kFnvBasis = 0xcbf29ce484222325ull;
uint64_t fnv1a(uint64_t h, const void* data, std::size_t bytes);

}  // namespace kova_bench

#endif
