// SPDX-License-Identifier: Apache-2.0
// The sample kernel of every action: two passes per chunk. The first has no dependency from one
// sample to the next (gain, envelope, oscillator, panning, truncation, normalisation) and is
// written so the compiler vectorises it; the second is the serial part (equaliser, clipping,
// slew limiter). Kept apart, the serial pass carries little besides the equaliser's own chain.
#include <cstdint>

#if defined(__SSE2__)
#include <emmintrin.h>
#elif defined(__aarch64__)
#include <arm_neon.h>
#endif

#include "kova/kova_dsp.h"
#include "dsp/dsp_internal.h"
#include "engine/sample_kernel.h"

namespace kova_gen {
namespace {

// Samples per chunk: even, so the parities of every chunk line up with the whole block, and
// small enough for the buffers to stay in the first-level cache.
constexpr int64_t kChunk = 256;

// trunc32 without branches, so the first pass stays a straight line the compiler can
// vectorise; the integer comes back as a double. Saturates like trunc_sat32, NaN gives 0. Each
// select is written in the form of a minimum, maximum or mask instruction.
inline double eq_input(double v) {
    v = v == v ? v : 0.0;
    v = v < 2147483647.0 ? v : 2147483647.0;
    v = v > -2147483648.0 ? v : -2147483648.0;
    return static_cast<double>(static_cast<int32_t>(v));
}

// Every product of a chunk (in place) to its equaliser input, eq_input of each. The plain
// conversion a vector unit offers differs from trunc_sat32 only where the product is NaN or out
// of range, which gains of a usable level never produce: on x86 that conversion marks both cases
// with INT32_MIN, and only a pair so marked takes the exact path (a product that truly truncates
// to INT32_MIN takes it too, to the same result). AArch64's conversion saturates and takes NaN to
// 0 by itself, which is trunc_sat32 exactly.
void truncate_inputs(double* x, int64_t len) {
    int64_t i = 0;
#if defined(__SSE2__)
    const __m128i marked = _mm_set1_epi32(INT32_MIN);
    for (; i + 1 < len; i += 2) {
        const __m128d v = _mm_loadu_pd(x + i);
        const __m128i t = _mm_cvttpd_epi32(v);
        if (_mm_movemask_epi8(_mm_cmpeq_epi32(t, marked)) & 0xFF) [[unlikely]] {
            x[i] = eq_input(x[i]);
            x[i + 1] = eq_input(x[i + 1]);
        } else {
            _mm_storeu_pd(x + i, _mm_cvtepi32_pd(t));
        }
    }
#elif defined(__aarch64__)
    for (; i + 1 < len; i += 2) {
        const int32x2_t t = vqmovn_s64(vcvtq_s64_f64(vld1q_f64(x + i)));
        vst1q_f64(x + i, vcvtq_f64_s64(vmovl_s32(t)));
    }
#endif
    for (; i < len; ++i) x[i] = eq_input(x[i]);
}

// The equaliser's normalisation. Done in the serial pass, where the divider works beside the
// equaliser's chain instead of holding up the first pass.
inline double normalised(double sample) {
    return sample / 2147483647.0;
}

// Equaliser outputs to 16 bits: trunc_sat32 (NaN gives 0), then values beyond 16 bits pinned to
// the clip thresholds, which the caller replaces in order; a pinned value stands for every
// output at or beyond its threshold, as clipped() tests them. Returns whether any was pinned.
// The vector forms narrow with saturation; on x86 a pair the conversion marks (NaN, out of
// range) takes the exact scalar form, as in truncate_inputs().
bool to_16_bits(const double* y, int64_t len, int16_t* out) {
    int64_t i = 0;
    bool pinned = false;
#if defined(__SSE2__)
    const __m128i marked = _mm_set1_epi32(INT32_MIN);
    const __m128i high = _mm_set1_epi16(kClipHigh);
    const __m128i low = _mm_set1_epi16(kClipLow);
    __m128i at_limit = _mm_setzero_si128();
    for (; i + 7 < len; i += 8) {
        const __m128i a = _mm_unpacklo_epi64(_mm_cvttpd_epi32(_mm_loadu_pd(y + i)),
                                             _mm_cvttpd_epi32(_mm_loadu_pd(y + i + 2)));
        const __m128i b = _mm_unpacklo_epi64(_mm_cvttpd_epi32(_mm_loadu_pd(y + i + 4)),
                                             _mm_cvttpd_epi32(_mm_loadu_pd(y + i + 6)));
        const __m128i bad = _mm_or_si128(_mm_cmpeq_epi32(a, marked), _mm_cmpeq_epi32(b, marked));
        if (_mm_movemask_epi8(bad)) [[unlikely]]
            break;
        const __m128i p = _mm_packs_epi32(a, b);
        at_limit =
            _mm_or_si128(at_limit, _mm_or_si128(_mm_cmpeq_epi16(p, high), _mm_cmpeq_epi16(p, low)));
        _mm_storeu_si128(reinterpret_cast<__m128i*>(out + i), p);
    }
    pinned = _mm_movemask_epi8(at_limit) != 0;
#elif defined(__aarch64__)
    const int16x8_t high = vdupq_n_s16(kClipHigh);
    const int16x8_t low = vdupq_n_s16(kClipLow);
    uint16x8_t at_limit = vdupq_n_u16(0);
    for (; i + 7 < len; i += 8) {
        int32x4_t w[2];
        for (int h = 0; h < 2; ++h) {
            const double* q = y + i + 4 * h;
            w[h] = vcombine_s32(vqmovn_s64(vcvtq_s64_f64(vld1q_f64(q))),
                                vqmovn_s64(vcvtq_s64_f64(vld1q_f64(q + 2))));
        }
        const int16x8_t p = vcombine_s16(vqmovn_s32(w[0]), vqmovn_s32(w[1]));
        at_limit = vorrq_u16(at_limit, vorrq_u16(vceqq_s16(p, high), vceqq_s16(p, low)));
        vst1q_s16(out + i, p);
    }
    pinned = vmaxvq_u16(at_limit) != 0;
#endif
    for (; i < len; ++i) {
        int32_t r = kova::dsp::trunc_sat32(y[i]);
        if (r >= kClipHigh || r <= kClipLow) {
            pinned = true;
            r = r >= kClipHigh ? kClipHigh : kClipLow;
        }
        out[i] = static_cast<int16_t>(r);
    }
    return pinned;
}

// What follows the equaliser and the clipper: nothing (pitch-raise staging, start and end
// sounds) or the slew limiter (plain moves).
enum class Post { none, slew };

struct PostState {
    double decay;
    int16_t mem[2];  // slew memories, even and odd
};

template <Post kPost>
[[gnu::always_inline]] inline int16_t post(int16_t d, double decay, int16_t& memory) {
    if (kPost == Post::slew) {
        // |m - d| >= limit moves d to m -/+ limit: the same as clamping d into
        // [m - limit, m + limit], which compiles to conditional moves.
        constexpr int32_t kSlewLimit = 1000;
        const int32_t m = memory;
        int32_t v = d;
        v = v < m - kSlewLimit ? m - kSlewLimit : v;
        v = v > m + kSlewLimit ? m + kSlewLimit : v;
        d = static_cast<int16_t>(v);
        // |d * decay| <= 32768: the conversion is always defined.
        memory = static_cast<int16_t>(static_cast<int32_t>(d * decay));
    }
    return d;
}

// Second pass over one chunk of truncated inputs. Alongside, it advances the envelope factor
// for the next chunk (c, one value per pair written to both samples): that chain is serial
// too, and here it runs in the shadow of the equaliser's. The equaliser state is loaded into a
// local kernel per chunk: held in an object the caller can see, it would go through memory on
// every sample (the envelope stores might alias it), adding a store and a load to the chain.
template <Post kPost, bool kEnv, bool kUnitMid>
void serial_pass(KOVA_EQ* keq, const double* x, int64_t len, int16_t* dst, PostState& ps,
                 double* env, double& c, double step) {
    EqKernel eq(keq);
    const double decay = ps.decay;
    int16_t mem_even = ps.mem[0];
    int16_t mem_odd = ps.mem[1];
    int64_t i = 0;
    for (; i + 1 < len; i += 2) {
        if (kEnv) {
            c = c + step;
            env[i] = c;
            env[i + 1] = c;
        }
        dst[i] = post<kPost>(finish_input<kUnitMid>(eq, normalised(x[i])), decay, mem_even);
        dst[i + 1] = post<kPost>(finish_input<kUnitMid>(eq, normalised(x[i + 1])), decay, mem_odd);
    }
    if (i < len)
        dst[i] = post<kPost>(finish_input<kUnitMid>(eq, normalised(x[i])), decay, mem_even);
    ps.mem[0] = mem_even;
    ps.mem[1] = mem_odd;
}

// The serial pass, without the mid band's multiply when its gain is 1.0 (it always is in the
// library's own equaliser; a record set up by hand may differ).
template <Post kPost, bool kEnv = true>
void serial_pass_for(KOVA_EQ* keq, const double* x, int64_t len, int16_t* dst, PostState& ps,
                     double* env, double& c, double step) {
    if (keq->mid_gain == 1.0) {
        serial_pass<kPost, kEnv, true>(keq, x, len, dst, ps, env, c, step);
    } else {
        serial_pass<kPost, kEnv, false>(keq, x, len, dst, ps, env, c, step);
    }
}

// First pass of a move over `len` samples of one stretch of the loop (no wrap inside): gain x
// sample x envelope x oscillator x pan, in that order (factors that are 1.0 are left out, which
// changes no bit); truncate_inputs() follows. `first` is the parity of the stretch's first sample.
template <bool kOsc, bool kPan>
void products(const int16_t* src, double gain, const double pan_gain[2], const double* env,
              const double* o, double* x, int64_t len, int64_t first) {
    if (!kPan) {
        for (int64_t i = 0; i < len; ++i) {
            double v = gain * src[i] * env[i];
            if (kOsc) v = v * o[i];
            x[i] = v;
        }
        return;
    }
    // With panning, the pair loop keeps each parity's gain in its own lane.
    int64_t i = 0;
    if (first & 1) {
        double v = gain * src[0] * env[0];
        if (kOsc) v = v * o[0];
        x[0] = v * pan_gain[1];
        i = 1;
    }
    const double pan_even = pan_gain[0];
    const double pan_odd = pan_gain[1];
    for (; i + 1 < len; i += 2) {
        double v0 = gain * src[i] * env[i];
        double v1 = gain * src[i + 1] * env[i + 1];
        if (kOsc) {
            v0 = v0 * o[i];
            v1 = v1 * o[i + 1];
        }
        x[i] = v0 * pan_even;
        x[i + 1] = v1 * pan_odd;
    }
    if (i < len) {
        double v = gain * src[i] * env[i];
        if (kOsc) v = v * o[i];
        x[i] = v * pan_even;
    }
}

// The first pass over a chunk, stretch by stretch of the loop, wrapping at the loop end.
template <bool kOsc, bool kPan>
void loop_products(LoopRender& r, const double* env, const double* o, double* x, int64_t len) {
    int64_t i = 0;
    while (i < len) {
        // A position at or past the end plays one sample and wraps.
        int64_t seg = r.loop_end - r.pos;
        if (seg < 1) seg = 1;
        if (seg > len - i) seg = len - i;
        products<kOsc, kPan>(r.pcm + r.pos, r.gain, r.pan_gain, env + i, o + i, x + i, seg, i);
        i += seg;
        r.pos = static_cast<int32_t>(r.pos + seg);
        if (r.pos >= r.loop_end) r.pos = r.restart;
    }
}

template <bool kOsc, bool kPan, Post kPost>
void loop_blocks(KOVA_EQ* eq, LoopRender& r, int16_t* dst, int64_t count) {
    alignas(16) double x[kChunk];
    alignas(16) double env[kChunk];
    alignas(16) double o[kChunk];
    PostState ps{r.decay, {r.mem_even, r.mem_odd}};
    double c = r.c;
    // The first chunk's envelope; every later one comes out of the serial pass before it.
    const int64_t first = count < kChunk ? count : kChunk;
    for (int64_t i = 0; i < first; i += 2) {
        c = c + r.step;
        env[i] = c;
        env[i + 1] = c;
    }
    for (int64_t done = 0; done < count; done += kChunk) {
        const int64_t len = (count - done < kChunk) ? count - done : kChunk;
        if (kOsc) _osc_fill(r.osc, o, len);
        loop_products<kOsc, kPan>(r, env, o, x, len);
        truncate_inputs(x, len);
        serial_pass_for<kPost>(eq, x, len, dst + done, ps, env, c, r.step);
    }
    r.mem_even = ps.mem[0];
    r.mem_odd = ps.mem[1];
}

template <Post kPost>
void loop_blocks_by_factors(KOVA_EQ* eq, LoopRender& r, int16_t* dst, int64_t count) {
    const bool osc = r.osc != nullptr;
    const bool pan = !(r.pan_gain[0] == 1.0 && r.pan_gain[1] == 1.0);
    if (osc && pan) {
        loop_blocks<true, true, kPost>(eq, r, dst, count);
    } else if (osc) {
        loop_blocks<true, false, kPost>(eq, r, dst, count);
    } else if (pan) {
        loop_blocks<false, true, kPost>(eq, r, dst, count);
    } else {
        loop_blocks<false, false, kPost>(eq, r, dst, count);
    }
}

// The pan gain of its parity on each finished sample (`out` starts on an even sample), truncated
// and saturated to 32 bits like trunc_sat32, then its low 16 bits. On x86 a group with a pair the
// conversion marks (a NaN or out-of-range product, from a pan depth no setter allows) takes the
// exact scalar form, as in truncate_inputs().
void pan_finished(int16_t* out, int64_t len, const double pan_gain[2]) {
    int64_t i = 0;
#if defined(__SSE2__)
    const __m128d gain = _mm_set_pd(pan_gain[1], pan_gain[0]);
    const __m128i marked = _mm_set1_epi32(INT32_MIN);
    auto panned = [&](__m128i four) {  // four int32 samples, even first
        const __m128i a = _mm_cvttpd_epi32(_mm_mul_pd(_mm_cvtepi32_pd(four), gain));
        const __m128i b =
            _mm_cvttpd_epi32(_mm_mul_pd(_mm_cvtepi32_pd(_mm_shuffle_epi32(four, 0xEE)), gain));
        return _mm_unpacklo_epi64(a, b);
    };
    for (; i + 7 < len; i += 8) {
        const __m128i s = _mm_loadu_si128(reinterpret_cast<const __m128i*>(out + i));
        const __m128i a = panned(_mm_srai_epi32(_mm_unpacklo_epi16(s, s), 16));
        const __m128i b = panned(_mm_srai_epi32(_mm_unpackhi_epi16(s, s), 16));
        const __m128i off = _mm_or_si128(_mm_cmpeq_epi32(a, marked), _mm_cmpeq_epi32(b, marked));
        if (_mm_movemask_epi8(off)) [[unlikely]]
            break;
        // The low 16 bits of each, sign-extended, so the saturating pack keeps them as they are.
        const __m128i low_a = _mm_srai_epi32(_mm_slli_epi32(a, 16), 16);
        const __m128i low_b = _mm_srai_epi32(_mm_slli_epi32(b, 16), 16);
        _mm_storeu_si128(reinterpret_cast<__m128i*>(out + i), _mm_packs_epi32(low_a, low_b));
    }
#elif defined(__aarch64__)
    const float64x2_t gain = {pan_gain[0], pan_gain[1]};
    auto panned = [&](int32x2_t two) {
        return vqmovn_s64(vcvtq_s64_f64(vmulq_f64(vcvtq_f64_s64(vmovl_s32(two)), gain)));
    };
    for (; i + 7 < len; i += 8) {
        const int16x8_t s = vld1q_s16(out + i);
        const int32x4_t lo = vmovl_s16(vget_low_s16(s));
        const int32x4_t hi = vmovl_s16(vget_high_s16(s));
        const int32x4_t a = vcombine_s32(panned(vget_low_s32(lo)), panned(vget_high_s32(lo)));
        const int32x4_t b = vcombine_s32(panned(vget_low_s32(hi)), panned(vget_high_s32(hi)));
        vst1q_s16(out + i, vcombine_s16(vmovn_s32(a), vmovn_s32(b)));
    }
#endif
    for (; i < len; ++i) {
        const int32_t v = kova::dsp::trunc_sat32(out[i] * pan_gain[i & 1]);
        out[i] = static_cast<int16_t>(v);
    }
}

// A start or end sound's equaliser inputs: each sample times the gain, truncated.
void once_inputs(const int16_t* src, double gain, double* x, int64_t len) {
    for (int64_t i = 0; i < len; ++i) x[i] = gain * src[i];
    truncate_inputs(x, len);
}

// Start and end sounds: first pass (gain, truncation), the serial pass, then with panning the
// pan gain on the finished samples, which depends on nothing serial and runs vectorised.
template <bool kPan>
void once_blocks(KOVA_EQ* eq, const int16_t* pcm, int64_t count, double gain,
                 const double pan_gain[2], int16_t* dst) {
    alignas(64) double x[kChunk];
    double unused_c = 0.0;
    PostState ps{1.0, {0, 0}};
    for (int64_t done = 0; done < count; done += kChunk) {
        const int64_t len = (count - done < kChunk) ? count - done : kChunk;
        int16_t* out = dst + done;
        once_inputs(pcm + done, gain, x, len);
        serial_pass_for<Post::none, false>(eq, x, len, out, ps, nullptr, unused_c, 0.0);
        if (kPan) pan_finished(out, len, pan_gain);
    }
}

// A long start or end sound, piece by piece as the scratch holds it: the equaliser inputs, the
// sections' states on lanes (eq_lanes.cpp), the outputs from the states, which no longer form a
// chain and run vectorised, then clipping in order and the pan gain. The same operations in the
// same order as once_blocks(), so the same bits. Scratch per piece: the inputs behind the three
// delayed ones the first outputs need, and a state pair per sample.
bool once_lanes(KOVA_EQ* eq, const int16_t* pcm, int64_t count, double gain, const double* pan_gain,
                int16_t* dst, void* scratch, int64_t scratch_bytes) {
    const int64_t max_piece = ((scratch_bytes / int64_t{sizeof(double)} - 3) / 3) & ~int64_t{1};
    if (count < eq_lane_min_run() || max_piece < eq_lane_min_run()) return false;
    const int64_t pieces = (count + max_piece - 1) / max_piece;
    const int64_t piece = ((count + pieces - 1) / pieces + 1) & ~int64_t{1};  // even: parity
    auto* xb = static_cast<double*>(scratch);
    double* x = xb + 3;
    double* st = x + piece;
    xb[0] = eq->hist[2];
    xb[1] = eq->hist[1];
    xb[2] = eq->hist[0];
    const double lg = eq->low_gain, mg = eq->mid_gain, hg = eq->high_gain;
    for (int64_t done = 0; done < count; done += piece) {
        const int64_t len = (count - done < piece) ? count - done : piece;
        int16_t* out = dst + done;
        once_inputs(pcm + done, gain, x, len);
        for (int64_t i = 0; i < len; ++i) x[i] = normalised_integer(x[i]);
        eq_lane_states(eq, x, len, st);
        eq->low_state = st[2 * len - 2];
        eq->high_state = st[2 * len - 1];
        // Output i from its states and the input three samples back (xb[i]), into xb[i].
        for (int64_t i = 0; i < len; ++i) {
            const double low = st[2 * i];
            const double delayed = xb[i];
            const double high = delayed - st[2 * i + 1];
            const double mid = delayed - (low + high);
            xb[i] = (high * hg + (low * lg + mid * mg)) * 2147483647.0;
        }
        if (to_16_bits(xb, len, out)) {
            for (int64_t i = 0; i < len; ++i) {
                if (out[i] == kClipHigh || out[i] == kClipLow) out[i] = clipped(out[i]);
            }
        }
        if (!(pan_gain[0] == 1.0 && pan_gain[1] == 1.0)) pan_finished(out, len, pan_gain);
        xb[0] = x[len - 3];
        xb[1] = x[len - 2];
        xb[2] = x[len - 1];
    }
    eq->hist[0] = xb[2];
    eq->hist[1] = xb[1];
    eq->hist[2] = xb[0];
    return true;
}

}  // namespace

void render_loop(KOVA_EQ* eq, LoopRender& r, int16_t* dst, int64_t count) {
    if (count < 1) return;
    if (r.slew) {
        loop_blocks_by_factors<Post::slew>(eq, r, dst, count);
    } else {
        loop_blocks_by_factors<Post::none>(eq, r, dst, count);
    }
}

void render_once(KOVA_EQ* eq, const int16_t* pcm, int64_t count, double gain,
                 const double pan_gain[2], int16_t* dst, void* scratch, int64_t scratch_bytes) {
    if (count < 1) return;
    if (once_lanes(eq, pcm, count, gain, pan_gain, dst, scratch, scratch_bytes)) return;
    // The pan gain multiplies the finished sample; a gain of 1.0 keeps it as it is.
    if (pan_gain[0] == 1.0 && pan_gain[1] == 1.0) {
        once_blocks<false>(eq, pcm, count, gain, pan_gain, dst);
    } else {
        once_blocks<true>(eq, pcm, count, gain, pan_gain, dst);
    }
}

}  // namespace kova_gen
