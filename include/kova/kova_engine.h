// SPDX-License-Identifier: Apache-2.0
/**
 * @file kova_engine.h
 * @brief The synthesis engine: context lifecycle, generation, registration, tuning, repeat
 * information and saving.
 *
 * Every operation takes the context first; source sets are named by 1-based identifiers (a
 * valid identifier lies from 1 to kova_get_src_num()). A refused call changes nothing.
 *
 * @par Threading
 * The engine creates no threads and one context is not safe for concurrent use. The Java face
 * serialises every engine call of every context with the process-wide registry lock
 * (`gpKovaMutex`). In addition, each context's own mutex is held by registration, filter updates,
 * repeat information and saving while they walk or change the set list; generation and the tuning
 * controls do not take it. Generation keeps two process-wide clip counters shared by all contexts
 * without a lock, so C callers that generate on several threads, even on different contexts,
 * must serialise all generation calls themselves (one lock around kova_gen_sounds() and
 * kova_gen_samples()).
 *
 * @par Real time
 * Generation (kova_gen_sounds(), kova_gen_samples()) allocates nothing, does no I/O and takes no
 * lock: it may run on an audio thread. kova_init(), the registrations and the filter and source
 * updates allocate and read files; kova_save_source() writes a file; these may block on the
 * context mutex and on the disk and belong on a worker thread.
 */
#ifndef KOVA_ENGINE_H
#define KOVA_ENGINE_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

/** @name Lifecycle
 * @{ */

/**
 * Checks a format block.
 * @param f the format block. Its `sample_rate` must be from 8000 to 48000 and its `channels`
 *          1 or 2; when `p` is 1, `channels` must be 2 and `w` and `h` non-zero (`w` and `h` are
 *          not checked otherwise).
 * @return 1 when the block is usable, -1 when not (also for a null block).
 */
KOVA_API int32_t kova_checkformat(const KOVA_FORMAT* f);

/**
 * Creates an engine context: its oscillator, equaliser, 192000-byte staging buffer, mutex and an
 * empty source-set list. Allocates.
 * @param f the format block (copied). It must pass kova_checkformat().
 * @param[out] err receives ::KOVA_OK, ::KOVA_ERR_INVALID_FORMAT when kova_checkformat() rejects
 *          `f`, or ::KOVA_ERR_INSUFF_MEM.
 * @return the new context, owned by the caller (free it with kova_deinit()); null on failure, and
 *         null without storing anything when `f` or `err` is null.
 */
KOVA_API KOVA_CTX* kova_init(const KOVA_FORMAT* f, int32_t* err);

/**
 * Destroys a context and everything it owns (source sets, buffers, mutex). The caller must make
 * sure no other call on the context runs or follows.
 * @param ctx the context from kova_init(), or anything else (refused).
 * @return ::KOVA_OK when the context was freed; ::KOVA_ERR_INVALID_PARAM for a null context or
 *         one that is not alive (already destroyed).
 */
KOVA_API int32_t kova_deinit(KOVA_CTX* ctx);

/** @} */

/** @name Generation
 * Real time: no allocation, no I/O, no lock; see the threading note of this file.
 * @{ */

/**
 * Generates the block of one motion event into `out`. A start event plays the active set's start
 * sound, an end event its whole end sound (as far as `out` holds them); a move plays
 * `channels` * `sample_rate` * dt / 1000 samples of the loop sound, dt being the time since the
 * previous event (16 ms at 48000 Hz stereo: 1536 samples, 3072 bytes), shaped by the speed and
 * the tune set. A set without a loop sound produces nothing.
 * @param ctx a live context with an active set.
 * @param param the event. Its `action` must be one of ::KOVA_ACTION_START, ::KOVA_ACTION_MOVE
 *          or ::KOVA_ACTION_END; `x`, `y` in pixels and `time` in milliseconds, 0 or more.
 * @param out the destination; never written beyond `out->size` bytes. Its `size` is not changed.
 * @return the number of bytes written (twice the sample count), 0 when nothing was generated or
 *         an argument was refused. Never negative.
 */
KOVA_API int32_t kova_gen_sounds(KOVA_CTX* ctx, const KOVA_PARAM* param, KOVA_PCMBUF* out);

/**
 * The generator behind kova_gen_sounds(), counting samples. It refuses only a null or dead
 * context; kova_gen_sounds() makes every other check, so callers use that one.
 * @param ctx a live context.
 * @param param the event (see kova_gen_sounds()). This must not be null.
 * @param out the destination (see kova_gen_sounds()). This must not be null.
 * @return the number of signed 16-bit samples written; 0 when refused.
 */
KOVA_API int32_t kova_gen_samples(KOVA_CTX* ctx, const KOVA_PARAM* param, KOVA_PCMBUF* out);

