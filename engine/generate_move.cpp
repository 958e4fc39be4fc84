// Move events: speed envelope, fast-move reset, the loop block and the optional pitch raise.
#include <cfloat>
#include <cmath>
#include <cstdint>

#include "kova/kova_engine.h"
#include "engine/generate_finish.h"
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
constexpr int32_t kSlewLimit = 1000;
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

// Per-call values of the sample loop.
struct LoopRun {
    const int16_t* pcm;
    int32_t pos;
    LoopBounds bounds;
    double gain;
    double step;
    double pan_gain[2];
};

// Slew memory factor. The equaliser only ever sets 0.7..1.0; a foreign value outside -1..1 (or
// NaN) could push the memory out of 16 bits, so it is held at 1.0, which keeps the sample.
double usable_decay(double decay) {
    return (decay >= -1.0 && decay <= 1.0) ? decay : 1.0;
}

// One output sample from the loop: envelope factor c, oscillator value o, pan gain of its
// parity; with kSlew the slew limiter against that parity's memory.
template <bool kSlew>
struct SampleStep {
    const int16_t* pcm;
    double gain;
    double decay;
    int32_t loop_end;
    int32_t restart;

    [[gnu::always_inline]] inline int16_t operator()(kova_gen::EqKernel& eq, int32_t& pos, double c,
                                                     double o, double pan, int16_t& memory) const {
        const int16_t s = pcm[pos];
        pos = pos + 1;
        int16_t d = kova_gen::finish_sample(eq, gain * s * c * o * pan);
        if (pos >= loop_end) pos = restart;
        if (kSlew) {
            // |m - d| >= limit moves d to m -/+ limit: the same as clamping d into
            // [m - limit, m + limit]. Written as a clamp it compiles to conditional moves; the
            // branch it replaces went either way at random on noise-like sources.
            const int32_t m = memory;
            const int32_t lo = m - kSlewLimit;
            const int32_t hi = m + kSlewLimit;
            int32_t v = d;
            v = v < lo ? lo : v;
            v = v > hi ? hi : v;
            d = static_cast<int16_t>(v);
            // |d * decay| <= 32768: the conversion is always defined.
            memory = static_cast<int16_t>(static_cast<int32_t>(d * decay));
        }
        return d;
    }
};

// Oscillator values are fetched a chunk at a time into this many slots on the stack, so the
// sample loop itself makes no calls and keeps the equaliser state in registers. Even, so the
// parities of every chunk line up with the whole block.
constexpr int64_t kOscChunk = 256;

// Per-block loop state that moves from one span to the next.
struct SpanState {
    double c;  // envelope factor
    int32_t pos;
    int16_t mem_even;
    int16_t mem_odd;
};

// Renders `count` samples into dst, the envelope factor climbing by one step per pair (before
// the even sample), the oscillator value o[i] per sample when kOsc. Written per pair so each
// parity's pan gain and slew memory stay in registers.
template <bool kOsc, bool kSlew>
void render_span(kova_gen::EqKernel& eq, const SampleStep<kSlew>& one, const LoopRun& run,
                 SpanState& st, const double* o, int16_t* dst, int64_t count) {
    const double step = run.step;
    const double pan_even = run.pan_gain[0];
    const double pan_odd = run.pan_gain[1];
    double c = st.c;
    int32_t pos = st.pos;
    int16_t mem_even = st.mem_even;
    int16_t mem_odd = st.mem_odd;
    int64_t i = 0;
    for (; i + 1 < count; i += 2) {
        c = c + step;
        dst[i] = one(eq, pos, c, kOsc ? o[i] : 1.0, pan_even, mem_even);
        dst[i + 1] = one(eq, pos, c, kOsc ? o[i + 1] : 1.0, pan_odd, mem_odd);
    }
    if (i < count) {
        c = c + step;
        dst[i] = one(eq, pos, c, kOsc ? o[i] : 1.0, pan_even, mem_even);
    }
    st = SpanState{c, pos, mem_even, mem_odd};
}

// Renders a whole block from the loop source (the envelope starting at c), updating the play
// position in run and, with kSlew, the context's slew memories.
template <bool kSlew>
void render_block(KOVA_CTX* ctx, bool osc_on, LoopRun& run, double c, int16_t* dst, int64_t count) {
    kova_gen::EqKernel eq(ctx->eq);
    const SampleStep<kSlew> one{run.pcm, run.gain, usable_decay(ctx->eq->slew_decay),
                                run.bounds.end, run.bounds.restart};
    SpanState st{c, run.pos, ctx->slew_even, ctx->slew_odd};
    if (!osc_on) {
        render_span<false>(eq, one, run, st, nullptr, dst, count);
    } else {
        double o[kOscChunk];
        for (int64_t done = 0; done < count; done += kOscChunk) {
            const int64_t len = (count - done < kOscChunk) ? count - done : kOscChunk;
            _osc_fill(ctx->osc, o, len);
            render_span<true>(eq, one, run, st, o, dst + done, len);
        }
    }
    run.pos = st.pos;
    if (kSlew) {
        ctx->slew_even = st.mem_even;
        ctx->slew_odd = st.mem_odd;
    }
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

    LoopRun run{};
    run.pcm = loop->pcm_proc;
    run.pos = loop->pos;
    run.bounds = bounds;
    run.gain = tune->gain * tune->loop_gain * ctx->volume * b.level;
    run.step = step;
    run.pan_gain[0] = b.pan_gain[0];
    run.pan_gain[1] = b.pan_gain[1];
    const bool osc_on = tune->osc_enable == 1;

    if (tune->sharp_enable != 1) {
        render_block<true>(ctx, osc_on, run, e0, out->data, n);
        loop->pos = run.pos;
        return n;
    }

    double ratio = _calc_sharpness(env, depth_as_float(tune->sharpness));
    if (ratio > kMaxRatio) ratio = kMaxRatio;
    if (ratio == 1.0) {
        render_block<false>(ctx, osc_on, run, e0, out->data, n);
        loop->pos = run.pos;
        return n;
    }

    // Staged samples never exceed the staging buffer (long, fast moves with a deep pitch raise
    // would ask for up to 7x the block).
    int64_t m = static_cast<int64_t>(ratio * n);
    if (m > kWorkSamples) m = kWorkSamples;
    render_block<false>(ctx, osc_on, run, e0, ctx->work_buf, m);
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
