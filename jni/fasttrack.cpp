// SPDX-License-Identifier: Apache-2.0
/* Low-latency output stream: a fast AudioTrack whose callback drains a ring buffer that the
 * generating side fills with whole blocks. */
#include "kova/android/kova_fasttrack.h"

#include <android/log.h>
#include <media/AudioTrack.h>
#include <pthread.h>

#include <atomic>
#include <new>

#include "kova/kova_output.h"
#include "util/kova_mem.h"

namespace {

constexpr const char* kTag = "kova_fasttrack";
constexpr uint32_t kRingRequest = 384000;
constexpr int kMaxRate = 48000;
constexpr int kModeNormal = 1;
constexpr int32_t kPlaying = 1;
constexpr int32_t kStopped = 0;

#define FT_LOG(...) __android_log_print(ANDROID_LOG_DEBUG, kTag, __VA_ARGS__)

/* A failed mutex allocation leaves pMutex null and the stream then runs unlocked. */
void lock(KOVA_FASTTRACK* ft) {
    if (ft->pMutex) pthread_mutex_lock(ft->pMutex);
}
void unlock(KOVA_FASTTRACK* ft) {
    if (ft->pMutex) pthread_mutex_unlock(ft->pMutex);
}

/* The callback takes a first look at `state` without the lock, so every access is atomic. */
int32_t load_state(KOVA_FASTTRACK* ft) {
    return std::atomic_ref<int32_t>(ft->state).load(std::memory_order_acquire);
}
void store_state(KOVA_FASTTRACK* ft, int32_t s) {
    std::atomic_ref<int32_t>(ft->state).store(s, std::memory_order_release);
}

}  // namespace

