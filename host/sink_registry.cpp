#include "sink_registry.h"

#include "track_thread.h"

#include <sndfile.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstring>
#include <mutex>
#include <thread>
#include <vector>

namespace kova_host {
namespace {

class NullSink final : public AudioSink {
   public:
    void write(const void*, size_t) override {}
};

/* Every byte any capture sink received, in arrival order. */
struct CaptureStore {
    std::mutex lock;
    std::vector<uint8_t> bytes;
};

CaptureStore& capture_store() {
    static CaptureStore store;
    return store;
}

class CaptureSink final : public AudioSink {
   public:
    void write(const void* data, size_t bytes) override {
        if (bytes == 0) return;
        CaptureStore& store = capture_store();
        const auto* p = static_cast<const uint8_t*>(data);
        std::lock_guard<std::mutex> guard(store.lock);
        store.bytes.insert(store.bytes.end(), p, p + bytes);
    }
};

/* A device that takes `stall` to accept each burst, then discards it. */
class StallSink final : public AudioSink {
   public:
    explicit StallSink(std::chrono::milliseconds stall) : mStall(stall) {}
    void write(const void*, size_t) override { std::this_thread::sleep_for(mStall); }
    bool paced() const override { return true; }

   private:
    const std::chrono::milliseconds mStall;
};

std::atomic<uint32_t> g_stall_ms{0};

std::unique_ptr<AudioSink> make_stall(uint32_t, uint32_t) {
    return std::make_unique<StallSink>(std::chrono::milliseconds(g_stall_ms.load()));
}

std::unique_ptr<AudioSink> make_null(uint32_t, uint32_t) {
    return std::make_unique<NullSink>();
}
std::unique_ptr<AudioSink> make_capture(uint32_t, uint32_t) {
    return std::make_unique<CaptureSink>();
}

std::atomic<SinkFactory> g_factory{make_null};
std::atomic<int32_t> g_fail_next{0};
std::atomic<bool> g_hold{false};
std::atomic<unsigned long> g_callbacks{0};
std::atomic<unsigned long> g_underruns{0};

}  // namespace

void use_sink_factory(SinkFactory factory) {
    g_factory.store(factory ? factory : make_null);
}

std::unique_ptr<AudioSink> make_sink(uint32_t rate, uint32_t channels) {
    std::unique_ptr<AudioSink> sink = g_factory.load()(rate, channels);
    return sink ? std::move(sink) : std::make_unique<NullSink>();
}

bool device_held() {
    return g_hold.load();
}

int32_t take_open_failure() {
    return g_fail_next.exchange(0);
}

void count_callback(bool underrun) {
    g_callbacks.fetch_add(1, std::memory_order_relaxed);
    if (underrun) g_underruns.fetch_add(1, std::memory_order_relaxed);
}

}  // namespace kova_host

using kova_host::capture_store;

extern "C" {

void kova_host_use_capture_sink(void) {
    kova_host::use_sink_factory(kova_host::make_capture);
}
void kova_host_use_null_sink(void) {
    kova_host::use_sink_factory(kova_host::make_null);
}

void kova_host_use_stall_sink(uint32_t stall_ms) {
    if (stall_ms == 0) {
        kova_host::use_sink_factory(kova_host::make_null);
        return;
    }
    kova_host::g_stall_ms.store(stall_ms);
    kova_host::use_sink_factory(kova_host::make_stall);
}

size_t kova_host_lingering_tracks(void) {
    return kova_host::lingering_tracks();
}

size_t kova_host_capture_size(void) {
    std::lock_guard<std::mutex> guard(capture_store().lock);
    return capture_store().bytes.size();
}

size_t kova_host_capture_copy(void* dst, size_t cap) {
    if (!dst) return 0;
    std::lock_guard<std::mutex> guard(capture_store().lock);
    const size_t n = std::min(cap, capture_store().bytes.size());
    if (n) std::memcpy(dst, capture_store().bytes.data(), n);
    return n;
}

void kova_host_capture_clear(void) {
    std::lock_guard<std::mutex> guard(capture_store().lock);
    capture_store().bytes.clear();
}

int kova_host_capture_write_wav(const char* path, int rate, int channels) {
    if (!path || rate <= 0 || channels < 1) return -1;
    std::vector<int16_t> samples;
    {
        std::lock_guard<std::mutex> guard(capture_store().lock);
        const size_t frame_bytes = sizeof(int16_t) * static_cast<size_t>(channels);
        const size_t whole = capture_store().bytes.size() / frame_bytes * frame_bytes;
        samples.resize(whole / sizeof(int16_t));
        if (whole) std::memcpy(samples.data(), capture_store().bytes.data(), whole);
    }
    SF_INFO info{};
    info.samplerate = rate;
    info.channels = channels;
    info.format = SF_FORMAT_WAV | SF_FORMAT_PCM_16;
    SNDFILE* file = sf_open(path, SFM_WRITE, &info);
    if (!file) return -1;
    const sf_count_t frames =
        static_cast<sf_count_t>(samples.size() / static_cast<size_t>(channels));
    const bool ok = sf_writef_short(file, samples.data(), frames) == frames;
    return (sf_close(file) == 0 && ok) ? 0 : -1;
}

unsigned long kova_host_underruns(void) {
    return kova_host::g_underruns.load();
}
unsigned long kova_host_callbacks(void) {
    return kova_host::g_callbacks.load();
}

void kova_host_reset_counters(void) {
    kova_host::g_underruns.store(0);
    kova_host::g_callbacks.store(0);
}

void kova_host_hold_device(int hold) {
    kova_host::g_hold.store(hold != 0);
}

void kova_host_fail_next_open(int32_t status) {
    kova_host::g_fail_next.store(status);
}

}  // extern "C"
