// SPDX-License-Identifier: Apache-2.0
// Latency as an application meets it: from the gen_tofasttrack call of an event to the moment
// the output device pulls the first byte of that event's sound, for the start event and for the
// moves of a steady stroke (one every 16 ms, 16 ms of sound each), and how much sound is queued
// ahead of each move. The stand-in device pulls 4 ms bursts in real time into a capture store;
// a poller notes when the captured count passes each event's first byte. Once with the
// 200 ms start sound of the benchmark files and once with a 40 ms one: the start sound is
// queued whole ahead of the moves, so its length is added to every move's latency.

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <cstdio>
#include <string>
#include <thread>
#include <vector>

#include "bench_clock.h"
#include "bench_files.h"
#include "bench_registry.h"
#include "jni/jni_entries.h"
#include "kova/kova_engine.h"
#include "kova/android/kova_registry.h"
#include "kova_host/audio_sink.h"
#include "summary.h"

namespace kova_bench {
namespace {

constexpr int kMoves = 60;                  // about one second of stroke
constexpr double kBytesPerMs = 192.0;       // 48000 Hz, 2 channels, 16 bits
constexpr int32_t kShortStartBytes = 7680;  // 40 ms

double now_ms() {
    return now_s() * 1e3;
}

struct Sent {
    double at_ms;
    size_t first_byte;  // offset of the event's first byte in everything written
    size_t captured;    // bytes the device had pulled when the call was made
};

struct Pulled {
    double at_ms;
    size_t total;
};

struct StrokeFigures {
    double start_ms = -1;
    std::vector<double> move_ms;
    std::vector<double> queued_ms;
};

double median(std::vector<double> v) {
    if (v.empty()) return -1;
    std::sort(v.begin(), v.end());
    return v[v.size() / 2];
}

double highest(const std::vector<double>& v) {
    return v.empty() ? -1 : *std::max_element(v.begin(), v.end());
}

// One stroke on a started stream: a start, kMoves moves 16 ms apart, an end.
StrokeFigures run_stroke(jlong id) {
    kova_host_capture_clear();
    std::atomic<bool> stop{false};
    std::vector<Pulled> pulled;
    pulled.reserve(1 << 16);
    std::thread poller([&] {
        size_t last = 0;
        while (!stop.load()) {
            const size_t now = kova_host_capture_size();
            if (now != last) {
                pulled.push_back(Pulled{now_ms(), now});
                last = now;
            }
            timespec pause{0, 100000};
            nanosleep(&pause, nullptr);
        }
    });

    std::vector<Sent> sent;
    size_t written = 0;
    float x = 540, y = 1140;
    int64_t time = 1000;
    double tick = now_ms() + 10.0;
    for (int e = 0; e <= kMoves + 1; ++e) {
        sleep_until_s(tick / 1e3);
        const jint action = e == 0 ? KOVA_ACTION_START : (e > kMoves ? KOVA_ACTION_END : 1);
        if (e > 0) {
            x += (e / 8) % 2 ? 0.0f : 16.0f;
            y += (e / 8) % 2 ? 16.0f : 0.0f;
            time += 16;
        }
        const Sent s{now_ms(), written, kova_host_capture_size()};
        const jint n = Java_com_corvane_audio_Kova_gen_1tofasttrack(nullptr, nullptr, id, x, y,
                                                                    time, 0, action);
        if (n > 0) {
            sent.push_back(s);
            written += static_cast<size_t>(n);
        }
        tick += 16.0;
    }
    const double give_up = now_ms() + 2000.0;
    while (kova_host_capture_size() < written && now_ms() < give_up) sleep_until_s(now_s() + 0.005);
    stop = true;
    poller.join();

    StrokeFigures f;
    for (size_t k = 0; k < sent.size(); ++k) {
        const Sent& s = sent[k];
        auto p = std::find_if(pulled.begin(), pulled.end(),
                              [&](const Pulled& q) { return q.total > s.first_byte; });
        if (p == pulled.end()) continue;
        const double latency = p->at_ms - s.at_ms;
        if (k == 0) {
            f.start_ms = latency;
        } else if (k + 1 < sent.size()) {  // moves; the end is not a move
            f.move_ms.push_back(latency);
            f.queued_ms.push_back(static_cast<double>(s.first_byte - s.captured) / kBytesPerMs);
        }
    }
    return f;
}

// The benchmark files with the start sound cut to 40 ms.
bool write_short_start(std::string& path) {
    path = scratch_path("start-40ms.pcm");
    std::vector<char> bytes(kShortStartBytes);
    FILE* in = std::fopen(pcm_paths()[KOVA_SLOT_START], "rb");
    FILE* out = std::fopen(path.c_str(), "wb");
    bool ok = in && out && std::fread(bytes.data(), 1, bytes.size(), in) == bytes.size() &&
              std::fwrite(bytes.data(), 1, bytes.size(), out) == bytes.size();
    if (in) std::fclose(in);
    if (out) std::fclose(out);
    return ok;
}

}  // namespace

void report_latency() {
    preamble() << "\n### Latency through the output stream (stand-in device: 4 ms bursts in real "
                  "time; moves 16 ms apart)\n\n";
    std::string short_start;
    kova_host_use_capture_sink();
    const jlong id = Java_com_corvane_audio_Kova_init(nullptr, nullptr, 48000, 2, 1, 1080, 2280);
    kova_host_use_null_sink();
    KOVA_CTX* ctx = id >= 1 ? pKOVAInfo[id - 1].pInstance->pCtx : nullptr;
    int32_t err = 0;
    const char* paths[KOVA_SLOT_COUNT] = {nullptr, pcm_paths()[1], pcm_paths()[2]};
    if (!ctx || !write_short_start(short_start) ||
        kova_reg_src_byfiles(ctx, pcm_paths(), &err) != 1 ||
        (paths[0] = short_start.c_str(), kova_reg_src_byfiles(ctx, paths, &err) != 2)) {
        preamble() << "set-up failed\n";
        if (id >= 1) Java_com_corvane_audio_Kova_deinit(nullptr, nullptr, id);
        return;
    }
    preamble()
        << "| start sound | start: call to first byte pulled, ms | move: median, ms | "
           "move: max, ms | audio queued ahead of a move, median ms |\n|---|---|---|---|---|\n";
    const struct {
        int32_t set;
        const char* label;
    } kRuns[] = {{1, "200 ms (38400 bytes)"}, {2, "40 ms (7680 bytes)"}};
    for (const auto& run : kRuns) {
        kova_set_active_src(ctx, run.set);
        Java_com_corvane_audio_Kova_start_1fasttrack(nullptr, nullptr, id);
        const StrokeFigures f = run_stroke(id);
        Java_com_corvane_audio_Kova_stop_1fasttrack(nullptr, nullptr, id);
        preamble() << "| " << run.label << " | " << fixed(f.start_ms, 1) << " | "
                   << fixed(median(f.move_ms), 1) << " | " << fixed(highest(f.move_ms), 1) << " | "
                   << fixed(median(f.queued_ms), 1) << " |\n";
    }
    Java_com_corvane_audio_Kova_deinit(nullptr, nullptr, id);
}

}  // namespace kova_bench
