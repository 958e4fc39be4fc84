// SPDX-License-Identifier: Apache-2.0
/**
 * @file kova_source.h
 * @brief Sound sources: the source model, PCM loading, the file-access layer, the source-set
 * file and the file queries.
 *
 * A source-set file holds one saved set: little-endian fixed-layout records from offset 0 (the
 * filter count N, N 40-byte ::KOVA_FLT_DSC, the 88-byte ::KOVA_TUNE_SET, the 20-byte
 * ::KOVA_SRC_INFO, then per present slot a 48-byte ::KOVA_SRC image and its unfiltered samples).
 * It has no magic and no version; readers treat it as untrusted input.
 *
 * @par Threading
 * Nothing here keeps shared state or takes a lock. The file queries and
 * kova_read_source_file() may run on any thread, also while an engine uses the same file. The
 * other operations work on sets owned by one engine context; the engine calls them with its
 * context mutex held.
 *
 * @par Real time
 * Everything here except kova_is_valid_filter() allocates or does file I/O (one file opened and
 * closed within each call) and may block on the disk: keep it off audio threads.
 */
#ifndef KOVA_SOURCE_H
#define KOVA_SOURCE_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

/** @name Source model
 * @{ */

/**
 * Frees a sound with its sample buffers and path.
 * @param src the sound; null does nothing.
 */
KOVA_API void kova_free_sourceobj(KOVA_SRC* src);

/**
 * Frees a source set with its sounds, filter list and tune set. Shaped as a ::LIST_RELEASE_FN.
 * @param set the ::KOVA_SRCSET; null does nothing.
 */
KOVA_API void kova_free_sourceset(void* set);

/**
 * Replaces the descriptor of the same type in a filter list (copying all 40 bytes).
 * @param filters a list of ::KOVA_FLT_DSC pointers.
 * @param dsc the new descriptor.
 * @return the 0-based position replaced, or -1 when the list holds no descriptor of that type
 *         (or an argument is null).
 */
KOVA_API int kova_update_filterdsc(LIST* filters, const KOVA_FLT_DSC* dsc);

/**
 * Checks a descriptor's type.
 * @param dsc the descriptor. This must not be null.
 * @return 1 when `type` is one of ::KOVA_FLT_LOWPASS, ::KOVA_FLT_HIGHPASS, ::KOVA_FLT_BANDPASS
 *         or ::KOVA_FLT_BANDREJECT, else -1.
 */
KOVA_API int kova_is_valid_filter(const KOVA_FLT_DSC* dsc);

/** @} */

/** @name Loading raw PCM files
 * @{ */

/**
 * Loads a raw PCM file (signed 16-bit interleaved, no header) into a new sound, cut at the
 * slot's maximum; repeat start 0, repeat end = size. One read, no streaming.
 * @param path the file, shorter than ::KOVA_PATH_BUF_BYTES; a regular file.
 * @param slot the slot. This must be one of ::KOVA_SLOT_START, ::KOVA_SLOT_LOOP or
 *          ::KOVA_SLOT_END.
 * @param[out] err receives ::KOVA_OK, ::KOVA_ERR_INSUFF_MEM, or ::KOVA_ERR_SOURCE for every
 *          other failure (missing, unreadable or empty file, bad slot).
 * @return the sound, owned by the caller (free it with kova_free_sourceobj()); null on failure.
 */
KOVA_API KOVA_SRC* kova_load_sound_source(const char* path, int slot, int* err);

/**
 * Reads the start of a file into a buffer (one read).
 * @param path the file, shorter than ::KOVA_PATH_BUF_BYTES.
 * @param buf the destination.
 * @param capacity its size in bytes, 0 or more.
 * @return the bytes read; 0 when nothing could be read (no buffer, unusable path, missing file);
 *         -1 when the read failed.
 */
KOVA_API int kova_read_source_file(const char* path, void* buf, int capacity);

/** @} */

/** @name File access layer
 * All file I/O of the library goes through a ::TARQ_MFAL; its eight operations are reached only
 * through an initialised object.
 * @{ */

