// Saving a set and registering the saved file again, checked against the file's bytes.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "engine/engine_fixture.h"
#include "kova/kova.h"

namespace {

using kova_test::set_of;

std::vector<char> read_all(const std::string& p) {
    std::ifstream f(p, std::ios::binary);
    return {std::istreambuf_iterator<char>(f), {}};
}

std::vector<char> wave(size_t bytes, int seed) {
    std::vector<char> v(bytes);
    for (size_t i = 0; i < bytes; ++i) v[i] = static_cast<char>((i * 7 + seed * 13) % 251);
    return v;
}

template <typename T>
T at(const std::vector<char>& file, size_t off) {
    T v;
    std::memcpy(&v, file.data() + off, sizeof(T));
    return v;
}

void expect_same_dsc(const KOVA_FLT_DSC& a, const KOVA_FLT_DSC& b) {
    EXPECT_TRUE(a.type == b.type && a.freq == b.freq && a.bandwidth == b.bandwidth &&
                a.enable == b.enable && a.samplerate == b.samplerate && a.channels == b.channels)
        << a.type << " " << a.freq << " vs " << b.type << " " << b.freq;
}

// A context holding one set registered from a 2 kHz low-pass.
kova_test::CtxPtr filter_set_ctx() {
    const KOVA_FLT_DSC low{KOVA_FLT_LOWPASS, 2000.0, 0.0, 1, 48000, 2};
    kova_test::CtxPtr ctx = kova_test::make_ctx();
    int32_t err = 0;
    EXPECT_EQ(kova_reg_src_byfilter(ctx.get(), &low, &err), 1);
    return ctx;
}

}  // namespace

TEST(SaveSource, SavedSetRegistersAgainWithItsShape) {
    kova_test::TempDir dir;
    const std::vector<char> start = wave(2000, 1), loop = wave(40000, 2), end = wave(1200, 3);
    const std::string sp = dir.write("s.pcm", start), lp = dir.write("l.pcm", loop),
                      ep = dir.write("e.pcm", end), saved = dir.file("set.kova");
    auto a_owner = kova_test::make_ctx();
    KOVA_CTX* a = a_owner.get();
    const char* paths[3] = {sp.c_str(), lp.c_str(), ep.c_str()};
    const KOVA_FLT_DSC low{KOVA_FLT_LOWPASS, 3000.0, 0.0, 1, 48000, 2};
    const KOVA_FLT_DSC band{KOVA_FLT_BANDPASS, 1000.0, 400.0, 1, 48000, 2};
    int32_t err = 0;
    ASSERT_EQ(kova_reg_src_byfiles(a, paths, &err), 1);
    ASSERT_EQ(kova_attach_filter(a, 1, &low, &err), 1);
    ASSERT_EQ(kova_attach_filter(a, 1, &band, &err), 1);
    const KOVA_TUNE_SET tune{0.7, 0.3, 1, 0.5, 1, 0.8, 0.5, 0.0, 0.1, 0.2, 0.3};
    ASSERT_EQ(kova_set_tuneset(a, 1, &tune), 0);
    const KOVA_RPT_INFO rpt{{0, 0, 0}, {-1, 10, -1}, {5, 100, -1}};
    ASSERT_EQ(kova_set_rptinfo(a, 1, &rpt), 0);

    const int32_t written = kova_save_source(a, 1, saved.c_str());
    const int n = 2;
    ASSERT_EQ(written, 112 + 40 * n + 3 * 48 + 2000 + 40000 + 1200);
    struct stat st {};
    ASSERT_EQ(stat(saved.c_str(), &st), 0);
    const mode_t mask = umask(0);
    umask(mask);
    EXPECT_EQ(st.st_mode & 0777, 0644u & ~mask);

    const std::vector<char> file = read_all(saved);
    ASSERT_EQ(file.size(), static_cast<size_t>(written));
    EXPECT_EQ(at<int32_t>(file, 0), n);
    expect_same_dsc(at<KOVA_FLT_DSC>(file, 4), low);
    expect_same_dsc(at<KOVA_FLT_DSC>(file, 44), band);
    EXPECT_EQ(at<double>(file, 4 + 40 * n), 0.7);           // gain
    EXPECT_EQ(at<double>(file, 4 + 40 * n + 80), 0.3);      // end_gain
    EXPECT_EQ(at<int32_t>(file, 92 + 40 * n + 12), 48000);  // info: samplerate
    EXPECT_EQ(at<int32_t>(file, 92 + 40 * n + 16), 2);
    EXPECT_EQ(at<int32_t>(file, 112 + 40 * n + 24), 2000);  // start record: size
    EXPECT_EQ(at<int32_t>(file, 112 + 40 * n + 44), 960);   // rpt_end 5 ms
    EXPECT_EQ(0, memcmp(file.data() + 160 + 40 * n, start.data(), start.size()));

    auto b_owner = kova_test::make_ctx();
    KOVA_CTX* b = b_owner.get();
    ASSERT_EQ(kova_reg_src_bysavefile(b, saved.c_str(), &err), 1);
    EXPECT_EQ(err, KOVA_OK);
    KOVA_SRCSET* sa = set_of(a, 1);
    KOVA_SRCSET* sb = set_of(b, 1);
    ASSERT_EQ(sb->filters->count, 2u);
    expect_same_dsc(*static_cast<KOVA_FLT_DSC*>(list_getat(sb->filters, 0)->data), low);
    expect_same_dsc(*static_cast<KOVA_FLT_DSC*>(list_getat(sb->filters, 1)->data), band);
    KOVA_TUNE_SET tb{};
    ASSERT_EQ(kova_get_tuneset(b, 1, &tb), 0);
    EXPECT_EQ(tb.gain, 0.7);
    EXPECT_EQ(tb.osc_depth, 0.5);
    EXPECT_EQ(tb.sharpness, 0.8);
    EXPECT_EQ(tb.file_gain, 0.5);  // a file level of 0 takes over the noise level
    EXPECT_EQ(tb.wn_gain, 0.0);
    EXPECT_EQ(tb.end_gain, 0.3);
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        const KOVA_SRC* x = sa->src[slot];
        const KOVA_SRC* y = sb->src[slot];
        ASSERT_NE(y, nullptr);
        EXPECT_EQ(y->size, x->size);
        EXPECT_EQ(y->slot, slot);
        EXPECT_EQ(y->rpt_start, x->rpt_start);
        EXPECT_EQ(y->rpt_end, x->rpt_end);
        EXPECT_EQ(y->origin, KOVA_ORIGIN_SAVEFILE);
        EXPECT_EQ(y->path, nullptr);
        EXPECT_EQ(0, memcmp(y->pcm, x->pcm, x->size));
        // Refiltered on reading, the same as the set that was saved.
        EXPECT_EQ(0, memcmp(y->pcm_proc, x->pcm_proc, x->size));
    }
    EXPECT_EQ(sa->src[KOVA_SLOT_LOOP]->rpt_start, 1920);
}

