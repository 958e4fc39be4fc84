// SPDX-License-Identifier: Apache-2.0
/**
 * @file kova_output.h
 * @brief Low-latency output helpers usable from C: the ring buffer and the per-device volume
 * tables.
 *
 * The fast-track output stream itself is C++ and platform-only: kova/android/kova_fasttrack.h.
 *
 * @par Threading
 * The ring buffer has no lock and no atomic operations: its one producer and one consumer
 * serialise every call (the output stream holds its own mutex around each one, the device
 * callback included). The volume tables are constant in practice (the library never writes
 * them) and may be read from any thread.
 *
 * @par Real time
 * Only kova_ringbuffer_create() and kova_ringbuffer_free() allocate or free. Read and write copy
 * at most two pieces, never block and never allocate: they suit a device callback.
 */
#ifndef KOVA_OUTPUT_H
#define KOVA_OUTPUT_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

/** @name Ring buffer
 * A single-producer single-consumer byte queue of fixed capacity; callers serialise access.
 * @{ */

/**
 * Creates an empty ring buffer whose storage is the smallest power of two of at least
 * `requested` bytes (at least 2); it holds one byte less. Allocates.
 * @param requested the wanted capacity in bytes, at most 2^31 (384000 gives 524288 of storage).
 * @return the ring buffer, owned by the caller (free it with kova_ringbuffer_free()); null when
 *         memory is short or the request is above 2^31.
 */
KOVA_API KOVA_RINGBUFFER* kova_ringbuffer_create(uint32_t requested);

/**
 * Frees a ring buffer and its storage.
 * @param rb the ring buffer; null does nothing.
 */
KOVA_API void kova_ringbuffer_free(KOVA_RINGBUFFER* rb);

/**
 * Empties a ring buffer and zeroes its storage.
 * @param rb the ring buffer; null does nothing.
 */
KOVA_API void kova_ringbuffer_reset(KOVA_RINGBUFFER* rb);

/**
 * Bytes that can be read.
 * @param rb the ring buffer; null gives 0.
 * @return 0 to `size` - 1.
 */
KOVA_API uint32_t kova_ringbuffer_read_space(const KOVA_RINGBUFFER* rb);

/**
 * Bytes that can be written; read space plus write space is always `size` - 1.
 * @param rb the ring buffer; null gives 0.
 * @return 0 to `size` - 1.
 */
KOVA_API uint32_t kova_ringbuffer_write_space(const KOVA_RINGBUFFER* rb);

/**
 * Reads up to `len` bytes; fewer when fewer are held (not an error).
 * @param rb the ring buffer; null gives 0.
 * @param dst the destination. This must hold `len` bytes; it is not tested.
 * @param len the most bytes to read.
 * @return the bytes read.
 */
KOVA_API uint32_t kova_ringbuffer_read(KOVA_RINGBUFFER* rb, void* dst, uint32_t len);

/**
 * Writes as much of `len` bytes as fits. Refusing a block that does not fit whole is the caller's
 * rule (the output stream checks the write space first).
 * @param rb the ring buffer; null gives 0.
 * @param src the bytes; null gives 0.
 * @param len the bytes to write.
 * @return the bytes written.
 */
KOVA_API uint32_t kova_ringbuffer_write(KOVA_RINGBUFFER* rb, const void* src, uint32_t len);

/** @} */

/** @name Volume tables
 * Per-device volume curves, row-major, ::KOVA_VOLUME_ROW floats per row: 16 step values (0 to
 * 100) then a factor (1 or 0.5), or 8 step values, the factor and zeros. Writable data that the
 * library never writes; which device situation each row stands for is the application's choice.
 * @{ */

#define KOVA_VOLUME_ROW 17               /**< Floats per row. */
#define KOVA_VOLUME_DEVICE_VALUES 238    /**< Floats in a device table (14 rows). */
#define KOVA_VOLUME_SITUATION_VALUES 289 /**< Floats in ::situationVolume (17 rows). */
KOVA_API extern float spkVolume[KOVA_VOLUME_DEVICE_VALUES];       /**< Speaker curves. */
KOVA_API extern float headsetVolume[KOVA_VOLUME_DEVICE_VALUES];   /**< Wired headset curves. */
KOVA_API extern float earpieceVolume[KOVA_VOLUME_DEVICE_VALUES];  /**< Earpiece curves. */
KOVA_API extern float bluetoothVolume[KOVA_VOLUME_DEVICE_VALUES]; /**< Bluetooth curves. */
KOVA_API extern float usbVolume[KOVA_VOLUME_DEVICE_VALUES];       /**< USB audio curves. */
KOVA_API extern float hdmiVolume[KOVA_VOLUME_DEVICE_VALUES];      /**< HDMI curves. */
/** Situation factors: two non-zero values (columns 0 and 1) per row. */
KOVA_API extern float situationVolume[KOVA_VOLUME_SITUATION_VALUES];

/**
 * Number of volume values for a device code.
 * @param device the device code; 1 and 2 have a table.
 * @return 17 for 1 and 2, 1 for any other code.
 */
KOVA_API int kova_get_volumetablesize(int device);

/**
 * Copies row 1 of ::spkVolume and row 1 of ::headsetVolume, ::KOVA_VOLUME_ROW floats each.
 * @param speaker receives the speaker row. This must hold at least ::KOVA_VOLUME_ROW floats.
 * @param headset receives the headset row. This must hold at least ::KOVA_VOLUME_ROW floats.
 * When either is null nothing is written.
 */
KOVA_API void kova_get_volumetable(float* speaker, float* headset);

/** @} */

KOVA_EXTERN_C_END

#endif
