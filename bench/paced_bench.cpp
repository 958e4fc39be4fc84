// Moves paced as a finger makes them: one event every 16 ms, with the caches evicted in between
// (an application and the system run between two touch events). Wall time of each call, next
// to the back-to-back figure of the same move, which keeps its data cached and understates
// what an event costs in use.
#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

#include "bench_clock.h"
#include "bench_files.h"
#include "bench_registry.h"
#include "kova/kova_engine.h"
#include "summary.h"

namespace kova_bench {
namespace {

constexpr int kEvents = 60;                // about one second of moves per repetition
constexpr size_t kEvictBytes = 32u << 20;  // larger than the last-level cache

// Writes over a buffer larger than the caches, so the next event finds none of its data there.
void evict(std::vector<uint8_t>& junk) {
    for (size_t i = 0; i < junk.size(); i += 64) junk[i] = static_cast<uint8_t>(junk[i] + 1);
    benchmark::ClobberMemory();
}

struct PacedCase {
    const char* label;
    const char* back_to_back;  // the unpaced benchmark of the same move
    uint32_t p;
    int32_t osc, sharp;
};

constexpr PacedCase kPaced[] = {{"move_plain", "generate/move_plain", 0, 0, 0},
                                {"move_all", "generate/move_all", 1, 1, 1}};

std::string name_of(const PacedCase& c) {
    return std::string("paced/") + c.label;
}

void bm_paced(benchmark::State& state, PacedCase c) {
    KOVA_FORMAT fmt{48000, 2, c.p, 1080, 2280};
    int32_t err = 0;
    KOVA_CTX* ctx = kova_init(&fmt, &err);
    KOVA_TUNE_SET tune{};
    _cfg_tune_default(&tune);
    tune.osc_enable = c.osc;
    tune.osc_depth = 0.5;
    tune.sharp_enable = c.sharp;
    if (ctx == nullptr || kova_reg_src_byfiles(ctx, pcm_paths(), &err) != 1 ||
        kova_set_active_src(ctx, 1) != KOVA_OK || kova_set_tuneset(ctx, 1, &tune) != KOVA_OK) {
        state.SkipWithError("engine setup failed");
        kova_deinit(ctx);
        return;
    }
    std::vector<int16_t> buf(480000);
    KOVA_PCMBUF out{buf.data(), 960000};
    std::vector<uint8_t> junk(kEvictBytes);
    // A stroke along a square, 16 px per event.
    constexpr float kDx[4] = {16, 0, -16, 0};
    constexpr float kDy[4] = {0, 16, 0, -16};
    KOVA_PARAM ev{540, 1140, 1000, 0.0f, KOVA_ACTION_START};
    kova_gen_sounds(ctx, &ev, &out);
    ev.action = KOVA_ACTION_MOVE;
    uint32_t k = 0;
    int64_t empty = 0;
    double tick = now_s();
    // One event per iteration; only the call is timed.
    for (auto _ : state) {
        evict(junk);
        tick += 0.016;
        sleep_until_s(tick);
        ev.x += kDx[(k / 8) & 3];
        ev.y += kDy[(k / 8) & 3];
        ++k;
        ev.time += 16;
        const double t0 = now_s();
        empty += kova_gen_sounds(ctx, &ev, &out) == 0;
        state.SetIterationTime(now_s() - t0);
    }
    if (empty != 0) state.SkipWithError("an event produced no sound");
    kova_deinit(ctx);
}

// Paced wall time per event beside the back-to-back CPU time of the same move.
int summary(const Results& r, std::ostream& out) {
    out << "\n### Paced moves (one every 16 ms, caches evicted between events; wall time of the "
           "call)\n\n| move | paced us/event | back-to-back us/event | paced / back-to-back "
           "|\n|---|---|---|---|\n";
    for (const PacedCase& c : kPaced) {
        // The framework names a run with a fixed count and manual time after both.
        const Measured* paced =
            find(r, name_of(c) + "/iterations:" + std::to_string(kEvents) + "/manual_time");
        const Measured* b2b = find(r, c.back_to_back);
        if (!paced) continue;
        out << "| " << c.label << " | " << fixed(paced->real_ns / 1e3, 2) << " | "
            << (b2b ? fixed(b2b->cpu_ns / 1e3, 2) : std::string("-")) << " | "
            << (b2b ? fixed(paced->real_ns / b2b->cpu_ns, 2) : std::string("-")) << " |\n";
    }
    return 0;
}

}  // namespace

void register_paced_benchmarks() {
    for (const PacedCase& c : kPaced) {
        benchmark::RegisterBenchmark(name_of(c).c_str(), bm_paced, c)
            ->Iterations(kEvents)
            ->UseManualTime();
    }
    add_section(32, summary);
}

}  // namespace kova_bench
