/* Fast-track output stream: an android::AudioTrack opened with the fast flag and a pull callback,
 * fed through a KOVA_RINGBUFFER. C++ only, because the stream holds a platform strong reference. */
#ifndef KOVA_FASTTRACK_H
#define KOVA_FASTTRACK_H

#include "../kova_types.h"

/* After kova_types.h: this header uses uintptr_t without including <stdint.h>. */
#include <utils/StrongPointer.h>

namespace android {
class AudioTrack;
}

/* Created by kova_open_fasttrack in zero-filled storage from the library's allocator and
 * constructed in place (so `track` is a real null strong reference); only kova_close_fasttrack
 * ends it. `state` is read by the callback without the lock and is therefore accessed atomically.
 */
struct KOVA_FASTTRACK {
    android::sp<android::AudioTrack> track;
    void* pBuffer; /* android::AudioTrack::Buffer* of the most recent callback */
    KOVA_RINGBUFFER* pRing;
    uint32_t lastCopied;
    uint32_t lastAvail;
    pthread_mutex_t* pMutex;
    int32_t state; /* 1 playing, 0 stopped */
};

extern "C" {
KOVA_API KOVA_FASTTRACK* kova_open_fasttrack(int sample_rate, int channels);
KOVA_API void kova_close_fasttrack(KOVA_FASTTRACK* ft, int mode);
KOVA_API uint32_t kova_write_fasttrack(KOVA_FASTTRACK* ft, const void* data, uint32_t capacity,
                                       uint32_t length);
KOVA_API void kova_start_fasttrack(KOVA_FASTTRACK* ft);
KOVA_API void kova_stop_fasttrack(KOVA_FASTTRACK* ft);
KOVA_API void FastTrackCallback(int event, void* user, void* info);
}

#endif
