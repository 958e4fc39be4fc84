#include <media/AudioTrack.h>
#include <time.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <bit>
#include <cerrno>

#include "sink_registry.h"
#include "track_thread.h"

namespace kova_host {
namespace {

constexpr long kNsPerSecond = 1'000'000'000;
/* The highest rate the stand-in device accepts; above it a track fails like a real one. */
constexpr uint32_t kMaxSampleRate = 192000;
/* Falling further behind than this (a stalled process, a debugger) restarts the clock instead of
 * firing a storm of catch-up bursts. */
constexpr long kMaxLagNs = 8 * TrackThread::kPeriodNs;

long diff_ns(const timespec& a, const timespec& b) {
    return (a.tv_sec - b.tv_sec) * kNsPerSecond + (a.tv_nsec - b.tv_nsec);
}

void advance(timespec& t, long ns) {
    t.tv_nsec += ns;
    while (t.tv_nsec >= kNsPerSecond) {
        t.tv_nsec -= kNsPerSecond;
        ++t.tv_sec;
    }
}

void sleep_until(timespec& deadline) {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    if (diff_ns(now, deadline) > kMaxLagNs) {
        deadline = now;
        return;
    }
    while (clock_nanosleep(CLOCK_MONOTONIC, TIMER_ABSTIME, &deadline, nullptr) == EINTR) {
    }
}

}  // namespace

/* Everything the callback thread uses; co-owned by the track and the thread, so a thread that
 * outlives a bounded release still has it. */
struct TrackThread::State {
    State(android::AudioTrack::callback_t callback, void* user, uint32_t rate, uint32_t channels,
          std::unique_ptr<AudioSink> sink)
        : callback(callback),
          user(user),
          burstFrames(std::max<size_t>(1, static_cast<size_t>(rate) * kPeriodNs / kNsPerSecond)),
          burstBytes(burstFrames * channels * sizeof(int16_t)),
          sink(std::move(sink)),
          room(burstBytes) {}

    bool active_locked() const { return active && !exit; }
    void pull_burst();
    void run();

    const android::AudioTrack::callback_t callback;
    void* const user;
    const size_t burstFrames;
    const size_t burstBytes;
    std::unique_ptr<AudioSink> sink;
    std::vector<uint8_t> room;
    // Outlives each callback: the callee may keep its address.
    android::AudioTrack::Buffer buffer{};

    std::mutex lock;
    std::condition_variable wake;
    bool active = false;
    bool exit = false;
    bool done = false;       // run() has finished with the sink and the callback
    bool lingering = false;  // released before done; counted in g_lingering

