// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstdlib>
#include <vector>

#include "kova/kova_dsp.h"

namespace {

using Pcm = std::vector<int16_t>;

// Resamples `in` (exactly sized, so ASan sees any read past it; its first `in_bytes` when given).
Pcm resample(int32_t num, int32_t den, const Pcm& in, int32_t in_bytes = -1) {
    Pcm src = in, dst(in.size() * 101 + 8, -7);
    KOVA_PCMBUF i{src.data(), in_bytes < 0 ? int32_t(in.size() * 2) : in_bytes};
    KOVA_PCMBUF o{dst.data(), 12345};
    kova_resample_s16_stereo(num, den, &i, &o);
    EXPECT_EQ(o.size % 4 == 0 || o.size == i.size, true);
    dst.resize(o.size / 2);
    return dst;
}

Pcm ramp(int frames) {
    Pcm v;
    for (int f = 0; f < frames; ++f) v.push_back(int16_t(f * 100)), v.push_back(int16_t(-f * 7));
    return v;
}

TEST(FixedPoint, DivideRoundsHalfUpAndRefusesLargeQuotients) {
    EXPECT_EQ(calcDevide(7, 1), 0x70000000);
    EXPECT_EQ(calcDevide(8, 1), 0);
    EXPECT_EQ(calcDevide(1, -3), -89478485);
    EXPECT_EQ(calcDevide(5, 0), 0);
    EXPECT_EQ(calcDevide(1, 1 << 29), 1);  // exact halves round up in magnitude
    EXPECT_EQ(calcDevide(-3, 1 << 29), -2);
    EXPECT_EQ(calcDevide(INT_MIN, -1), 0);
    // Against round-half-up(|a / b| * 2^28) with the sign of a / b, in exact integer arithmetic.
    std::srand(3);
    for (int k = 0; k < 20000; ++k) {
        int64_t b = std::rand() % 2000000 + 1, a = std::rand() % (7 * b + 1);
        int64_t want = ((a << 29) + b) / (2 * b);
        int32_t sa = k & 1 ? int32_t(-a) : int32_t(a), sb = k & 2 ? int32_t(-b) : int32_t(b);
        ASSERT_EQ(calcDevide(sa, sb), (k & 1) != ((k & 2) != 0) ? -want : want) << a << "/" << b;
    }
    EXPECT_EQ(calcMultiply(0x10000000, 12345), 12345);
    EXPECT_EQ(calcMultiply(-1, 1), -1);
    EXPECT_EQ(calcMultiply(0x08000000, -3), -2);  // floor(-1.5)
    EXPECT_EQ(calcMultiply(0x30000000, 0x20000000), 0x60000000);
}

TEST(Resampler, KnownValues) {
    EXPECT_EQ(resample(2, 1, ramp(10)), (Pcm{0, 0, 200, -14, 400, -28, 600, -42, 800, -56}));
    EXPECT_EQ(resample(1, 2, Pcm{0, 1000, 100, 2000, -50, 3000}),
              (Pcm{0, 1000, 50, 1500, 100, 2000, 25, 2500}));
    // Rounding is toward minus infinity: 91.875 -> 91, -91.875 -> -92.
    EXPECT_EQ(resample(44100, 48000, Pcm{0, 0, 100, -100}), (Pcm{0, 0, 91, -92}));
}

TEST(Resampler, MatchesExactLinearInterpolation) {
    std::srand(5);
    Pcm in(2 * 1935);
    for (int16_t& v : in) v = int16_t(std::rand() % 65536 - 32768);
    for (auto [num, den] : {std::pair{48000, 38084}, {38084, 48000}, {1, 3}, {69, 10}, {1, 100}}) {
        Pcm out = resample(num, den, in);
        const int frames = int(out.size() / 2);
        // Every position below the last frame is produced, and only those.
        ASSERT_EQ(frames, int(std::ceil(1934.0 * den / num - 1e-9))) << num << "/" << den;
        for (int k = 0; k < frames; ++k) {
            const double pos = double(k) * num / den;
            const int f = int(pos);
            for (int c = 0; c < 2; ++c) {
                const int s0 = in[2 * f + c], s1 = in[2 * f + 2 + c];
                ASSERT_NEAR(out[2 * k + c], s0 + (s1 - s0) * (pos - f), 1.5) << num << "/" << den;
            }
        }
    }
}

TEST(Resampler, RatioOneCopiesShortBlocksAndRefusedRatiosAreEmpty) {
    Pcm in = ramp(7);
    EXPECT_EQ(resample(48000, 48000, in), in);
    EXPECT_EQ(resample(1073741825, 1073741824, in), in);  // rounds to exactly 1.0
    EXPECT_EQ(resample(1, 2, ramp(1)).size(), 0u);
    // A trailing half frame is ignored, never read.
    EXPECT_EQ(resample(1, 2, ramp(10), 42), resample(1, 2, ramp(10)));
    // Refused ratios give an empty block.
    for (auto [num, den] :
         {std::pair{1, 0}, {1, 1000000000}, {7, 1}, {-1, 2}, {48000, -96000}, {INT_MIN, -1}}) {
        EXPECT_EQ(resample(num, den, ramp(10)).size(), 0u) << num << "/" << den;
    }
    EXPECT_EQ(resample(699, 100, ramp(10)).size(), 2u * 2);  // just below 7 still works
}

}  // namespace
