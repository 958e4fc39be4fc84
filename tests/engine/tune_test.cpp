// SPDX-License-Identifier: Apache-2.0
// Tune-set range rules and pairs, thickness and volume controls.
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "engine_fixture.h"

namespace {

using kova_test::tune_values;

TEST(TuneTest, SetTakesOnlyValuesInRange) {
    kova_test::TempDir dir;
    kova_test::CtxPtr ctx = kova_test::make_ctx();
    KOVA_TUNE_SET& t = *kova_test::reg_files(ctx.get(), dir, {{}, {1, 2}, {}})->tune;

    // gain out of range, pan taken; oscillator on with a bad depth: neither changes; sharpness
    // pair taken; NaN, negative and just-above-1 levels skipped; 0 and 1 taken.
    KOVA_TUNE_SET in{1.5, 0.3, 1, 2.0, 1, 0.7, 1.0, 1.0000001, NAN, -0.1, 0.0};
    EXPECT_EQ(kova_set_tuneset(ctx.get(), 1, &in), KOVA_OK);
    EXPECT_EQ(tune_values(t),
              (std::vector<double>{1.0, 0.3, 0, 1.0, 1, 0.7, 1.0, 0.4, 0.6, 0.9, 0.0}));

    // Off is taken with the depth kept for later; an enable of 2 leaves its pair alone.
    in = KOVA_TUNE_SET{0.5, 0.5, 2, 0.5, 0, 2.0, 0.5, 0.5, 0.5, 0.5, 0.5};
    EXPECT_EQ(kova_set_tuneset(ctx.get(), 1, &in), KOVA_OK);
    EXPECT_EQ(tune_values(t),
              (std::vector<double>{0.5, 0.5, 0, 1.0, 0, 0.7, 0.5, 0.5, 0.5, 0.5, 0.5}));
}

TEST(TuneTest, ThicknessAndVolume) {
    kova_test::CtxPtr ctx = kova_test::make_ctx();
    EXPECT_EQ(kova_set_thickness(ctx.get(), 1.0), KOVA_OK);  // no set yet: no effect
    EXPECT_EQ(ctx->eq->low_gain, 1.0);

    kova_test::TempDir dir;
    KOVA_SRCSET* set = kova_test::reg_files(ctx.get(), dir, {{}, {1, 2}, {}});
    EXPECT_EQ(kova_set_thickness(ctx.get(), 1.0), KOVA_OK);
    EXPECT_EQ(set->thickness, 1.0);
    EXPECT_EQ(ctx->eq->low_gain, 1.2);
    EXPECT_EQ(ctx->eq->slew_decay, 1.0);

    EXPECT_EQ(kova_set_volume(ctx.get(), 0.5), KOVA_OK);
    EXPECT_EQ(ctx->volume, 0.4);
    EXPECT_EQ(kova_set_volume(ctx.get(), 2.0), KOVA_OK);
    EXPECT_EQ(ctx->volume, 1.6);
}

}  // namespace