/**
 * Clears an access object, fills its operations and copies the path into a new
 * ::KOVA_PATH_BUF_BYTES buffer. Allocates. Whatever the result, the caller owns `mfal->path`
 * afterwards and frees it (also after a failure, when it is not null).
 * @param path the file. This must be shorter than ::KOVA_PATH_BUF_BYTES.
 * @param mfal the object to fill. This must not be null.
 * @return 0, or -1 when the path is too long or memory is short.
 */
KOVA_API int tarq_mfal_init(const char* path, TARQ_MFAL* mfal);

/** @} */

/** @name Record readers and writers
 * Each takes the handle of an open file, the access object through which it reads or writes, and
 * the record; each returns the result of its last read or write (a byte count, 0 at the end of
 * the file, or -1). None seeks, except _read_flt_size().
 * @{ */

/**
 * Writes the 4-byte filter count.
 * @param h the handle from `mfal->open` (write mode).
 * @param mfal the access object.
 * @param count the count.
 * @return the write's result: 4, or -1.
 */
KOVA_API int _write_flt_size(void* h, TARQ_MFAL* mfal, int32_t count);

/**
 * Seeks to offset 0 and reads the 4-byte filter count.
 * @param h the handle from `mfal->open`.
 * @param mfal the access object.
 * @param[out] count receives the count.
 * @return the read's result: 4, less at the end of the file, or -1.
 */
KOVA_API int _read_flt_size(void* h, TARQ_MFAL* mfal, int32_t* count);

/**
 * Writes a 40-byte filter descriptor.
 * @param h the handle (write mode).
 * @param mfal the access object.
 * @param dsc the descriptor.
 * @return the write's result: 40, or -1.
 */
KOVA_API int _write_KOVA_FLT_DSC(void* h, TARQ_MFAL* mfal, const KOVA_FLT_DSC* dsc);

/**
 * Reads a 40-byte filter descriptor.
 * @param h the handle.
 * @param mfal the access object.
 * @param[out] dsc receives the descriptor.
 * @return the read's result: 40, less at the end of the file, or -1.
 */
KOVA_API int _read_KOVA_FLT_DSC(void* h, TARQ_MFAL* mfal, KOVA_FLT_DSC* dsc);

/**
 * Writes the 88-byte tune set.
 * @param h the handle (write mode).
 * @param mfal the access object.
 * @param tune the tune set.
 * @return the write's result: 88, or -1.
 */
KOVA_API int _write_KOVA_TUNE_SET(void* h, TARQ_MFAL* mfal, const KOVA_TUNE_SET* tune);

/**
 * Reads the 88-byte tune set.
 * @param h the handle.
 * @param mfal the access object.
 * @param[out] tune receives the tune set.
 * @return the read's result: 88, less at the end of the file, or -1.
 */
KOVA_API int _read_KOVA_TUNE_SET(void* h, TARQ_MFAL* mfal, KOVA_TUNE_SET* tune);

/**
 * Writes the 20-byte slot information.
 * @param h the handle (write mode).
 * @param mfal the access object.
 * @param info the information.
 * @return the write's result: 20, or -1.
 */
KOVA_API int _write_KOVA_SRC_INFO(void* h, TARQ_MFAL* mfal, const KOVA_SRC_INFO* info);

/**
 * Reads the 20-byte slot information.
 * @param h the handle.
 * @param mfal the access object.
 * @param[out] info receives the information.
 * @return the read's result: 20, less at the end of the file, or -1.
 */
KOVA_API int _read_KOVA_SRC_INFO(void* h, TARQ_MFAL* mfal, KOVA_SRC_INFO* info);

/**
 * Writes a sound: its 48-byte record, then `size` bytes of its unfiltered samples.
 * @param h the handle (write mode).
 * @param mfal the access object.
 * @param src the sound.
 * @return the sum of the two writes' results.
 */
KOVA_API int _write_KOVA_SRC(void* h, TARQ_MFAL* mfal, const KOVA_SRC* src);

