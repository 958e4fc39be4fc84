// SPDX-License-Identifier: Apache-2.0
/* Arithmetic helpers shared by the signal blocks, where outputs must be bit-exact on every target.
 * Multiply-adds stay unfused because the whole library is built with -ffp-contract=off (see
 * CMakeLists.txt): a*b + c must round twice, as written. */
#ifndef KOVA_DSP_EXACT_MATH_H
#define KOVA_DSP_EXACT_MATH_H

#include <cstdint>

namespace kova::dsp {

inline constexpr double kPi = 3.141592653589793;
/* The equaliser's constant, 1 / 4294967295, added to both of its sections on every step (the
 * equaliser itself and the generator's copies of its step). */
inline constexpr double kEqStateBias = 2.3283064370807974e-10;
inline constexpr double kTwoPi = 6.283185307179586;

/* Truncates toward zero to 32 bits, saturating at the limits. NaN gives 0: a plain cast would be
 * undefined for NaN and for values out of range. */
inline int32_t trunc_sat32(double v) {
    if (v >= 2147483647.0) return INT32_MAX;
    if (v <= -2147483648.0) return INT32_MIN;
    if (v != v) return 0;
    return static_cast<int32_t>(v);
}

}  // namespace kova::dsp

#endif