    /* Held around each callback and by the release while it sets `exit`: once the release has
     * it, no callback runs and none will. Never held while the sink is called. */
    std::mutex callbackLock;
};

namespace {
std::atomic<size_t> g_lingering{0};
}

size_t lingering_tracks() {
    return g_lingering.load();
}

TrackThread::TrackThread(android::AudioTrack::callback_t callback, void* user, uint32_t rate,
                         uint32_t channels, std::unique_ptr<AudioSink> sink)
    : mState(std::make_shared<State>(callback, user, rate, channels, std::move(sink))),
      mThread([state = mState] { state->run(); }) {}

TrackThread::~TrackThread() {
    State& s = *mState;
    {
        std::lock_guard<std::mutex> callbacks(s.callbackLock);
        std::lock_guard<std::mutex> guard(s.lock);
        s.exit = true;
    }
    s.wake.notify_all();
    std::unique_lock<std::mutex> guard(s.lock);
    if (s.wake.wait_for(guard, std::chrono::nanoseconds(kReleaseWaitNs), [&s] { return s.done; })) {
        guard.unlock();
        mThread.join();
        return;
    }
    s.lingering = true;
    g_lingering.fetch_add(1);
    guard.unlock();
    mThread.detach();
}

void TrackThread::start() {
    {
        std::lock_guard<std::mutex> guard(mState->lock);
        mState->active = true;
    }
    mState->wake.notify_all();
}

void TrackThread::stop() {
    std::lock_guard<std::mutex> guard(mState->lock);
    mState->active = false;
}

void TrackThread::State::pull_burst() {
    if (device_held()) return;
    // A callback that claims the burst without filling it plays silence, not the previous burst.
    std::fill(room.begin(), room.end(), uint8_t{0});
    {
        std::lock_guard<std::mutex> callbacks(callbackLock);
        {
            std::lock_guard<std::mutex> guard(lock);
            if (exit) return;
        }
        buffer.frameCount = burstFrames;
        buffer.size = burstBytes;
        buffer.raw = room.data();
        callback(android::AudioTrack::EVENT_MORE_DATA, user, &buffer);
    }
    const size_t got = std::min(buffer.size, burstBytes);
    {
        // A burst whose track was stopped while the callback ran is not played.
        std::lock_guard<std::mutex> guard(lock);
        if (!active_locked()) {
            count_callback(false);
            return;
        }
    }
    count_callback(got < burstBytes);
    sink->write(room.data(), got);
}

void TrackThread::State::run() {
    std::unique_lock<std::mutex> guard(lock);
    for (;;) {
        wake.wait(guard, [this] { return exit || active; });
        if (exit) break;
        guard.unlock();
        sink->start();
        timespec deadline{};
        clock_gettime(CLOCK_MONOTONIC, &deadline);
        // Like a device that plays out its first period before it asks for more, the first pull
        // comes one period after start(): the caller has then finished starting its stream and
        // the first burst is real data, not a request it still refuses.
        advance(deadline, kPeriodNs);
        sleep_until(deadline);
        guard.lock();
        // The callback runs without `lock` held: it takes the stream's own lock, under which the
        // stream calls stop().
        while (active_locked()) {
            guard.unlock();
            pull_burst();
            if (!sink->paced()) {
                advance(deadline, kPeriodNs);
                sleep_until(deadline);
            }
            guard.lock();
        }
        guard.unlock();
        sink->stop();
        guard.lock();
    }
    guard.unlock();
    sink.reset();  // the device is closed before the thread counts as ended
    guard.lock();
    done = true;
    if (lingering) g_lingering.fetch_sub(1);
    guard.unlock();
    wake.notify_all();
}

}  // namespace kova_host

namespace android {

AudioTrack::AudioTrack(audio_stream_type_t, uint32_t sampleRate, audio_format_t format,
                       audio_channel_mask_t channelMask, size_t, audio_output_flags_t,
                       callback_t cbf, void* user, int32_t, audio_session_t, transfer_type,
                       const audio_offload_info_t*, uid_t, pid_t, const audio_attributes_t*, bool,
                       float)
    : mStatus(NO_ERROR) {
    const int32_t forced = kova_host::take_open_failure();
    const int channels = std::popcount(channelMask);
    if (forced != NO_ERROR) {
        mStatus = forced;
    } else if (format != AUDIO_FORMAT_PCM_16_BIT || channels < 1 || channels > 8 ||
               sampleRate > kova_host::kMaxSampleRate) {
        mStatus = BAD_VALUE;
    }
    if (mStatus != NO_ERROR || cbf == nullptr) return;
    // 0 asks for the device's own rate, which is 48000 Hz here.
    const uint32_t rate = sampleRate ? sampleRate : 48000;
    mThread = std::make_unique<kova_host::TrackThread>(
        cbf, user, rate, static_cast<uint32_t>(channels), kova_host::make_sink(rate, channels));
}

AudioTrack::~AudioTrack() {
    mThread.reset();
}

status_t AudioTrack::initCheck() const {
    return mStatus;
}

status_t AudioTrack::start() {
    if (mStatus != NO_ERROR) return mStatus;
    if (mThread) mThread->start();
    return NO_ERROR;
}

void AudioTrack::stop() {
    if (mThread) mThread->stop();
}

void AudioTrack::flush() {}

}  // namespace android
