// SPDX-License-Identifier: Apache-2.0
// Editing a registered set's filters and files; refusal of degenerate descriptors.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <string>
#include <vector>

#include "engine/engine_fixture.h"
#include "kova/kova.h"
#include "util/kova_mem.h"

namespace {

constexpr KOVA_FLT_DSC kLow{KOVA_FLT_LOWPASS, 500.0, 0.0, 1, 48000, 2};
constexpr KOVA_FLT_DSC kBand{KOVA_FLT_BANDPASS, 1000.0, 200.0, 1, 48000, 2};

// A stereo sine of `hz` at 48 kHz.
std::vector<int16_t> sine(double hz, int frames) {
    std::vector<int16_t> s(frames * 2);
    for (int i = 0; i < frames; ++i) {
        s[2 * i] = s[2 * i + 1] = static_cast<int16_t>(8000 * std::sin(2 * M_PI * hz * i / 48000));
    }
    return s;
}

double rms(const int16_t* s, int n) {
    double acc = 0;
    for (int i = n / 2; i < n; ++i) acc += double(s[i]) * s[i];  // past the filter's settling
    return std::sqrt(acc / (n - n / 2));
}

struct FilterOps : testing::Test {
    kova_test::TempDir dir;
    kova_test::CtxPtr owner = kova_test::make_ctx();
    KOVA_CTX* ctx = owner.get();
    int32_t err = 0;
    KOVA_SRCSET* set(int id) { return kova_test::set_of(ctx, id); }
    const KOVA_FLT_DSC& filter(int id, uint32_t i) {
        return *static_cast<KOVA_FLT_DSC*>(list_getat(set(id)->filters, i)->data);
    }
    static void expect_filtered(const KOVA_SRC* s, LIST* filters) {
        std::vector<int16_t> ref(s->pcm, s->pcm + s->size / 2);
        kova_proc_filters(ref.data(), s->size, filters);
        EXPECT_EQ(0, memcmp(s->pcm_proc, ref.data(), s->size));
        EXPECT_EQ(s->pos, 0);
    }
};

}  // namespace

TEST_F(FilterOps, AttachReplacesSameTypeAndAppendsNewOnes) {
    ASSERT_EQ(kova_reg_src_byfilter(ctx, &kLow, &err), 1);
    KOVA_FLT_DSC low2 = kLow;
    low2.freq = 3000.0;
    EXPECT_EQ(kova_attach_filter(ctx, 1, &low2, &err), 1);
    EXPECT_EQ(err, KOVA_OK);
    ASSERT_EQ(set(1)->filters->count, 1u);
    EXPECT_EQ(filter(1, 0).freq, 3000.0);
    EXPECT_EQ(kova_attach_filter(ctx, 1, &kBand, &err), 1);
    ASSERT_EQ(set(1)->filters->count, 2u);
    EXPECT_EQ(filter(1, 0).type, KOVA_FLT_LOWPASS);
    EXPECT_EQ(filter(1, 1).type, KOVA_FLT_BANDPASS);
    expect_filtered(set(1)->src[KOVA_SLOT_LOOP], set(1)->filters);

    // Only the types present are written.
    KOVA_FLT_DSC out[4];
    memset(out, 0x7F, sizeof(out));
    const KOVA_FLT_DSC untouched = out[1];
    EXPECT_EQ(kova_get_filters(ctx, 1, out), 0);
    EXPECT_EQ(out[0].freq, 3000.0);
    EXPECT_EQ(out[2].bandwidth, 200.0);
    EXPECT_EQ(0, memcmp(&out[1], &untouched, sizeof(untouched)));
    EXPECT_EQ(0, memcmp(&out[3], &untouched, sizeof(untouched)));
}

TEST_F(FilterOps, UpdateRereadsFilesAndRefiltersEverySource) {
    kova_test::reg_files(ctx, dir, {sine(300, 2000), sine(300, 8000), {}});
    ASSERT_EQ(kova_attach_filter(ctx, 1, &kLow, &err), 1);
    const double low_level =
        rms(set(1)->src[1]->pcm_proc, 16000);  // 300 Hz passes the 500 Hz low-pass
    set(1)->src[0]->pos = 7;
    set(1)->src[1]->pos = 11;

    dir.write("slot1", sine(6000, 8000));  // the loop file changes on disk
    KOVA_FLT_DSC low2 = kLow;
    low2.freq = 400.0;
    ASSERT_EQ(kova_update_filter(ctx, 1, &low2, &err), 1);
    EXPECT_EQ(err, KOVA_OK);
    for (int slot : {0, 1}) expect_filtered(set(1)->src[slot], set(1)->filters);
    // The loop now holds the 6 kHz sine from disk, far in the 400 Hz low-pass's stop band.
    EXPECT_GT(low_level, 0.8 * 0.9 * 8000 / std::sqrt(2.0));
    EXPECT_LT(rms(set(1)->src[1]->pcm_proc, 16000), 0.02 * low_level);
}

