// SPDX-License-Identifier: Apache-2.0
// Several instances driven at once through the Java entry points, as an application with a few
// views would: strokes with an event every 8 ms, stops and restarts of the output stream and
// registrations in between, while each instance's device thread drains its stream.
//
// Checked:
//   - each device received exactly the blocks its instance generated, in order (compared
//     whenever the stream was drained), so no block was lost, refused for lack of room or padded;
//   - no underrun while the producer keeps up: during a stroke whose events all came within
//     kKeepUp of each other, the stream still held a device burst ahead of every event;
//   - no per-event or per-stroke allocation: the library allocates only while registering
//     (allocation counter); LeakSanitizer checks that what it allocated is given back.
// Length: KOVA_SOAK_SECONDS (default 3; CI runs 20).
#include <array>
#include <cstdio>
#include <memory>
#include <mutex>
#include <random>

#include "jni/jni_test_support.h"
#include "kova/android/kova_fasttrack.h"
#include "kova/kova_output.h"
#include "kova_host/audio_sink.h"
#include "util/kova_mem.h"

namespace {

using Clock = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr int kInstances = 4;
constexpr auto kEventGap = 8ms;
// The start sound (200 ms) queues ahead of the moves; a producer that is never later than this
// between two events keeps the stream from running dry.
constexpr auto kKeepUp = 100ms;
// One burst of the host device: 4 ms of 48 kHz stereo.
constexpr uint32_t kBurstBytes = 192 * 2 * 2;
constexpr uint32_t kSlotBytes[3] = {38400, 192000, 38400};

using Bytes = std::vector<uint8_t>;

// What one device received, in order. A whole burst of zeros is not counted: a callback that
// finds the stream not yet marked playing right after start() leaves the burst as the device
// handed it over, which the host device plays as silence; generated sound never holds a burst
// of exact zeros, so no generated data can hide there.
struct DeviceLog final : kova_host::AudioSink {
    void write(const void* data, size_t bytes) override {
        const auto* p = static_cast<const uint8_t*>(data);
        const bool silent =
            bytes == kBurstBytes && std::all_of(p, p + bytes, [](uint8_t b) { return b == 0; });
        std::lock_guard<std::mutex> guard(lock);
        if (!silent) received.insert(received.end(), p, p + bytes);
    }
    std::mutex lock;
    Bytes received;
};
std::vector<DeviceLog*> g_devices;  // in track creation order, owned by the tracks

int soak_seconds() {
    const char* s = std::getenv("KOVA_SOAK_SECONDS");
    const int v = s != nullptr ? std::atoi(s) : 0;
    return v > 0 ? v : 3;
}

// Registrations are serialised here so the allocations each one makes can be counted.
std::mutex g_register_lock;
std::atomic<unsigned long> g_register_allocs{0};

// Per producer: events, strokes, moments the stream held less than a burst while the producer
// kept up, drains, drains where the device content differed from the generated blocks,
// registrations, bytes generated.
enum Count { kEvents, kStrokes, kThin, kDrains, kDiffer, kRegs, kBytes };
using Counts = std::array<unsigned long, kBytes + 1>;

class Producer {
   public:
    Producer(int i, jlong id, jni_test::Sounds& snd, Clock::time_point t0)
        : id_(id),
          device_(g_devices[i]),
          rng_(1234u + i),
          t0_(t0),
          inst_(instance(id)),
          snd_(snd) {}

    void run(Clock::time_point stop_at) {
        JAVA(start_1fasttrack, id_);
        auto next = Clock::now();
        while (Clock::now() < stop_at) {
            stroke(next);
            // Between strokes: a finger's pause, longer than the end sound, so the stream empties
            // as on a phone; now and then a registration, a new tune set, a thickness or volume
            // change, or a drained stop and restart.
            next += std::chrono::milliseconds(250 + rng_() % 350);
            std::this_thread::sleep_until(next);
            const unsigned r = rng_() % 10;
            const double v = 0.1 * (rng_() % 11);
            if (r < 2) register_set();
            // Panning, oscillator and pitch raise vary; the pitch raise keeps a block's length
            // close to its time span, so the stream's fill stays steady.
            const jint osc = rng_() % 2, sharp = rng_() % 2, set = num_sets();
            if (r == 2) JAVA(set_1tuneset, id_, set, 1, .4, osc, .3, sharp, .2, 0, .4, .6, .9, .6);
            if (r == 3) JAVA(set_1thickness, id_, v);
            if (r == 4) JAVA(set_1volume, id_, 0.5 + v / 2);
            if (r >= 8) {
                drain_and_compare();
                JAVA(stop_1fasttrack, id_);
                JAVA(start_1fasttrack, id_);
            }
            next = Clock::now();
        }
        drain_and_compare();
        JAVA(stop_1fasttrack, id_);
    }

    void register_set() {
        {
            std::lock_guard<std::mutex> guard(g_register_lock);
            const unsigned long before = kova_mem_alloc_count();
            if (jni_test::reg(id_, snd_) > 0) ++counts[kRegs];
            g_register_allocs += kova_mem_alloc_count() - before;
        }
        JAVA(set_1src, id_, 1 + rng_() % num_sets());
    }

    Counts counts{};

   private:
    static KovaInstance* instance(jlong id) { return pKOVAInfo[id - 1].pInstance; }
    jint num_sets() { return JAVA(get_1src_1num, id_); }
    // Bytes the stream holds (its device thread drains it under the stream's lock).
    uint32_t queued() {
        KOVA_FASTTRACK* ft = inst_->pFastTrack;
        pthread_mutex_lock(ft->pMutex);
        const uint32_t n = kova_ringbuffer_read_space(ft->pRing);
        pthread_mutex_unlock(ft->pMutex);
        return n;
    }