extern "C" {

KOVA_FASTTRACK* kova_open_fasttrack(int sample_rate, int channels) {
    // Zero-filled storage from the library's allocator, then value-initialised in place so that
    // the strong reference is a properly constructed null; close runs the destructor.
    void* mem = kova_mem_calloc(1, sizeof(KOVA_FASTTRACK));
    KOVA_FASTTRACK* ft = mem ? new (mem) KOVA_FASTTRACK() : nullptr;
    if (sample_rate > kMaxRate || channels < 1 || !ft) {
        kova_close_fasttrack(ft, kModeNormal);
        return nullptr;
    }

    ft->pMutex = static_cast<pthread_mutex_t*>(kova_mem_malloc(sizeof(pthread_mutex_t)));
    if (ft->pMutex) pthread_mutex_init(ft->pMutex, nullptr);
    lock(ft);

    ft->pRing = kova_ringbuffer_create(kRingRequest);
    if (!ft->pRing) {
        unlock(ft);
        kova_close_fasttrack(ft, kModeNormal);
        return nullptr;
    }

    ft->track = new android::AudioTrack(
        AUDIO_STREAM_SYSTEM, static_cast<uint32_t>(sample_rate), AUDIO_FORMAT_PCM_16_BIT,
        channels > 1 ? AUDIO_CHANNEL_OUT_STEREO : AUDIO_CHANNEL_OUT_MONO, 0, AUDIO_OUTPUT_FLAG_FAST,
        FastTrackCallback, ft, 0, AUDIO_SESSION_ALLOCATE, android::AudioTrack::TRANSFER_DEFAULT,
        nullptr, static_cast<uid_t>(-1), -1, nullptr, false, 1.0f);

    const android::status_t status = ft->track->initCheck();
    if (status != android::NO_ERROR) {
        FT_LOG("kova_init::openFastTrack(%dHz,%dCh,FC:%d) is failed (initCheck(%x))", sample_rate,
               channels, 0, static_cast<unsigned>(status));
        unlock(ft);
        kova_close_fasttrack(ft, 0);
        return nullptr;
    }

    store_state(ft, kStopped);
    ft->track->stop();
    FT_LOG("kova_init::openFastTrack(%dHz,%dCh, FC:%d) is finished successfully", sample_rate,
           channels, 0);
    unlock(ft);
    return ft;
}

void kova_close_fasttrack(KOVA_FASTTRACK* ft, int mode) {
    if (!ft) return;
    lock(ft);
    if (ft->track != nullptr) {
        store_state(ft, kStopped);
        if (mode == kModeNormal) {
            ft->track->stop();
            ft->track->flush();
        }
    }
    unlock(ft);

    // Dropping the last reference ends the callback thread, so nothing touches the ring or the
    // mutex once they are freed below. The lock must not be held here: a callback in flight may
    // be waiting for it.
    ft->track.clear();
    kova_ringbuffer_free(ft->pRing);
    ft->pRing = nullptr;
    ft->pBuffer = nullptr;
    if (ft->pMutex) {
        pthread_mutex_destroy(ft->pMutex);
        kova_mem_free(ft->pMutex);
        ft->pMutex = nullptr;
    }
    ft->~KOVA_FASTTRACK();
    kova_mem_free(ft);

    if (mode == kModeNormal) {
        FT_LOG("kova_close_fasttrack() is finished successfully");
    } else {
        FT_LOG("kova_close_fasttrack() is finished (initCheck() is failed)");
    }
}

uint32_t kova_write_fasttrack(KOVA_FASTTRACK* ft, const void* data, uint32_t capacity,
                              uint32_t length) {
    if (!ft) return 0;
    lock(ft);
    uint32_t result = 0;
    if (ft->track != nullptr && length != 0 && load_state(ft) == kPlaying) {
        uint32_t n = kova_ringbuffer_write_space(ft->pRing);
        if (capacity < n) n = capacity;
        if (length < n) n = length;
        // All or nothing: a block that does not fit whole is dropped, never split.
        if (n != length) {
            result = n;
        } else {
            result = kova_ringbuffer_write(ft->pRing, data, length);
        }
    }
    unlock(ft);
    return result;
}

void kova_start_fasttrack(KOVA_FASTTRACK* ft) {
    if (!ft) return;
    lock(ft);
    if (ft->track != nullptr && load_state(ft) == kStopped) {
        FT_LOG("kova_start_fasttrack()");
        kova_ringbuffer_reset(ft->pRing);
        ft->track->start();
        store_state(ft, kPlaying);
    }
    unlock(ft);
}

void kova_stop_fasttrack(KOVA_FASTTRACK* ft) {
    if (!ft) return;
    lock(ft);
    if (ft->track != nullptr && load_state(ft) == kPlaying) {
        FT_LOG("kova_stop_fasttrack()");
        store_state(ft, kStopped);
        ft->track->stop();
        ft->track->flush();
        kova_ringbuffer_reset(ft->pRing);
    }
    unlock(ft);
}

void FastTrackCallback(int event, void* user, void* info) {
    auto* ft = static_cast<KOVA_FASTTRACK*>(user);
    if (!ft || event != android::AudioTrack::EVENT_MORE_DATA || load_state(ft) != kPlaying) return;

    lock(ft);
    ft->pBuffer = info;
    auto* buffer = static_cast<android::AudioTrack::Buffer*>(info);
    if (!ft->pRing || !buffer || ft->track == nullptr) {
        FT_LOG("FastTrackCallback(event:%d, parameter error)", event);
        unlock(ft);
        return;
    }
    if (buffer->raw) {
        const uint32_t avail = kova_ringbuffer_read_space(ft->pRing);
        ft->lastAvail = avail;
        // Underrun hands over only what is there; the buffer is shortened, never padded.
        const uint32_t n = buffer->size < avail ? static_cast<uint32_t>(buffer->size) : avail;
        ft->lastCopied = n;
        kova_ringbuffer_read(ft->pRing, buffer->raw, n);
        buffer->size = n;
    }
    unlock(ft);
}

}  // extern "C"
