/* Host stand-in for the platform's android::AudioTrack: the subset the fast-track stream uses.
 *
 * A track created with a callback owns a thread that, once started, asks the callback for a fixed
 * burst (4 ms of audio, 192 frames at 48000 Hz) on absolute deadlines, like a device pulling at its
 * real pace, and hands exactly the bytes it got back to the selected sink (see
 * kova_host/audio_sink.h). A shorter answer is an underrun and is counted; nothing is padded.
 * Releasing the last strong reference stops the thread and waits a short, bounded time for it (see
 * host/track_thread.h); the callback is never called again once the release returns. */
#ifndef KOVA_HOST_MEDIA_AUDIOTRACK_H
#define KOVA_HOST_MEDIA_AUDIOTRACK_H

#include <stddef.h>
#include <stdint.h>
#include <sys/types.h>
#include <system/audio.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>

#include <memory>

namespace kova_host {
class TrackThread;
}

namespace android {

class AudioTrack : public virtual RefBase {
   public:
    enum event_type {
        EVENT_MORE_DATA = 0,
        EVENT_UNDERRUN = 1,
        EVENT_LOOP_END = 2,
        EVENT_MARKER = 3,
        EVENT_NEW_POS = 4,
        EVENT_BUFFER_END = 5,
        EVENT_NEW_IAUDIOTRACK = 6,
        EVENT_STREAM_END = 7,
    };

    /* Room handed to the callback with EVENT_MORE_DATA: the callback fills `raw` and stores in
     * `size` the bytes it supplied; `frameCount` is the room in frames. */
    struct Buffer {
        size_t frameCount;
        size_t size;
        union {
            void* raw;
            int16_t* i16;
        };
    };

    typedef void (*callback_t)(int event, void* user, void* info);

    enum transfer_type {
        TRANSFER_DEFAULT = 0,
        TRANSFER_CALLBACK = 1,
    };

    AudioTrack(audio_stream_type_t streamType, uint32_t sampleRate, audio_format_t format,
               audio_channel_mask_t channelMask, size_t frameCount = 0,
               audio_output_flags_t flags = AUDIO_OUTPUT_FLAG_NONE, callback_t cbf = nullptr,
               void* user = nullptr, int32_t notificationFrames = 0,
               audio_session_t sessionId = AUDIO_SESSION_ALLOCATE,
               transfer_type transferType = TRANSFER_DEFAULT,
               const audio_offload_info_t* offloadInfo = nullptr, uid_t uid = AUDIO_UID_INVALID,
               pid_t pid = -1, const audio_attributes_t* pAttributes = nullptr,
               bool doNotReconnect = false, float maxRequiredSpeed = 1.0f);

    AudioTrack(const AudioTrack&) = delete;
    AudioTrack& operator=(const AudioTrack&) = delete;

    /* NO_ERROR when the track exists and can be started; the failure status otherwise. */
    status_t initCheck() const;
    /* Begins delivering callbacks. */
    status_t start();
    /* Stops playback and callbacks. Does not wait for a callback already running, so it may be
     * called while holding a lock that the callback takes. */
    void stop();
    /* Discards data queued in the track (the stand-in keeps none). */
    void flush();

   protected:
    /* Stops the callback thread (bounded wait); runs when the last strong reference goes. */
    ~AudioTrack() override;

   private:
    status_t mStatus;
    std::unique_ptr<kova_host::TrackThread> mThread;
};

}  // namespace android

#endif
