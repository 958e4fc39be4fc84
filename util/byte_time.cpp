// SPDX-License-Identifier: Apache-2.0
// Conversions between byte counts of 16-bit PCM and milliseconds, for the engine and for the
// file queries alike.
#include "util/byte_time.h"

#include <climits>

namespace {

// Product of rate and channels in 32 bits, wrapping like the 32-bit multiply it stands for
// (garbage read from a file must not turn into undefined behaviour).
int32_t frame_rate(int32_t sample_rate, int32_t channels) {
    return static_cast<int32_t>(static_cast<uint32_t>(sample_rate) *
                                static_cast<uint32_t>(channels));
}

}  // namespace

namespace kova {

int64_t byte_to_ms(int32_t bytes, int32_t sample_rate, int32_t channels) {
    const int32_t rate = frame_rate(sample_rate, channels);
    // A format without samples per second has no duration; answer 0 instead of dividing by 0.
    if (rate <= 0) return 0;
    const double ms = static_cast<double>(bytes) * 1000.0 / (2.0 * static_cast<double>(rate));
    return static_cast<int64_t>(ms);
}

int32_t ms_to_byte(int64_t ms, int32_t sample_rate, int32_t channels) {
    if (ms < 1) return 0;
    const int32_t rate = frame_rate(sample_rate, channels);
    if (rate <= 0 || channels <= 0) return 0;
    int64_t b = 0;
    // Saturate instead of overflowing; such values lie far beyond any source anyway.
    if (__builtin_mul_overflow(ms, static_cast<int64_t>(rate) * 2, &b)) b = INT64_MAX;
    const double q = static_cast<double>(b) / 1000.0;
    const int32_t bytes = q >= static_cast<double>(INT32_MAX) ? INT32_MAX : static_cast<int32_t>(q);
    const int64_t frame = 2 * static_cast<int64_t>(channels);
    return static_cast<int32_t>((bytes / frame) * frame);
}

}  // namespace kova
