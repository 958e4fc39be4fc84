// Registration by files, filter and saved file: identifiers, limits, defaults, failure paths.
#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "kova/kova.h"
#include "util/kova_mem.h"

namespace {

struct TempDir {
    std::string path;
    TempDir() {
        char t[] = "/tmp/kova_regXXXXXX";
        path = mkdtemp(t);
    }
    ~TempDir() { std::filesystem::remove_all(path); }
    std::string pcm(const std::string& name, size_t samples) const {
        std::vector<int16_t> s(samples);
        for (size_t i = 0; i < samples; ++i) s[i] = static_cast<int16_t>(i * 37 % 2000 - 1000);
        std::ofstream(path + "/" + name, std::ios::binary)
            .write(reinterpret_cast<const char*>(s.data()), static_cast<long>(samples * 2));
        return path + "/" + name;
    }
};

struct Engine {
    KOVA_CTX* ctx;
    Engine() {
        KOVA_FORMAT f{48000, 2, 0, 0, 0};
        int32_t err = 1;
        ctx = kova_init(&f, &err);
    }
    ~Engine() { kova_deinit(ctx); }
};

const KOVA_FLT_DSC kLowpass{KOVA_FLT_LOWPASS, 2000.0, 0.0, 1, 48000, 2};

int32_t gen_bytes(KOVA_CTX* ctx, uint32_t action) {
    static int16_t buf[96000];
    KOVA_PARAM p{100.0f, 100.0f, 10, 0.0f, action};
    KOVA_PCMBUF out{buf, sizeof(buf)};
    return kova_gen_sounds(ctx, &p, &out);
}

}  // namespace

TEST(Registration, LoopPathDecidesWhetherASetExists) {
    TempDir dir;
    Engine e;
    const std::string start = dir.pcm("s.pcm", 400), loop = dir.pcm("l.pcm", 4000),
                      end = dir.pcm("e.pcm", 400), missing = dir.path + "/none.pcm";
    int32_t err = 0;
    const char* no_loop[3] = {start.c_str(), nullptr, end.c_str()};
    EXPECT_EQ(kova_reg_src_byfiles(e.ctx, no_loop, &err), 0);
    EXPECT_EQ(err, KOVA_ERR_SOURCE);
    const char* bad_loop[3] = {start.c_str(), missing.c_str(), end.c_str()};
    EXPECT_EQ(kova_reg_src_byfiles(e.ctx, bad_loop, &err), 0);
    EXPECT_EQ(err, KOVA_ERR_SOURCE);
    EXPECT_EQ(kova_get_src_num(e.ctx), 0);
    EXPECT_EQ(e.ctx->active_src, 0);

    const char* only_loop[3] = {nullptr, loop.c_str(), nullptr};
    ASSERT_EQ(kova_reg_src_byfiles(e.ctx, only_loop, &err), 1);
    EXPECT_EQ(err, KOVA_OK);
    auto* set = static_cast<KOVA_SRCSET*>(list_getat(e.ctx->src_list, 0)->data);
    EXPECT_EQ(set->src[KOVA_SLOT_START], nullptr);
    EXPECT_EQ(set->src[KOVA_SLOT_END], nullptr);
    ASSERT_EQ(set->src[KOVA_SLOT_LOOP]->size, 8000);
    EXPECT_EQ(0, memcmp(set->src[KOVA_SLOT_LOOP]->pcm, set->src[KOVA_SLOT_LOOP]->pcm_proc, 8000));
    EXPECT_EQ(gen_bytes(e.ctx, KOVA_ACTION_START), 0);
    EXPECT_EQ(gen_bytes(e.ctx, KOVA_ACTION_END), 0);
}

