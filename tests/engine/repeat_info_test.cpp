// SPDX-License-Identifier: Apache-2.0
// Repeat points in milliseconds: conversions with known numbers, reading and storing them.
#include <gtest/gtest.h>

#include <vector>

#include "engine/engine_fixture.h"
#include "kova/kova.h"

TEST(RepeatInfo, ConversionsGiveKnownNumbers) {
    EXPECT_EQ(_cvt_ms_to_byte(1, 44100, 1), 88);    // 88.2 truncated
    EXPECT_EQ(_cvt_ms_to_byte(7, 44100, 2), 1232);  // 1234.8 -> 1234 -> whole frames
    EXPECT_EQ(_cvt_ms_to_byte(5, 44100, 1), 440);   // 441 -> whole frames
    EXPECT_EQ(_cvt_ms_to_byte(-5, 48000, 2), 0);
    EXPECT_EQ(_cvt_byte_to_ms(191, 48000, 1), 1);  // 1.98 truncated toward zero
    EXPECT_EQ(_cvt_byte_to_ms(-191, 48000, 1), -1);
    // Rates read from damaged files must not divide by zero or overflow.
    EXPECT_EQ(_cvt_byte_to_ms(1000, 0, 2), 0);
    EXPECT_EQ(_cvt_ms_to_byte(INT64_MAX, 48000, 2) % 4, 0);
}

TEST(RepeatInfo, StoringKeepsValuesWithinTheSource) {
    kova_test::TempDir dir;
    auto owner = kova_test::make_ctx(44100, 2);
    KOVA_CTX* ctx = owner.get();
    const std::vector<int16_t> ms50(4410, 1), ms100(8820, 1);  // 8820 and 17640 bytes
    KOVA_SRCSET* set = kova_test::reg_files(ctx, dir, {ms50, ms100, {}});
    KOVA_SRC* s = set->src[KOVA_SLOT_START];
    KOVA_SRC* l = set->src[KOVA_SLOT_LOOP];

    KOVA_RPT_INFO in{{0, 0, 0}, {-1, 5, 0}, {51, 10, 7}};
    ASSERT_EQ(kova_set_rptinfo(ctx, 1, &in), 0);
    EXPECT_EQ(s->rpt_start, 0);    // -1: unchanged
    EXPECT_EQ(s->rpt_end, 8820);   // 51 ms > 50 ms length: unchanged
    EXPECT_EQ(l->rpt_start, 880);  // 5 ms = 882 bytes, cut to whole frames
    EXPECT_EQ(l->rpt_end, 1764);   // 10 ms = 441 frames
    in = KOVA_RPT_INFO{{0, 0, 0}, {0, 100, 0}, {50, 0, 0}};
    ASSERT_EQ(kova_set_rptinfo(ctx, 1, &in), 0);
    EXPECT_EQ(s->rpt_end, 8820);  // equal to the length: the whole source
    EXPECT_EQ(l->rpt_start, 17640);
    EXPECT_EQ(l->rpt_end, 0);  // 0 ms stores 0 bytes, also for the loop slot
    in = KOVA_RPT_INFO{{0, 0, 0}, {51, -1, -1}, {-1, -1, -1}};
    ASSERT_EQ(kova_set_rptinfo(ctx, 1, &in), 0);
    EXPECT_EQ(s->rpt_start, 0);  // 51 ms > 50 ms length: unchanged

    KOVA_RPT_INFO out{};
    ASSERT_EQ(kova_get_rptinfo(ctx, 1, &out), 0);
    EXPECT_EQ(out.len_ms[KOVA_SLOT_START], 50);
    EXPECT_EQ(out.rpt_start_ms[KOVA_SLOT_LOOP], 100);
    // An empty slot: no length, and -1 for both points.
    EXPECT_TRUE(out.len_ms[KOVA_SLOT_END] == 0 && out.rpt_start_ms[KOVA_SLOT_END] == -1 &&
                out.rpt_end_ms[KOVA_SLOT_END] == -1);
}
