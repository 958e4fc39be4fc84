// SPDX-License-Identifier: Apache-2.0
/**
 * @file kova_dsp.h
 * @brief Signal blocks: oscillator, thickness equaliser, biquad filters, noise sources,
 * resampler.
 *
 * @par Threading
 * No block takes a lock. A block object (oscillator, equaliser record, filter context) is used by
 * one thread at a time; inside the library each belongs to one engine context and is reached
 * under the serialisation of the engine's callers (see kova_engine.h). kova_gen_white_noise_16bit()
 * and kova_gen_sound_source_wn() use the C library's `rand`, which is process state.
 *
 * @par Real time
 * kova_osc_get_sample(), kova_osc_gen_samples(), kova_osc_set_freq(), kova_eq_proc(),
 * kova_eq_set_thickness(), kova_flt_process(), kova_resample_s16_stereo(), calcDevide() and
 * calcMultiply() allocate nothing and do no I/O. The constructors and kova_proc_filters()
 * allocate.
 */
#ifndef KOVA_DSP_H
#define KOVA_DSP_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

/** @name Oscillator
 * A tone whose period is a whole number of samples; values run from -1 to +1.
 * @{ */

/**
 * Creates an oscillator at 10 Hz, phase 0. Allocates.
 * @param sample_rate the sample rate in Hz, above 0.
 * @param channels the interleaved channels; each value is handed out once per channel (1 or 2).
 * @param waveform 1 square, 2 sawtooth, any other value sine.
 * @return the oscillator, owned by the caller (free it with kova_osc_deinit()); null when memory
 *         is short.
 */
KOVA_API KOVA_OSC* kova_osc_init(int32_t sample_rate, uint32_t channels, uint32_t waveform);

/**
 * Frees an oscillator.
 * @param osc the oscillator from kova_osc_init().
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM for a null or invalid oscillator (nothing freed).
 */
KOVA_API int32_t kova_osc_deinit(KOVA_OSC* osc);

/**
 * Sets the frequency; the period becomes `sample_rate` / `freq` samples, at least 1.
 * @param osc the oscillator.
 * @param freq the frequency in Hz, above 0.
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM for a null or invalid oscillator.
 */
KOVA_API int32_t kova_osc_set_freq(KOVA_OSC* osc, double freq);

/**
 * Returns the current value and advances the phase.
 * @param osc the oscillator.
 * @return the value, -1.0 to +1.0; -3.0 for a null or invalid oscillator.
 */
KOVA_API double kova_osc_get_sample(KOVA_OSC* osc);

/**
 * Writes the next values as signed 16-bit samples (value * 32767, truncated).
 * @param osc the oscillator.
 * @param buf the destination.
 * @param bytes its length in bytes; bytes / 2 samples are written (an odd last byte is left).
 * @return the number of samples written; ::KOVA_ERR_INVALID_PARAM for a null or invalid
 *         oscillator, a null buffer or a length below 1.
 */
KOVA_API int32_t kova_osc_gen_samples(KOVA_OSC* osc, int16_t* buf, int32_t bytes);

/** @} */

/** @name Thickness equaliser
 * Three bands split at two crossovers; the thickness raises the low band and lowers the high one.
 * @{ */

/**
 * Sets a record up: all gains 1.0, state zero.
 * @param eq the record, owned by the caller; null is ignored.
 * @param low_hz the low crossover in Hz (the engine uses 880).
 * @param high_hz the high crossover in Hz (the engine uses 5000), below half the rate.
 * @param sample_rate the sample rate in Hz, above 0.
 */
KOVA_API void kova_eq_init(KOVA_EQ* eq, int32_t low_hz, int32_t high_hz, int32_t sample_rate);

/**
 * Sets the band gains and the slew decay for a thickness. The range is not checked here.
 * @param eq the record; null is returned as is.
 * @param thickness the thickness. This must be from 0.0 (thin) to 1.0 (thick).
 * @return `eq`.
 */
KOVA_API KOVA_EQ* kova_eq_set_thickness(KOVA_EQ* eq, double thickness);

/**
 * Filters one sample (the output lags the input by three calls).
 * @param eq a record set up by kova_eq_init(); not checked.
 * @param sample the input, on any integer scale up to the 32-bit range.
 * @return the output, on the same scale.
 */
KOVA_API int32_t kova_eq_proc(KOVA_EQ* eq, int32_t sample);

/** @} */

/** @name Biquad filters
 * @{ */

/**
 * Designs second-order filter coefficients (state pointers untouched). An unknown type designs
 * nothing: the coefficients stay zero and the filter outputs silence.
 * @param bq the record to fill. This must not be null.
 * @param sample_rate the sample rate in Hz, above 0.
 * @param type the filter type. This must be one of ::KOVA_FLT_LOWPASS, ::KOVA_FLT_HIGHPASS,
 *          ::KOVA_FLT_BANDPASS or ::KOVA_FLT_BANDREJECT.
 * @param freq the cut-off (low-, high-pass) or centre (band types) frequency in Hz, above 0 and
 *          below half the rate.
 * @param bandwidth the band width in Hz (band types only).
 */