TEST(Registration, IdentifiersLimitsAndSelection) {
    TempDir dir;
    Engine e;
    const std::string loop = dir.pcm("l.pcm", 4000), saved = dir.path + "/set.kova";
    const char* paths[3] = {nullptr, loop.c_str(), nullptr};
    int32_t err = 0;
    EXPECT_EQ(kova_reg_src_byfiles(e.ctx, paths, &err), 1);
    EXPECT_EQ(kova_reg_src_byfilter(e.ctx, &kLowpass, &err), 2);
    EXPECT_EQ(e.ctx->active_src, 2);
    EXPECT_EQ(kova_get_src_num(e.ctx), 2);
    ASSERT_GT(kova_save_source(e.ctx, 1, saved.c_str()), 0);

    for (int i = 3; i <= 20; ++i) ASSERT_EQ(kova_reg_src_byfilter(e.ctx, &kLowpass, &err), i);
    EXPECT_EQ(kova_reg_src_byfiles(e.ctx, paths, &err), 0);
    EXPECT_EQ(err, KOVA_ERR_SRC_FULL);
    EXPECT_EQ(kova_reg_src_byfilter(e.ctx, &kLowpass, &err), 0);
    EXPECT_EQ(err, KOVA_ERR_SRC_FULL);
    EXPECT_EQ(kova_reg_src_bysavefile(e.ctx, saved.c_str(), &err), 21);
    EXPECT_EQ(err, KOVA_OK);
    EXPECT_EQ(kova_reg_src_bysavefile(e.ctx, saved.c_str(), &err), 0);
    EXPECT_EQ(err, KOVA_ERR_SRC_FULL);
    EXPECT_EQ(kova_get_src_num(e.ctx), 21);
    EXPECT_EQ(e.ctx->active_src, 21);

    // Selecting applies the set's thickness to the equaliser; out-of-range ids change nothing.
    kova_set_thickness(e.ctx, 0.9);  // set 21 now has thickness 0.9
    EXPECT_EQ(kova_set_active_src(e.ctx, 1), KOVA_OK);
    KOVA_EQ ref;
    kova_eq_init(&ref, 880, 5000, 48000);
    kova_eq_set_thickness(&ref, 0.6);
    EXPECT_EQ(e.ctx->eq->mid_gain, ref.mid_gain);
    EXPECT_EQ(e.ctx->eq->slew_decay, ref.slew_decay);
    EXPECT_EQ(kova_set_active_src(e.ctx, 0), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_set_active_src(e.ctx, 22), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_set_active_src(nullptr, 1), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(e.ctx->active_src, 1);
    EXPECT_EQ(kova_get_src_num(nullptr), 0);
}

TEST(Registration, RefusedArgumentsChangeNothing) {
    Engine e;
    KOVA_CTX dead{};
    int32_t err = 0;
    const char* none[3] = {nullptr, nullptr, nullptr};
    EXPECT_EQ(kova_reg_src_byfiles(&dead, none, &err), 0);
    EXPECT_EQ(err, KOVA_ERR_INVALID_PARAM);
    err = 0;
    EXPECT_EQ(kova_reg_src_byfiles(e.ctx, nullptr, &err), 0);
    EXPECT_EQ(err, KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_reg_src_byfilter(e.ctx, &kLowpass, nullptr), 0);
    EXPECT_EQ(kova_reg_src_bysavefile(e.ctx, nullptr, &err), 0);
    EXPECT_EQ(err, KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_reg_src_bysavefile(e.ctx, "/nonexistent/kova.set", &err), 0);
    EXPECT_EQ(err, KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(kova_get_src_num(e.ctx), 0);
    EXPECT_EQ(e.ctx->active_src, 0);
}

TEST(Registration, TuneDefaultsDifferOnlyInNoiseAndFileLevel) {
    TempDir dir;
    Engine e;
    const std::string loop = dir.pcm("l.pcm", 100);
    const char* paths[3] = {nullptr, loop.c_str(), nullptr};
    int32_t err = 0;
    ASSERT_EQ(kova_reg_src_byfiles(e.ctx, paths, &err), 1);
    ASSERT_EQ(kova_reg_src_byfilter(e.ctx, &kLowpass, &err), 2);
    for (int id = 1; id <= 2; ++id) {
        KOVA_TUNE_SET t{};
        ASSERT_EQ(kova_get_tuneset(e.ctx, id, &t), 0);
        EXPECT_EQ(t.gain, 1.0);
        EXPECT_EQ(t.pan, 0.4);
        EXPECT_EQ(t.osc_enable, 0);
        EXPECT_EQ(t.osc_depth, 1.0);
        EXPECT_EQ(t.sharp_enable, 0);
        EXPECT_EQ(t.sharpness, 0.2);
        EXPECT_EQ(t.wn_gain, id == 1 ? 0.0 : 0.5);
        EXPECT_EQ(t.file_gain, id == 1 ? 0.4 : 0.0);
        EXPECT_EQ(t.start_gain, 0.6);
        EXPECT_EQ(t.loop_gain, 0.9);
        EXPECT_EQ(t.end_gain, 0.6);
        EXPECT_EQ(static_cast<KOVA_SRCSET*>(list_getat(e.ctx->src_list, id - 1)->data)->thickness,
                  0.6);
    }
}

// Every allocation of every registration path is made to fail in turn: the call reports a
// documented code, leaves the list and the active set alone, and leaks nothing (ASan).
TEST(Registration, AllocationFailuresLeaveNothingBehind) {
    TempDir dir;
    Engine e;
    const std::string start = dir.pcm("s.pcm", 400), loop = dir.pcm("l.pcm", 4000),
                      saved = dir.path + "/set.kova";
    const char* paths[3] = {start.c_str(), loop.c_str(), nullptr};
    int32_t err = 0;
    ASSERT_EQ(kova_reg_src_byfilter(e.ctx, &kLowpass, &err), 1);
    ASSERT_EQ(kova_attach_filter(e.ctx, 1, &kLowpass, &err), 1);
    ASSERT_GT(kova_save_source(e.ctx, 1, saved.c_str()), 0);

    enum Way { kFiles, kFilter, kSaveFile };
    int gen_failures = 0;
    for (Way way : {kFiles, kFilter, kSaveFile}) {
        for (long n = 0;; ++n) {
            ASSERT_LT(n, 200) << "registration never succeeded";
            const int32_t before = kova_get_src_num(e.ctx);
            testing::internal::CaptureStdout();
            kova_mem_fail_after(n);
            const int32_t id = way == kFiles ? kova_reg_src_byfiles(e.ctx, paths, &err)
                               : way == kFilter
                                   ? kova_reg_src_byfilter(e.ctx, &kLowpass, &err)
                                   : kova_reg_src_bysavefile(e.ctx, saved.c_str(), &err);
            kova_mem_fail_after(-1);
            const std::string out = testing::internal::GetCapturedStdout();
            if (id != 0) {
                EXPECT_EQ(id, before + 1);
                EXPECT_EQ(err, KOVA_OK);
                break;
            }
            EXPECT_EQ(kova_get_src_num(e.ctx), before);
            EXPECT_EQ(e.ctx->active_src, before);
            if (n == 0) {
                EXPECT_EQ(err, KOVA_ERR_INSUFF_MEM);
            }
            if (way == kFiles) {  // a loop file that could not be loaded reads as a missing source
                EXPECT_TRUE(err == KOVA_ERR_INSUFF_MEM || err == KOVA_ERR_SOURCE) << err;
            } else if (way == kFilter) {  // the noise generator's failure has its own code
                const bool gen_failed = out.find("kova_gen_sound_source() fail.") != out.npos;
                EXPECT_EQ(err, gen_failed ? KOVA_ERR_INVALID_PARAM : KOVA_ERR_INSUFF_MEM);
                gen_failures += gen_failed;
            } else {  // the file reader reports a missing path buffer or handle as -3
                EXPECT_TRUE(err == KOVA_ERR_INSUFF_MEM || err == KOVA_ERR_INVALID_PARAM) << err;
            }
        }
    }
    EXPECT_GT(gen_failures, 0);
}