/**
 * Copies all five fields of one event into another.
 * @param dst the destination. This must not be null.
 * @param src the source. This must not be null.
 */
KOVA_API void kova_set_param(KOVA_PARAM* dst, const KOVA_PARAM* src);

/**
 * The speed envelope of a move: speed in pixels per millisecond (clamped to 0..23) mapped to
 * 6 + speed * 2.5652..., and the normalised move energy.
 * @param prev the previous event. This must not be null.
 * @param cur the current event. This must not be null.
 * @param[out] energy receives the move energy (distance squared times `norm`); left unwritten
 *          when the time step is below 1 ms.
 * @param norm the context's normalisation, 10000 / sqrt(w*w + h*h).
 * @return the envelope; 0.0 when `cur->time` - `prev->time` is below 1.
 */
KOVA_API double _calc_envelope(const KOVA_PARAM* prev, const KOVA_PARAM* cur, double* energy,
                               double norm);

/**
 * The pitch ratio of the sharpness effect.
 * @param env the speed envelope.
 * @param depth the tune set's `sharpness`, 0 to 1.
 * @return max(1.0, 1.0 + (env - 1.0) * (depth * 0.1)).
 */
KOVA_API double _calc_sharpness(double env, float depth);

/**
 * A distortion hook without effect.
 * @param a ignored.
 * @param b the value.
 * @return `b` unchanged.
 */
KOVA_API double _calc_distortion(double a, double b);

/** @} */

/** @name Registration and selection
 * These allocate and read files, and hold the context mutex while they build or change a set.
 * Where there is an `err` out-parameter it is preset to ::KOVA_ERR_INVALID_PARAM and must not be
 * null. A successful registration appends the set and makes it active (without applying its
 * thickness; kova_set_active_src() does that).
 * @{ */

/**
 * Registers a source set from three raw PCM files: signed 16-bit interleaved little-endian
 * samples in the context's format, without a header. Files longer than the slot's maximum are
 * cut (::KOVA_SLOT_START_MAX_BYTES, ::KOVA_SLOT_LOOP_MAX_BYTES, ::KOVA_SLOT_END_MAX_BYTES).
 * @param ctx a live context holding fewer than ::KOVA_MAX_SRCSETS sets.
 * @param paths the start, loop and end files, each shorter than ::KOVA_PATH_BUF_BYTES; start and
 *          end may be null (a start or end file that cannot be loaded leaves its slot empty).
 *          The loop file is required. The strings are copied.
 * @param[out] err receives ::KOVA_OK, ::KOVA_ERR_INVALID_PARAM (dead context),
 *          ::KOVA_ERR_SRC_FULL, ::KOVA_ERR_INSUFF_MEM, or ::KOVA_ERR_SOURCE when the loop sound
 *          could not be loaded.
 * @return the new set's identifier (the number of sets), or 0 on failure.
 */
KOVA_API int32_t kova_reg_src_byfiles(KOVA_CTX* ctx, const char* const paths[KOVA_SLOT_COUNT],
                                      int32_t* err);

/**
 * Makes a set active and applies its thickness to the equaliser. No lock, no allocation.
 * @param ctx a live context.
 * @param index the set's identifier. This must be from 1 to kova_get_src_num().
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM.
 */
KOVA_API int32_t kova_set_active_src(KOVA_CTX* ctx, int32_t index);

/**
 * Counts the registered sets. No lock, no allocation.
 * @param ctx a live context.
 * @return the number of sets (0 to ::KOVA_MAX_SRCSETS_SAVEFILE); 0 for a null or dead context.
 */
KOVA_API int32_t kova_get_src_num(KOVA_CTX* ctx);

/**
 * Registers a set whose loop sound is one second of white noise shaped by one filter.
 * Uses the process's `rand`.
 * @param ctx a live context holding fewer than ::KOVA_MAX_SRCSETS sets.
 * @param dsc the filter (copied). Its `type` must be one of ::KOVA_FLT_LOWPASS,
 *          ::KOVA_FLT_HIGHPASS, ::KOVA_FLT_BANDPASS or ::KOVA_FLT_BANDREJECT.
 * @param[out] err receives ::KOVA_OK, ::KOVA_ERR_INVALID_PARAM (dead context, invalid filter,
 *          noise generation failed), ::KOVA_ERR_SRC_FULL or ::KOVA_ERR_INSUFF_MEM.
 * @return the new set's identifier, or 0 on failure.
 */
KOVA_API int32_t kova_reg_src_byfilter(KOVA_CTX* ctx, const KOVA_FLT_DSC* dsc, int32_t* err);