TEST(SaveSource, OverwritesWithoutTruncatingAndWritesOnlyPresentSlots) {
    kova_test::TempDir dir;
    const std::string path = dir.write("old.kova", std::vector<char>(300000, '\xAB'));
    const kova_test::CtxPtr owner = filter_set_ctx();
    KOVA_CTX* ctx = owner.get();
    ASSERT_EQ(kova_save_source(ctx, 1, path.c_str()), 112 + 40 + 48 + 192000);
    const std::vector<char> file = read_all(path);
    ASSERT_EQ(file.size(), 300000u);
    EXPECT_EQ(at<int32_t>(file, 132), 0);  // start slot absent
    EXPECT_EQ(at<int32_t>(file, 136), 1);
    EXPECT_EQ(at<int32_t>(file, 140), 0);
    EXPECT_EQ(at<int32_t>(file, 152 + 24), 192000);  // the loop record follows the info record
    EXPECT_EQ(at<int32_t>(file, 152 + 32), KOVA_SLOT_LOOP);
    EXPECT_EQ(0, memcmp(file.data() + 200, set_of(ctx, 1)->src[KOVA_SLOT_LOOP]->pcm, 192000));
    for (size_t i = 192200; i < file.size(); ++i) ASSERT_EQ(file[i], '\xAB') << i;
}

TEST(SaveSource, PathLimitsAndRefusals) {
    kova_test::TempDir dir;
    const kova_test::CtxPtr owner = filter_set_ctx();
    KOVA_CTX* ctx = owner.get();
    std::string base = dir.path;
    while (base.size() < 300) {
        base += "/" + std::string(100, 'd');
        std::filesystem::create_directory(base);
    }
    const std::string p511 = base + "/" + std::string(510 - base.size(), 'f');
    const std::string p512 = p511 + "g";
    ASSERT_EQ(p511.size(), 511u);
    EXPECT_GT(kova_save_source(ctx, 1, p511.c_str()), 0);
    EXPECT_TRUE(std::filesystem::exists(p511));
    EXPECT_EQ(kova_save_source(ctx, 1, p512.c_str()), KOVA_ERR_SOURCE);
    EXPECT_FALSE(std::filesystem::exists(p512));
    EXPECT_EQ(kova_save_source(ctx, 1, (dir.path + "/no/such.kova").c_str()), KOVA_ERR_SOURCE);
    EXPECT_EQ(kova_save_source(ctx, 1, dir.path.c_str()), KOVA_ERR_SOURCE);  // a directory
    for (long n : {0, 1}) {  // path buffer, then handle cell
        kova_mem_fail_after(n);
        EXPECT_EQ(kova_save_source(ctx, 1, (dir.path + "/nomem.kova").c_str()), KOVA_ERR_SOURCE);
        kova_mem_fail_after(-1);
    }
    EXPECT_FALSE(std::filesystem::exists(dir.path + "/nomem.kova"));
    EXPECT_EQ(kova_save_source(ctx, 0, p511.c_str()), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_save_source(ctx, 2, p511.c_str()), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_save_source(ctx, 1, nullptr), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_save_source(nullptr, 1, p511.c_str()), KOVA_ERR_INVALID_PARAM);
}
