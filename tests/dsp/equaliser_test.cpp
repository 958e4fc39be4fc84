// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>

#include "kova/kova_dsp.h"

namespace {

KOVA_EQ fresh() {
    KOVA_EQ eq;
    kova_eq_init(&eq, 880, 5000, 48000);
    return eq;
}

// Output level of a sine relative to its input, measured after the equaliser has settled.
double level_at(double thickness, double hz) {
    KOVA_EQ eq = fresh();
    kova_eq_set_thickness(&eq, thickness);
    const double amp = 1e8;
    double in2 = 0, out2 = 0;
    for (int i = 0; i < 96000; ++i) {
        double x = amp * std::sin(2 * M_PI * hz * i / 48000);
        int32_t y = kova_eq_proc(&eq, static_cast<int32_t>(x));
        if (i >= 48000) in2 += x * x, out2 += double(y) * y;
    }
    return std::sqrt(out2 / in2);
}

TEST(Equaliser, InitAndThicknessSetKnownValues) {
    KOVA_EQ eq = fresh();
    struct Case {
        double t, low, high, slew;
    };
    for (Case c : {Case{0, .6, 1.2, .7}, Case{1, 1.2, .6, 1.0}, Case{.5, .9, .9, .85},
                   Case{2, 1.2, .6, 1.0}, Case{-1, .6, 1.2, .7}, Case{NAN, .6, 1.2, .7}}) {
        EXPECT_EQ(kova_eq_set_thickness(&eq, c.t), &eq);
        EXPECT_DOUBLE_EQ(eq.low_gain, c.low) << c.t;
        EXPECT_DOUBLE_EQ(eq.high_gain, c.high) << c.t;
        EXPECT_DOUBLE_EQ(eq.slew_decay, c.slew) << c.t;
    }
    // Thickness 0.6 gives exactly the initial 0.88 only with the factor just above 0.3.
    kova_eq_set_thickness(&eq, 0.6);
    EXPECT_EQ(eq.slew_decay, 0.88);
}

TEST(Equaliser, ThicknessTradesLowBandAgainstHighBand) {
    // At 50 Hz the low band carries nearly everything. At 15 kHz the output is
    // high_gain * x + (1 - high_gain) * hs + (low_gain - 1) * ls with |hs| ~ 0.54 and |ls| < 0.06,
    // which bounds the level to 1.07 .. 1.33 at thickness 0 and 0.37 .. 0.83 at thickness 1.
    EXPECT_NEAR(level_at(0.0, 50), 0.6, 0.05);
    EXPECT_NEAR(level_at(1.0, 50), 1.2, 0.05);
    EXPECT_GT(level_at(0.0, 15000), 1.05);
    EXPECT_LT(level_at(1.0, 15000), 0.85);
}

TEST(Equaliser, ConstantSettlesAtLowGainPlusBias) {
    // Steady state of each section: state = x + bias / coef. Crossovers of 1 and 2 Hz make
    // the bias terms worth thousands of units, so each one is visible.
    KOVA_EQ eq;
    kova_eq_init(&eq, 1, 2, 48000);
    kova_eq_set_thickness(&eq, 0.0);
    const double x = 1e9 / 2147483647.0, bias = 2.3283064370807974e-10;
    double expected =
        (0.6 * x + (0.6 - 1) * bias / eq.low_coef + (1 - 1.2) * bias / eq.high_coef) * 2147483647.0;
    int32_t y = 0;
    for (int i = 0; i < 200000; ++i) y = kova_eq_proc(&eq, 1000000000);
    EXPECT_NEAR(y, expected, 1);
}

}  // namespace
