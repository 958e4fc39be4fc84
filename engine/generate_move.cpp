// SPDX-License-Identifier: Apache-2.0
// Move events: speed envelope, fast-move reset, the loop block and the optional pitch raise.
#include <cfloat>
#include <cmath>
#include <cstdint>

#include "kova/kova_engine.h"
#include "engine/sample_kernel.h"
#include "dsp/dsp_internal.h"

namespace {

constexpr uint32_t kMinStepMs = 3;
constexpr uint32_t kMaxStepMs = 199;
constexpr int64_t kMinMovePx = 3;
constexpr double kMaxSpeed = 23.0;                // px per ms
constexpr double kEnvSlope = 2.5652173913043477;  // 59 / 23
constexpr double kEnvBase = 6.0;
constexpr double kEnergyDivisor = 5.0;
constexpr double kFastEnergy = 8000.0;
constexpr int32_t kFastMovesBeforeReset = 5;
constexpr int32_t kLoopEndMargin = 4;  // samples
constexpr double kMsPerSecond = 1000.0;
constexpr double kOscFreqFactor = 200.0;
constexpr double kSharpFactor = 0.1;
constexpr int64_t kWorkSamples = KOVA_WORK_BUF_BYTES / 2;
// The resampler's 4.28 step must stay below 7.0; with the output rate rounded down to an even
// number the effective ratio exceeds this cap by at most 0.01 at 8000 Hz.
constexpr double kMaxRatio = 6.9;

// |a - b| along one axis: float difference truncated to an integer. Saturating keeps the
// conversion defined for any finite coordinates; 64 bits keep the magnitude of INT32_MIN.
int64_t axis_delta(float a, float b) {
    const int64_t d = kova::dsp::trunc_sat32(a - b);
    return d < 0 ? -d : d;
}

// Squared distance, formed in float from the integer deltas.
double squared_distance(int64_t dx, int64_t dy) {
    const float fx = static_cast<float>(dx);
    const float fy = static_cast<float>(dy);
    const float d2 = fx * fx + fy * fy;
    return d2;
}

struct LoopBounds {
    int32_t end;      // pos reaching this wraps
    int32_t restart;  // where it wraps to
};

// Loop region from the repeat end. A repeat end under 10 bytes would leave no region (or a
// negative one): the loop then plays over the whole source. A repeat end beyond the samples
// is cut at the last sample. Either way end stays within 1..avail and restart below end.
LoopBounds loop_bounds(const KOVA_SRC* loop, int32_t avail) {
    int32_t end = loop->rpt_end / 2 - kLoopEndMargin;
    if (end < 1) return LoopBounds{avail, 0};
    if (end > avail) end = avail;
    return LoopBounds{end, end / 2};
}

// Oscillator frequency from the speed envelope. Capped at the sample rate, where the period is
// one sample; above it the period would truncate to 0. NaN (a depth read from a file) takes the
// cap as well.
double osc_frequency(double env, double depth, uint32_t sample_rate) {
    const double f = env * (depth * kOscFreqFactor);
    const double cap = static_cast<double>(sample_rate);
    return (f < cap) ? f : cap;
}

// A depth beyond float range (possible in a set read from a file) would make the float
// conversion undefined; it saturates to infinity and the ratio cap takes over.
float depth_as_float(double d) {
    if (d > FLT_MAX) return INFINITY;
    if (d < -FLT_MAX) return -INFINITY;
    return static_cast<float>(d);
}

// Slew memory factor. The equaliser only ever sets 0.7..1.0; a foreign value outside -1..1 (or
// NaN) could push the memory out of 16 bits, so it is held at 1.0, which keeps the sample.
double usable_decay(double decay) {
    return (decay >= -1.0 && decay <= 1.0) ? decay : 1.0;
}

}  // namespace

