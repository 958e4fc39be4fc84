// SPDX-License-Identifier: Apache-2.0
// Random events, tune values and repeat points: generation stays inside the caller's buffer and
// returns an even, non-negative byte count no larger than the buffer.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <random>
#include <vector>

#include "engine_fixture.h"

namespace {

TEST(GenRobustnessTest, RandomInputStayInBounds) {
    std::mt19937 rng(20240611);
    auto uni = [&](double lo, double hi) { return std::uniform_real_distribution<>(lo, hi)(rng); };
    auto pick = [&](int lo, int hi) { return std::uniform_int_distribution<>(lo, hi)(rng); };
    // Tune values as a saved file may carry them: in range, far out of range, NaN, huge.
    auto wild = [&]() {
        switch (pick(0, 5)) {
            case 0:
                return double(NAN);
            case 1:
                return 1e300;
            case 2:
                return -uni(0, 5);
            case 3:
                return uni(0, 8);
            default:
                return uni(0, 1);
        }
    };
    const KOVA_FORMAT formats[] = {{8000, 1, 0, 10, 10},
                                   {8000, 2, 1, 300, 500},
                                   {48000, 2, 1, 1080, 2280},
                                   {22050, 2, 0, 0, 0},
                                   {44100, 1, 0, 0, 0}};
    for (const KOVA_FORMAT& f : formats) {
        int32_t err = 0;
        kova_test::CtxPtr ctx(kova_init(&f, &err));
        ASSERT_TRUE(ctx);
        for (int s = 0; s < 6; ++s) {
            auto noise = [&](int max_samples) {
                std::vector<int16_t> v(static_cast<size_t>(pick(1, max_samples)));
                for (auto& x : v) x = static_cast<int16_t>(pick(-32768, 32767));
                return v;
            };
            KOVA_SRC* loop = kova_test::make_src(1, pick(0, 2), noise(96000));
            loop->rpt_end = pick(-100, loop->size + 1000);
            loop->pos = pick(-10, loop->size);
            KOVA_TUNE_SET t{wild(), wild(), pick(0, 2), wild(), pick(0, 2), wild(),
                            wild(), wild(), wild(),     wild(), wild()};
            kova_test::add_set(ctx.get(),
                               pick(0, 3) ? kova_test::make_src(0, 1, noise(19200)) : nullptr, loop,
                               pick(0, 3) ? kova_test::make_src(2, 1, noise(19200)) : nullptr, t);
            kova_set_volume(ctx.get(), pick(0, 4) ? uni(0, 2) : wild());
            int64_t time = pick(0, 1000);
            for (int e = 0; e < 150; ++e) {
                time += pick(0, 9) ? pick(0, 60) : pick(-500, 400);
                const int r = pick(0, 19);
                const uint32_t action = r == 0 ? 0 : (r == 1 ? 2 : 1);
                const KOVA_PARAM p{static_cast<float>(uni(0, 3000)),
                                   static_cast<float>(uni(0, 3000)), time < 0 ? 0 : time, 0.0f,
                                   action};
                const int32_t size = pick(0, 9) ? pick(1, 40000) : pick(1, 8);
                std::vector<int16_t> mem(static_cast<size_t>(size / 2 + 64), 0x5A5A);
                KOVA_PCMBUF out{mem.data(), size};
                const int32_t bytes = kova_gen_sounds(ctx.get(), &p, &out);
                ASSERT_GE(bytes, 0);
                ASSERT_EQ(bytes % 2, 0);
                ASSERT_LE(bytes, size);
                const auto* raw = reinterpret_cast<const uint8_t*>(mem.data());
                for (size_t b = static_cast<size_t>(size); b < mem.size() * 2; ++b) {
                    ASSERT_EQ(raw[b], 0x5A) << "wrote past the buffer at byte " << b;
                }
                ASSERT_GE(ctx->osc->period, 1);
                if (bytes > 0 && action == KOVA_ACTION_MOVE) {  // played: back inside
                    ASSERT_GE(loop->pos, 0);
                    ASSERT_LT(loop->pos, loop->size / 2);
                }
            }
        }
    }
}

}  // namespace
