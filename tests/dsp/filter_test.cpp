// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "kova/kova_dsp.h"
#include "util/kova_mem.h"

namespace {

KOVA_FLT_DSC dsc(uint32_t type, double freq, double bw = 200, int32_t channels = 1) {
    return KOVA_FLT_DSC{type, freq, bw, 1, 48000, channels};
}

KOVA_FLT* make(const KOVA_FLT_DSC& d) {
    int32_t err = 99;
    KOVA_FLT* f = kova_flt_init(&d, &err);
    EXPECT_EQ(err, KOVA_OK);
    return f;
}

std::vector<int16_t> filtered(const KOVA_FLT_DSC& d, std::vector<int16_t> pcm) {
    KOVA_FLT* f = make(d);
    EXPECT_EQ(kova_flt_process(f, pcm.data(), int32_t(pcm.size() * 2)), KOVA_OK);
    kova_flt_deinit(f);
    return pcm;
}

std::vector<int16_t> sine(double hz, int n, double amp = 16000) {
    std::vector<int16_t> v(n);
    for (int i = 0; i < n; ++i) v[i] = int16_t(amp * std::sin(2 * M_PI * hz * i / 48000));
    return v;
}

double rms(const std::vector<int16_t>& v, size_t from) {
    double s = 0;
    for (size_t i = from; i < v.size(); ++i) s += double(v[i]) * v[i];
    return std::sqrt(s / double(v.size() - from));
}

// Gain of the filter at `hz`, measured on a sine after settling, with the 0.9 output factor
// removed.
double gain(const KOVA_FLT_DSC& d, double hz) {
    std::vector<int16_t> in = sine(hz, 96000);
    return rms(filtered(d, in), 48000) / rms(in, 48000) / 0.9;
}

TEST(Filter, MeasuredResponses) {
    EXPECT_NEAR(gain(dsc(KOVA_FLT_LOWPASS, 1000), 1000), M_SQRT1_2, 0.005);
    EXPECT_NEAR(gain(dsc(KOVA_FLT_HIGHPASS, 1000), 1991.5), M_SQRT1_2, 0.005);
    EXPECT_LT(gain(dsc(KOVA_FLT_HIGHPASS, 1000), 1000), 0.3);  // cut-off is not at `freq`
    EXPECT_NEAR(gain(dsc(KOVA_FLT_BANDPASS, 1000), 1000), 1.0, 0.005);
    EXPECT_NEAR(gain(dsc(KOVA_FLT_BANDPASS, 1000), 1100), M_SQRT1_2, 0.03);  // band edge
    EXPECT_LT(gain(dsc(KOVA_FLT_BANDREJECT, 1000), 1000), 0.005);
    EXPECT_GT(gain(dsc(KOVA_FLT_BANDREJECT, 1000), 3000), 0.99);
    // A constant: the high- and band-pass settle at 0; an unknown type is silent.
    std::vector<int16_t> dc(48000, 10000);
    EXPECT_EQ(filtered(dsc(KOVA_FLT_HIGHPASS, 1000), dc).back(), 0);
    EXPECT_EQ(filtered(dsc(KOVA_FLT_BANDPASS, 1000), dc).back(), 0);
    for (int16_t v : filtered(dsc(4, 1000), dc)) ASSERT_EQ(v, 0);
}

TEST(Filter, OverflowWrapsInsteadOfClipping) {
    // After a long run at -32768 the high-pass is at rest; a jump to 32767 gives y = a0 * 65535,
    // and 0.9 of that lies above 32767, so the stored sample wraps to a negative value.
    std::vector<int16_t> pcm(4800, -32768);
    pcm.push_back(32767);
    KOVA_FLT* f = make(dsc(KOVA_FLT_HIGHPASS, 1000));
    const double a0 = f->biquad->a0;
    kova_flt_process(f, pcm.data(), int32_t(pcm.size() * 2));
    kova_flt_deinit(f);
    EXPECT_NEAR(pcm.back(), int32_t(0.9 * a0 * 65535) - 65536, 1);
}

TEST(Filter, ChannelsAreIndependentAndStateCarriesAcrossCalls) {
    std::vector<int16_t> left = sine(1000, 4800), right = sine(9000, 4800), st;
    for (int i = 0; i < 4800; ++i) st.push_back(left[i]), st.push_back(right[i]);
    st.push_back(1234);  // half a frame at the end stays untouched
    KOVA_FLT_DSC d = dsc(KOVA_FLT_LOWPASS, 1000, 0, 2);

    std::vector<int16_t> whole = filtered(d, st), split = st;
    KOVA_FLT* f = make(d);
    kova_flt_process(f, split.data(), 2 * 2 * 1001);
    kova_flt_process(f, split.data() + 2 * 1001, int32_t(split.size() - 2 * 1001) * 2);
    kova_flt_deinit(f);
    EXPECT_EQ(split, whole);
    EXPECT_EQ(whole.back(), 1234);

    std::vector<int16_t> l = filtered(dsc(KOVA_FLT_LOWPASS, 1000), left);
    std::vector<int16_t> r = filtered(dsc(KOVA_FLT_LOWPASS, 1000), right);
    for (int i = 0; i < 4800; ++i) {
        ASSERT_EQ(whole[2 * i], l[i]) << i;
        ASSERT_EQ(whole[2 * i + 1], r[i]) << i;
    }
}

}  // namespace
