// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <vector>

#include "kova/kova_dsp.h"
#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "util/kova_mem.h"

namespace {

using Pcm = std::vector<int16_t>;

void keep(void*) {}  // descriptors in these lists live on the test's stack

KOVA_FLT_DSC flt(uint32_t type, double freq, uint32_t enable = 1) {
    return KOVA_FLT_DSC{type, freq, 300, enable, 48000, 2};
}

Pcm noise(int samples) {
    Pcm v(samples);
    kova_gen_white_noise_16bit(v.data(), samples * 2);
    return v;
}

// The filter bank over a list of descriptors (by address, so entries can be null).
// `fail_after` limits the allocations of the bank itself.
Pcm bank(Pcm pcm, std::vector<KOVA_FLT_DSC*> dscs, long fail_after = -1) {
    LIST* l = list_create();
    for (KOVA_FLT_DSC* d : dscs) list_pushback(l, d);
    kova_mem_fail_after(fail_after);
    kova_proc_filters(pcm.data(), uint32_t(pcm.size() * 2), l);
    kova_mem_fail_after(-1);
    list_destory(l, keep);
    return pcm;
}

// A chain of filters applied one after another, each from rest.
Pcm chain(Pcm pcm, std::vector<KOVA_FLT_DSC> dscs) {
    for (const KOVA_FLT_DSC& d : dscs) {
        int32_t err;
        KOVA_FLT* f = kova_flt_init(&d, &err);
        kova_flt_process(f, pcm.data(), int32_t(pcm.size() * 2));
        kova_flt_deinit(f);
    }
    return pcm;
}

Pcm mean(const std::vector<Pcm>& branches) {
    Pcm out(branches[0].size());
    for (size_t s = 0; s < out.size(); ++s) {
        int sum = 0;
        for (const Pcm& b : branches) sum += b[s];
        out[s] = int16_t(sum / int(branches.size()));  // C++ division truncates toward zero
    }
    return out;
}

TEST(Noise, TenthOfFullScaleOneDrawPerSampleNeverSeeded) {
    std::srand(77);
    std::vector<int> draws(20000);
    for (int& r : draws) r = std::rand();
    std::srand(77);  // the generator must continue the caller's sequence, not reseed it
    Pcm v = noise(20000);
    for (size_t i = 0; i < v.size(); ++i) {
        ASSERT_NEAR(v[i], (draws[i] / 2147483647.0 - 0.5) * 6553.6, 1.0) << i;
        ASSERT_LE(std::abs(v[i]), 3276);
    }

    int16_t five[3] = {7, 7, 7};
    kova_gen_white_noise_16bit(five, 5);
    EXPECT_EQ(five[2], 7);
}

TEST(Noise, SourcesPerSlot) {
    KOVA_FLT_DSC d = flt(0, 1000);
    const int32_t sizes[] = {38400, 192000, 38400};
    for (uint32_t slot = 0; slot < 3; ++slot) {
        int32_t err = 99;
        KOVA_SRC* s = kova_gen_sound_source_wn(&d, slot, &err);
        ASSERT_NE(s, nullptr);
        EXPECT_EQ(err, KOVA_OK);
        EXPECT_EQ(s->size, sizes[slot]);
        EXPECT_EQ(std::memcmp(s->pcm, s->pcm_proc, s->size), 0);
        kova_free_sourceobj(s);
    }
}

TEST(FilterBank, ParallelBranchesAveragedWithTruncation) {
    Pcm in = noise(4000);
    KOVA_FLT_DSC lp = flt(KOVA_FLT_LOWPASS, 1000), hp = flt(KOVA_FLT_HIGHPASS, 3000),
                 bp = flt(KOVA_FLT_BANDPASS, 5000), off = flt(0, 1, 0), two = flt(0, 1, 2);
    const Pcm a = chain(in, {lp}), b = chain(in, {hp}), c = chain(in, {bp});
    EXPECT_EQ(bank(in, {&lp}), a);
    EXPECT_EQ(bank(in, {nullptr, &lp, &two, &hp}), mean({a, b}));  // missing, enable 2: skipped
    EXPECT_EQ(bank(in, {&lp, &hp, &bp}), mean({a, b, c}));
    // Position 4 and later filter the latest branch in series.
    EXPECT_EQ(bank(in, {&lp, &hp, &off, &off, &bp}), mean({a, chain(in, {hp, bp})}));
    EXPECT_EQ(bank(in, {&off, &off, &off, &off, &bp}), in);  // no branch to join
}

TEST(FilterBank, AllocationFailuresDropFiltersWithoutLeaking) {
    Pcm in = noise(4000);
    KOVA_FLT_DSC lp = flt(KOVA_FLT_LOWPASS, 1000), hp = flt(KOVA_FLT_HIGHPASS, 3000);
    testing::internal::CaptureStdout();
    // First branch and its 7-allocation filter, then nothing.
    Pcm first_only = bank(in, {&lp, &hp}, 8);
    // First branch only: its filter cannot be made, so it stays an unfiltered copy.
    Pcm unfiltered = bank(in, {&lp, &hp}, 1);
    testing::internal::GetCapturedStdout();
    EXPECT_EQ(first_only, chain(in, {lp}));
    EXPECT_EQ(unfiltered, in);
}

}  // namespace
