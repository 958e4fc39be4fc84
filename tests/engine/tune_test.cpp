// Tune-set range rules and pairs, thickness and volume controls.
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "engine_fixture.h"

namespace {

// The eleven values in record order.
std::vector<double> values(const KOVA_TUNE_SET& t) {
    return {t.gain,      t.pan,     t.osc_enable * 1.0, t.osc_depth,  t.sharp_enable * 1.0,
            t.sharpness, t.wn_gain, t.file_gain,        t.start_gain, t.loop_gain,
            t.end_gain};
}

TEST(TuneTest, DefaultsAndCopy) {
    KOVA_TUNE_SET t{};
    EXPECT_EQ(_cfg_tune_default(&t), &t);
    EXPECT_EQ(values(t), (std::vector<double>{1.0, 0.4, 0, 1.0, 0, 0.2, 0.5, 0.4, 0.6, 0.9, 0.6}));
    EXPECT_EQ(_cfg_tune_default(nullptr), nullptr);

    kova_test::CtxPtr ctx = kova_test::make_ctx();
    kova_test::add_set(ctx.get(), nullptr, kova_test::make_src(1, 1, {1, 2}), nullptr);
    KOVA_TUNE_SET out{};
    ASSERT_EQ(kova_get_tuneset(ctx.get(), 1, &out), KOVA_OK);
    EXPECT_EQ(values(out),
              (std::vector<double>{1.0, 0.4, 0, 1.0, 0, 0.2, 0.0, 0.4, 0.6, 0.9, 0.6}));
    EXPECT_EQ(kova_get_tuneset(ctx.get(), 2, &out), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_get_tuneset(ctx.get(), 0, &out), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_get_tuneset(ctx.get(), 1, nullptr), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_get_tuneset(nullptr, 1, &out), KOVA_OK);
}

TEST(TuneTest, SetTakesOnlyValuesInRange) {
    kova_test::CtxPtr ctx = kova_test::make_ctx();
    auto* set = kova_test::add_set(ctx.get(), nullptr, kova_test::make_src(1, 1, {1, 2}), nullptr);
    KOVA_TUNE_SET& t = *set->tune;

    KOVA_TUNE_SET in = kova_test::file_tune();
    in.gain = 1.5;
    in.pan = 0.3;
    in.osc_enable = 1;
    in.osc_depth = 2.0;  // on with a bad depth: neither changes
    in.sharp_enable = 1;
    in.sharpness = 0.7;
    in.start_gain = NAN;
    in.loop_gain = -0.1;
    in.end_gain = 0.0;
    in.wn_gain = 1.0;
    in.file_gain = 1.0000001;
    EXPECT_EQ(kova_set_tuneset(ctx.get(), 1, &in), KOVA_OK);
    EXPECT_EQ(t.gain, 1.0);
    EXPECT_EQ(t.pan, 0.3);
    EXPECT_EQ(t.osc_enable, 0);
    EXPECT_EQ(t.osc_depth, 1.0);
    EXPECT_EQ(t.sharp_enable, 1);
    EXPECT_EQ(t.sharpness, 0.7);
    EXPECT_EQ(t.start_gain, 0.6);
    EXPECT_EQ(t.loop_gain, 0.9);
    EXPECT_EQ(t.end_gain, 0.0);
    EXPECT_EQ(t.wn_gain, 1.0);
    EXPECT_EQ(t.file_gain, 0.4);

    in = t;
    in.sharp_enable = 0;  // off is taken, the depth stays for later
    in.sharpness = 2.0;
    in.osc_enable = 2;  // neither on nor off: the pair stays
    in.osc_depth = 0.5;
    EXPECT_EQ(kova_set_tuneset(ctx.get(), 1, &in), KOVA_OK);
    EXPECT_EQ(t.sharp_enable, 0);
    EXPECT_EQ(t.sharpness, 0.7);
    EXPECT_EQ(t.osc_enable, 0);
    EXPECT_EQ(t.osc_depth, 1.0);

    const std::vector<double> kept = values(t);
    EXPECT_EQ(kova_set_tuneset(ctx.get(), 2, &in), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_set_tuneset(ctx.get(), 1, nullptr), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_set_tuneset(nullptr, 1, &in), KOVA_OK);
    ctx->tag = 0;
    EXPECT_EQ(kova_set_tuneset(ctx.get(), 1, &in), KOVA_OK);
    ctx->tag = KOVA_CTX_TAG;
    EXPECT_EQ(values(t), kept);
}

TEST(TuneTest, ThicknessAndVolume) {
    kova_test::CtxPtr ctx = kova_test::make_ctx();
    EXPECT_EQ(kova_set_thickness(ctx.get(), 1.0), KOVA_OK);  // no set yet: no effect
    EXPECT_EQ(ctx->eq->low_gain, 1.0);

    auto* set = kova_test::add_set(ctx.get(), nullptr, kova_test::make_src(1, 1, {1, 2}), nullptr);
    EXPECT_EQ(kova_set_thickness(ctx.get(), 1.0), KOVA_OK);
    EXPECT_EQ(set->thickness, 1.0);
    EXPECT_EQ(ctx->eq->low_gain, 1.2);
    EXPECT_EQ(ctx->eq->slew_decay, 1.0);
    for (double bad : {1.01, -0.01, double(NAN)}) {
        EXPECT_EQ(kova_set_thickness(ctx.get(), bad), KOVA_ERR_INVALID_PARAM);
    }
    EXPECT_EQ(set->thickness, 1.0);
    EXPECT_EQ(kova_set_thickness(nullptr, 0.5), KOVA_ERR_INVALID_PARAM);

    EXPECT_EQ(kova_set_volume(ctx.get(), 0.5), KOVA_OK);
    EXPECT_EQ(ctx->volume, 0.4);
    EXPECT_EQ(kova_set_volume(ctx.get(), 2.0), KOVA_OK);
    EXPECT_EQ(ctx->volume, 1.6);
    EXPECT_EQ(kova_set_volume(nullptr, 1.0), KOVA_ERR_INVALID_PARAM);
    ctx->tag = 0;
    EXPECT_EQ(kova_set_volume(ctx.get(), 1.0), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_set_thickness(ctx.get(), 0.5), KOVA_ERR_INVALID_PARAM);
    ctx->tag = KOVA_CTX_TAG;
    EXPECT_EQ(ctx->volume, 1.6);
    EXPECT_EQ(set->thickness, 1.0);
}

}  // namespace
