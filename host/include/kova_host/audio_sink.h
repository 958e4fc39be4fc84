/* Where the host stand-in of android::AudioTrack sends what its callback supplied.
 *
 * The selection applies to tracks created after the call; tracks already open keep their sink.
 * Two sinks come with the library:
 *   - capture: keeps every byte the "device" received, in order, across all tracks, until cleared;
 *   - null (the default): discards;
 *   - stall: discards, but every burst write blocks first, like a device that stopped draining.
 * The counters cover every track of the process since start-up (or the last reset). */
#ifndef KOVA_HOST_AUDIO_SINK_H
#define KOVA_HOST_AUDIO_SINK_H

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

void kova_host_use_capture_sink(void);
void kova_host_use_null_sink(void);
/* Tracks created from now on get a sink whose every burst write blocks for `stall_ms`
 * milliseconds before discarding the burst. 0 means no stall: the same as the null sink. */
void kova_host_use_stall_sink(uint32_t stall_ms);

/* Released tracks whose callback thread is still held up by its sink. Releasing a track waits
 * only a short time (100 ms) for its thread; a thread still busy after that ends on its own,
 * without calling the callback again. Tests poll this to finish with no such thread left. */
size_t kova_host_lingering_tracks(void);

/* The captured bytes: their count, a copy of the first min(size, cap) of them (returns the count
 * copied), and emptying the store. */
size_t kova_host_capture_size(void);
size_t kova_host_capture_copy(void* dst, size_t cap);
void kova_host_capture_clear(void);
/* Writes the captured bytes (16-bit PCM, machine order) as a 16-bit WAV file; whole frames only.
 * 0 on success, -1 on bad arguments or a file error. */
int kova_host_capture_write_wav(const char* path, int rate, int channels);

/* Bursts answered with fewer bytes than asked, and callbacks made, by every track. */
unsigned long kova_host_underruns(void);
unsigned long kova_host_callbacks(void);
void kova_host_reset_counters(void);

/* While held (non-zero), started tracks make no callbacks, like a stalled device; their clocks
 * keep running. Lets tests fill and inspect a playing stream without the device draining it. */
void kova_host_hold_device(int hold);

/* ALSA playback on a sound device (alsa_sink.cpp). The probe opens the playback device `device`
 * ("default" when null) and closes it again: 0 when it can be opened, otherwise a negative ALSA
 * error code and a one-line reason in `why` (up to cap - 1 characters). kova_host_use_alsa_sink
 * probes the same way and, on success, selects the device for tracks created from now on; on
 * failure the selection is unchanged. */
int kova_host_alsa_probe(const char* device, char* why, size_t cap);
int kova_host_use_alsa_sink(const char* device, char* why, size_t cap);

/* The next track created reports `status` from initCheck() and gets no thread (a non-zero
 * status, e.g. -19 for a missing device). One-shot; 0 cancels. */
void kova_host_fail_next_open(int32_t status);

#ifdef __cplusplus
}

#include <memory>

namespace kova_host {

/* A device end for the callback thread. All three methods are called on the track's callback
 * thread only (start when playback begins, write per burst, stop when it ends), never
 * concurrently for one sink; the sink is created when the track is created and destroyed on that
 * thread as it ends, which may be after the track itself was released. */
class AudioSink {
   public:
    virtual ~AudioSink() = default;
    virtual void start() {}
    /* Exactly the bytes the callback supplied for one burst; `bytes` may be 0 on an underrun. */
    virtual void write(const void* data, size_t bytes) = 0;
    virtual void stop() {}
    /* True when write() itself blocks at the device's pace; the track then skips its own timer. */
    virtual bool paced() const { return false; }
};

/* Creates the sink for a new track of `rate` Hz and `channels` interleaved 16-bit channels; may
 * return null (the track then discards). */
using SinkFactory = std::unique_ptr<AudioSink> (*)(uint32_t rate, uint32_t channels);

/* Selects the factory for tracks created from now on; null selects the null sink. */
void use_sink_factory(SinkFactory factory);

}  // namespace kova_host
#endif

#endif
