// SPDX-License-Identifier: Apache-2.0
/* Linear-interpolating stereo resampler on a 4.28 fixed-point position, and 4.28 helpers. */
#include <climits>
#include <cstdint>
#include <cstring>

#include "dsp/dsp_internal.h"
#include "kova/kova_dsp.h"

namespace {

constexpr int kFracBits = 28;
constexpr int32_t kOne = 1 << kFracBits; /* 1.0 */
constexpr int32_t kFracMask = kOne - 1;  /* 0x0FFFFFFF */
constexpr int32_t kSnap = 0x80;          /* positions this close to a frame snap onto it */
constexpr int32_t kMaxStep = 7 * kOne;   /* 7.0: larger steps could overflow the position */
constexpr int64_t kMaxIntegerPart = 7;
constexpr int32_t kFrameBytes = 4;

/* Rounded 4.28 quotient a / b, or 0 when it has no representation (see calcDevide). */
int32_t ratio_4_28(int32_t a, int32_t b) {
    /* A zero denominator has no quotient; 0 is the same "no ratio" answer as for an overflow. */
    if (b == 0) return 0;
    /* 64-bit throughout: INT32_MIN / -1 and |INT32_MIN| do not fit in 32 bits. */
    const int64_t q = static_cast<int64_t>(a) / b;
    if (q > kMaxIntegerPart || q < -kMaxIntegerPart) return 0;

    const int64_t num = a < 0 ? -static_cast<int64_t>(a) : a;
    const int64_t den = b < 0 ? -static_cast<int64_t>(b) : b;
    int64_t result = q < 0 ? -q : q;
    int64_t rem = num % den;
    int bits = 0;
    while (bits < kFracBits && rem != 0) {
        rem <<= 1;
        result <<= 1;
        if (rem >= den) {
            result |= 1;
            rem -= den;
        }
        ++bits;
    }
    if ((rem << 1) >= den) result += 1; /* half rounds up in magnitude */
    result <<= (kFracBits - bits);
    /* Rounding cannot reach 8.0 for 32-bit operands, but the bound is cheap to keep. */
    if (result > INT32_MAX) return 0;
    return ((a < 0) != (b < 0)) ? static_cast<int32_t>(-result) : static_cast<int32_t>(result);
}

/* Linear interpolation of one sample: s0 + floor((s1 - s0) * frac / 2^28). */
inline int16_t lerp(int32_t s0, int32_t s1, int32_t frac) {
    return static_cast<int16_t>(
        s0 + static_cast<int32_t>((static_cast<int64_t>(s1 - s0) * frac) >> kFracBits));
}

}  // namespace

extern "C" {

int32_t calcDevide(int32_t a, int32_t b) {
    return ratio_4_28(a, b);
}

int32_t calcMultiply(int32_t a, int32_t b) {
    return static_cast<int32_t>((static_cast<int64_t>(a) * b) >> kFracBits);
}

void _resample_s16_stereo_capped(int32_t numerator, int32_t denominator, const KOVA_PCMBUF* in,
                                 KOVA_PCMBUF* out, int32_t out_capacity) {
    if (out == nullptr) return;
    if (in == nullptr || in->data == nullptr || out->data == nullptr || in->size < 1 ||
        out_capacity < 1) {
        out->size = 0;
        return;
    }

    const int32_t step = ratio_4_28(numerator, denominator);
    if (step == kOne) {
        /* A copy cut short by the capacity ends on a whole frame, so the next block does not
         * start with the channels swapped. */
        const int32_t bytes =
            in->size <= out_capacity ? in->size : out_capacity / kFrameBytes * kFrameBytes;
        std::memmove(out->data, in->data, static_cast<size_t>(bytes));
        out->size = bytes;
        return;
    }
    /* Refused ratios give an empty block: a step of 0 (a ratio that rounds to 0, a zero
     * denominator, an integer part above 7) never advances; a negative one walks backwards out
     * of the block; from 7.0 up the position can pass 8.0 and overflow the 4.28 format. */
    if (step <= 0 || step >= kMaxStep) {
        out->size = 0;
        return;
    }

    /* Only whole frames are read; a trailing partial frame is ignored. */
    const int32_t in_frames = in->size / kFrameBytes;
    const int32_t max_out = out_capacity / kFrameBytes;
    if (in_frames < 2 || max_out < 1) {
        out->size = 0;
        return;
    }

    const int16_t* src = in->data;
    int16_t* dst = out->data;
    const int32_t last = in_frames - 1; /* every output frame needs frame f + 1 */
    int32_t f = 0;
    int32_t pos = 0; /* fraction only, 0 .. kFracMask */
    int32_t n = 0;
    do {
        /* With fraction 0 the interpolation yields the left frame exactly, so there is no
         * separate branch for it; frame f + 1 always exists because f < last. */
        const int16_t* s = src + 2 * f;
        const int32_t l0 = s[0], r0 = s[1], l1 = s[2], r1 = s[3];
        dst[2 * n] = lerp(l0, l1, pos);
        dst[2 * n + 1] = lerp(r0, r1, pos);
        ++n;

        /* step < 7.0 and pos < 1.0, so the sum and the rounding offset stay below 2^31. */
        pos += step;
        const int32_t nudged = pos + kSnap;
        if ((nudged & kFracMask) < 2 * kSnap) pos = nudged & ~kFracMask;
        f += pos >> kFracBits;
        pos &= kFracMask;
    } while (f < last && n < max_out);

    out->size = n * kFrameBytes;
}

void kova_resample_s16_stereo(int32_t numerator, int32_t denominator, const KOVA_PCMBUF* in,
                              KOVA_PCMBUF* out) {
    _resample_s16_stereo_capped(numerator, denominator, in, out, INT32_MAX);
}

}  // extern "C"
