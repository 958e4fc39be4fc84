// SPDX-License-Identifier: Apache-2.0
#include <functional>

#include "source_fixture.h"

namespace {

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

TEST(FileQueries, MissingFile) {
    TempDir t;
    const std::string p = t.file("missing");
    KOVA_FLT_DSC flt[4] = {};
    KOVA_RPT_INFO r;
    KOVA_TUNE_SET tn;
    pcminfo(p, KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_get_filters_fromfile(p.c_str(), flt), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_get_rptinfo_fromfile(p.c_str(), &r), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(p.c_str(), &tn); }, -3),
              "kova_get_tuneset_fromfile(" + p + ") failed \n");
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(nullptr, &tn); }, -3),
              "kova_get_tuneset_fromfile((null)) failed \n");
}

}  // namespace
