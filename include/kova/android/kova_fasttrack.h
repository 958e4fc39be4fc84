// SPDX-License-Identifier: Apache-2.0
/**
 * @file kova_fasttrack.h
 * @brief Fast-track output stream: an `android::AudioTrack` opened with the fast flag and a pull
 * callback, fed through a ::KOVA_RINGBUFFER.
 *
 * C++ only and platform-only: the stream holds a platform strong reference
 * (`android::sp`, from the platform's `utils/StrongPointer.h`; off Android the library's own
 * stand-in takes the track's place). Include it as `<kova/android/kova_fasttrack.h>`.
 *
 * @par Threading
 * Two threads meet in a stream: the thread that writes blocks (in the Java face it holds the
 * registry lock `gpKovaMutex`) and the platform's audio thread that calls FastTrackCallback().
 * Both take the stream's own mutex `pMutex` around every access to the ring buffer and to `state`.
 * Lock order: the registry lock, then `pMutex`; the callback takes only `pMutex`.
 *
 * @par Real time
 * kova_write_fasttrack() and FastTrackCallback() allocate nothing, copy at most twice and never
 * wait for the device (a block that does not fit is dropped); they wait only for the other side's
 * short copy under `pMutex`. kova_open_fasttrack() allocates and creates the platform track;
 * kova_close_fasttrack() joins the platform's callback thread.
 */
#ifndef KOVA_FASTTRACK_H
#define KOVA_FASTTRACK_H

#include "../kova_types.h"

/* After kova_types.h: this header uses uintptr_t without including <stdint.h>. */
#include <utils/StrongPointer.h>

/** @cond KOVA_INTERNAL */
namespace android {
class AudioTrack;
}
/** @endcond */

/**
 * One output stream (kova_open_fasttrack()). Created in zero-filled storage from the library's
 * allocator and constructed in place (so `track` is a real null strong reference); only
 * kova_close_fasttrack() ends it. Callers treat it as opaque.
 */
struct KOVA_FASTTRACK {
    android::sp<android::AudioTrack> track; /**< The platform track; null once closed. */
    void* pBuffer;           /**< The `android::AudioTrack::Buffer*` of the most recent callback. */
    KOVA_RINGBUFFER* pRing;  /**< The queue, owned: 384000 requested, 524288 of storage. */
    uint32_t lastCopied;     /**< Bytes handed to the device by the most recent callback. */
    uint32_t lastAvail;      /**< Bytes the queue held at the most recent callback. */
    pthread_mutex_t* pMutex; /**< The stream's mutex, owned; null when it could not be made. */
    /** 1 playing, 0 stopped. Read by the callback without the lock, so accessed atomically. */
    int32_t state;
};

extern "C" {
/**
 * Opens a stream, stopped, on a fast track with the platform's default frame count. Allocates
 * and creates the platform track with its callback thread.
 * @param sample_rate the rate in Hz, at most 48000 (the Java face uses 48000).
 * @param channels the channel count, 1 or 2 (the Java face uses 2).
 * @return the stream, owned by the caller (end it with kova_close_fasttrack()); null when the
 *         arguments are refused, memory is short or the platform refuses the track.
 */
KOVA_API KOVA_FASTTRACK* kova_open_fasttrack(int sample_rate, int channels);

/**
 * Ends a stream: stops it, releases the track (which joins its callback thread), then frees the
 * queue, the mutex and the record. May block until the callback thread ends.
 * @param ft the stream; null does nothing.
 * @param mode 1 for a normal close (stop and flush first); any other value after a failed open.
 */
KOVA_API void kova_close_fasttrack(KOVA_FASTTRACK* ft, int mode);

/**
 * Queues one block, all or nothing: only while the stream plays and only when the whole block
 * fits; otherwise nothing is stored. Allocates nothing; takes `pMutex`.
 * @param ft the stream; null gives 0.
 * @param data the samples, interleaved signed 16-bit in the machine's byte order.
 * @param capacity the bytes `data` holds.
 * @param length the bytes to queue; at most `capacity`.
 * @return `length` when the block was stored; otherwise below `length` (0 while stopped, for a
 *         length of 0, or when the queue is full; the free space when it does not fit).
 */
KOVA_API uint32_t kova_write_fasttrack(KOVA_FASTTRACK* ft, const void* data, uint32_t capacity,
                                       uint32_t length);

/**
 * Starts a stopped stream: empties the queue, then starts the track. Starting a playing stream
 * does nothing.
 * @param ft the stream; null does nothing.
 */
KOVA_API void kova_start_fasttrack(KOVA_FASTTRACK* ft);

/**
 * Stops a playing stream: stops and flushes the track, then empties the queue (what it held is
 * discarded). Stopping a stopped stream does nothing.
 * @param ft the stream; null does nothing.
 */
KOVA_API void kova_stop_fasttrack(KOVA_FASTTRACK* ft);

/**
 * The track's pull callback, called by the platform on its audio thread: on a more-data event
 * of a playing stream it copies what the queue holds (up to the buffer's size) into the buffer
 * and shortens the buffer's `size` to it; it never pads with silence. Allocates nothing.
 * @param event the platform event; only 0 (more data) is handled.
 * @param user the stream (::KOVA_FASTTRACK*).
 * @param info the `android::AudioTrack::Buffer*` to fill.
 */
KOVA_API void FastTrackCallback(int event, void* user, void* info);
}

#endif
