// SPDX-License-Identifier: Apache-2.0
// Source-set files: the writer, the reader and the engine-less queries.
#include <cmath>
#include <functional>

#include "kova/kova_dsp.h"
#include "source_fixture.h"

namespace {

const Bytes kStart = pattern(1200, 1), kLoop = pattern(4000, 2);

// Band-pass and low-pass filters, start and loop sources, an empty end slot.
KOVA_SRCSET* sample_set(const KOVA_TUNE_SET& t) {
    return make_set({dsc(KOVA_FLT_BANDPASS, 1000.0), dsc(KOVA_FLT_LOWPASS, 3000.0)}, t,
                    make_src(0, kStart, 400, 1200), make_src(1, kLoop, 0, 4000));
}

TEST(SrcsetFile, WriterStoresTheSamplesNotTheWorkingCopy) {
    TempDir t;
    const int sum = save(sample_set(tune(0.5, 0.4)), t.file("s"), 44100, 1);
    const Bytes f = read_file(t.file("s"));
    ASSERT_EQ(f.size(), 4 + 80 + 88 + 20 + 48 + 1200 + 48 + 4000u);
    EXPECT_EQ(sum, static_cast<int>(f.size()));
    // Every field's offset is pinned by the cross-machine test's byte image; here the tune set's
    // place after two descriptors, and payloads that are the samples, not the working copy.
    EXPECT_EQ(at<double>(f, 84), 0.9);
    EXPECT_EQ(at<double>(f, 164), 0.6);
    EXPECT_EQ(Bytes(f.begin() + 240, f.begin() + 1440), kStart);
    EXPECT_EQ(Bytes(f.begin() + 1488, f.end()), kLoop);
    Read r(t.file("s"));
    EXPECT_TRUE(r.set->tune->file_gain == 0.4 && r.set->tune->wn_gain == 0.0);  // 0.4 is kept
}

TEST(SrcsetFile, RoundTripOverALongerOldFile) {
    TempDir t;
    write_file(t.file("r"), pattern(300000, 9));  // not truncated: the old tail must not matter
    save(sample_set(tune(0.5, 0.0)), t.file("r"));
    Read r(t.file("r"));
    ASSERT_EQ(r.rc, KOVA_OK);
    EXPECT_EQ(filters_of(r.set), (decltype(filters_of(r.set)){{2, 1000.0}, {0, 3000.0}}));
    EXPECT_TRUE(r.set->tune->file_gain == 0.5 && r.set->tune->wn_gain == 0.0);
    EXPECT_EQ(r.set->tune->sharpness, 0.25);
    EXPECT_EQ(r.set->src[2], nullptr);
    const Bytes* pcm[] = {&kStart, &kLoop};
    for (int slot = 0; slot < 2; ++slot) {
        const KOVA_SRC* s = r.set->src[slot];
        ASSERT_NE(s, nullptr);
        const auto n = static_cast<int32_t>(pcm[slot]->size());
        EXPECT_TRUE(s->size == n && s->slot == slot && s->rpt_end == n && s->pos == 0);
        EXPECT_EQ(s->rpt_start, slot == 0 ? 400 : 0);
        EXPECT_TRUE(s->origin == KOVA_ORIGIN_SAVEFILE && s->path == nullptr);
        EXPECT_EQ(std::memcmp(s->pcm, pcm[slot]->data(), n), 0);
        EXPECT_EQ(std::memcmp(s->pcm_proc, pcm[slot]->data(), n), 0);  // no enabled filter
    }
    // An empty start slot: flags 0, 1, and the loop record right after the info record.
    save(make_set({}, tune(0, 0.4), nullptr, make_src(1, kLoop, 0, 4000)), t.file("e"));
    const Bytes e = read_file(t.file("e"));
    EXPECT_TRUE(at<int32_t>(e, 92) == 0 && at<int32_t>(e, 96) == 1 && at<int32_t>(e, 136) == 4000);
    Read re(t.file("e"));
    EXPECT_TRUE(re.rc == KOVA_OK && re.set->src[0] == nullptr && re.set->src[1] != nullptr);
}

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

// A file that cannot be opened leaves the set given in untouched.
TEST(SrcsetFile, UnopenableFilesLeaveTheSetAlone) {
    TempDir t;
    for (const std::string& p : {t.file("missing"), t.file(std::string(600, 'x'))}) {
        Read r(p);
        EXPECT_TRUE(r.rc == KOVA_ERR_INVALID_PARAM && r.set->tune->file_gain == -7);
    }
}

std::string printed(const std::function<int()>& query, int want_rc) {
    fflush(stdout);
    testing::internal::CaptureStdout();
    EXPECT_EQ(query(), want_rc);
    fflush(stdout);
    return testing::internal::GetCapturedStdout();
}

TEST(FileQueries, PayloadOffsetsAndRepeatInfo) {
    TempDir t;
    save(make_set({}, tune(0, 0.4), make_src(0, pattern(38400, 1), 9600, 19200),
                  make_src(1, pattern(192000, 2), 0, 192000)),
         t.file("a"));
    EXPECT_EQ(pcminfo(t.file("a")), (std::vector<int>{160, 38400, 38608, 192000, -7, -7}));
    KOVA_RPT_INFO r{};
    ASSERT_EQ(kova_get_rptinfo_fromfile(t.file("a").c_str(), &r), KOVA_OK);
    EXPECT_TRUE(r.len_ms[0] == 200 && r.rpt_start_ms[0] == 50 && r.rpt_end_ms[0] == 100);
    EXPECT_EQ(r.len_ms[1], 1000);
    EXPECT_TRUE(r.len_ms[2] == 0 && r.rpt_start_ms[2] == -1 && r.rpt_end_ms[2] == -1);
    // The stored format converts: 8820 bytes at 44100 Hz mono are 100 ms.
    save(make_set({}, tune(0, 0.4), nullptr, make_src(1, pattern(8820, 2), 0, 4410)), t.file("m"),
         44100, 1);
    ASSERT_EQ(kova_get_rptinfo_fromfile(t.file("m").c_str(), &r), KOVA_OK);
    EXPECT_TRUE(r.len_ms[1] == 100 && r.rpt_end_ms[1] == 50);
}

TEST(FileQueries, TwoFiltersOfOneTypeShiftTuneAndPayload) {
    TempDir t;
    const std::string p = t.file("b");
    save(make_set({dsc(KOVA_FLT_HIGHPASS, 200.0), dsc(KOVA_FLT_HIGHPASS, 900.0, 1)}, tune(0.3, 0.0),
                  nullptr, make_src(1, pattern(40, 1), 0, 40)),
         p);
    EXPECT_EQ(at<double>(read_file(p), 84 + 40), 0.25);  // the tune set starts at 84
    EXPECT_EQ(pcminfo(p)[2], 240);
    KOVA_TUNE_SET tn{};
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(p.c_str(), &tn); }, 0),
              "kova_get_tuneset_fromfile(" + p + ")\n");
    EXPECT_TRUE(tn.sharpness == 0.25 && tn.file_gain == 0.3 && tn.wn_gain == 0.0);
    KOVA_FLT_DSC out[4] = {dsc(7, 0), dsc(7, 0), dsc(7, 0), dsc(7, 0)};
    EXPECT_EQ(printed([&] { return kova_get_filters_fromfile(p.c_str(), out); }, 0),
              "kova_get_filters_fromfile(" + p + ")\n");
    EXPECT_TRUE(out[1].type == 1 && out[1].freq == 900.0 && out[1].enable == 1);
    EXPECT_EQ(out[0].type + out[2].type + out[3].type, 21u);  // untouched
}

// The codes for a missing or null path are rows of the contract table (ApiContract); here the
// line the tune-set query prints.
TEST(FileQueries, TuneSetQueryNamesAMissingFile) {
    TempDir t;
    const std::string p = t.file("missing");
    KOVA_TUNE_SET tn;
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(p.c_str(), &tn); }, -3),
              "kova_get_tuneset_fromfile(" + p + ") failed \n");
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(nullptr, &tn); }, -3),
              "kova_get_tuneset_fromfile((null)) failed \n");
}

}  // namespace
