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

/* Pulls bursts from the track's callback at the device's pace while started.
 *
 * Release is bounded: the destructor tells the thread to stop, waits for a callback already
 * running (callbacks never block on the device), and then waits at most kReleaseWaitNs for the
 * thread to end. A thread held up longer by its sink (a device that never drains, a stalled
 * write) is left to finish alone: everything it still uses is in a state record it co-owns, and
 * it never calls the callback again, so the callback's user data may go as soon as the
 * destructor returns. */
class TrackThread {
   public:
    static constexpr long kPeriodNs = 4'000'000;         // 4 ms per burst: 192 frames at 48000 Hz
    static constexpr long kReleaseWaitNs = 100'000'000;  // 100 ms

    TrackThread(android::AudioTrack::callback_t callback, void* user, uint32_t rate,
                uint32_t channels, std::unique_ptr<AudioSink> sink);
    ~TrackThread();

    void start();
    void stop();

    struct State;

   private:
    std::shared_ptr<State> mState;
    std::thread mThread;
};

/* Released tracks whose thread has not ended yet. */
size_t lingering_tracks();

}  // namespace kova_host

#endif