KOVA_API void makefilter(KOVA_BIQUAD* bq, int32_t sample_rate, uint32_t type, double freq,
                         double bandwidth);

/**
 * Creates a filter context for a descriptor, with zero state per channel. Allocates.
 * @param dsc the descriptor (copied; its `enable` is not used).
 * @param[out] err receives ::KOVA_OK, or ::KOVA_ERR_INSUFF_MEM; nothing when an argument is null.
 * @return the context, owned by the caller (free it with kova_flt_deinit()); null on failure.
 */
KOVA_API KOVA_FLT* kova_flt_init(const KOVA_FLT_DSC* dsc, int32_t* err);

/**
 * Filters interleaved samples in place; the state carries over to the next call.
 * @param flt the filter context.
 * @param buf the samples, `dsc->channels` interleaved.
 * @param bytes the length in bytes.
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM for a null or invalid context.
 */
KOVA_API int32_t kova_flt_process(KOVA_FLT* flt, int16_t* buf, int32_t bytes);

/**
 * Frees a filter context.
 * @param flt the filter context.
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM for a null or invalid context.
 */
KOVA_API int32_t kova_flt_deinit(KOVA_FLT* flt);

/** @} */

/** @name Filtered white-noise sources and the filter bank
 * @{ */

/**
 * Writes white noise from the C library's `rand` (never seeded by the library), -3276 to 3276.
 * @param buf the destination; null writes nothing.
 * @param bytes its length in bytes; bytes / 2 samples are written, none below 2.
 */
KOVA_API void kova_gen_white_noise_16bit(int16_t* buf, int32_t bytes);

/**
 * Creates a sound of white noise as long as the slot's maximum (::KOVA_SLOT_START_MAX_BYTES,
 * ::KOVA_SLOT_LOOP_MAX_BYTES or ::KOVA_SLOT_END_MAX_BYTES), in `pcm` and, unfiltered, in
 * `pcm_proc` (filter that with kova_proc_filters()). Allocates.
 * @param dsc a descriptor; only tested for null.
 * @param slot the slot. This must be one of ::KOVA_SLOT_START, ::KOVA_SLOT_LOOP or
 *          ::KOVA_SLOT_END.
 * @param[out] err receives ::KOVA_OK, ::KOVA_ERR_SOURCE (null descriptor, slot above 2) or
 *          ::KOVA_ERR_INSUFF_MEM.
 * @return the sound, owned by the caller (free it with kova_free_sourceobj()); null on failure.
 */
KOVA_API KOVA_SRC* kova_gen_sound_source_wn(const KOVA_FLT_DSC* dsc, uint32_t slot, int32_t* err);

/**
 * Filters samples in place with a filter list: each enabled filter (`enable` 1) of the first
 * four runs on its own copy of the input, from zero state, and the result is the mean of the
 * copies (the input stays when no filter is enabled). Allocates up to four buffers of `bytes`
 * during the call.
 * @param buf the samples.
 * @param bytes their length in bytes.
 * @param filters a list of ::KOVA_FLT_DSC pointers; null leaves the samples.
 */
KOVA_API void kova_proc_filters(int16_t* buf, uint32_t bytes, LIST* filters);

/** @} */

/** @name Stereo resampler and 4.28 fixed-point helpers
 * Fixed-point ratios are signed 32-bit with 28 fractional bits: 1.0 is 0x10000000.
 * @{ */

/**
 * Resamples interleaved stereo by linear interpolation: `numerator` / `denominator` input frames
 * per output frame (48000 / 96000 plays at half speed, 96000 / 48000 at double speed). Integer
 * arithmetic only.
 * @param numerator the step's numerator, above 0.
 * @param denominator the step's denominator, above 0; the step must be below 8.
 * @param in the input: whole stereo frames (`size` a multiple of 4).
 * @param out the output; `data` receives the frames and `size` is set to the bytes written. The
 *          resampler does not know the capacity: for n input frames and step s it writes at most
 *          ceil((n - 1) / s) frames, and `data` must hold them.
 */
KOVA_API void kova_resample_s16_stereo(int32_t numerator, int32_t denominator,
                                       const KOVA_PCMBUF* in, KOVA_PCMBUF* out);

/**
 * Divides in 4.28 fixed point.
 * @param a the numerator.
 * @param b the denominator; this must not be 0.
 * @return a / b as a 4.28 value; 0 when the integer part of the quotient's magnitude exceeds 7.
 */
KOVA_API int32_t calcDevide(int32_t a, int32_t b);

/**
 * Multiplies two 4.28 fixed-point values.
 * @param a a 4.28 value.
 * @param b a 4.28 value.
 * @return the low 32 bits of (a * b) >> 28, the 64-bit product shifted arithmetically.
 */
KOVA_API int32_t calcMultiply(int32_t a, int32_t b);

/** @} */

KOVA_EXTERN_C_END

#endif