/**
 * Registers the set saved in a source-set file by kova_save_source(). The file is untrusted
 * input, read as kova_open_source() does.
 * @param ctx a live context holding fewer than ::KOVA_MAX_SRCSETS_SAVEFILE sets.
 * @param path the file, shorter than ::KOVA_PATH_BUF_BYTES. This must not be null.
 * @param[out] err receives ::KOVA_OK, ::KOVA_ERR_INVALID_PARAM (dead context, null path, file
 *          missing or damaged), ::KOVA_ERR_SRC_FULL or ::KOVA_ERR_INSUFF_MEM.
 * @return the new set's identifier, or 0 on failure.
 */
KOVA_API int32_t kova_reg_src_bysavefile(KOVA_CTX* ctx, const char* path, int32_t* err);

/**
 * Replaces a set's filter of the same type and re-filters all its sounds (file sounds are read
 * again from their files; a file that cannot be read again leaves its slot empty).
 * @param ctx a live context.
 * @param index the set's identifier, 1 to kova_get_src_num().
 * @param dsc the new filter (copied); the set must already hold a filter of its `type`, which
 *          must be one of ::KOVA_FLT_LOWPASS, ::KOVA_FLT_HIGHPASS, ::KOVA_FLT_BANDPASS or
 *          ::KOVA_FLT_BANDREJECT.
 * @param[out] err receives ::KOVA_OK, ::KOVA_ERR_INVALID_PARAM (also when the set has no
 *          filter of that type) or ::KOVA_ERR_INSUFF_MEM.
 * @return `index`, or 0 on failure.
 */
KOVA_API int32_t kova_update_filter(KOVA_CTX* ctx, int32_t index, const KOVA_FLT_DSC* dsc,
                                    int32_t* err);

/**
 * Adds a filter to a set when its type is new to the set (else replaces the one of that type),
 * then re-filters as kova_update_filter() does.
 * @param ctx a live context.
 * @param index the set's identifier, 1 to kova_get_src_num().
 * @param dsc the filter (copied). Its `type` must be one of ::KOVA_FLT_LOWPASS,
 *          ::KOVA_FLT_HIGHPASS, ::KOVA_FLT_BANDPASS or ::KOVA_FLT_BANDREJECT.
 * @param[out] err receives ::KOVA_OK, ::KOVA_ERR_INVALID_PARAM or ::KOVA_ERR_INSUFF_MEM.
 * @return `index`, or 0 on failure.
 */
KOVA_API int32_t kova_attach_filter(KOVA_CTX* ctx, int32_t index, const KOVA_FLT_DSC* dsc,
                                    int32_t* err);

/**
 * Copies a set's filters into an array indexed by filter type; elements of types the set lacks
 * are left untouched. Holds the context mutex; allocates nothing.
 * @param ctx a live context.
 * @param index the set's identifier, 1 to kova_get_src_num().
 * @param flt the destination, ::KOVA_FLT_TYPE_COUNT descriptors.
 * @return always ::KOVA_OK, also when the call is refused (then nothing is copied).
 */
KOVA_API int32_t kova_get_filters(KOVA_CTX* ctx, int32_t index,
                                  KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT]);

/**
 * Replaces sounds of a set with raw PCM files (as kova_reg_src_byfiles() loads them; a file
 * that cannot be loaded leaves its slot empty) and filters them with the set's filters; each
 * replaced sound's repeat points return to the whole sound. On success the tune set's
 * `file_gain` becomes 0.4 and `wn_gain` 0.0.
 * @param ctx a live context.
 * @param index the set's identifier, 1 to kova_get_src_num().
 * @param paths the start, loop and end files; a null entry keeps that slot.
 * @param[out] err receives ::KOVA_OK, ::KOVA_ERR_INVALID_PARAM, or ::KOVA_ERR_SOURCE when
 *          the set is missing or has no loop sound afterwards.
 * @return `index`, or 0 when refused or when the set has no loop sound afterwards.
 */
KOVA_API int32_t kova_update_src_byfiles(KOVA_CTX* ctx, int32_t index,
                                         const char* const paths[KOVA_SLOT_COUNT], int32_t* err);

/** @} */

/** @name Tune set, thickness, volume
 * No lock, no allocation; a change takes effect with the next generated event.
 * @{ */

/**
 * Copies a set's tune set.
 * @param ctx a live context.
 * @param index the set's identifier, 1 to kova_get_src_num().
 * @param[out] out receives all eleven values. This must not be null.
 * @return ::KOVA_OK; ::KOVA_ERR_INVALID_PARAM for an identifier out of range or a null `out`;
 *         ::KOVA_OK without copying for a null or dead context.
 */
KOVA_API int32_t kova_get_tuneset(KOVA_CTX* ctx, int32_t index, KOVA_TUNE_SET* out);

