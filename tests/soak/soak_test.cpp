// Several instances driven at once through the Java entry points, as an application with a few
// views would: strokes with an event every 8 ms, stops and restarts of the output stream and
// registrations in between, while each instance's device thread drains its stream.
//
// Checked:
//   - each device received exactly the blocks its instance generated, in order (streaming hash
//     and byte count per instance, compared whenever the stream was drained);
//   - no underrun while the producer keeps up: during a stroke whose events all came within
//     kKeepUpMs of each other, the stream never held less than one device burst;
//   - no block was refused for lack of room (the stream kept room for the largest block, and
//     blocks that kova_write_fasttrack actually refused are counted and reported as drops);
//   - memory stays flat: the library allocates only while registering (allocation counter), and
//     the process's resident size grows by no more than the registered sources can explain
//     (plain builds; sanitizers keep their own books).
// Length: KOVA_SOAK_SECONDS (default 3; CI runs 20).
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <mutex>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "jni/jni_test_support.h"
#include "kova/android/kova_fasttrack.h"
#include "kova/kova_output.h"
#include "kova_host/audio_sink.h"
#include "util/kova_mem.h"

namespace {

// Sanitizers keep shadow memory, quarantines and histories that grow with the work done, so the
// resident size says nothing about the library there; their own leak checks stand in for it.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr bool kResidentMeaningful = false;
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
constexpr bool kResidentMeaningful = false;
#else
constexpr bool kResidentMeaningful = true;
#endif
#else
constexpr bool kResidentMeaningful = true;
#endif

using Clock = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr int kInstances = 4;
constexpr int kEventMs = 8;
// The start sound (200 ms) queues ahead of the moves; a producer that is never later than this
// between two events keeps the stream from running dry.
constexpr int kKeepUpMs = 100;
// One burst of the host device: 4 ms of 48 kHz stereo.
constexpr uint32_t kBurstBytes = 192 * 2 * 2;
constexpr uint32_t kStartBytes = 38400;
constexpr uint32_t kLoopBytes = 192000;
constexpr uint32_t kEndBytes = 38400;
// Sources of one registered set, twice (the samples and their working copy), plus the record.
constexpr long kSetBytes = 2 * (kStartBytes + kLoopBytes + kEndBytes) + 4096;

struct Fnv {
    uint64_t h = 1469598103934665603ull;
    uint64_t bytes = 0;
    void add(const void* data, size_t n) {
        const auto* p = static_cast<const uint8_t*>(data);
        for (size_t i = 0; i < n; ++i) h = (h ^ p[i]) * 1099511628211ull;
        bytes += n;
    }
};

// What one device received, in order. A whole burst of zeros is not counted: a callback that
// finds the stream not yet marked playing right after start() leaves the burst as the device
// handed it over, which the host device plays as silence; generated sound never holds a burst
// of exact zeros, so no generated data can hide there.
struct DeviceLog {
    std::mutex lock;
    Fnv received;
    uint64_t silent_bursts = 0;
};

std::mutex g_devices_lock;
std::vector<std::unique_ptr<DeviceLog>> g_devices;  // in track creation order; outlive the tracks

class LoggingSink final : public kova_host::AudioSink {
   public:
    explicit LoggingSink(DeviceLog* log) : log_(log) {}
    void write(const void* data, size_t bytes) override {
        const auto* p = static_cast<const uint8_t*>(data);
        const bool silent =
            bytes == kBurstBytes && std::all_of(p, p + bytes, [](uint8_t b) { return b == 0; });
        std::lock_guard<std::mutex> guard(log_->lock);
        if (silent) {
            ++log_->silent_bursts;
        } else {
            log_->received.add(data, bytes);
        }
    }

