// Generation never allocates: start, move (every path) and end leave the allocation count alone.
#include <gtest/gtest.h>

#include <vector>

#include "engine_fixture.h"

namespace {

using kova_test::event;

TEST(AllocFreeMoveTest, NoAllocationPerEvent) {
    kova_test::CtxPtr ctx = kova_test::make_ctx(48000, 2, 1, 1080, 2280);
    std::vector<int16_t> pcm(4000, 1200);
    auto* set = kova_test::add_set(ctx.get(), kova_test::make_src(0, KOVA_ORIGIN_FILE, pcm),
                                   kova_test::make_src(1, KOVA_ORIGIN_NOISE, pcm),
                                   kova_test::make_src(2, KOVA_ORIGIN_FILE, pcm));
    std::vector<int16_t> buf(20000);
    // Plain, oscillator, pitch raise, and both (the pitch raise stages into the work buffer).
    const int32_t modes[4][2] = {{0, 0}, {1, 0}, {0, 1}, {1, 1}};
    for (const auto& mode : modes) {
        set->tune->osc_enable = mode[0];
        set->tune->sharp_enable = mode[1];
        set->tune->sharpness = 1.0;
        const unsigned long before = kova_mem_alloc_count();
        int32_t bytes = kova_test::gen(ctx.get(), event(10, 10, 1000, KOVA_ACTION_START), buf);
        for (int k = 1; k <= 8; ++k) {
            bytes += kova_test::gen(ctx.get(), event(10.0f + 160 * k, 10, 1000 + 20 * k, 1), buf);
        }
        bytes += kova_test::gen(ctx.get(), event(10, 10, 1300, KOVA_ACTION_END), buf);
        EXPECT_EQ(kova_mem_alloc_count(), before);
        EXPECT_GT(bytes, 2 * 8000);  // the calls did produce sound
    }
}

}  // namespace
