// SPDX-License-Identifier: Apache-2.0
// 20 instances whose strokes start at the same instant, as twenty views of an application might
// on one touch: each Java thread calls gen_tofasttrack with a start event, and every call holds
// the process-wide registry lock while it generates its start sound. Figures: how long after the
// common instant each call returns, and the part of that spent waiting (the return time less the
// time one start takes alone).

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <pthread.h>
#include <time.h>
#include <thread>
#include <vector>

#include "bench_clock.h"
#include "bench_files.h"
#include "bench_registry.h"
#include "jni/jni_entries.h"
#include "kova/kova_engine.h"
#include "kova/android/kova_registry.h"
#include "summary.h"

namespace kova_bench {
namespace {

constexpr int kInstances = KOVA_MAX_INSTANCES;
constexpr int kRounds = 50;

double now_us() {
    return now_s() * 1e6;
}

double thread_cpu_us() {
    timespec t{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
    return static_cast<double>(t.tv_sec) * 1e6 + static_cast<double>(t.tv_nsec) / 1e3;
}

jint start_stroke(jlong id) {
    return Java_com_corvane_audio_Kova_gen_1tofasttrack(nullptr, nullptr, id, 540.0f, 1140.0f, 1000,
                                                        0.0f, KOVA_ACTION_START);
}

double percentile(std::vector<double> v, double p) {
    std::sort(v.begin(), v.end());
    const auto i = static_cast<size_t>(p * static_cast<double>(v.size() - 1) + 0.5);
    return v[i];
}

// kRounds rounds of kInstances threads that sleep until one common instant and then call
// work(i); the return times after that instant, round after round.
template <class Work>
std::vector<double> rounds(Work work, void (*between)()) {
    std::vector<double> done(static_cast<size_t>(kInstances * kRounds));
    for (int round = 0; round < kRounds; ++round) {
        const double at = now_us() + 20000.0;
        std::vector<std::thread> threads;
        for (int i = 0; i < kInstances; ++i) {
            threads.emplace_back([&, i] {
                sleep_until_s(at / 1e6);
                work(i);
                done[static_cast<size_t>(round * kInstances + i)] = now_us() - at;
            });
        }
        for (std::thread& t : threads) t.join();
        between();
    }
    return done;
}

// What one hand-over of the lock costs: a round's spread of returns over its hand-overs.
std::vector<double> handovers(const std::vector<double>& done) {
    std::vector<double> out;
    for (int round = 0; round < kRounds; ++round) {
        const auto first = done.begin() + round * kInstances;
        const auto [lo, hi] = std::minmax_element(first, first + kInstances);
        out.push_back((*hi - *lo) / (kInstances - 1));
    }
    return out;
}

std::vector<jlong> g_ids;  // the instances of the current report

}  // namespace

void report_registry_wait() {
    std::vector<jlong> ids;
    for (int i = 0; i < kInstances; ++i) {
        const jlong id =
            Java_com_corvane_audio_Kova_init(nullptr, nullptr, 48000, 2, 1, 1080, 2280);
        if (id < 1) break;
        int32_t err = 0;
        KOVA_CTX* ctx = pKOVAInfo[id - 1].pInstance->pCtx;
        if (kova_reg_src_byfiles(ctx, pcm_paths(), &err) != 1 || kova_set_active_src(ctx, 1) != 0) {
            break;
        }
        ids.push_back(id);
    }
    auto release = [&] {
        for (jlong id : ids) Java_com_corvane_audio_Kova_deinit(nullptr, nullptr, id);
    };
    preamble() << "\n### Registry lock: " << kInstances
               << " instances starting strokes at the same instant (" << kRounds
               << " rounds; start sound 38400 bytes = 200 ms)\n\n";
    if (ids.size() != kInstances) {
        preamble() << "instance set-up failed\n";
        release();
        return;
    }

    // One start alone, for the time a call holds the lock.
    std::vector<double> alone;
    for (int i = 0; i < kRounds; ++i) {
        const double t0 = now_us();
        start_stroke(ids[0]);
        alone.push_back(now_us() - t0);
        Java_com_corvane_audio_Kova_stop_1fasttrack(nullptr, nullptr, ids[0]);
    }
    const double hold = percentile(alone, 0.5);

    g_ids = ids;
    const std::vector<double> done =
        rounds([](int i) { start_stroke(g_ids[size_t(i)]); },
               [] {
                   // Emptied between rounds, so that every start sound fits the stream's ring
                   // buffer.
                   for (jlong id : g_ids)
                       Java_com_corvane_audio_Kova_stop_1fasttrack(nullptr, nullptr, id);
               });
    release();
    // The machine's own share: the same threads passing a plain mutex around a busy loop as
    // long as one start alone, with no library code at all.
    static pthread_mutex_t plain = PTHREAD_MUTEX_INITIALIZER;
    static double busy_us;
    busy_us = hold;
    const std::vector<double> plain_done = rounds(
        [](int) {
            pthread_mutex_lock(&plain);
            // On the thread's CPU clock, so that a preempted holder holds on, as real work does.
            const double t0 = thread_cpu_us();
            while (thread_cpu_us() - t0 < busy_us) {
            }
            pthread_mutex_unlock(&plain);
        },
        [] {});

    std::vector<double> wait;
    for (double d : done) wait.push_back(std::max(0.0, d - hold));
    const std::vector<double> handover = handovers(done);
    const std::vector<double> plain_handover = handovers(plain_done);
    const double p99 = percentile(wait, 0.99);
    preamble() << "| figure | p50 | p99 | max | target |\n|---|---|---|---|---|\n"
               << "| one start alone (lock held), us | " << fixed(hold, 0) << " | "
               << fixed(percentile(alone, 0.99), 0) << " | " << fixed(percentile(alone, 1.0), 0)
               << " | - |\n"
               << "| return after the common instant, ms | "
               << fixed(percentile(done, 0.5) / 1e3, 2) << " | "
               << fixed(percentile(done, 0.99) / 1e3, 2) << " | "
               << fixed(percentile(done, 1.0) / 1e3, 2) << " | - |\n"
               << "| wait (return less one start alone), ms | "
               << fixed(percentile(wait, 0.5) / 1e3, 2) << " | " << fixed(p99 / 1e3, 2) << " | "
               << fixed(percentile(wait, 1.0) / 1e3, 2) << " | p99 <= 2 ms "
               << verdict(p99 <= 2000.0) << " |\n"
               << "| one hand-over (round's spread / " << kInstances - 1 << "), us | "
               << fixed(percentile(handover, 0.5), 0) << " | "
               << fixed(percentile(handover, 0.99), 0) << " | "
               << fixed(percentile(handover, 1.0), 0) << " | - |\n"
               << "| plain mutex around a busy loop as long: one hand-over, us | "
               << fixed(percentile(plain_handover, 0.5), 0) << " | "
               << fixed(percentile(plain_handover, 0.99), 0) << " | "
               << fixed(percentile(plain_handover, 1.0), 0) << " | - |\n"
               << "| plain mutex: return after the common instant, ms | "
               << fixed(percentile(plain_done, 0.5) / 1e3, 2) << " | "
               << fixed(percentile(plain_done, 0.99) / 1e3, 2) << " | "
               << fixed(percentile(plain_done, 1.0) / 1e3, 2) << " | - |\n";
}

}  // namespace kova_bench