   private:
    DeviceLog* log_;
};

std::unique_ptr<kova_host::AudioSink> make_logging_sink(uint32_t, uint32_t) {
    std::lock_guard<std::mutex> guard(g_devices_lock);
    g_devices.push_back(std::make_unique<DeviceLog>());
    return std::make_unique<LoggingSink>(g_devices.back().get());
}

long resident_bytes() {
    long pages = 0, resident = 0;
    std::ifstream("/proc/self/statm") >> pages >> resident;
    return resident * sysconf(_SC_PAGESIZE);
}

int soak_seconds() {
    const char* s = std::getenv("KOVA_SOAK_SECONDS");
    const int v = s != nullptr ? std::atoi(s) : 0;
    return v > 0 ? v : 3;
}

// Registrations are serialised here so the allocations each one makes can be counted.
std::mutex g_register_lock;
std::atomic<unsigned long> g_register_allocs{0};

struct Result {
    uint64_t events = 0;
    uint64_t strokes = 0;
    uint64_t strokes_checked = 0;  // strokes in which the producer kept up
    uint64_t thin_moments = 0;     // stream below one burst while the producer kept up
    uint64_t refused_room = 0;     // a block that could not have fitted
    uint64_t dropped = 0;          // blocks the stream refused (not stored, never played)
    uint64_t drains = 0;
    uint64_t mismatches = 0;  // device content differed from the generated blocks
    uint64_t registrations = 0;
    uint64_t bytes = 0;
};

class Producer {
   public:
    Producer(int index, jlong id, DeviceLog* device, const std::string (&paths)[3],
             Clock::time_point t0)
        : index_(index), id_(id), device_(device), rng_(1234u + index), t0_(t0) {
        for (int i = 0; i < 3; ++i) paths_[i].utf = paths[i];
        inst_ = pKOVAInfo[id - 1].pInstance;
    }

    void run(Clock::time_point stop_at) {
        JNIEnv* env = fake_jni::env();
        Java_com_corvane_audio_Kova_start_1fasttrack(env, nullptr, id_);
        auto next = Clock::now();
        while (Clock::now() < stop_at) {
            stroke(next);
            ++result_.strokes;
            // Between strokes: a finger's pause, longer than the end sound, so the stream empties
            // as on a phone; now and then a registration, a new tune set, a thickness or volume
            // change, or a drained stop and restart.
            next += std::chrono::milliseconds(250 + rng_() % 350);
            std::this_thread::sleep_until(next);
            const unsigned r = rng_() % 10;
            if (r < 2) register_set();
            if (r == 2) retune();
            if (r == 3)
                Java_com_corvane_audio_Kova_set_1thickness(env, nullptr, id_, 0.1 * (rng_() % 11));
            if (r == 4)
                Java_com_corvane_audio_Kova_set_1volume(env, nullptr, id_,
                                                        0.5 + 0.05 * (rng_() % 10));
            if (r >= 8) {
                drain_and_compare();
                Java_com_corvane_audio_Kova_stop_1fasttrack(env, nullptr, id_);
                Java_com_corvane_audio_Kova_start_1fasttrack(env, nullptr, id_);
            }
            next = Clock::now();
        }
        drain_and_compare();
        Java_com_corvane_audio_Kova_stop_1fasttrack(env, nullptr, id_);
    }

    const Result& result() const { return result_; }

   private:
    int64_t now_ms() const {
        return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - t0_).count();
    }

    uint32_t ring_read_space() {
        KOVA_FASTTRACK* ft = inst_->pFastTrack;
        pthread_mutex_lock(ft->pMutex);
        const uint32_t n = kova_ringbuffer_read_space(ft->pRing);
        pthread_mutex_unlock(ft->pMutex);
        return n;
    }
    uint32_t ring_write_index() {
        KOVA_FASTTRACK* ft = inst_->pFastTrack;
        pthread_mutex_lock(ft->pMutex);
        const uint32_t n = ft->pRing->writeIdx;
        pthread_mutex_unlock(ft->pMutex);
        return n;
    }
    uint32_t ring_write_space() {
        KOVA_FASTTRACK* ft = inst_->pFastTrack;
        pthread_mutex_lock(ft->pMutex);
        const uint32_t n = kova_ringbuffer_write_space(ft->pRing);
        pthread_mutex_unlock(ft->pMutex);
        return n;
    }

    // One event through the Java entry point; the block it generated is what the device must
    // receive next.
    void event(float x, float y, int action) {
        // The stream only ever gains room while the producer is away, so room seen now is room
        // at the write.
        if (ring_write_space() < kStartBytes + kEndBytes) ++result_.refused_room;
        // Only this thread writes, so the write index moves exactly when the block was stored;
        // a block the stream refused (the call still returns its length) is a drop, and the
        // device must not expect it.
        const uint32_t write_before = ring_write_index();
        const jint n = Java_com_corvane_audio_Kova_gen_1tofasttrack(fake_jni::env(), nullptr, id_,
                                                                    x, y, now_ms(), 0.0f, action);
        ASSERT_GE(n, 0);
        if (n > 0 && ring_write_index() == write_before) {
            ++result_.dropped;
            return;
        }
        written_.add(inst_->pcm.data, static_cast<size_t>(n));
        result_.bytes += static_cast<uint64_t>(n);
        ++result_.events;
    }

