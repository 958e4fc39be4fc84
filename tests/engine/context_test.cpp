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
    // Null arguments: nothing stored, nothing printed.
    int32_t err = 42;
    testing::internal::CaptureStdout();
    EXPECT_EQ(kova_init(nullptr, &err), nullptr);
    EXPECT_EQ(kova_init(&cases[0].f, nullptr), nullptr);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
    EXPECT_EQ(err, 42);
    EXPECT_EQ(kova_checkformat(nullptr), -1);
}

TEST(ContextTest, FreshContextState) {
    kova_test::CtxPtr ctx = kova_test::make_ctx(48000, 2, 1, 1080, 2280);
    ASSERT_TRUE(ctx);
    EXPECT_EQ(ctx->tag, KOVA_CTX_TAG);
    EXPECT_EQ(ctx->norm, 10000.0 / std::sqrt(1166400.0 + 5198400.0));
    EXPECT_EQ(ctx->volume, 0.8);
    EXPECT_EQ(ctx->active_src, 0);
    EXPECT_EQ(ctx->stroke, 0u);
    EXPECT_EQ(ctx->prev_env, 0.0);
    EXPECT_EQ(ctx->src_list->count, 0u);
    EXPECT_EQ(ctx->format->p, 1u);
    EXPECT_EQ(ctx->osc->sample_rate, 48000);
    EXPECT_EQ(ctx->eq->slew_decay, 0.88);
    EXPECT_EQ(ctx->eq->low_coef, 0.11512805391913455);

    // Mono drops panning from the context's copy; a 0 x 0 screen makes every move fast.
    kova_test::CtxPtr mono = kova_test::make_ctx(44100, 1, 1 + 4, 0, 0);
    ASSERT_TRUE(mono);
    EXPECT_EQ(mono->format->p, 0u);
    EXPECT_TRUE(std::isinf(mono->norm) && mono->norm > 0);
}

TEST(ContextTest, EveryAllocationFailureIsReportedAndReleased) {
    const KOVA_FORMAT f{48000, 2, 1, 1080, 2280};
    int failures = 0;
    for (long n = 0;; ++n) {
        int32_t err = 7;
        kova_mem_fail_after(n);
        testing::internal::CaptureStdout();
        KOVA_CTX* ctx = kova_init(&f, &err);
        kova_mem_fail_after(-1);
        const std::string out = testing::internal::GetCapturedStdout();
        if (ctx != nullptr) {
            EXPECT_EQ(err, KOVA_OK);
            EXPECT_EQ(kova_deinit(ctx), KOVA_OK);
            break;
        }
        ++failures;
        SCOPED_TRACE(n);
        EXPECT_EQ(err, KOVA_ERR_INSUFF_MEM);
        // The oscillator reports its own failure before ours; ours always close the output.
        const std::string tail = "KOVA_CTX malloc fail \nkova_init() fail. err code (-2) \n";
        ASSERT_GE(out.size(), tail.size());
        EXPECT_EQ(out.substr(out.size() - tail.size()), tail);
        if (n == 0) {
            EXPECT_EQ(out, tail);
        }
        ASSERT_LT(n, 100) << "kova_init never succeeded";
    }
    // Context, format, event, oscillator, mutex, equaliser, staging buffer and the list.
    EXPECT_GE(failures, 8);
}

TEST(ContextTest, DeinitRefusesNullAndDeadHandles) {
    EXPECT_EQ(kova_deinit(nullptr), KOVA_ERR_INVALID_PARAM);
    // A dead record with pointers that must never be followed: any release would fault.
    KOVA_CTX dead{};
    dead.tag = 0;
    dead.format = reinterpret_cast<KOVA_FORMAT*>(0x10);
    dead.work_buf = reinterpret_cast<int16_t*>(0x20);
    EXPECT_EQ(kova_deinit(&dead), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(dead.format, reinterpret_cast<KOVA_FORMAT*>(0x10));

    // A context with registered sets releases them with itself (leaks would show under ASan).
    kova_test::CtxPtr ctx = kova_test::make_ctx();
    kova_test::add_set(ctx.get(), nullptr,
                       kova_test::make_src(KOVA_SLOT_LOOP, KOVA_ORIGIN_FILE, {1, 2, 3, 4}),
                       nullptr);
    EXPECT_EQ(kova_deinit(ctx.release()), KOVA_OK);
}

}  // namespace
