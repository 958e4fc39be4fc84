// SPDX-License-Identifier: Apache-2.0
/* Three-band thickness equaliser: two first-order low-pass sections split low, mid and high. */
#include <cmath>
#include <cstring>

#include "kova/kova_dsp.h"
#include "dsp/exact_math.h"

namespace {

using kova::dsp::kEqStateBias;
using kova::dsp::kPi;

constexpr double kFullScale = 2147483647.0;
/* The double just above 0.3 (0x3FD3333333333334); the slew factor is defined with it. */
constexpr double kSlewSlope = 0.30000000000000004;
constexpr double kInitialSlewDecay = 0.88;

/* A rate below 1 Hz has no crossover to place: the coefficient stays 0 instead of becoming
 * the NaN of a division by zero. */
double section_coef(int32_t crossover_hz, int32_t sample_rate) {
    if (sample_rate < 1) return 0.0;
    return 2.0 *
           std::sin((static_cast<double>(crossover_hz) / static_cast<double>(sample_rate)) * kPi);
}

}  // namespace

extern "C" {

void kova_eq_init(KOVA_EQ* eq, int32_t low_hz, int32_t high_hz, int32_t sample_rate) {
    if (eq == nullptr) return;
    std::memset(eq, 0, sizeof(*eq));
    eq->low_gain = 1.0;
    eq->mid_gain = 1.0;
    eq->high_gain = 1.0;
    eq->slew_decay = kInitialSlewDecay;
    eq->low_coef = section_coef(low_hz, sample_rate);
    eq->high_coef = section_coef(high_hz, sample_rate);
}

KOVA_EQ* kova_eq_set_thickness(KOVA_EQ* eq, double thickness) {
    if (eq == nullptr) return nullptr;
    /* Clamped to 0..1 (NaN counts as 0): outside it the gains turn negative or exceed 1.2 and
     * slew_decay exceeds 1, which would make the generator's slew memory grow without bound.
     * Callers already accept only 0..1, so their values pass unchanged. */
    if (!(thickness >= 0.0)) thickness = 0.0;
    if (thickness > 1.0) thickness = 1.0;
    eq->low_gain = thickness * 0.6 + 0.6;
    eq->mid_gain = 1.0;
    eq->high_gain = 1.2 - thickness * 0.6;
    eq->slew_decay = thickness * kSlewSlope + 0.7;
    return eq;
}

int32_t kova_eq_proc(KOVA_EQ* eq, int32_t sample) {
    /* Callers pass an initialised record; without one the sample passes through unchanged
     * rather than crashing. */
    if (eq == nullptr) return sample;
    const double x = static_cast<double>(sample) / kFullScale;
    eq->low_state = eq->low_state + (eq->low_coef * (x - eq->low_state) + kEqStateBias);
    eq->high_state = eq->high_state + (eq->high_coef * (x - eq->high_state) + kEqStateBias);

    /* The bands are taken against the input of three calls ago. */
    const double delayed = eq->hist[2];
    const double low = eq->low_state;
    const double high = delayed - eq->high_state;
    const double mid = delayed - (low + high);
    const double y =
        (high * eq->high_gain + (low * eq->low_gain + mid * eq->mid_gain)) * kFullScale;

    eq->hist[2] = eq->hist[1];
    eq->hist[1] = eq->hist[0];
    eq->hist[0] = x;
    return kova::dsp::trunc_sat32(y);
}

}  // extern "C"