    void stroke(Clock::time_point& next) {
        float x = static_cast<float>(100 + rng_() % 800);
        float y = static_cast<float>(200 + rng_() % 1800);
        event(x, y, KOVA_ACTION_START);
        const int moves = 40 + static_cast<int>(rng_() % 150);  // 0.3 to 1.5 s
        float vx = static_cast<float>(3 + rng_() % 30), vy = static_cast<float>(3 + rng_() % 30);
        bool kept_up = true;
        auto last = Clock::now();
        for (int i = 0; i < moves; ++i) {
            next += std::chrono::milliseconds(kEventMs);
            std::this_thread::sleep_until(next);
            const auto now = Clock::now();
            next = std::max(next, now);  // a late producer resumes its pace instead of bursting
            if (now - last > std::chrono::milliseconds(kKeepUpMs)) kept_up = false;
            last = now;
            // Ahead of every move the stream must still hold audio: it only drains between
            // two writes, so it never ran dry since the last one.
            if (kept_up && ring_read_space() < kBurstBytes) ++result_.thin_moments;
            if (i % 25 == 0) vx = -vx;
            x = std::clamp(x + vx, 0.0f, 1079.0f);
            y = std::clamp(y + vy, 0.0f, 2279.0f);
            if (y <= 0.0f || y >= 2279.0f) vy = -vy;
            event(x, y, KOVA_ACTION_MOVE);
        }
        next += std::chrono::milliseconds(kEventMs);
        std::this_thread::sleep_until(next);
        event(x, y, KOVA_ACTION_END);
        if (kept_up) ++result_.strokes_checked;
    }

    void register_set() {
        JNIEnv* env = fake_jni::env();
        {
            std::lock_guard<std::mutex> guard(g_register_lock);
            const unsigned long before = kova_mem_alloc_count();
            const jint set = Java_com_corvane_audio_Kova_reg_1src_1byfiles(
                env, nullptr, id_, fake_jni::jstr(paths_[0]), fake_jni::jstr(paths_[1]),
                fake_jni::jstr(paths_[2]));
            g_register_allocs += kova_mem_alloc_count() - before;
            if (set > 0) ++result_.registrations;
        }
        const jint count = Java_com_corvane_audio_Kova_get_1src_1num(env, nullptr, id_);
        Java_com_corvane_audio_Kova_set_1src(env, nullptr, id_,
                                             1 + static_cast<jint>(rng_() % count));
    }

    void retune() {
        // Panning, oscillator and pitch raise vary; the pitch raise keeps a block's length
        // close to its time span, so the stream's fill stays steady.
        const jint osc = static_cast<jint>(rng_() % 2), sharp = static_cast<jint>(rng_() % 2);
        Java_com_corvane_audio_Kova_set_1tuneset(
            fake_jni::env(), nullptr, id_,
            Java_com_corvane_audio_Kova_get_1src_1num(fake_jni::env(), nullptr, id_), 1.0, 0.4, osc,
            0.3, sharp, 0.2, 0.0, 0.4, 0.6, 0.9, 0.6);
    }

    // Waits until the device took everything written, then compares contents.
    void drain_and_compare() {
        const auto give_up = Clock::now() + 60s;  // a hang guard, not a time limit on the code
        for (;;) {
            {
                std::lock_guard<std::mutex> guard(device_->lock);
                if (device_->received.bytes >= written_.bytes) break;
            }
            if (Clock::now() > give_up) break;
            std::this_thread::sleep_for(2ms);
        }
        std::lock_guard<std::mutex> guard(device_->lock);
        if (device_->received.bytes != written_.bytes || device_->received.h != written_.h) {
            ++result_.mismatches;
        }
        ++result_.drains;
    }

    const int index_;
    const jlong id_;
    DeviceLog* const device_;
    fake_jni::String paths_[3];
    std::mt19937 rng_;
    const Clock::time_point t0_;
    KovaInstance* inst_;
    Fnv written_;
    Result result_;
};