/**
 * Reads a sound: its 48-byte record and its samples, into a new sound whose `pcm` and
 * `pcm_proc` both hold the samples (origin ::KOVA_ORIGIN_SAVEFILE). Allocates at most
 * ::KOVA_SLOT_LOOP_MAX_BYTES twice. A longer payload is cut at that limit (the rest is skipped)
 * and one cut short by the end of the file is kept as far as it was read; a record cut by the
 * end of the file, or with a size of 0 or less, gives null.
 * @param h the handle.
 * @param mfal the access object.
 * @return the sound, owned by the caller (free it with kova_free_sourceobj()); null on failure.
 */
KOVA_API KOVA_SRC* _read_KOVA_SRC(void* h, TARQ_MFAL* mfal);

/** @} */

/** @name Whole source-set files
 * @{ */

/**
 * Writes a set to an open file from its current position (0 after opening): filter count,
 * filters, tune set, slot information, sounds. Does not open, seek or close.
 * @param sample_rate the engine's sample rate in Hz (stored in the slot information).
 * @param channels the engine's channels (stored in the slot information).
 * @param set the set; its filter list must exist.
 * @param mfal the access object.
 * @param h the handle, opened for writing (mode bit 0 set).
 * @return the sum of all writes' results: the bytes written.
 */
KOVA_API int kova_write_srcset(int sample_rate, int channels, KOVA_SRCSET* set, TARQ_MFAL* mfal,
                               void* h);

/**
 * Reads a source-set file into a prepared set and filters its sounds with the filters read.
 * Allocates and reads the file. The file is untrusted input: it is never read beyond its
 * records, and records that cannot be used are left out or make the call fail.
 * @param set the set: `filters` an empty list, `tune` an allocated record (overwritten), the
 *          three `src` null.
 * @param path the file, shorter than ::KOVA_PATH_BUF_BYTES.
 * @return ::KOVA_OK; ::KOVA_ERR_INVALID_PARAM for a null argument, a file that cannot be opened
 *         or a damaged file; ::KOVA_ERR_INSUFF_MEM.
 */
KOVA_API int kova_open_source(KOVA_SRCSET* set, const char* path);

/** @} */

/** @name Queries on a saved file, without an engine
 * Read only; any thread. ::KOVA_ERR_INVALID_PARAM means unusable arguments (a null path or
 * output) or a file that cannot be opened or read.
 * @{ */

/**
 * Finds where each slot's samples lie in a source-set file.
 * @param path the file.
 * @param[out] start_off receives the start sound's payload offset in bytes (0 when absent).
 * @param[out] start_size receives its size in bytes (0 when absent).
 * @param[out] loop_off receives the loop sound's payload offset.
 * @param[out] loop_size receives its size.
 * @param[out] end_off receives the end sound's payload offset.
 * @param[out] end_size receives its size.
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM.
 */
KOVA_API int kova_get_pcminfo_fromfile(const char* path, int* start_off, int* start_size,
                                       int* loop_off, int* loop_size, int* end_off, int* end_size);

/**
 * Reads a saved set's filters into an array indexed by filter type; elements of absent types
 * are left untouched.
 * @param path the file.
 * @param[out] flt ::KOVA_FLT_TYPE_COUNT descriptors.
 * @return ::KOVA_OK, ::KOVA_ERR_INVALID_PARAM or ::KOVA_ERR_INSUFF_MEM.
 */
KOVA_API int kova_get_filters_fromfile(const char* path, KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT]);

/**
 * Reads a saved set's tune set.
 * @param path the file.
 * @param[out] tune receives the tune set. This must not be null.
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM.
 */
KOVA_API int kova_get_tuneset_fromfile(const char* path, KOVA_TUNE_SET* tune);

/**
 * Reads a saved set's repeat information in milliseconds, at the sample rate and channels stored
 * in the file.
 * @param path the file.
 * @param[out] info receives the lengths and repeat points (see kova_get_rptinfo()). This must
 *          not be null.
 * @return ::KOVA_OK, or ::KOVA_ERR_INVALID_PARAM.
 */
KOVA_API int kova_get_rptinfo_fromfile(const char* path, KOVA_RPT_INFO* info);

/** @} */

KOVA_EXTERN_C_END

#endif
