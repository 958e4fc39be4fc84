// SPDX-License-Identifier: Apache-2.0
// Generation: the worked move checked against a reference built from the documented per-sample
// formulas, the pitch-raise path, clipping, panning, loop wrap, fast moves and the event rules.
// That no event allocates is checked on every event of the generation fuzz corpus (replayed under
// ctest as fuzz_replay_generate).
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <random>
#include <vector>

#include "engine_fixture.h"
#include "kova/kova_dsp.h"
#include "engine/sample_kernel.h"

namespace {

using kova_test::event;
using kova_test::gen;

constexpr double kWorkedEnv = 14.016304347826086;
constexpr double kWorkedStep = 0.004237078238224637;

// Reference loop block: envelope climbing on even samples, gain, panning, equaliser (a fresh
// one, as in a new context), loop wrap and optionally the slew limiter with decay 0.88.
struct Ref {
    double gain, e0, step, pan[2];
    int32_t pos, loop_end, restart;
    bool slew;
};

std::vector<int16_t> reference(const std::vector<int16_t>& loop, Ref r, int64_t count,
                               int32_t* end_pos) {
    KOVA_EQ eq;
    kova_eq_init(&eq, 880, 5000, 48000);
    std::vector<int16_t> out(static_cast<size_t>(count));
    int32_t mem[2] = {0, 0};
    double c = r.e0;
    for (int64_t i = 0; i < count; ++i) {
        if (i % 2 == 0) c += r.step;
        const double v = r.gain * loop[static_cast<size_t>(r.pos++)] * c * 1.0 * r.pan[i % 2];
        int32_t d = kova_eq_proc(&eq, static_cast<int32_t>(v));
        EXPECT_LT(std::abs(d), 32767) << "reference assumes no clipping";
        if (r.pos >= r.loop_end) r.pos = r.restart;
        if (r.slew) {
            int32_t& m = mem[i % 2];
            if (std::abs(m - d) >= 1000) d = m > d ? m - 1000 : m + 1000;
            m = static_cast<int16_t>(static_cast<int32_t>(d * 0.88));
        }
        out[static_cast<size_t>(i)] = static_cast<int16_t>(d);
    }
    *end_pos = r.pos;
    return out;
}

// `staged` samples (stereo) resampled from 48000 Hz to `rate` by the library's resampler.
std::vector<int16_t> resampled(std::vector<int16_t> staged, int32_t rate) {
    std::vector<int16_t> out(staged.size());
    const KOVA_PCMBUF in{staged.data(), static_cast<int32_t>(staged.size() * 2)};
    KOVA_PCMBUF pcm{out.data(), 0};
    kova_resample_s16_stereo(48000, rate, &in, &pcm);
    out.resize(static_cast<size_t>(pcm.size / 2));
    return out;
}

struct GenTest : testing::Test {
    kova_test::TempDir dir;
    kova_test::CtxPtr ctx = kova_test::make_ctx(48000, 2, 1, 1080, 2280);
    std::vector<int16_t> loop = kova_test::varied(96000);  // 192000 bytes
    KOVA_SRCSET* set = kova_test::reg_files(ctx.get(), dir, {{}, loop, {}});
    std::vector<int16_t> buf = std::vector<int16_t>(40000);

