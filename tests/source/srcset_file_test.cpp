// SPDX-License-Identifier: Apache-2.0
// Source-set files read back: the working copy through the stored filters, and the engine-less
// queries. Writer, layout and byte images are pinned by the cross-machine test.
#include <functional>

#include "kova/kova_dsp.h"
#include "source_fixture.h"

namespace {

TEST(SrcsetFile, EnabledFiltersRebuildTheWorkingCopy) {
    TempDir t;
    const Bytes loop = pattern(9600, 7);
    const KOVA_FLT_DSC lo = dsc(KOVA_FLT_LOWPASS, 500.0, 1), hi = dsc(KOVA_FLT_HIGHPASS, 2000.0, 1);
    save(make_set({lo, hi}, tune(0, 0.4), nullptr, make_src(1, loop, 0, 9600)), t.file("f"));
    Read r(t.file("f"));
    ASSERT_EQ(r.rc, KOVA_OK);
    Bytes expect = loop;  // the payload through a bank of the same filters
    KOVA_SRCSET* bank = make_set({lo, hi});
    kova_proc_filters(reinterpret_cast<int16_t*>(expect.data()), 9600, bank->filters);
    kova_free_sourceset(bank);
    ASSERT_NE(expect, loop);
    EXPECT_EQ(std::memcmp(r.set->src[1]->pcm, loop.data(), 9600), 0);
    EXPECT_EQ(std::memcmp(r.set->src[1]->pcm_proc, expect.data(), 9600), 0);
}

std::string printed(const std::function<int()>& query, int want_rc) {
    fflush(stdout);
    testing::internal::CaptureStdout();
    EXPECT_EQ(query(), want_rc);
    fflush(stdout);
    return testing::internal::GetCapturedStdout();
}

// A file with two filters of one type and a loop stored at 44100 Hz mono.
TEST(FileQueries, TwoFiltersOfOneTypeAndAnotherFormat) {
    TempDir t;
    const std::string p = t.file("b");
    save(make_set({dsc(KOVA_FLT_HIGHPASS, 200.0), dsc(KOVA_FLT_HIGHPASS, 900.0, 1)}, tune(0.3, 0.0),
                  nullptr, make_src(1, pattern(8820, 1), 0, 4410)),
         p, 44100, 1);
    EXPECT_EQ(pcminfo(p), (std::vector<int>{-7, -7, 240, 8820, -7, -7}));
    // 8820 bytes at 44100 Hz mono are 100 ms; an absent slot has no repeat points.
    KOVA_RPT_INFO r{};
    ASSERT_EQ(kova_get_rptinfo_fromfile(p.c_str(), &r), KOVA_OK);
    EXPECT_TRUE(r.len_ms[1] == 100 && r.rpt_end_ms[1] == 50);
    EXPECT_TRUE(r.len_ms[2] == 0 && r.rpt_start_ms[2] == -1 && r.rpt_end_ms[2] == -1);
    KOVA_TUNE_SET tn{};
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(p.c_str(), &tn); }, 0),
              "kova_get_tuneset_fromfile(" + p + ")\n");
    EXPECT_TRUE(tn.sharpness == 0.25 && tn.file_gain == 0.3 && tn.wn_gain == 0.0);
    KOVA_FLT_DSC out[4] = {dsc(7, 0), dsc(7, 0), dsc(7, 0), dsc(7, 0)};
    EXPECT_EQ(printed([&] { return kova_get_filters_fromfile(p.c_str(), out); }, 0),
              "kova_get_filters_fromfile(" + p + ")\n");
    EXPECT_TRUE(out[1].type == 1 && out[1].freq == 900.0 && out[1].enable == 1);
    EXPECT_EQ(out[0].type + out[2].type + out[3].type, 21u);  // untouched
    // The line for a missing or null path (the codes are rows of the contract table).
    const std::string missing = t.file("missing");
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(missing.c_str(), &tn); }, -3),
              "kova_get_tuneset_fromfile(" + missing + ") failed \n");
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(nullptr, &tn); }, -3),
              "kova_get_tuneset_fromfile((null)) failed \n");
}

}  // namespace
