// SPDX-License-Identifier: Apache-2.0
// Byte counts of 16-bit PCM and milliseconds at a sample rate and channel count. Below both the
// engine and the source layer, which convert repeat points and lengths with it.
#ifndef KOVA_UTIL_BYTE_TIME_H
#define KOVA_UTIL_BYTE_TIME_H

#include <cstdint>

namespace kova {

/* Milliseconds that `bytes` of PCM last, truncated toward zero; 0 for a format without a rate. */
int64_t byte_to_ms(int32_t bytes, int32_t sample_rate, int32_t channels);

/* Bytes of `ms` milliseconds, truncated, saturated at INT32_MAX and cut to whole frames; 0 for
 * ms < 1 or a format without a rate. */
int32_t ms_to_byte(int64_t ms, int32_t sample_rate, int32_t channels);

}  // namespace kova

#endif