TEST_F(FilterOps, ReplacingFilesKeepsOtherSlotsAndReportsAnEmptyLoop) {
    ASSERT_EQ(kova_reg_src_byfilter(ctx, &kLow, &err), 1);
    const std::string s = dir.write("s.pcm", sine(300, 1000));
    const char* add_start[3] = {s.c_str(), nullptr, nullptr};
    EXPECT_EQ(kova_update_src_byfiles(ctx, 1, add_start, &err), 1);
    EXPECT_EQ(err, KOVA_OK);
    EXPECT_EQ(set(1)->src[0]->size, 4000);
    EXPECT_EQ(set(1)->src[1]->origin, KOVA_ORIGIN_NOISE);
    for (int slot : {0, 1}) expect_filtered(set(1)->src[slot], set(1)->filters);  // not twice
    EXPECT_EQ(set(1)->tune->file_gain, 0.4);
    EXPECT_EQ(set(1)->tune->wn_gain, 0.0);

    const std::string missing = dir.file("none.pcm");
    const char* bad_loop[3] = {nullptr, missing.c_str(), nullptr};
    EXPECT_EQ(kova_update_src_byfiles(ctx, 1, bad_loop, &err), 0);
    EXPECT_EQ(err, KOVA_ERR_SOURCE);
    EXPECT_EQ(set(1)->src[1], nullptr);
    // The set stays registered; that a set without a loop plays nothing is a row of the contract
    // table.
    EXPECT_EQ(kova_get_src_num(ctx), 1);
    EXPECT_EQ(kova_update_src_byfiles(ctx, 2, add_start, &err), 0);
    EXPECT_EQ(err, KOVA_ERR_INVALID_PARAM);
}

TEST_F(FilterOps, RefusalsAndFailuresLeaveTheContextAlone) {
    ASSERT_EQ(kova_reg_src_byfilter(ctx, &kLow, &err), 1);
    const std::vector<int16_t> before(set(1)->src[1]->pcm_proc, set(1)->src[1]->pcm_proc + 96000);
    // Each row the valid band-pass (or low-pass) with one field made degenerate.
    const auto with = [](KOVA_FLT_DSC d, auto KOVA_FLT_DSC::*field, auto value) {
        d.*field = value;
        return d;
    };
    using D = KOVA_FLT_DSC;
    const KOVA_FLT_DSC bad[] = {
        with(kBand, &D::type, 4u),           with(kBand, &D::samplerate, 0),
        with(kBand, &D::samplerate, -48000), with(kBand, &D::samplerate, 400000),
        with(kBand, &D::freq, 0.0),          with(kBand, &D::freq, 24000.0),  // Nyquist
        with(kBand, &D::freq, NAN),          with(kBand, &D::bandwidth, 0.0),
        with(kBand, &D::bandwidth, 24000.0), with(kBand, &D::bandwidth, INFINITY),
        with(kBand, &D::channels, 0),        with(kBand, &D::channels, 3),
        with(kLow, &D::freq, -1.0),          with(kLow, &D::bandwidth, NAN)};
    for (const KOVA_FLT_DSC& d : bad) {
        int32_t e[3] = {0, 0, 0};  // identifiers are never negative: a sum of 0 is three zeros
        EXPECT_EQ(kova_reg_src_byfilter(ctx, &d, &e[0]) + kova_attach_filter(ctx, 1, &d, &e[1]) +
                      kova_update_filter(ctx, 1, &d, &e[2]),
                  0);
        EXPECT_EQ(std::vector<int32_t>(e, e + 3), std::vector<int32_t>(3, KOVA_ERR_INVALID_PARAM));
    }
    // A type the set does not have cannot be updated.
    testing::internal::CaptureStdout();
    EXPECT_EQ(kova_update_filter(ctx, 1, &kBand, &err), 0);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "kova_update_filterdsc() < 0 \n");
    EXPECT_EQ(err, KOVA_ERR_INVALID_PARAM);

    EXPECT_EQ(kova_get_src_num(ctx), 1);
    EXPECT_EQ(ctx->active_src, 1);
    ASSERT_EQ(set(1)->filters->count, 1u);
    EXPECT_EQ(0, memcmp(&filter(1, 0), &kLow, sizeof(kLow)));
    EXPECT_EQ(0, memcmp(before.data(), set(1)->src[1]->pcm_proc, 192000));
}