    KOVA_SRC* loop_src() { return set->src[KOVA_SLOT_LOOP]; }
    // The worked move: start at (100,100)@1000, move to (130,140)@1016, with the loop moved to
    // `from` in between when given.
    int32_t worked_move(int32_t from = -1) {
        EXPECT_EQ(gen(ctx.get(), event(100, 100, 1000, KOVA_ACTION_START), buf), 0);
        if (from >= 0) loop_src()->pos = from;
        return gen(ctx.get(), event(130, 140, 1016, KOVA_ACTION_MOVE), buf);
    }
    Ref worked_ref(bool slew) {
        const double q = 0.4 * (130.0f / 1080.0f), gain = 1.0 * 0.9 * 0.8 * 0.4;
        return Ref{gain, 1.0, kWorkedStep, {1.0 - q, 1.0 - 0.4 + q}, 0, 95996, 47998, slew};
    }
};

// From the loop's start, and from 6 samples before its end 95996, where it wraps to 47998.
TEST_F(GenTest, WorkedMoveMatchesReference) {
    for (int32_t from : {0, 95990}) {
        kova_eq_init(ctx->eq, 880, 5000, 48000);  // the reference starts from a fresh equaliser
        ASSERT_EQ(worked_move(from), 3072);
        EXPECT_EQ(ctx->fast_count, 0);
        Ref r = worked_ref(true);
        r.pos = from;
        int32_t end_pos = 0;
        EXPECT_EQ(std::vector<int16_t>(buf.begin(), buf.begin() + 1536),
                  reference(loop, r, 1536, &end_pos));
        EXPECT_EQ(loop_src()->pos, end_pos);
    }

    const KOVA_PARAM a = event(100, 100, 1000, 0), b = event(130, 140, 1016, 1);
    double energy = 0;
    EXPECT_EQ(_calc_envelope(&b, &a, &energy, 1.0), 0.0);  // time running backwards
}

TEST_F(GenTest, PitchRaiseStagesAndResamples) {
    set->tune->sharp_enable = 1;
    set->tune->sharpness = 0.2;
    const int32_t bytes = worked_move();
    // 1935 staged samples resampled from 48000 Hz to 38084 Hz, no slew limiting.
    int32_t end_pos = 0;
    const auto want = resampled(reference(loop, worked_ref(false), 1935, &end_pos), 38084);
    ASSERT_GT(want.size(), 1500u);
    ASSERT_EQ(bytes, static_cast<int32_t>(want.size() * 2));
    EXPECT_EQ(std::vector<int16_t>(buf.begin(), buf.begin() + bytes / 2), want);
    EXPECT_EQ(loop_src()->pos, 1935);

    // Depth 0 gives ratio 1: straight into the caller's buffer, still without slew limiting.
    set->tune->sharpness = 0.0;
    loop_src()->pos = 0;
    kova_eq_init(ctx->eq, 880, 5000, 48000);  // the reference starts from a fresh equaliser
    ASSERT_EQ(worked_move(), 3072);
    EXPECT_EQ(std::vector<int16_t>(buf.begin(), buf.begin() + 1536),
              reference(loop, worked_ref(false), 1536, &end_pos));
}

// The longest, fastest move with the deepest pitch raise asks for 6.9 x 19104 staged samples;
// only the 96000 of the staging buffer are staged (nothing written past it) and resampled.
TEST_F(GenTest, PitchRaiseStagesNoMoreThanTheWorkBuffer) {
    set->tune->sharp_enable = 1;
    set->tune->sharpness = 1.0;
    constexpr size_t kWork = KOVA_WORK_BUF_BYTES / 2;
    std::vector<int16_t> guarded(kWork + 40000, 0x5A5A);
    int16_t* const own = ctx->work_buf;
    ctx->work_buf = guarded.data();
    ASSERT_EQ(gen(ctx.get(), event(0, 0, 1000, KOVA_ACTION_START), buf), 0);
    const int32_t bytes = gen(ctx.get(), event(5000, 0, 1199, KOVA_ACTION_MOVE), buf);
    ctx->work_buf = own;
    EXPECT_EQ(std::count(guarded.begin() + kWork, guarded.end(), 0x5A5A), 40000);
    // 96000 staged samples from 48000 Hz to 2 * trunc(48000 / 6.9 / 2) = 6956 Hz.
    const auto want = resampled({guarded.begin(), guarded.begin() + kWork}, 6956);
    ASSERT_EQ(bytes, static_cast<int32_t>(want.size() * 2));
    EXPECT_TRUE(std::equal(want.begin(), want.end(), buf.begin()));
}

TEST_F(GenTest, SixthFastMoveRestartsLoop) {
    ASSERT_EQ(gen(ctx.get(), event(0, 0, 1000, KOVA_ACTION_START), buf), 0);
    std::vector<int16_t> block(1536);
    for (int k = 1; k <= 7; ++k) {  // 150 px in 16 ms: energy above 8000
        ASSERT_EQ(gen(ctx.get(), event(150.0f * k, 0, 1000 + 16 * k, 1), block), 3072);
        const int32_t want = k <= 5 ? 1536 * k : 47998 + 1536 * (k - 5);
        EXPECT_EQ(loop_src()->pos, want) << "move " << k;
    }
}

TEST_F(GenTest, TimeAndDistanceRules) {
    auto& prev = *ctx->prev_param;
    ASSERT_EQ(gen(ctx.get(), event(100, 100, 1000, KOVA_ACTION_START), buf), 0);
    EXPECT_EQ(gen(ctx.get(), event(200, 100, 1002, 1), buf), 0);  // 2 ms
    EXPECT_EQ(prev.time, 1002);
    EXPECT_EQ(gen(ctx.get(), event(300, 100, 1202, 1), buf), 0);  // 200 ms
    EXPECT_EQ(gen(ctx.get(), event(400, 100, 1205, 1), buf), 2 * 2 * 144);
    EXPECT_EQ(gen(ctx.get(), event(500, 100, 1404, 1), buf), 2 * 2 * 9552);
    EXPECT_EQ(gen(ctx.get(), event(600, 100, 1300, 1), buf), 0);  // earlier
    EXPECT_EQ(prev.time, 1300);
    EXPECT_EQ(gen(ctx.get(), event(602, 102, 1316, 1), buf), 0);  // 2 px each way
    EXPECT_EQ(gen(ctx.get(), event(605, 102, 1332, 1), buf), 3072);
}

TEST_F(GenTest, StartAndEndSlots) {
    // Empty start slot: nothing, yet the stroke is open and measured from the start event.
    ctx->prev_env = 9.0;
    ctx->slew_odd = 55;
    EXPECT_EQ(gen(ctx.get(), event(10, 10, 500, KOVA_ACTION_START), buf), 0);
    EXPECT_EQ(ctx->stroke, 1u);
    EXPECT_EQ(ctx->prev_env, 1.0);
    EXPECT_EQ(ctx->slew_odd, 0);
    EXPECT_EQ(gen(ctx.get(), event(40, 10, 516, KOVA_ACTION_MOVE), buf), 3072);

    // End with an empty end slot rewinds the loop and closes the stroke.
    EXPECT_NE(loop_src()->pos, 0);
    ctx->fast_count = 3;
    EXPECT_EQ(gen(ctx.get(), event(40, 10, 530, KOVA_ACTION_END), buf), 0);
    EXPECT_EQ(loop_src()->pos, 0);
    EXPECT_EQ(ctx->stroke, 0u);
    EXPECT_EQ(ctx->fast_count, 0);

    // A move outside a stroke only opens one.
    const double env = ctx->prev_env;
    EXPECT_EQ(gen(ctx.get(), event(90, 10, 546, KOVA_ACTION_MOVE), buf), 0);
    EXPECT_EQ(ctx->stroke, 1u);
    EXPECT_EQ(ctx->prev_param->x, 90.0f);
    EXPECT_EQ(ctx->prev_env, env);
}

// Start sound with panning depth 0.4: gain 1 * 0.6 * 0.8 * 0.4. First odd-length varied sounds,
// bit for bit against the documented order (equaliser, then the pan gain on the finished sample):
// a short one, then a long one (the equaliser on lanes, in two pieces) twice over, each call
// going on from the equaliser state the one before left, the last far off the screen, where
// panned samples pass the 32-bit range.
TEST_F(GenTest, PanGainsFollowPosition) {
    KOVA_EQ eq;
    kova_eq_init(&eq, 880, 5000, 48000);
    auto sat32 = [](double v) {
        return v >= 2147483647.0 ? INT32_MAX : v <= -2147483648.0 ? INT32_MIN : int32_t(v);
    };
    for (auto [len, x] : {std::pair{1001, 300.0f}, {9001, 300.0f}, {9001, 3e11f}}) {
        const double q = 0.4 * (x / 1080.0f);
        const double pan[2] = {1.0 - q, 1.0 - 0.4 + q};
        const std::vector<int16_t> start = kova_test::varied(len);
        kova_test::reg_files(ctx.get(), dir, {start, loop, {}});  // the equaliser state goes on
        ASSERT_EQ(gen(ctx.get(), event(x, 5, 900, KOVA_ACTION_START), buf), 2 * len);
        for (size_t i = 0; i < start.size(); ++i) {
            const auto s = static_cast<int16_t>(
                kova_eq_proc(&eq, static_cast<int32_t>(1.0 * 0.6 * 0.8 * 0.4 * start[i])));
            ASSERT_EQ(buf[i], static_cast<int16_t>(sat32(s * pan[i % 2]))) << i;
        }
    }
}

// Overloads are replaced by rotating values, each side on its own, across calls and contexts.
TEST(GenClipTest, ReplacementValuesRotate) {
    struct Side {
        std::vector<int> seq;  // the rotation of replacement values
        int at = -1, seen = 0;
        void take(int v) {
            const auto k = static_cast<int>(std::find(seq.begin(), seq.end(), v) - seq.begin());
            ASSERT_LT(k, 3) << v;
            EXPECT_TRUE(at < 0 || k == (at + 1) % 3) << v << " after " << seq[at < 0 ? 0 : at];
            at = k;
            ++seen;
        }
    } hi{{32517, 32267, 32017}}, lo{{-32519, -32269, -32019}};
    for (int round = 0; round < 2; ++round) {
        kova_test::TempDir dir;
        kova_test::CtxPtr ctx = kova_test::make_ctx(48000, 2, 0, 0, 0);
        // Sounds long enough for the equaliser's lanes, at a level far past the 32-bit range,
        // which the conversions must saturate on the way.
        const auto sound = [](int16_t v) { return std::vector<int16_t>(4000, v); };
        kova_test::reg_files(ctx.get(), dir, {sound(32767), sound(0), sound(-32768)})
            ->tune->file_gain = 1e6;
        kova_set_volume(ctx.get(), 10.0);
        if (round == 1) kova_set_thickness(ctx.get(), 1.0);  // low band x1.2: past 32 bits too
        std::vector<int16_t> buf(4000);
        for (int call = 0; call < 4; ++call) {
            ASSERT_EQ(gen(ctx.get(), event(0, 0, 1, call % 2 ? KOVA_ACTION_END : 0), buf), 8000);
            int against = 0;  // clipped on the side the input is not on
            for (int16_t v : buf) {
                if (v > 30000)
                    hi.take(v);
                else if (v < -30000)
                    lo.take(v);
                else
                    EXPECT_LE(std::abs(v), 1);  // the equaliser's delay in a fresh context
                against += (call % 2 ? v > 30000 : v < -30000);
            }
            EXPECT_EQ(against, call == 0 ? 0 : 3);  // the last three of the call before
        }
    }
    EXPECT_GT(hi.seen, 60);
    EXPECT_GT(lo.seen, 60);
}

// The generator's in-register equaliser step must stay bit-identical to kova_eq_proc, state
// included, whatever the input and thickness.
TEST(GenEqKernelTest, MatchesEqualiser) {
    std::mt19937 rng(7);
    KOVA_EQ lib, mine;
    kova_eq_init(&lib, 880, 5000, 44100);
    kova_eq_init(&mine, 880, 5000, 44100);
    for (double t : {0.6, 0.0, 1.0, 0.35}) {
        kova_eq_set_thickness(&lib, t);
        kova_eq_set_thickness(&mine, t);
        kova_gen::EqKernel k(&mine);
        for (int i = 0; i < 5000; ++i) {
            int32_t s = static_cast<int32_t>(rng());
            if (i % 3 == 0) s /= 4000;  // mostly sample-sized values, some full-range
            ASSERT_EQ(k.proc(s), kova_eq_proc(&lib, s)) << i;
        }
        k.store();
        ASSERT_EQ(std::memcmp(&lib, &mine, sizeof(lib)), 0);
    }
}

// The lanes a long start or end sound takes give kova_eq_proc's states bit for bit: on noise,
// where every lane arrives at the true state, and across digital silence and a constant level,
// where lanes can settle a few units off and their stretches must be worked again.
TEST(GenEqKernelTest, LanesMatchEqualiser) {
    std::mt19937 rng(3);
    std::vector<int32_t> in(20000);
    for (size_t i = 0; i < in.size(); ++i) {
        const bool silent = i >= 6000 && i < 11000, level = i >= 14000 && i < 17000;
        in[i] = silent ? 0 : level ? 5000 : static_cast<int32_t>(rng() % 20001) - 10000;
    }
    std::vector<double> x(in.size());
    for (size_t i = 0; i < in.size(); ++i) x[i] = in[i] / 2147483647.0;
    for (size_t n : {in.size(), size_t{5000}}) {
        KOVA_EQ eq;
        kova_eq_init(&eq, 880, 5000, 48000);
        eq.low_state = 1e-4;
        eq.high_state = -2e-5;
        KOVA_EQ ref = eq;
        std::vector<double> st(2 * n);
        const int64_t redone =
            kova_gen::eq_lane_states(&eq, x.data(), static_cast<int64_t>(n), st.data());
        EXPECT_EQ(redone > 0, n == in.size());
        for (size_t i = 0; i < n; ++i) {
            kova_eq_proc(&ref, in[i]);
            ASSERT_EQ(std::memcmp(&st[2 * i], &ref.low_state, sizeof(double)), 0) << i;
            ASSERT_EQ(std::memcmp(&st[2 * i + 1], &ref.high_state, sizeof(double)), 0) << i;
        }
    }
}

// The divider-free normalisation gives the quotient's bits: every sample-sized value, and a
// stride through the whole 32-bit range (two terms instead of three miss about one in 230).
TEST(GenEqKernelTest, NormalisingWithoutTheDividerIsExact) {
    auto exact = [](int64_t m) {
        const double v = static_cast<double>(m), q = v / 2147483647.0;
        const double r = kova_gen::normalised_integer(v);
        return std::memcmp(&q, &r, sizeof q) == 0;
    };
    for (int64_t m = -70000; m <= 70000; ++m) ASSERT_TRUE(exact(m)) << m;
    for (int64_t m = INT32_MIN; m <= INT32_MAX; m += 997) ASSERT_TRUE(exact(m)) << m;
    EXPECT_TRUE(exact(INT32_MAX));
}

}  // namespace
