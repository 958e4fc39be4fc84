// The block fill hands out exactly what the same number of single calls would, and leaves the
// oscillator in the same state, across frequency changes, channel counts and waveforms.
#include <gtest/gtest.h>

#include <cstring>
#include <vector>

#include "kova/kova_dsp.h"

namespace {

struct OscPair {
    KOVA_OSC* one;   // driven value by value
    KOVA_OSC* fill;  // driven by _osc_fill
    OscPair(uint32_t channels, uint32_t waveform)
        : one(kova_osc_init(48000, channels, waveform)),
          fill(kova_osc_init(48000, channels, waveform)) {}
    ~OscPair() {
        kova_osc_deinit(one);
        kova_osc_deinit(fill);
    }
};

// Bit patterns, so that -0.0 and 0.0 count as different values.
bool same_bits(double a, double b) {
    return std::memcmp(&a, &b, sizeof a) == 0;
}

TEST(OscFill, MatchesSingleValuesAndState) {
    // Short periods (reused within a call), a period above the fill's table, a period shorter
    // than the phase it inherits, and the one-sample cycle at the sample rate.
    const double freqs[] = {1400.0, 13000.0, 30.0, 7000.0, 48000.0, 440.0};
    const int64_t chunks[] = {1, 3, 256, 1000};
    for (uint32_t channels : {1u, 2u}) {
        for (uint32_t waveform : {0u, 1u, 2u}) {
            OscPair p(channels, waveform);
            ASSERT_NE(p.one, nullptr);
            ASSERT_NE(p.fill, nullptr);
            int64_t checked = 0;
            for (double f : freqs) {
                kova_osc_set_freq(p.one, f);
                kova_osc_set_freq(p.fill, f);
                for (int64_t n : chunks) {
                    std::vector<double> got(static_cast<size_t>(n));
                    _osc_fill(p.fill, got.data(), n);
                    for (int64_t i = 0; i < n; ++i) {
                        const double want = kova_osc_get_sample(p.one);
                        ASSERT_TRUE(same_bits(got[i], want))
                            << "channels " << channels << " waveform " << waveform << " freq " << f
                            << " value " << i << ": " << got[i] << " vs " << want;
                    }
                    checked += n;
                    ASSERT_EQ(p.fill->phase, p.one->phase);
                    ASSERT_EQ(p.fill->hold, p.one->hold);
                }
            }
            EXPECT_EQ(checked, 6 * 1260);
        }
    }
}

TEST(OscFill, RefusedOscillatorGivesTheErrorValue) {
    double out[4] = {1, 1, 1, 1};
    _osc_fill(nullptr, out, 4);
    for (double v : out) EXPECT_EQ(v, -3.0);
    KOVA_OSC* osc = kova_osc_init(48000, 2, 0);
    ASSERT_NE(osc, nullptr);
    const uint32_t tag = osc->tag;
    osc->tag = 0;
    out[0] = 1;
    _osc_fill(osc, out, 1);
    EXPECT_EQ(out[0], -3.0);
    EXPECT_EQ(osc->phase, 0);  // nothing advanced
    osc->tag = tag;
    kova_osc_deinit(osc);
}

}  // namespace
