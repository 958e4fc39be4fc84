/* Internal pieces shared by the generation files: the per-call block setup and the sample
 * finisher (equaliser, rotating clip values). Not exported.
 *
 * Include this header LAST: it brings in the exact-arithmetic settings of the signal blocks,
 * which apply to every function defined after it. */
#ifndef KOVA_ENGINE_GENERATE_FINISH_H
#define KOVA_ENGINE_GENERATE_FINISH_H

#include <cstdint>

#include "kova/kova_dsp.h"
#include "kova/kova_types.h"
#include "dsp/exact_math.h"

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

/* Equaliser, then clipping with rotating replacement values, then 16 bits. */
inline int16_t finish_sample(KOVA_EQ* eq, double v) {
    int32_t r = kova_eq_proc(eq, kova::dsp::trunc_sat32(v));
    if (r >= kClipHigh) {
        if (clip_count_hi >= kClipWrap) clip_count_hi = 0;
        clip_count_hi = static_cast<int16_t>(clip_count_hi + kClipStep);
        r = kClipHigh - clip_count_hi;
    } else if (r <= kClipLow) {
        if (clip_count_lo >= kClipWrap) clip_count_lo = 0;
        clip_count_lo = static_cast<int16_t>(clip_count_lo + kClipStep);
        r = static_cast<int16_t>(kClipHigh + clip_count_lo);
    }
    return static_cast<int16_t>(r);
}

/* Number of whole samples a source holds, 0 when it has none to play. */
inline int32_t playable_samples(const KOVA_SRC* src) {
    if (src == nullptr || src->pcm_proc == nullptr || src->size < 2) return 0;
    return src->size / 2;
}

/* Move event (action 1): the speed-shaped loop block. Returns samples written. */
int32_t gen_move(KOVA_CTX* ctx, const KOVA_PARAM* cur, KOVA_PCMBUF* out, const GenBlock& b);

}  // namespace kova_gen

#endif
