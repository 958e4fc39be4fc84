// SPDX-License-Identifier: Apache-2.0
// The oscillator: periods, waveforms, the sample-block writer, refusals, and the block fill
// (_osc_fill), which must hand out exactly what the same number of single calls would and leave
// the oscillator in the same state.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <vector>

#include "dsp/dsp_internal.h"
#include "kova/kova_dsp.h"

namespace {

std::vector<double> take(KOVA_OSC* osc, int n) {
    std::vector<double> v;
    for (int i = 0; i < n; ++i) v.push_back(kova_osc_get_sample(osc));
    return v;
}

TEST(Oscillator, PeriodFollowsRateAndFrequencyAndStaysAtLeastOne) {
    KOVA_OSC* osc = kova_osc_init(48000, 1, 0);
    ASSERT_NE(osc, nullptr);
    EXPECT_EQ(osc->period, 4800);  // 10 Hz to begin with
    EXPECT_EQ(kova_osc_set_freq(osc, 440.0), KOVA_OK);
    EXPECT_EQ(osc->period, 109);
    for (double f : {0.0, -5.0, double(NAN)}) {
        kova_osc_set_freq(osc, f);
        EXPECT_EQ(osc->freq, 1.0);
        EXPECT_EQ(osc->period, 48000);
    }
    // At or above the sample rate the cycle is one sample: a constant, never a division by 0.
    for (double f : {48000.0, 96000.0, double(INFINITY)}) {
        kova_osc_set_freq(osc, f);
        EXPECT_EQ(osc->period, 1);
        EXPECT_EQ(take(osc, 3), (std::vector<double>{0.0, 0.0, 0.0}));
    }
    kova_osc_set_freq(osc, 1e-300);  // a period too long for 64 bits is bounded, not undefined
    EXPECT_GT(osc->period, 0);
    EXPECT_EQ(kova_osc_deinit(osc), KOVA_OK);
}

TEST(Oscillator, WaveformsAtKnownPhases) {
    // 48000 / 12000 = period 4; 48000 / 9600 = period 5; 48000 / 6000 = period 8.
    KOVA_OSC* sq = kova_osc_init(48000, 1, 1);
    kova_osc_set_freq(sq, 12000.0);
    EXPECT_EQ(take(sq, 5), (std::vector<double>{1, 1, -1, -1, 1}));
    kova_osc_set_freq(sq, 9600.0);
    EXPECT_EQ(take(sq, 5), (std::vector<double>{1, -1, -1, -1, 1}));  // phase 1 carried over

    KOVA_OSC* saw = kova_osc_init(48000, 1, 2);
    kova_osc_set_freq(saw, 6000.0);
    EXPECT_EQ(take(saw, 9), (std::vector<double>{0, .25, .5, .75, -1, -.75, -.5, -.25, 0}));

    KOVA_OSC* sine = kova_osc_init(48000, 1, 7);  // any other code is a sine
    kova_osc_set_freq(sine, 6000.0);
    std::vector<double> s = take(sine, 8);
    for (int k = 0; k < 8; ++k) EXPECT_NEAR(s[k], std::sin(k * M_PI / 4), 1e-15) << k;

    KOVA_OSC* stereo = kova_osc_init(48000, 2, 2);  // each value handed out twice
    kova_osc_set_freq(stereo, 6000.0);
    EXPECT_EQ(take(stereo, 8), (std::vector<double>{0, 0, .25, .25, .5, .5, .75, .75}));
    for (KOVA_OSC* o : {sq, saw, sine, stereo}) kova_osc_deinit(o);
}

TEST(Oscillator, GenSamplesScalesToFullScaleAndLeavesOddByte) {
    KOVA_OSC* sine = kova_osc_init(48000, 1, 0);
    kova_osc_set_freq(sine, 12000.0);
    int16_t buf[5] = {9, 9, 9, 9, 9};
    EXPECT_EQ(kova_osc_gen_samples(sine, buf, 9), 4);
    EXPECT_EQ(std::vector<int16_t>(buf, buf + 5), (std::vector<int16_t>{0, 32767, 0, -32767, 9}));
    EXPECT_EQ(kova_osc_gen_samples(sine, buf, 1), 0);

    KOVA_OSC* sq = kova_osc_init(8000, 1, 1);
    int16_t big[2000];
    EXPECT_EQ(kova_osc_gen_samples(sq, big, sizeof big), 2000);
    for (int16_t v : big) ASSERT_TRUE(v == 32767 || v == -32767);
    kova_osc_deinit(sine);
    kova_osc_deinit(sq);
}

// Drives one oscillator value by value and a twin through _osc_fill in chunks of `n` values at
// each frequency, optionally switching the waveform field first; values (bit patterns, so -0.0
// and 0.0 differ) and state must agree.
void expect_fill_matches(uint32_t channels, uint32_t waveform, const std::vector<double>& freqs,
                         const std::vector<int64_t>& chunks, int waveform_every = 0) {
    KOVA_OSC* one = kova_osc_init(48000, channels, waveform);
    KOVA_OSC* fill = kova_osc_init(48000, channels, waveform);
    int step = 0;
    for (double f : freqs) {
        for (KOVA_OSC* o : {one, fill}) {
            kova_osc_set_freq(o, f);
            if (waveform_every) o->waveform = static_cast<uint32_t>(step / waveform_every);
        }
        for (int64_t n : chunks) {
            std::vector<double> got(static_cast<size_t>(n));
            _osc_fill(fill, got.data(), n);
            for (int64_t i = 0; i < n; ++i) {
                const double want = kova_osc_get_sample(one);
                ASSERT_EQ(std::memcmp(&got[i], &want, sizeof want), 0)
                    << channels << " " << one->waveform << " " << f << " " << i;
            }
            ASSERT_TRUE(fill->phase == one->phase && fill->hold == one->hold);
        }
        ++step;
    }
    kova_osc_deinit(one);
    kova_osc_deinit(fill);
}

TEST(OscFill, MatchesSingleValuesAndState) {
    // Short periods (reused within a call), a period above the fill's table, a period shorter
    // than the phase it inherits, and the one-sample cycle at the sample rate.
    for (uint32_t channels : {1u, 2u}) {
        for (uint32_t waveform : {0u, 1u, 2u}) {
            expect_fill_matches(channels, waveform, {1400.0, 13000.0, 30.0, 7000.0, 48000.0, 440.0},
                                {1, 3, 256, 1000});
        }
    }
    // Whole cycles are kept across calls, keyed by period and waveform: more periods than the
    // oscillator keeps, revisited in turn, with the waveform field changed at the same periods.
    std::vector<double> freqs;
    for (int round = 0; round < 3; ++round) {
        freqs.insert(freqs.end(), {1400.0, 1700.0, 2100.0, 2600.0, 3100.0, 3700.0, 4300.0, 5000.0,
                                   5900.0, 6700.0, 1400.0, 1700.0});
    }
    expect_fill_matches(2, 0, freqs, {301}, 12);
}

}  // namespace
