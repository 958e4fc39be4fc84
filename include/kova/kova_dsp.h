/* Signal blocks: oscillator, thickness equaliser, biquad filters, noise sources, resampler. */
#ifndef KOVA_DSP_H
#define KOVA_DSP_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

/* Oscillator. */
KOVA_API KOVA_OSC* kova_osc_init(int32_t sample_rate, uint32_t channels, uint32_t waveform);
KOVA_API int32_t kova_osc_deinit(KOVA_OSC* osc);
KOVA_API int32_t kova_osc_set_freq(KOVA_OSC* osc, double freq);
KOVA_API double kova_osc_get_sample(KOVA_OSC* osc);
KOVA_API int32_t kova_osc_gen_samples(KOVA_OSC* osc, int16_t* buf, int32_t bytes);

/* Thickness equaliser. */
KOVA_API void kova_eq_init(KOVA_EQ* eq, int32_t low_hz, int32_t high_hz, int32_t sample_rate);
KOVA_API KOVA_EQ* kova_eq_set_thickness(KOVA_EQ* eq, double thickness);
KOVA_API int32_t kova_eq_proc(KOVA_EQ* eq, int32_t sample);

/* Biquad filters. */
KOVA_API void makefilter(KOVA_BIQUAD* bq, int32_t sample_rate, uint32_t type, double freq,
                         double bandwidth);
KOVA_API KOVA_FLT* kova_flt_init(const KOVA_FLT_DSC* dsc, int32_t* err);
KOVA_API int32_t kova_flt_process(KOVA_FLT* flt, int16_t* buf, int32_t bytes);
KOVA_API int32_t kova_flt_deinit(KOVA_FLT* flt);

/* Filtered white-noise sources and the filter bank. */
KOVA_API void kova_gen_white_noise_16bit(int16_t* buf, int32_t bytes);
KOVA_API KOVA_SRC* kova_gen_sound_source_wn(const KOVA_FLT_DSC* dsc, uint32_t slot, int32_t* err);
KOVA_API void kova_proc_filters(int16_t* buf, uint32_t bytes, LIST* filters);

/* Stereo resampler and 4.28 fixed-point helpers. */
KOVA_API void kova_resample_s16_stereo(int32_t numerator, int32_t denominator,
                                       const KOVA_PCMBUF* in, KOVA_PCMBUF* out);
KOVA_API int32_t calcDevide(int32_t a, int32_t b);
KOVA_API int32_t calcMultiply(int32_t a, int32_t b);

KOVA_EXTERN_C_END

#endif
