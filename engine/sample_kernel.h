// SPDX-License-Identifier: Apache-2.0
/* The per-sample kernel of generation: what a call reads from the active set, the equaliser step
 * held in registers, clipping with rotating replacement values, and the loop and start/end
 * renderers built from them (generate_kernel.cpp). Not exported. */
#ifndef KOVA_ENGINE_SAMPLE_KERNEL_H
#define KOVA_ENGINE_SAMPLE_KERNEL_H

#include <cstdint>

#include "dsp/exact_math.h"
#include "kova/kova_dsp.h"
#include "kova/kova_types.h"

/* Replacement values for clipped samples rotate through three steps per side. The counters are
 * shared by every context and rely on the callers being serialised. */
extern int16_t clip_count_hi;
extern int16_t clip_count_lo;

namespace kova_gen {

constexpr int32_t kClipHigh = 32767;
constexpr int32_t kClipLow = -32768;
constexpr int16_t kClipStep = 250;
constexpr int16_t kClipWrap = 501;

/* What every action reads from the active set, worked out once per call. */
struct GenBlock {
    KOVA_SRCSET* set;
    const KOVA_TUNE_SET* tune;
    KOVA_SRC* loop;     /* always present: sets without one are refused */
    double level;       /* file_gain or wn_gain, chosen by the loop source's origin */
    double pan_gain[2]; /* even (left) and odd (right) samples; 1.0 each when panning is off */
};

/* trunc_sat32 with the common in-range case tested first, on the exponent bits: |v| < 2^31
 * (where the conversion is defined and equals the saturated one) exactly when the biased
 * exponent is below 1023 + 31; NaN and infinities have the largest exponent. An integer test
 * leaves the floating-point ports, which the equaliser's chain needs, to the chain. */
inline int32_t trunc32(double v) {
    uint64_t bits;
    __builtin_memcpy(&bits, &v, sizeof bits);
    if (((bits >> 52) & 0x7FF) < 1023 + 31) [[likely]]
        return static_cast<int32_t>(v);
    return kova::dsp::trunc_sat32(v);
}

/* The thickness equaliser's per-sample step, operation for operation the same as kova_eq_proc,
 * with its state held in locals for the length of a block and written back by store(). The
 * generator runs every output sample through it; an opaque call per sample (state reloaded from
 * memory, every floating register spilled around it) would cost about as much as the rest of
 * the block. A test keeps it bit-identical to kova_eq_proc. */
class EqKernel {
   public:
    explicit EqKernel(KOVA_EQ* eq)
        : eq_(eq),
          low_coef_(eq->low_coef),
          low_state_(eq->low_state),
          high_coef_(eq->high_coef),
          high_state_(eq->high_state),
          h0_(eq->hist[0]),
          h1_(eq->hist[1]),
          h2_(eq->hist[2]),
          low_gain_(eq->low_gain),
          mid_gain_(eq->mid_gain),
          high_gain_(eq->high_gain) {}
    EqKernel(const EqKernel&) = delete;
    EqKernel& operator=(const EqKernel&) = delete;
    ~EqKernel() { store(); }

    int32_t proc(int32_t sample) { return proc_input(static_cast<double>(sample) / kFullScale); }

    /* The same step from an input already normalised (sample / 2147483647.0). With kUnitMid
     * the mid band's gain, always 1.0 in the library's equaliser, is left out: multiplying by
     * 1.0 changes no bit, and one multiply less per sample shows in the generator's loop. */
    template <bool kUnitMid = false>
    int32_t proc_input(double x) {
        low_state_ = low_state_ + (low_coef_ * (x - low_state_) + kova::dsp::kEqStateBias);
        high_state_ = high_state_ + (high_coef_ * (x - high_state_) + kova::dsp::kEqStateBias);
        const double delayed = h2_;
        const double low = low_state_;
        const double high = delayed - high_state_;
        const double mid = delayed - (low + high);
        const double mid_part = kUnitMid ? mid : mid * mid_gain_;
        const double y = (high * high_gain_ + (low * low_gain_ + mid_part)) * kFullScale;
        h2_ = h1_;
        h1_ = h0_;
        h0_ = x;
        return trunc32(y);
    }