    // One event through the Java entry point; the block it generated is what the device must
    // receive next.
    void event(float x, float y, int action) {
        const int64_t ms = (Clock::now() - t0_) / 1ms;
        const jint n = JAVA(gen_1tofasttrack, id_, x, y, ms, 0.0f, action);
        ASSERT_GE(n, 0);
        const auto* pcm = reinterpret_cast<const uint8_t*>(inst_->pcm.data);
        written_.insert(written_.end(), pcm, pcm + n);
        counts[kBytes] += static_cast<unsigned long>(n);
        ++counts[kEvents];
    }

    // Down, 40 to 190 moves 8 ms apart (0.3 to 1.5 s), up.
    void stroke(Clock::time_point& next) {
        float x = static_cast<float>(100 + rng_() % 800);
        float y = static_cast<float>(200 + rng_() % 1800);
        event(x, y, KOVA_ACTION_START);
        const int moves = 40 + static_cast<int>(rng_() % 150);
        float vx = static_cast<float>(3 + rng_() % 30), vy = static_cast<float>(3 + rng_() % 30);
        bool kept_up = true;
        auto last = Clock::now();
        for (int i = 0; i <= moves; ++i) {
            next += kEventGap;
            std::this_thread::sleep_until(next);
            const auto now = Clock::now();
            next = std::max(next, now);  // a late producer resumes its pace, no burst
            kept_up = kept_up && now - last <= kKeepUp;
            last = now;
            // The stream only drains between two writes, so ahead of every event it must still
            // hold audio.
            if (kept_up && queued() < kBurstBytes) ++counts[kThin];
            if (i % 25 == 0) vx = -vx;
            x = std::clamp(x + vx, 0.0f, 1079.0f);
            y = std::clamp(y + vy, 0.0f, 2279.0f);
            if (y <= 0.0f || y >= 2279.0f) vy = -vy;
            event(x, y, i < moves ? KOVA_ACTION_MOVE : KOVA_ACTION_END);
        }
        ++counts[kStrokes];
    }

    // Waits until the device took everything written, then compares contents.
    void drain_and_compare() {
        const auto give_up = Clock::now() + 60s;  // a hang guard, not a time limit on the code
        std::unique_lock<std::mutex> guard(device_->lock);
        while (device_->received.size() < written_.size() && Clock::now() < give_up) {
            guard.unlock();
            std::this_thread::sleep_for(2ms);
            guard.lock();
        }
        if (device_->received != written_) ++counts[kDiffer];
        ++counts[kDrains];
    }

    const jlong id_;
    DeviceLog* const device_;
    std::mt19937 rng_;
    const Clock::time_point t0_;
    KovaInstance* const inst_;
    jni_test::Sounds& snd_;
    Bytes written_;
};

TEST(Soak, InstancesStreamStrokesWithoutLossOrGrowth) {
    jni_test::Sounds snd(kSlotBytes[0], kSlotBytes[1], kSlotBytes[2]);
    kova_host::use_sink_factory([](uint32_t, uint32_t) -> std::unique_ptr<kova_host::AudioSink> {
        auto device = std::make_unique<DeviceLog>();
        g_devices.push_back(device.get());
        return device;
    });
    ASSERT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
    std::vector<jlong> ids;
    for (int i = 0; i < kInstances; ++i) ids.push_back(jni_test::init_default());
    kova_host::use_sink_factory(nullptr);
    ASSERT_EQ(g_devices.size(), static_cast<size_t>(kInstances));
    const auto t0 = Clock::now();
    std::vector<std::unique_ptr<Producer>> producers;
    for (int i = 0; i < kInstances; ++i) {
        ASSERT_GE(ids[i], 1);
        producers.push_back(std::make_unique<Producer>(i, ids[i], snd, t0));
        producers[i]->register_set();
        ASSERT_EQ(producers[i]->counts[kRegs], 1u);
        producers[i]->counts = {};
    }

    const unsigned long allocs_before = kova_mem_alloc_count();
    g_register_allocs = 0;
    const auto stop_at = Clock::now() + std::chrono::seconds(soak_seconds());
    std::vector<std::thread> threads;
    for (auto& p : producers) threads.emplace_back([&p, stop_at] { p->run(stop_at); });
    for (auto& t : threads) t.join();
    const unsigned long allocs_after = kova_mem_alloc_count();

    Counts total{};
    for (const auto& p : producers) {
        const Counts& c = p->counts;
        EXPECT_EQ(c[kDiffer], 0u) << "device content differs from the generated blocks";
        EXPECT_EQ(c[kThin], 0u) << "stream ran dry while the producer kept up";
        EXPECT_GT(c[kBytes], 0u);
        for (size_t k = 0; k < total.size(); ++k) total[k] += c[k];
    }
    // Generation, streaming, starting and stopping allocate nothing: every library allocation
    // of the run was made by a registration.
    EXPECT_EQ(allocs_after - allocs_before, g_register_allocs.load());
    for (jlong id : ids) EXPECT_EQ(jni_test::deinit(id), 0);
    std::printf(
        "soak: %d s, %d instances, %lu events, %lu strokes, %lu registrations, %lu drains, %.1f MB "
        "streamed, host underruns %lu of %lu bursts\n",
        soak_seconds(), kInstances, total[kEvents], total[kStrokes], total[kRegs], total[kDrains],
        total[kBytes] / 1e6, kova_host_underruns(), kova_host_callbacks());
}

}  // namespace
