/* Internal to the host audio library: the callback thread of one track. */
#ifndef KOVA_HOST_TRACK_THREAD_H
#define KOVA_HOST_TRACK_THREAD_H

#include <media/AudioTrack.h>

#include <condition_variable>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

#include "kova_host/audio_sink.h"

namespace kova_host {

/* Pulls bursts from the track's callback at the device's pace while started. */
class TrackThread {
   public:
    static constexpr long kPeriodNs = 4'000'000;  // 4 ms per burst: 192 frames at 48000 Hz

    TrackThread(android::AudioTrack::callback_t callback, void* user, uint32_t rate,
                uint32_t channels, std::unique_ptr<AudioSink> sink);
    ~TrackThread();  // stops and joins

    void start();
    void stop();

   private:
    void run();
    bool active_locked() const { return mActive && !mExit; }
    void pull_burst();

    const android::AudioTrack::callback_t mCallback;
    void* const mUser;
    const size_t mBurstFrames;
    const size_t mBurstBytes;
    std::unique_ptr<AudioSink> mSink;
    std::vector<uint8_t> mRoom;
    android::AudioTrack::Buffer
        mBuffer{};  // outlives each callback: the callee may keep its address

    std::mutex mLock;
    std::condition_variable mWake;
    bool mActive = false;
    bool mExit = false;
    std::thread mThread;  // last: starts once everything above is set up
};

}  // namespace kova_host

#endif
