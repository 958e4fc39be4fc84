// SPDX-License-Identifier: Apache-2.0
/* Plays what the track's callback supplies on a sound device through ALSA.
 *
 * The track's own timer paces the bursts (the sink reports itself unpaced), and the sink keeps
 * the device a few bursts ahead with a silence cushion written at start. A short or empty burst
 * is completed with silence, as a real device plays silence when its client runs dry; so the
 * device is fed exactly one burst per period and its buffer neither runs empty nor fills up. This
 * also works with devices that do not block at all, such as ALSA's "null" device. */
#include <alsa/asoundlib.h>

#include <algorithm>
#include <cstring>
#include <mutex>
#include <string>
#include <vector>

#include "kova_host/audio_sink.h"
#include "track_thread.h"

namespace kova_host {
namespace {

constexpr unsigned kLatencyUs = 60000; /* the device buffer */
constexpr unsigned kCushionBursts = 5; /* silence queued at start: 20 ms */

std::mutex g_device_lock;
std::string g_device = "default";

/* ALSA reports configuration trouble on stderr by itself; the callers here report it instead. */
void quiet_alsa(const char*, int, const char*, int, const char*, ...) {}

void set_why(char* why, size_t cap, const std::string& text) {
    if (!why || cap == 0) return;
    std::strncpy(why, text.c_str(), cap - 1);
    why[cap - 1] = '\0';
}

int open_device(const std::string& device, snd_pcm_t** pcm, int mode) {
    snd_lib_error_set_handler(quiet_alsa);
    return snd_pcm_open(pcm, device.c_str(), SND_PCM_STREAM_PLAYBACK, mode);
}

class AlsaSink final : public AudioSink {
   public:
    AlsaSink(snd_pcm_t* pcm, uint32_t rate, uint32_t channels)
        : mPcm(pcm),
          mChannels(channels),
          mBurstFrames(std::max<size_t>(
              1, static_cast<size_t>(rate) * TrackThread::kPeriodNs / 1'000'000'000)),
          mSilence(mBurstFrames * channels, 0) {}

    ~AlsaSink() override { snd_pcm_close(mPcm); }

    void start() override {
        snd_pcm_prepare(mPcm);
        for (unsigned i = 0; i < kCushionBursts; ++i) put(mSilence.data(), mBurstFrames);
    }

    void write(const void* data, size_t bytes) override {
        const size_t frame_bytes = sizeof(int16_t) * mChannels;
        const size_t frames = std::min(bytes / frame_bytes, mBurstFrames);
        if (frames) put(static_cast<const int16_t*>(data), frames);
        if (frames < mBurstFrames) put(mSilence.data(), mBurstFrames - frames);
    }

    void stop() override { snd_pcm_drain(mPcm); }

   private:
    void put(const int16_t* data, size_t frames) {
        while (frames > 0) {
            snd_pcm_sframes_t n = snd_pcm_writei(mPcm, data, frames);
            if (n < 0) {
                // An underrun or a suspend: recover and continue; anything else drops the rest.
                if (snd_pcm_recover(mPcm, static_cast<int>(n), 1) < 0) return;
                continue;
            }
            data += static_cast<size_t>(n) * mChannels;
            frames -= static_cast<size_t>(n);
        }
    }

    snd_pcm_t* mPcm;
    const uint32_t mChannels;
    const size_t mBurstFrames;
    const std::vector<int16_t> mSilence;
};

std::unique_ptr<AudioSink> make_alsa(uint32_t rate, uint32_t channels) {
    std::string device;
    {
        std::lock_guard<std::mutex> guard(g_device_lock);
        device = g_device;
    }
    snd_pcm_t* pcm = nullptr;
    if (open_device(device, &pcm, 0) < 0) return nullptr;
    if (snd_pcm_set_params(pcm, SND_PCM_FORMAT_S16, SND_PCM_ACCESS_RW_INTERLEAVED, channels, rate,
                           1, kLatencyUs) < 0) {
        snd_pcm_close(pcm);
        return nullptr;
    }
    return std::make_unique<AlsaSink>(pcm, rate, channels);
}

}  // namespace
}  // namespace kova_host

extern "C" {

int kova_host_alsa_probe(const char* device, char* why, size_t cap) {
    const std::string name = device && *device ? device : "default";
    snd_pcm_t* pcm = nullptr;
    const int rc = kova_host::open_device(name, &pcm, SND_PCM_NONBLOCK);
    if (rc < 0) {
        kova_host::set_why(why, cap, snd_strerror(rc));
        return rc;
    }
    snd_pcm_close(pcm);
    kova_host::set_why(why, cap, "");
    return 0;
}

int kova_host_use_alsa_sink(const char* device, char* why, size_t cap) {
    const int rc = kova_host_alsa_probe(device, why, cap);
    if (rc < 0) return rc;
    {
        std::lock_guard<std::mutex> guard(kova_host::g_device_lock);
        kova_host::g_device = device && *device ? device : "default";
    }
    kova_host::use_sink_factory(kova_host::make_alsa);
    return 0;
}

}  // extern "C"
