// SPDX-License-Identifier: Apache-2.0
// Generation per motion event on an engine that plays the three registered files: time per event,
// real-time factor (seconds of audio per second of CPU) and heap allocations per event.
#include <algorithm>
#include <cstdint>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

#include "alloc_count.h"
#include "bench_clock.h"
#include "bench_files.h"
#include "bench_registry.h"
#include "bench_signal.h"
#include "kova/kova_dsp.h"
#include "kova/kova_engine.h"
#include "summary.h"
#include "util/kova_mem.h"

// The library's process-wide clip rotation; reset before each output fingerprint so that the
// fingerprints do not depend on what ran before.
extern int16_t clip_count_hi;
extern int16_t clip_count_lo;

namespace kova_bench {
namespace {

constexpr uint32_t kRate = 48000;
constexpr uint32_t kChannels = 2;
constexpr int64_t kMoveMs = 16;
constexpr int32_t kOutBytes = 960000;  // the instance's PCM buffer

enum class Event { start, end, move };

struct GenCase {
    const char* label;
    Event event;
    uint32_t p;  // position panning (format)
    int32_t osc;
    int32_t sharp;
    double sharpness;
    double target_rtf;  // 0: no target
};

constexpr GenCase kCases[] = {
    {"start", Event::start, 0, 0, 0, 0.2, 0},          {"end", Event::end, 0, 0, 0, 0.2, 0},
    {"move_plain", Event::move, 0, 0, 0, 0.2, 1000},   {"move_osc", Event::move, 0, 1, 0, 0.2, 0},
    {"move_pan", Event::move, 1, 0, 0, 0.2, 0},        {"move_pitch", Event::move, 0, 0, 1, 0.2, 0},
    {"move_pitch_deep", Event::move, 0, 0, 1, 1.0, 0}, {"move_all", Event::move, 1, 1, 1, 0.2, 300},
};

// A closed path of four 16 ms moves (its steps add up to zero, so a stroke never leaves the
// screen): 3.1, 0.9, 3.1 and 3.2 px/ms, none of them fast enough to reset the loop.
struct Step {
    float dx, dy;
};
constexpr Step kPath[] = {{30, 40}, {12, -9}, {-45, 20}, {3, -51}};

struct CtxDeleter {
    void operator()(KOVA_CTX* c) const { kova_deinit(c); }
};
using CtxPtr = std::unique_ptr<KOVA_CTX, CtxDeleter>;

// 48000 Hz stereo on a 1080x2280 screen with the three files registered and the case's tuning.
CtxPtr make_engine(const GenCase& c) {
    KOVA_FORMAT fmt{kRate, kChannels, c.p, 1080, 2280};
    int32_t err = 0;
    CtxPtr ctx(kova_init(&fmt, &err));
    if (!ctx) return ctx;
    if (kova_reg_src_byfiles(ctx.get(), pcm_paths(), &err) != 1 ||
        kova_set_active_src(ctx.get(), 1) != KOVA_OK) {
        return nullptr;
    }
    KOVA_TUNE_SET tune{};
    _cfg_tune_default(&tune);
    tune.osc_enable = c.osc;
    tune.osc_depth = 0.5;
    tune.sharp_enable = c.sharp;
    tune.sharpness = c.sharpness;
    tune.pan = 0.4;
    if (kova_set_tuneset(ctx.get(), 1, &tune) != KOVA_OK) return nullptr;
    return ctx;
}

// Walks the stroke: a start at the centre, then moves along the closed path.
class Stroke {
   public:
    KOVA_PARAM start() {
        k_ = 0;
        x_ = 540;
        y_ = 1140;
        t_ = 1000;
        return KOVA_PARAM{x_, y_, t_, 0.0f, KOVA_ACTION_START};
    }
    KOVA_PARAM move() {
        const Step& s = kPath[k_++ & 3];
        x_ += s.dx;
        y_ += s.dy;
        t_ += kMoveMs;
        return KOVA_PARAM{x_, y_, t_, 0.0f, KOVA_ACTION_MOVE};
    }
    KOVA_PARAM end() const { return KOVA_PARAM{x_, y_, t_ + kMoveMs, 0.0f, KOVA_ACTION_END}; }