TEST(Soak, InstancesStreamStrokesWithoutLossUnderrunOrGrowth) {
    jni_test::PcmFiles files;
    const std::string paths[3] = {files.write("start.pcm", kStartBytes, 660.0),
                                  files.write("loop.pcm", kLoopBytes, 220.0),
                                  files.write("end.pcm", kEndBytes, 440.0)};
    kova_host::use_sink_factory(make_logging_sink);
    JNIEnv* env = fake_jni::env();
    ASSERT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);

    std::vector<jlong> ids;
    for (int i = 0; i < kInstances; ++i) {
        const jlong id = Java_com_corvane_audio_Kova_init(env, nullptr, 48000, 2, 1, 1080, 2280);
        ASSERT_GE(id, 1);
        ids.push_back(id);
        fake_jni::String s[3] = {{paths[0]}, {paths[1]}, {paths[2]}};
        ASSERT_EQ(
            Java_com_corvane_audio_Kova_reg_1src_1byfiles(
                env, nullptr, id, fake_jni::jstr(s[0]), fake_jni::jstr(s[1]), fake_jni::jstr(s[2])),
            1);
    }
    kova_host::use_sink_factory(nullptr);
    ASSERT_EQ(g_devices.size(), static_cast<size_t>(kInstances));

    const unsigned long allocs_before = kova_mem_alloc_count();
    const long resident_before = resident_bytes();
    const auto t0 = Clock::now();
    const auto stop_at = t0 + std::chrono::seconds(soak_seconds());
    std::vector<std::unique_ptr<Producer>> producers;
    for (int i = 0; i < kInstances; ++i) {
        producers.push_back(std::make_unique<Producer>(i, ids[i], g_devices[i].get(), paths, t0));
    }
    std::vector<std::thread> threads;
    for (auto& p : producers) threads.emplace_back([&p, stop_at] { p->run(stop_at); });
    for (auto& t : threads) t.join();
    const long resident_after = resident_bytes();
    const unsigned long allocs_after = kova_mem_alloc_count();

    Result total;
    for (const auto& p : producers) {
        const Result& r = p->result();
        EXPECT_EQ(r.mismatches, 0u) << "device content differs from the generated blocks";
        EXPECT_EQ(r.thin_moments, 0u) << "stream ran dry while the producer kept up";
        EXPECT_EQ(r.refused_room, 0u) << "stream had no room for a block";
        EXPECT_EQ(r.dropped, 0u) << "stream refused blocks";
        EXPECT_GT(r.strokes, 0u);
        EXPECT_GT(r.bytes, 0u);
        total.events += r.events;
        total.strokes += r.strokes;
        total.strokes_checked += r.strokes_checked;
        total.drains += r.drains;
        total.dropped += r.dropped;
        total.registrations += r.registrations;
        total.bytes += r.bytes;
    }
    // Generation, streaming, starting and stopping allocate nothing: every library allocation
    // of the run was made by a registration.
    EXPECT_EQ(allocs_after - allocs_before, g_register_allocs.load());
    // Resident memory may grow by the sets registered, plus slack for the allocator and the
    // test's own bookkeeping; a per-event or per-stroke leak would exceed it over a long run.
    const long allowed = static_cast<long>(total.registrations) * kSetBytes + (24L << 20);
    if (kResidentMeaningful) {
        EXPECT_LE(resident_after - resident_before, allowed);
    }

    for (jlong id : ids) EXPECT_EQ(Java_com_corvane_audio_Kova_deinit(env, nullptr, id), 0);
    uint64_t silent = 0;
    for (const auto& d : g_devices) {
        std::lock_guard<std::mutex> guard(d->lock);
        silent += d->silent_bursts;
    }
    std::printf(
        "soak: %d s, %d instances, %llu events, %llu strokes (%llu with the producer "
        "keeping up), %llu registrations, %llu drains, %.1f MB streamed, resident "
        "%+ld KB, host underruns %lu of %lu bursts, %llu silent bursts, %llu dropped blocks\n",
        soak_seconds(), kInstances, (unsigned long long)total.events,
        (unsigned long long)total.strokes, (unsigned long long)total.strokes_checked,
        (unsigned long long)total.registrations, (unsigned long long)total.drains,
        total.bytes / 1e6, (resident_after - resident_before) / 1024, kova_host_underruns(),
        kova_host_callbacks(), (unsigned long long)silent, (unsigned long long)total.dropped);
}

}  // namespace
