#include <cstdio>
#include <functional>

#include "source_fixture.h"

using namespace srcfix;

namespace {

struct PcmInfo {
    int off[3] = {-7, -7, -7}, size[3] = {-7, -7, -7};
    int rc;
    explicit PcmInfo(const std::string& p)
        : rc(kova_get_pcminfo_fromfile(p.c_str(), &off[0], &size[0], &off[1], &size[1], &off[2],
                                       &size[2])) {}
};

std::string captured(const std::function<void()>& run) {
    fflush(stdout);
    testing::internal::CaptureStdout();
    run();
    fflush(stdout);
    return testing::internal::GetCapturedStdout();
}

TEST(FileQueries, PayloadOffsetsWithoutFilters) {
    TempDir t;
    KOVA_SRCSET* set = make_set({}, tune(0, 0.4), make_src(0, pattern(38400, 1), 0, 38400),
                                make_src(1, pattern(192000, 2), 0, 192000), nullptr);
    save(set, t.file("a.kova"));
    kova_free_sourceset(set);
    PcmInfo i(t.file("a.kova"));
    EXPECT_EQ(i.rc, KOVA_OK);
    EXPECT_EQ(i.off[0], 160);
    EXPECT_EQ(i.size[0], 38400);
    EXPECT_EQ(i.off[1], 38608);
    EXPECT_EQ(i.size[1], 192000);
    EXPECT_EQ(i.off[2], -7);  // absent slot: untouched
    EXPECT_EQ(i.size[2], -7);
}

TEST(FileQueries, TwoFiltersOfOneTypeShiftTuneAndPayload) {
    TempDir t;
    const std::string p = t.file("b.kova");
    const KOVA_FLT_DSC first = dsc(KOVA_FLT_HIGHPASS, 200.0),
                       second = dsc(KOVA_FLT_HIGHPASS, 900.0, 1);
    KOVA_SRCSET* set = make_set({first, second}, tune(0.3, 0.0), nullptr,
                                make_src(1, pattern(40, 1), 0, 40), nullptr);
    save(set, p);
    kova_free_sourceset(set);
    EXPECT_EQ(at<double>(read_file(p), 84 + 40), 0.25);  // sharpness of the tune set at 84

    EXPECT_EQ(PcmInfo(p).off[1], 240);
    KOVA_TUNE_SET tn{};
    EXPECT_EQ(captured([&] { EXPECT_EQ(kova_get_tuneset_fromfile(p.c_str(), &tn), KOVA_OK); }),
              "kova_get_tuneset_fromfile(" + p + ")\n");
    EXPECT_EQ(tn.sharpness, 0.25);
    EXPECT_EQ(tn.file_gain, 0.3);  // adjusted like the set reader
    EXPECT_EQ(tn.wn_gain, 0.0);

    KOVA_FLT_DSC out[4];
    for (auto& d : out) d = dsc(7, -1.0);
    EXPECT_EQ(captured([&] { EXPECT_EQ(kova_get_filters_fromfile(p.c_str(), out), KOVA_OK); }),
              "kova_get_filters_fromfile(" + p + ")\n");
    EXPECT_TRUE(same_dsc(out[1], second));
    for (int k : {0, 2, 3}) EXPECT_EQ(out[k].type, 7u);
}

TEST(FileQueries, RepeatInfoInMilliseconds) {
    TempDir t;
    KOVA_SRCSET* set = make_set({}, tune(0, 0.4), make_src(0, pattern(38400, 1), 9600, 19200),
                                make_src(1, pattern(8820, 2), 0, 4410), nullptr);
    save(set, t.file("s.kova"));  // 48000 Hz stereo
    save(set, t.file("m.kova"), 44100, 1);
    kova_free_sourceset(set);
    KOVA_RPT_INFO r{};
    ASSERT_EQ(kova_get_rptinfo_fromfile(t.file("s.kova").c_str(), &r), KOVA_OK);
    EXPECT_EQ(r.len_ms[0], 200);
    EXPECT_EQ(r.rpt_start_ms[0], 50);
    EXPECT_EQ(r.rpt_end_ms[0], 100);
    EXPECT_EQ(r.len_ms[2], 0);
    EXPECT_EQ(r.rpt_start_ms[2], -1);
    EXPECT_EQ(r.rpt_end_ms[2], -1);
    ASSERT_EQ(kova_get_rptinfo_fromfile(t.file("m.kova").c_str(), &r), KOVA_OK);
    EXPECT_EQ(r.len_ms[1], 100);  // the stored format converts: 8820 bytes at 44100 Hz mono
    EXPECT_EQ(r.rpt_end_ms[1], 50);
}

TEST(FileQueries, MissingFileOrArgumentsGiveInvalidParam) {
    TempDir t;
    const std::string p = t.file("missing.kova");
    EXPECT_EQ(PcmInfo(p).rc, KOVA_ERR_INVALID_PARAM);
    KOVA_FLT_DSC flt[4];
    KOVA_RPT_INFO r;
    KOVA_TUNE_SET tn;
    EXPECT_EQ(kova_get_filters_fromfile(p.c_str(), flt), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_get_rptinfo_fromfile(p.c_str(), &r), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_get_rptinfo_fromfile(nullptr, &r), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(captured([&] {
                  EXPECT_EQ(kova_get_tuneset_fromfile(p.c_str(), &tn), KOVA_ERR_INVALID_PARAM);
              }),
              "kova_get_tuneset_fromfile(" + p + ") failed \n");
    EXPECT_EQ(captured([&] {
                  EXPECT_EQ(kova_get_tuneset_fromfile(nullptr, &tn), KOVA_ERR_INVALID_PARAM);
              }),
              "kova_get_tuneset_fromfile((null)) failed \n");
}

TEST(FileQueries, FilterQueryReportsNoMemory) {
    TempDir t;
    KOVA_SRCSET* set =
        make_set({dsc(0, 100.0)}, tune(0, 0.4), nullptr, make_src(1, pattern(8, 1), 0, 8), nullptr);
    save(set, t.file("n.kova"));
    kova_free_sourceset(set);
    KOVA_FLT_DSC out[4] = {};
    const size_t before = heap_in_use();
    kova_mem_fail_after(2);  // the path buffer and the handle succeed, the working record fails
    const int rc = kova_get_filters_fromfile(t.file("n.kova").c_str(), out);
    kova_mem_fail_after(-1);
    EXPECT_EQ(rc, KOVA_ERR_INSUFF_MEM);
    EXPECT_EQ(out[0].freq, 0.0);
    EXPECT_TRUE(heap_back_to(before));
}

}  // namespace