/**
 * Sets a set's tune set. Each value is taken only when it lies in 0.0 to 1.0 (NaN is not); a
 * value not taken keeps the stored one without an error. `osc_enable` 0 turns the oscillator off;
 * 1 turns it on together with `osc_depth` when that is in range; any other value changes neither.
 * `sharp_enable` and `sharpness` follow the same rule.
 * @param ctx a live context.
 * @param index the set's identifier, 1 to kova_get_src_num().
 * @param in the new values. This must not be null.
 * @return ::KOVA_OK (also for a null or dead context, which changes nothing);
 *         ::KOVA_ERR_INVALID_PARAM for an identifier out of range or a null `in`.
 */
KOVA_API int32_t kova_set_tuneset(KOVA_CTX* ctx, int32_t index, const KOVA_TUNE_SET* in);

/**
 * Fills a tune set with the defaults: gain 1.0, pan 0.4, oscillator off with depth 1.0,
 * sharpness off with 0.2, wn_gain 0.5, file_gain 0.4, start 0.6, loop 0.9, end 0.6.
 * @param tune the record to fill, or null.
 * @return `tune`.
 */
KOVA_API KOVA_TUNE_SET* _cfg_tune_default(KOVA_TUNE_SET* tune);

/**
 * Sets the active set's thickness and applies it to the equaliser. Without an active set it
 * succeeds without effect.
 * @param ctx a live context.
 * @param thickness the thickness. This must be from 0.0 (thin) to 1.0 (thick).
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM for a null or dead context or a thickness out
 *         of range.
 */
KOVA_API int32_t kova_set_thickness(KOVA_CTX* ctx, double thickness);

/**
 * Sets the output volume of all sets of the context: the context stores `volume` * 0.8.
 * @param ctx a live context.
 * @param volume the volume factor; 1.0 gives the level at creation. No range is enforced.
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM for a null or dead context.
 */
KOVA_API int32_t kova_set_volume(KOVA_CTX* ctx, double volume);

/** @} */

/** @name Repeat information
 * Hold the context mutex; allocate nothing.
 * @{ */

/**
 * Converts a byte count of 16-bit PCM to milliseconds, truncated toward zero.
 * @param bytes the byte count.
 * @param sample_rate the sample rate in Hz; this must not be 0.
 * @param channels the channel count; this must not be 0.
 * @return bytes * 1000 / (2 * sample_rate * channels), truncated.
 */
KOVA_API int64_t _cvt_byte_to_ms(int32_t bytes, int32_t sample_rate, int32_t channels);

/**
 * Converts milliseconds to a byte count of whole frames of 16-bit PCM (100 ms at 48000 Hz stereo
 * is 19200 bytes).
 * @param ms the duration in milliseconds.
 * @param sample_rate the sample rate in Hz.
 * @param channels the channel count; this must not be 0.
 * @return the byte count, truncated to whole frames; 0 when `ms` is below 1.
 */
KOVA_API int32_t _cvt_ms_to_byte(int64_t ms, int32_t sample_rate, int32_t channels);

/**
 * Reads a set's repeat points and lengths in milliseconds.
 * @param ctx a live context.
 * @param index the set's identifier, 1 to kova_get_src_num().
 * @param[out] info receives, per slot, the length and the repeat start and end; an absent slot
 *          gets length 0 and -1 for both points. This must not be null.
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM.
 */
KOVA_API int32_t kova_get_rptinfo(KOVA_CTX* ctx, int32_t index, KOVA_RPT_INFO* info);

/**
 * Sets a set's repeat points. Each value is taken only when it is 0 or more, not beyond the
 * slot's length in milliseconds, and the slot holds a sound; others leave the point unchanged
 * without an error. Only the loop sound's repeat end affects playback.
 * @param ctx a live context.
 * @param index the set's identifier, 1 to kova_get_src_num().
 * @param info the new `rpt_start_ms` and `rpt_end_ms` per slot; `len_ms` is ignored. This must
 *          not be null.
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM.
 */
KOVA_API int32_t kova_set_rptinfo(KOVA_CTX* ctx, int32_t index, const KOVA_RPT_INFO* info);

/** @} */

/** @name Saving
 * @{ */

/**
 * Writes a set to a source-set file (its filters, tune set, repeat points and unfiltered sounds),
 * to be registered again with kova_reg_src_bysavefile() or read with the file queries of
 * kova_source.h. An existing file is overwritten from its start and not truncated. Does file I/O
 * and holds the context mutex until the file is closed.
 * @param ctx a live context.
 * @param index the set's identifier, 1 to kova_get_src_num().
 * @param path the file, shorter than ::KOVA_PATH_BUF_BYTES.
 * @return the number of bytes written; ::KOVA_ERR_INVALID_PARAM for a refused context,
 *         identifier or path; ::KOVA_ERR_SOURCE when the file cannot be created.
 */
KOVA_API int32_t kova_save_source(KOVA_CTX* ctx, int32_t index, const char* path);

/** @} */

KOVA_EXTERN_C_END

#endif
