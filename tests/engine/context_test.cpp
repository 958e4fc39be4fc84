// SPDX-License-Identifier: Apache-2.0
// Format check, context creation and release; tune-set range rules and pairs, a thickness
// without a set.
#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <vector>

#include "engine_fixture.h"

namespace {

using kova_test::tune_values;

TEST(ContextTest, FormatRules) {
    struct Case {
        KOVA_FORMAT f;
        int32_t want;
    };
    const Case cases[] = {
        {{48000, 2, 1, 1080, 2280}, 1}, {{48000, 1, 1, 1080, 2280}, -1},
        {{44100, 1, 0, 0, 0}, 1},       {{48000, 2, 2, 0, 0}, 1},
        {{8000, 1, 0, 0, 0}, 1},        {{7999, 2, 0, 10, 10}, -1},
        {{48001, 2, 0, 10, 10}, -1},    {{48000, 0, 0, 10, 10}, -1},
        {{48000, 3, 0, 10, 10}, -1},    {{48000, 2, 1, 0, 2280}, -1},
        {{48000, 2, 1, 1080, 0}, -1},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::Message() << c.f.sample_rate << "/" << c.f.channels << "/" << c.f.p
                                        << "/" << c.f.w << "/" << c.f.h);
        EXPECT_EQ(kova_checkformat(&c.f), c.want);
        int32_t err = 7;
        testing::internal::CaptureStdout();
        KOVA_CTX* ctx = kova_init(&c.f, &err);
        const std::string out = testing::internal::GetCapturedStdout();
        if (c.want == 1) {
            ASSERT_NE(ctx, nullptr);
            EXPECT_EQ(err, KOVA_OK);
            EXPECT_EQ(out, "");
            EXPECT_EQ(kova_deinit(ctx), KOVA_OK);
        } else {
            EXPECT_EQ(ctx, nullptr);
            EXPECT_EQ(err, KOVA_ERR_INVALID_FORMAT);
            EXPECT_EQ(out, "kova_init() fail. err code (-1) \n");
        }
    }
}

TEST(TuneTest, SetTakesOnlyValuesInRange) {
    kova_test::TempDir dir;
    kova_test::CtxPtr ctx = kova_test::make_ctx();
    EXPECT_EQ(kova_set_thickness(ctx.get(), 1.0), KOVA_OK);  // no set yet: no effect
    EXPECT_EQ(ctx->eq->low_gain, 1.0);
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

}  // namespace