namespace kova_gen {

int32_t gen_move(KOVA_CTX* ctx, const KOVA_PARAM* cur, KOVA_PCMBUF* out, const GenBlock& b) {
    const KOVA_PARAM* prev = ctx->prev_param;
    const KOVA_TUNE_SET* tune = b.tune;
    KOVA_SRC* loop = b.loop;
    const uint32_t rate = ctx->format->sample_rate;
    const uint32_t channels = ctx->format->channels;

    // Only the low 32 bits of the time step count: an earlier time wraps far outside the range.
    const auto dt =
        static_cast<uint32_t>(static_cast<uint64_t>(cur->time) - static_cast<uint64_t>(prev->time));
    if (dt < kMinStepMs || dt > kMaxStepMs) return 0;
    if (axis_delta(cur->x, prev->x) < kMinMovePx && axis_delta(cur->y, prev->y) < kMinMovePx) {
        return 0;
    }

    // A loop source without samples gives a silent move; it still counts as handled.
    const int32_t avail = playable_samples(loop);
    if (avail < 1) return 0;
    const LoopBounds bounds = loop_bounds(loop, avail);

    // Stays 0 if the envelope sees no time step (only a step wrapped past 32 bits can do that).
    double energy = 0.0;
    const double env = _calc_envelope(prev, cur, &energy, ctx->norm);
    const double e0 = ctx->prev_env;
    ctx->prev_env = env;

    if (energy > kFastEnergy) {
        if (ctx->fast_count >= kFastMovesBeforeReset) {
            loop->pos = bounds.restart;
            ctx->fast_count = 0;
        } else {
            ctx->fast_count = ctx->fast_count + 1;
        }
    }
    // A position outside the samples (left by a repeat change or a hand-made set) restarts the
    // loop; any position inside is played as it stands and wraps as usual.
    if (loop->pos < 0 || loop->pos >= avail) loop->pos = bounds.restart;

    const auto frames = static_cast<uint32_t>(static_cast<double>(rate * dt) / kMsPerSecond);
    const int64_t wanted = static_cast<int64_t>(channels) * frames;
    const int32_t room = out->size / 2;
    const auto n = static_cast<int32_t>(wanted < room ? wanted : room);

    if (tune->osc_enable == 1) {
        kova_osc_set_freq(ctx->osc, osc_frequency(env, tune->osc_depth, rate));
    }
    if (n < 1) return 0;
    const double step = ((env - e0) / n) / channels;

    kova_gen::LoopRender run{};
    run.pcm = loop->pcm_proc;
    run.pos = loop->pos;
    run.loop_end = bounds.end;
    run.restart = bounds.restart;
    run.gain = tune->gain * tune->loop_gain * ctx->volume * b.level;
    run.c = e0;
    run.step = step;
    run.pan_gain[0] = b.pan_gain[0];
    run.pan_gain[1] = b.pan_gain[1];
    run.osc = tune->osc_enable == 1 ? ctx->osc : nullptr;
    run.decay = usable_decay(ctx->eq->slew_decay);
    run.mem_even = ctx->slew_even;
    run.mem_odd = ctx->slew_odd;

    if (tune->sharp_enable != 1) {
        run.slew = true;
        kova_gen::render_loop(ctx->eq, run, out->data, n);
        loop->pos = run.pos;
        ctx->slew_even = run.mem_even;
        ctx->slew_odd = run.mem_odd;
        return n;
    }

    double ratio = _calc_sharpness(env, depth_as_float(tune->sharpness));
    if (ratio > kMaxRatio) ratio = kMaxRatio;
    if (ratio == 1.0) {
        kova_gen::render_loop(ctx->eq, run, out->data, n);
        loop->pos = run.pos;
        return n;
    }

    // Staged samples never exceed the staging buffer (long, fast moves with a deep pitch raise
    // would ask for up to 7x the block).
    int64_t m = static_cast<int64_t>(ratio * n);
    if (m > kWorkSamples) m = kWorkSamples;
    kova_gen::render_loop(ctx->eq, run, ctx->work_buf, m);
    loop->pos = run.pos;

    const auto out_rate = 2 * static_cast<int32_t>((rate / ratio) * 0.5);
    const KOVA_PCMBUF staged{ctx->work_buf, static_cast<int32_t>(m * 2)};
    KOVA_PCMBUF result{out->data, 0};
    // The caller's buffer size bounds the output; the block is about n samples long.
    _resample_s16_stereo_capped(static_cast<int32_t>(rate), out_rate, &staged, &result, out->size);
    return result.size / 2;
}

}  // namespace kova_gen

extern "C" {

KOVA_API double _calc_envelope(const KOVA_PARAM* prev, const KOVA_PARAM* cur, double* energy,
                               double norm) {
    if (prev == nullptr || cur == nullptr) return 0.0;
    int64_t dt = 0;
    if (__builtin_sub_overflow(cur->time, prev->time, &dt)) {
        dt = (cur->time < prev->time) ? INT64_MIN : INT64_MAX;
    }
    if (dt < 1) return 0.0;
    const double d2 = squared_distance(axis_delta(cur->x, prev->x), axis_delta(cur->y, prev->y));
    double speed = std::sqrt(d2) / static_cast<double>(dt);
    if (speed < 0.0) speed = 0.0;
    if (speed > kMaxSpeed) speed = kMaxSpeed;
    const double env = kEnvBase + speed * kEnvSlope;
    if (energy != nullptr) *energy = norm * d2 / kEnergyDivisor;
    return env;
}

KOVA_API double _calc_sharpness(double env, float depth) {
    const double r = 1.0 + (env - 1.0) * (depth * kSharpFactor);
    // max(1.0, r); NaN (from a NaN envelope or depth) also gives 1.0.
    return (r > 1.0) ? r : 1.0;
}

KOVA_API double _calc_distortion(double a, double b) {
    (void)a;
    return b;
}

}  // extern "C"