   private:
    uint32_t k_ = 0;
    float x_ = 0, y_ = 0;
    int64_t t_ = 0;
};

// The floor: the equaliser's recurrence alone over one 16 ms stereo block (1536 samples, one
// state chain across both channels), inputs already normalised, nothing else. Each sample is
// two chains of four dependent operations (subtract, multiply, add, add); no implementation of
// the same output can take less than one such chain per sample.
constexpr int kFloorSamples = static_cast<int>(kChannels * kRate * kMoveMs / 1000);

[[gnu::noinline]] void floor_recurrence(const double* x, int n, KOVA_EQ& eq) {
    constexpr double kBias = 2.3283064370807974e-10;
    double low = eq.low_state;
    double high = eq.high_state;
    const double lc = eq.low_coef;
    const double hc = eq.high_coef;
    for (int i = 0; i < n; ++i) {
        low = low + (lc * (x[i] - low) + kBias);
        high = high + (hc * (x[i] - high) + kBias);
    }
    eq.low_state = low;
    eq.high_state = high;
}

void bm_floor(benchmark::State& state) {
    const std::vector<int16_t> pcm = noise_pcm(kFloorSamples, 7);
    std::vector<double> x(pcm.size());
    for (size_t i = 0; i < pcm.size(); ++i) x[i] = pcm[i] * 9.0 / 2147483647.0;
    KOVA_EQ eq;
    kova_eq_init(&eq, 880, 5000, kRate);
    for (auto _ : state) {
        floor_recurrence(x.data(), kFloorSamples, eq);
        benchmark::DoNotOptimize(eq.low_state);
        benchmark::DoNotOptimize(eq.high_state);
    }
}

constexpr const char* kFloorName = "generate/floor_recurrence";

std::string name_of(const GenCase& c) {
    return std::string("generate/") + c.label;
}

void bm_generate(benchmark::State& state, GenCase c) {
    CtxPtr ctx = make_engine(c);
    if (!ctx) {
        state.SkipWithError("engine setup failed");
        return;
    }
    std::vector<int16_t> buf(kOutBytes / 2);
    KOVA_PCMBUF out{buf.data(), kOutBytes};
    Stroke stroke;
    KOVA_PARAM ev = stroke.start();
    kova_gen_sounds(ctx.get(), &ev, &out);
    const KOVA_PARAM fixed_event = c.event == Event::start ? stroke.start() : stroke.end();

    uint64_t bytes = 0, empty = 0;
    const uint64_t allocs_before = thread_alloc_count();
    const unsigned long lib_allocs_before = kova_mem_alloc_count();
    for (auto _ : state) {
        if (c.event == Event::move) ev = stroke.move();
        const int32_t n =
            kova_gen_sounds(ctx.get(), c.event == Event::move ? &ev : &fixed_event, &out);
        empty += n == 0;
        bytes += static_cast<uint64_t>(n);
        benchmark::ClobberMemory();
    }
    const double events = static_cast<double>(state.iterations());
    const double allocs = static_cast<double>(thread_alloc_count() - allocs_before);
    const double lib_allocs = static_cast<double>(kova_mem_alloc_count() - lib_allocs_before);
    if (empty != 0) state.SkipWithError("an event produced no sound");

    const double audio_s = static_cast<double>(bytes) / (2.0 * kChannels * kRate);
    state.counters["x_realtime"] = benchmark::Counter(audio_s, benchmark::Counter::kIsRate);
    state.counters["bytes/event"] = static_cast<double>(bytes) / events;
    state.counters["allocs/event"] = allocs / events;
    state.counters["lib_allocs/event"] = lib_allocs / events;
}

// FNV-1a of everything a fixed stroke (start, 400 moves, end) produces, from a fresh engine:
// equal fingerprints before and after a change to the library mean identical output.
void fingerprints() {
    preamble() << "\nGeneration output fingerprints (FNV-1a of start + 400 moves + end):\n";
    for (const GenCase& c : kCases) {
        if (c.event != Event::move) continue;
        CtxPtr ctx = make_engine(c);
        if (!ctx) {
            preamble() << "- " << c.label << ": engine setup failed\n";
            continue;
        }
        clip_count_hi = 0;
        clip_count_lo = 0;
        std::vector<int16_t> buf(kOutBytes / 2);
        KOVA_PCMBUF out{buf.data(), kOutBytes};
        Stroke stroke;
        uint64_t h = kFnvBasis, total = 0;
        auto run = [&](const KOVA_PARAM& ev) {
            const int32_t n = kova_gen_sounds(ctx.get(), &ev, &out);
            h = fnv1a(h, buf.data(), static_cast<std::size_t>(n));
            total += static_cast<uint64_t>(n);
        };
        run(stroke.start());
        for (int i = 0; i < 400; ++i) run(stroke.move());
        run(stroke.end());
        char line[128];
        std::snprintf(line, sizeof line, "- %-16s %016llx (%llu bytes)\n", c.label,
                      static_cast<unsigned long long>(h), static_cast<unsigned long long>(total));
        preamble() << line;
    }
}

// The same ratios from the fastest batch of each kind: 20 moves (or 20 floors) timed together,
// kinds in turn, 300 rounds. On a busy machine the medians above move by 10 to 20 % between runs;
// the fastest batch is the code's own cost with nothing else interfering, and repeats within
// about 1 %.
void steady_floor() {
    constexpr int kBatch = 20;
    constexpr int kSteadyRounds = 300;
    constexpr const char* kMoves[] = {"move_plain", "move_pan", "move_osc", "move_pitch",
                                      "move_all"};
    constexpr std::size_t kKinds = std::size(kMoves);
    struct Engine {
        CtxPtr ctx;
        Stroke stroke;
        double best = 1e9;
        double target = 0;
    };
    std::vector<Engine> engines(kKinds);
    std::vector<int16_t> buf(kOutBytes / 2);
    KOVA_PCMBUF out{buf.data(), kOutBytes};
    for (std::size_t k = 0; k < kKinds; ++k) {
        for (const GenCase& c : kCases) {
            if (std::string(c.label) != kMoves[k]) continue;
            engines[k].ctx = make_engine(c);
            engines[k].target = k == 0 ? 1.5 : (k == kKinds - 1 ? 2.5 : 0);
        }
        if (!engines[k].ctx) return;
        const KOVA_PARAM ev = engines[k].stroke.start();
        kova_gen_sounds(engines[k].ctx.get(), &ev, &out);
    }
    const std::vector<int16_t> pcm = noise_pcm(kFloorSamples, 7);
    std::vector<double> x(pcm.size());
    for (size_t i = 0; i < pcm.size(); ++i) x[i] = pcm[i] * 9.0 / 2147483647.0;
    KOVA_EQ eq;
    kova_eq_init(&eq, 880, 5000, kRate);
    double floor_best = 1e9;
    for (int round = 0; round < kSteadyRounds; ++round) {
        double t0 = now_s();
        for (int i = 0; i < kBatch; ++i) floor_recurrence(x.data(), kFloorSamples, eq);
        floor_best = std::min(floor_best, now_s() - t0);
        for (Engine& e : engines) {
            t0 = now_s();
            for (int i = 0; i < kBatch; ++i) {
                const KOVA_PARAM ev = e.stroke.move();
                kova_gen_sounds(e.ctx.get(), &ev, &out);
            }
            e.best = std::min(e.best, now_s() - t0);
        }
    }
    preamble() << "\n### Generation against the floor, fastest of " << kSteadyRounds
               << " batches of " << kBatch << " (floor " << fixed(floor_best / kBatch * 1e6, 2)
               << " us)\n\n| move | us/event | x floor | target |\n|---|---|---|---|\n";
    for (std::size_t k = 0; k < kKinds; ++k) {
        const double ratio = engines[k].best / floor_best;
        preamble() << "| " << kMoves[k] << " | " << fixed(engines[k].best / kBatch * 1e6, 2)
                   << " | " << fixed(ratio, 2) << " | ";
        if (engines[k].target > 0) {
            preamble() << "<= " << fixed(engines[k].target, 1) << " "
                       << verdict(ratio <= engines[k].target) << " |\n";
        } else {
            preamble() << "- |\n";
        }
    }
}

// Library time per 16 ms move over the floor's time, both medians of the same run.
int floor_summary(const Results& r, std::ostream& out) {
    const Measured* floor = find(r, kFloorName);
    if (!floor) return 0;
    struct Row {
        const char* label;
        const char* bench;
        double target;
    };
    constexpr Row kRows[] = {{"plain move", "generate/move_plain", 1.5},
                             {"move with panning", "generate/move_pan", 0},
                             {"move with oscillator", "generate/move_osc", 0},
                             {"move with pitch raise", "generate/move_pitch", 0},
                             {"move with all features", "generate/move_all", 2.5}};
    int missed = 0;
    out << "\n### Generation against the floor (16 ms stereo move at 48000 Hz; floor: the "
           "equaliser's recurrence alone over the same 1536 samples, "
        << fixed(floor->cpu_ns / 1e3, 2) << " us)\n\n"
        << "| move | us/event | x floor | target |\n|---|---|---|---|\n";
    for (const Row& row : kRows) {
        const Measured* m = find(r, row.bench);
        if (!m) continue;
        const double ratio = m->cpu_ns / floor->cpu_ns;
        out << "| " << row.label << " | " << fixed(m->cpu_ns / 1e3, 2) << " | " << fixed(ratio, 2)
            << " | ";
        if (row.target > 0) {
            missed += ratio > row.target;
            out << "<= " << fixed(row.target, 1) << " " << verdict(ratio <= row.target);
        } else {
            out << "-";
        }
        out << " |\n";
    }
    return missed;
}

int summary(const Results& r, std::ostream& out) {
    int missed = 0;
    out << "\n### Generation per event (48000 Hz stereo, 1080x2280, files of 38400/192000/38400 "
           "bytes)\n\n"
        << "| event | CPU us/event | audio per event | x real time | target | heap allocs/event "
        << "(all / library) |\n"
        << "|---|---|---|---|---|---|\n";
    for (const GenCase& c : kCases) {
        const Measured* m = find(r, name_of(c));
        if (!m) continue;
        const double rtf = m->counters.at("x_realtime");
        const double audio_ms = m->counters.at("bytes/event") / (2.0 * kChannels * kRate) * 1e3;
        out << "| " << c.label << " | " << fixed(m->cpu_ns / 1e3, 2) << " | " << fixed(audio_ms, 1)
            << " ms | " << fixed(rtf, 0) << " | ";
        if (c.target_rtf > 0) {
            missed += rtf < c.target_rtf;
            out << ">= " << fixed(c.target_rtf, 0) << " " << verdict(rtf >= c.target_rtf);
        } else {
            out << "-";
        }
        const double allocs = m->counters.at("allocs/event");
        const double lib_allocs = m->counters.at("lib_allocs/event");
        missed += allocs != 0 || lib_allocs != 0;
        out << " | " << (alloc_counting_enabled() ? fixed(allocs, 0) : std::string("n/a")) << " / "
            << fixed(lib_allocs, 0) << " " << verdict(allocs == 0 && lib_allocs == 0) << " |\n";
    }
    return missed;
}

}  // namespace

void register_generate_benchmarks() {
    fingerprints();
    steady_floor();
    for (const GenCase& c : kCases) {
        benchmark::RegisterBenchmark(name_of(c).c_str(), bm_generate, c);
    }
    benchmark::RegisterBenchmark(kFloorName, bm_floor);
    add_section(30, summary);
    add_section(31, floor_summary);
}

}  // namespace kova_bench
