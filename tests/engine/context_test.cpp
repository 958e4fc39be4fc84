// SPDX-License-Identifier: Apache-2.0
// Format check, context creation (including every allocation failing in turn) and release.
#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "engine_fixture.h"

namespace {

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

}  // namespace
