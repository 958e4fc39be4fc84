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

// Start and end sounds: first pass (gain, truncation), the serial pass, then with panning the
// pan gain on the finished samples, which depends on nothing serial and runs vectorised.
template <bool kPan>
void once_blocks(KOVA_EQ* eq, const int16_t* pcm, int64_t count, double gain,
                 const double pan_gain[2], int16_t* dst) {
    alignas(64) double x[kChunk];
    double unused_c = 0.0;
    PostState ps{1.0, {0, 0}};
    const double pan_even = pan_gain[0];
    const double pan_odd = pan_gain[1];
    for (int64_t done = 0; done < count; done += kChunk) {
        const int64_t len = (count - done < kChunk) ? count - done : kChunk;
        const int16_t* src = pcm + done;
        int16_t* out = dst + done;
        for (int64_t i = 0; i < len; ++i) x[i] = gain * src[i];
        truncate_inputs(x, len);
        serial_pass_for<Post::none, false>(eq, x, len, out, ps, nullptr, unused_c, 0.0);
        if (kPan) {
            // Each finished sample times the pan gain of its parity (chunks start on an even
            // sample), truncated and saturated to 32 bits like trunc_sat32, then its low 16 bits.
            int64_t i = 0;
            for (; i + 1 < len; i += 2) {
                x[i] = out[i] * pan_even;
                x[i + 1] = out[i + 1] * pan_odd;
            }
            if (i < len) x[i] = out[i] * pan_even;
            truncate_inputs(x, len);
            for (i = 0; i < len; ++i) out[i] = static_cast<int16_t>(static_cast<int32_t>(x[i]));
        }
    }
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
                 const double pan_gain[2], int16_t* dst) {
    if (count < 1) return;
    // The pan gain multiplies the finished sample; a gain of 1.0 keeps it as it is.
    if (pan_gain[0] == 1.0 && pan_gain[1] == 1.0) {
        once_blocks<false>(eq, pcm, count, gain, pan_gain, dst);
    } else {
        once_blocks<true>(eq, pcm, count, gain, pan_gain, dst);
    }
}

}  // namespace kova_gen
