#include <media/AudioTrack.h>
#include <time.h>

#include <algorithm>
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

TrackThread::TrackThread(android::AudioTrack::callback_t callback, void* user, uint32_t rate,
                         uint32_t channels, std::unique_ptr<AudioSink> sink)
    : mCallback(callback),
      mUser(user),
      mBurstFrames(std::max<size_t>(1, static_cast<size_t>(rate) * kPeriodNs / kNsPerSecond)),
      mBurstBytes(mBurstFrames * channels * sizeof(int16_t)),
      mSink(std::move(sink)),
      mRoom(mBurstBytes),
      mThread(&TrackThread::run, this) {}

TrackThread::~TrackThread() {
    {
        std::lock_guard<std::mutex> guard(mLock);
        mExit = true;
    }
    mWake.notify_all();
    mThread.join();
}

void TrackThread::start() {
    {
        std::lock_guard<std::mutex> guard(mLock);
        mActive = true;
    }
    mWake.notify_all();
}

void TrackThread::stop() {
    std::lock_guard<std::mutex> guard(mLock);
    mActive = false;
}

void TrackThread::pull_burst() {
    if (device_held()) return;
    // A callback that claims the burst without filling it plays silence, not the previous burst.
    std::fill(mRoom.begin(), mRoom.end(), uint8_t{0});
    mBuffer.frameCount = mBurstFrames;
    mBuffer.size = mBurstBytes;
    mBuffer.raw = mRoom.data();
    mCallback(android::AudioTrack::EVENT_MORE_DATA, mUser, &mBuffer);
    const size_t got = std::min(mBuffer.size, mBurstBytes);
    {
        // A burst whose track was stopped while the callback ran is not played.
        std::lock_guard<std::mutex> guard(mLock);
        if (!active_locked()) {
            count_callback(false);
            return;
        }
    }
    count_callback(got < mBurstBytes);
    mSink->write(mRoom.data(), got);
}

void TrackThread::run() {
    std::unique_lock<std::mutex> lock(mLock);
    for (;;) {
        mWake.wait(lock, [this] { return mExit || mActive; });
        if (mExit) return;
        lock.unlock();
        mSink->start();
        timespec deadline{};
        clock_gettime(CLOCK_MONOTONIC, &deadline);
        // Like a device that plays out its first period before it asks for more, the first pull
        // comes one period after start(): the caller has then finished starting its stream and
        // the first burst is real data, not a request it still refuses.
        advance(deadline, kPeriodNs);
        sleep_until(deadline);
        lock.lock();
        // The callback runs without mLock held: it takes the stream's own lock, under which the
        // stream calls stop().
        while (active_locked()) {
            lock.unlock();
            pull_burst();
            if (!mSink->paced()) {
                advance(deadline, kPeriodNs);
                sleep_until(deadline);
            }
            lock.lock();
        }
        lock.unlock();
        mSink->stop();
        lock.lock();
    }
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