    /* Writes the filter state back to the record (the gains are only read). */
    void store() const {
        eq_->low_state = low_state_;
        eq_->high_state = high_state_;
        eq_->hist[0] = h0_;
        eq_->hist[1] = h1_;
        eq_->hist[2] = h2_;
    }

   private:
    static constexpr double kFullScale = 2147483647.0;
    KOVA_EQ* eq_;
    double low_coef_, low_state_, high_coef_, high_state_;
    double h0_, h1_, h2_;
    double low_gain_, mid_gain_, high_gain_;
};

/* The equaliser's normalisation, sample / 2147483647.0, without the divider, for an
 * integer-valued input of 32-bit range: with 2147483647 = 2^31 - 1, m / (2^31 - 1) =
 * m 2^-31 + m 2^-62 + m 2^-93 + ..., and the first three terms, added in this order, round to
 * the correctly rounded quotient for every one of the 2^32 integers (checked one by one; a test
 * keeps a sample). All three products are exact. Where no chain hides the divider's slow
 * throughput (the equaliser lanes' first pass), this is several times faster. */
inline double normalised_integer(double m) {
    return m * 0x1p-31 + (m * 0x1p-62 + m * 0x1p-93);
}

/* An equaliser output clipped with rotating replacement values, as 16 bits. */
inline int16_t clipped(int32_t r) {
    if (r >= kClipHigh) [[unlikely]] {
        if (clip_count_hi >= kClipWrap) clip_count_hi = 0;
        clip_count_hi = static_cast<int16_t>(clip_count_hi + kClipStep);
        r = kClipHigh - clip_count_hi;
    } else if (r <= kClipLow) [[unlikely]] {
        if (clip_count_lo >= kClipWrap) clip_count_lo = 0;
        clip_count_lo = static_cast<int16_t>(clip_count_lo + kClipStep);
        r = static_cast<int16_t>(kClipHigh + clip_count_lo);
    }
    return static_cast<int16_t>(r);
}

/* Equaliser (from a normalised input), then clipping. */
template <bool kUnitMid = false>
inline int16_t finish_input(EqKernel& eq, double x) {
    return clipped(eq.proc_input<kUnitMid>(x));
}

/* Number of whole samples a source holds, 0 when it has none to play. */
inline int32_t playable_samples(const KOVA_SRC* src) {
    if (src == nullptr || src->pcm_proc == nullptr || src->size < 2) return 0;
    return src->size / 2;
}

/* The loop part of a move as the sample kernel takes it. `c` is the envelope factor before the
 * first sample; it climbs by `step` before every even sample. */
struct LoopRender {
    const int16_t* pcm;
    int32_t pos; /* play position, updated */
    int32_t loop_end;
    int32_t restart;
    double gain;
    double c;
    double step;
    double pan_gain[2];
    KOVA_OSC* osc; /* null when the oscillator is off */
    bool slew;
    double decay;     /* slew memory factor */
    int16_t mem_even; /* slew memories, updated */
    int16_t mem_odd;
};

/* `count` loop samples into dst: envelope, gain, oscillator, panning, equaliser, clipping and,
 * when r.slew, the slew limiter. */
void render_loop(KOVA_EQ* eq, LoopRender& r, int16_t* dst, int64_t count);

/* A start or end sound: `count` samples of pcm times gain through the equaliser and the
 * clipper, each finished sample then multiplied by the pan gain of its parity. `scratch` (the
 * context's staging buffer, free during these actions) lets a long sound take the equaliser
 * lanes below. */
void render_once(KOVA_EQ* eq, const int16_t* pcm, int64_t count, double gain,
                 const double pan_gain[2], int16_t* dst, void* scratch, int64_t scratch_bytes);

/* The equaliser sections' states after each of n normalised inputs x, starting from the
 * record's state (which is not changed), as (low, high) pairs into st[2 * n]: bit for bit those
 * of kova_eq_proc. Worked on lanes when n is at least eq_lane_min_run(), else serially. Returns
 * how many lane stretches had to be worked again serially (eq_lanes.cpp). */
int64_t eq_lane_states(const KOVA_EQ* eq, const double* x, int64_t n, double* st);
int64_t eq_lane_min_run();

/* Move event (action 1): the speed-shaped loop block. Returns samples written. */
int32_t gen_move(KOVA_CTX* ctx, const KOVA_PARAM* cur, KOVA_PCMBUF* out, const GenBlock& b);

}  // namespace kova_gen

#endif
