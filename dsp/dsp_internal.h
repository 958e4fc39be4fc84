// SPDX-License-Identifier: Apache-2.0
/* Signal-block helpers shared inside the library and with its tests. Not exported. */
#ifndef KOVA_DSP_INTERNAL_H
#define KOVA_DSP_INTERNAL_H

#include <stdint.h>

#include "kova/kova_types.h"

KOVA_EXTERN_C_BEGIN

/* The next `count` values of kova_osc_get_sample, leaving the oscillator as that many calls
 * would. */
void _osc_fill(KOVA_OSC* osc, double* out, int64_t count);

/* The resampler with an output capacity in bytes; never writes more than capacity. */
void _resample_s16_stereo_capped(int32_t numerator, int32_t denominator, const KOVA_PCMBUF* in,
                                 KOVA_PCMBUF* out, int32_t out_capacity);

KOVA_EXTERN_C_END

#endif
