// SPDX-License-Identifier: Apache-2.0
#include "bench_signal.h"

namespace kova_bench {

std::vector<int16_t> noise_pcm(std::size_t samples, uint32_t seed) {
    std::vector<int16_t> pcm(samples);
    uint32_t state = seed * 2654435761u + 1u;
    int32_t smooth[2] = {0, 0};
    for (std::size_t i = 0; i < samples; ++i) {
        state = state * 1664525u + 1013904223u;  // LCG; the top bits are the usable ones
        const int32_t white = static_cast<int32_t>(state >> 16) - 32768;
        int32_t& s = smooth[i & 1];
        s += (white - s) / 4;  // one-pole low-pass, so neighbouring frames are related
        pcm[i] = static_cast<int16_t>(s / 6);
    }
    return pcm;
}

uint64_t fnv1a(uint64_t h, const void* data, std::size_t bytes) {
    const auto* p = static_cast<const unsigned char*>(data);
    for (std::size_t i = 0; i < bytes; ++i) {
        h ^= p[i];
        h *= 0x100000001b3ull;
    }
    return h;
}

}  // namespace kova_bench
