// SPDX-License-Identifier: Apache-2.0
// Every exported call against null pointers, dead handles and out-of-range ids: each row gives
// the documented result (and error code, where the call has one), and afterwards the live
// objects the refused calls were aimed at are exactly as before.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "engine/engine_fixture.h"
#include "jni/jni_test_support.h"
#include "kova/android/kova_fasttrack.h"
#include "kova/kova.h"
#include "kova/kova_output.h"

namespace {

using Got = std::vector<double>;
struct Row {
    const char* call;
    std::function<Got()> run;
    Got want;
};

constexpr int32_t kBad = KOVA_ERR_INVALID_PARAM;
const KOVA_FLT_DSC kLow{KOVA_FLT_LOWPASS, 2000.0, 0.0, 1, 48000, 2};

// R: the call's result. E: its result and error cell, which starts at 42 for each call.
// clang-format off
#define R(call, ...) Row{#call, [&] { return Got{double(call)}; }, Got{__VA_ARGS__}}
#define E(call, ...) Row{#call, [&] { err = 42; const double r = call; return Got{r, double(err)}; }, \
                         Got{__VA_ARGS__}}
// clang-format on

void check(const std::vector<Row>& rows) {
    for (const Row& r : rows) EXPECT_EQ(r.run(), r.want) << r.call;
}

// Whatever a refused call could have touched in a live context with one set: every byte of the
// context, its previous event and equaliser, and what the set holds.
std::vector<double> snapshot(KOVA_CTX* ctx) {
    KOVA_TUNE_SET t{};
    KOVA_RPT_INFO info{};
    kova_get_tuneset(ctx, 1, &t);
    kova_get_rptinfo(ctx, 1, &info);
    std::vector<double> v = kova_test::tune_values(t);
    const KOVA_SRCSET* set = kova_test::set_of(ctx, 1);
    v.insert(v.end(), {double(kova_get_src_num(ctx)), set->thickness, double(set->filters->count),
                       double(set->src[KOVA_SLOT_LOOP]->pos), double(info.rpt_end_ms[1]),
                       double(set->src[KOVA_SLOT_LOOP]->pcm_proc[100])});
    for (auto [p, n] : {std::pair<const void*, size_t>{ctx, sizeof *ctx},
                        {ctx->prev_param, sizeof(KOVA_PARAM)}, {ctx->eq, sizeof(KOVA_EQ)}})
        v.insert(v.end(), static_cast<const uint8_t*>(p), static_cast<const uint8_t*>(p) + n);
    return v;
}

TEST(ApiContract, EngineCallsRefuseNullDeadAndOutOfRange) {
    kova_test::TempDir dir;
    kova_test::CtxPtr owner = kova_test::make_ctx();
    KOVA_CTX* ctx = owner.get();
    int32_t err = 0;
    ASSERT_EQ(kova_reg_src_byfilter(ctx, &kLow, &err), 1);
    // A dead record whose pointers must never be followed: any use would fault.
    KOVA_CTX dead{};
    dead.format = reinterpret_cast<KOVA_FORMAT*>(0x10);
    dead.work_buf = reinterpret_cast<int16_t*>(0x20);
    const KOVA_CTX dead_copy = dead;
    // An open stroke, so that a move that was not refused would play.
    std::vector<int16_t> block(1536);
    kova_test::gen(ctx, kova_test::event(100, 100, 1000, KOVA_ACTION_START), block);
    ASSERT_EQ(kova_test::gen(ctx, kova_test::event(130, 140, 1016, 1), block), 3072);
    const std::vector<double> before = snapshot(ctx);

    const std::string path = dir.file("never");
    const char* p = path.c_str();
    const KOVA_FORMAT phone{48000, 2, 1, 1080, 2280};
    const char* none[3] = {nullptr, nullptr, nullptr};
    const char* missing[3] = {nullptr, p, nullptr};
    std::vector<int16_t> pcm(64, 0x5A5A);
    KOVA_PCMBUF out{pcm.data(), 128}, empty{pcm.data(), 0}, no_data{nullptr, 128};
    const KOVA_PARAM move = kova_test::event(170, 140, 1032, KOVA_ACTION_MOVE);
    KOVA_TUNE_SET t = kova_test::file_tune();
    KOVA_RPT_INFO info{};
    KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT] = {};
    std::vector<Row> rows = {
        R(kova_checkformat(nullptr), -1),
        E(kova_init(nullptr, &err) != nullptr, 0, 42),
        R(kova_init(&phone, nullptr) != nullptr, 0),
        R(kova_deinit(nullptr), kBad),
        R(kova_deinit(&dead), kBad),
        E(kova_reg_src_byfiles(&dead, none, &err), 0, kBad),
        E(kova_reg_src_byfiles(ctx, nullptr, &err), 0, kBad),
        R(kova_reg_src_byfiles(ctx, missing, nullptr), 0),
        R(kova_reg_src_byfilter(ctx, &kLow, nullptr), 0),
        E(kova_reg_src_byfilter(ctx, nullptr, &err), 0, kBad),
        E(kova_reg_src_byfilter(&dead, &kLow, &err), 0, kBad),
        E(kova_reg_src_bysavefile(ctx, nullptr, &err), 0, kBad),
        E(kova_reg_src_bysavefile(ctx, p, &err), 0, kBad),
        E(kova_reg_src_bysavefile(&dead, p, &err), 0, kBad),
        R(kova_get_src_num(nullptr), 0),
        R(kova_get_src_num(&dead), 0),
        R(kova_get_tuneset(ctx, 1, nullptr), kBad),
        R(kova_set_tuneset(ctx, 1, nullptr), kBad),
        R(_cfg_tune_default(nullptr) != nullptr, 0),
        R(kova_set_thickness(nullptr, 0.5), kBad),
        R(kova_set_thickness(&dead, 0.5), kBad),
        R(kova_set_thickness(ctx, -0.01), kBad),
        R(kova_set_thickness(ctx, NAN), kBad),
        R(kova_set_volume(nullptr, 1.0), kBad),
        R(kova_set_volume(&dead, 1.0), kBad),
        R(kova_get_rptinfo(ctx, 1, nullptr), kBad),
        R(kova_set_rptinfo(ctx, 1, nullptr), kBad),
        R(kova_save_source(ctx, 1, nullptr), kBad),
        E(kova_attach_filter(ctx, 1, nullptr, &err), 0, kBad),
        R(kova_attach_filter(ctx, 1, &kLow, nullptr), 0),
        E(kova_update_filter(ctx, 1, nullptr, &err), 0, kBad),
        R(kova_get_filters(ctx, 1, nullptr), 0),
        E(kova_update_src_byfiles(ctx, 1, nullptr, &err), 0, kBad),
        R(kova_update_src_byfiles(ctx, 1, missing, nullptr), 0),
    };
    check(rows);
    // Calls on set i of context c, for a null and a dead context and for sets 0 and 2 of a context
    // with one set. The tune-set calls answer 0 for a missing context.
    for (auto [c, i] :
         {std::pair<KOVA_CTX*, int32_t>{nullptr, 1}, {&dead, 1}, {ctx, 0}, {ctx, 2}}) {
        SCOPED_TRACE(std::to_string(c == ctx) + ", set " + std::to_string(i));
        check({
            R(kova_set_active_src(c, i), kBad),
            R(kova_get_tuneset(c, i, &t), c == ctx ? kBad : 0.0),
            R(kova_set_tuneset(c, i, &t), c == ctx ? kBad : 0.0),
            R(kova_get_rptinfo(c, i, &info), kBad),
            R(kova_set_rptinfo(c, i, &info), kBad),
            R(kova_save_source(c, i, p), kBad),
            E(kova_attach_filter(c, i, &kLow, &err), 0, kBad),
            E(kova_update_filter(c, i, &kLow, &err), 0, kBad),
            R(kova_get_filters(c, i, flt) + flt[0].type, 0),
            E(kova_update_src_byfiles(c, i, missing, &err), 0, kBad),
        });
    }
    // Generation: both entry points refuse the same requests, leaving the buffer alone.
    // So do a context without a playable set: none active, or one without a loop sound.
    const KOVA_PARAM bad[] = {
        kova_test::event(-1, 140, 1032, 1), kova_test::event(170, -0.5f, 1032, 1),
        kova_test::event(-INFINITY, 140, 1032, 1), kova_test::event(170, 140, -1, 1),
        kova_test::event(170, 140, 1032, 3)};
    KOVA_SRC*& loop = kova_test::set_of(ctx, 1)->src[KOVA_SLOT_LOOP];
    KOVA_SRC* const saved_loop = loop;
    for (auto gen : {kova_gen_sounds, kova_gen_samples}) {
        check({R(gen(nullptr, &move, &out), 0), R(gen(&dead, &move, &out), 0),
               R(gen(ctx, nullptr, &out), 0), R(gen(ctx, &move, nullptr), 0),
               R(gen(ctx, &move, &empty), 0), R(gen(ctx, &move, &no_data), 0)});
        for (const KOVA_PARAM& ev : bad) check({R(gen(ctx, &ev, &out), 0)});
        for (int32_t active : {0, 2, -1}) {
            ctx->active_src = active;
            check({R(gen(ctx, &move, &out), 0)});
        }
        ctx->active_src = 1;
        loop = nullptr;
        check({R(gen(ctx, &move, &out), 0)});
        loop = saved_loop;
    }
    kova_set_param(nullptr, &move);
    kova_set_param(ctx->prev_param, nullptr);
    EXPECT_EQ(_calc_envelope(nullptr, &move, nullptr, 1.0), 0.0);

    EXPECT_EQ(snapshot(ctx), before);
    EXPECT_EQ(std::memcmp(&dead, &dead_copy, sizeof dead), 0);
    EXPECT_EQ(pcm, std::vector<int16_t>(64, 0x5A5A));
    EXPECT_FALSE(std::filesystem::exists(path));
    EXPECT_EQ(kova_set_active_src(ctx, 1), KOVA_OK);  // still fully usable
    EXPECT_EQ(kova_gen_sounds(ctx, &move, &out), 128);
}

TEST(ApiContract, SignalFileStreamAndListCallsRefuseNullAndWrongTags) {
    int32_t err = 0;
    int16_t two[2] = {1000, 2000};
    KOVA_OSC* osc = kova_osc_init(48000, 1, 1);
    KOVA_FLT* wrong_flt = kova_flt_init(&kLow, &err);
    KOVA_OSC* wrong_osc = kova_osc_init(48000, 1, 1);
    wrong_flt->tag = KOVA_OSC_TAG;  // another object's tag
    wrong_osc->tag = KOVA_CTX_TAG;
    KOVA_PCMBUF in{two, 4}, out{two, 99}, none{nullptr, 16};
    kova_test::TempDir dir;
    const std::string missing = dir.file("missing"),
                      file = dir.write("f", std::vector<char>(64, 1));
    const char* m = missing.c_str();
    const char* f = file.c_str();
    int o[6] = {-7, -7, -7, -7, -7, -7};
    KOVA_TUNE_SET tune{};
    KOVA_RPT_INFO info{};
    KOVA_FLT_DSC flts[KOVA_FLT_TYPE_COUNT] = {};
    TARQ_MFAL mfal{};
    LIST* list = list_create();
    KOVA_SRCSET* busy = static_cast<KOVA_SRCSET*>(kova_mem_calloc(1, sizeof(KOVA_SRCSET)));
    busy->filters = list_create();
    busy->tune = &tune;
    list_pushback(busy->filters, nullptr);
    KOVA_RINGBUFFER* ring = kova_ringbuffer_create(16);
    float row[KOVA_VOLUME_ROW] = {-7};

    // Null and wrong-tag objects; null and missing paths.
    for (KOVA_FLT* x : {static_cast<KOVA_FLT*>(nullptr), wrong_flt}) {
        check({R(kova_flt_process(x, two, 4), kBad), R(kova_flt_deinit(x), kBad)});
    }
    for (KOVA_OSC* x : {static_cast<KOVA_OSC*>(nullptr), wrong_osc}) {
        check({R(kova_osc_deinit(x), kBad), R(kova_osc_set_freq(x, 440.0), kBad),
               R(kova_osc_get_sample(x), -3.0), R(kova_osc_gen_samples(x, two, 4), kBad)});
    }
    for (const char* x : {static_cast<const char*>(nullptr), m}) {
        check({E(kova_load_sound_source(x, 1, &err) != nullptr, 0, KOVA_ERR_SOURCE),
               R(kova_read_source_file(x, two, 4), 0),
               R(kova_get_pcminfo_fromfile(x, &o[0], &o[1], &o[2], &o[3], &o[4], &o[5]), kBad),
               R(kova_get_filters_fromfile(x, flts), kBad),
               R(kova_get_tuneset_fromfile(x, &tune), kBad),
               R(kova_get_rptinfo_fromfile(x, &info), kBad)});
    }
    check({
        E(kova_flt_init(nullptr, &err) != nullptr, 0, 42),
        R(kova_flt_init(&kLow, nullptr) != nullptr, 0),
        R(kova_osc_gen_samples(osc, nullptr, 4), kBad),
        R(kova_osc_gen_samples(osc, two, 0), kBad),
        R(kova_eq_set_thickness(nullptr, 0.5) != nullptr, 0),
        R(kova_eq_proc(nullptr, 1234), 1234),
        E(kova_gen_sound_source_wn(nullptr, 1, &err) != nullptr, 0, KOVA_ERR_SOURCE),
        E(kova_gen_sound_source_wn(&kLow, 3, &err) != nullptr, 0, KOVA_ERR_SOURCE),
        R(kova_is_valid_filter(nullptr), -1),
        R(kova_update_filterdsc(nullptr, &kLow), -1),
        R(kova_update_filterdsc(list, nullptr), -1),
        R(kova_update_filterdsc(list, &kLow), -1),
        R(kova_read_source_file(f, nullptr, 4), 0),
        R(kova_read_source_file(f, two, -1), 0),
        R(tarq_mfal_init(nullptr, &mfal), -1),
        R(tarq_mfal_init(f, nullptr), -1),
        R(_write_flt_size(nullptr, &mfal, 1), -1),
        R(_read_flt_size(&mfal, nullptr, o), -1),
        R(_write_KOVA_FLT_DSC(nullptr, &mfal, &kLow), -1),
        R(_read_KOVA_FLT_DSC(&mfal, &mfal, nullptr), -1),
        R(_write_KOVA_TUNE_SET(&mfal, nullptr, &tune), -1),
        R(_read_KOVA_TUNE_SET(&mfal, &mfal, nullptr), -1),
        R(_write_KOVA_SRC_INFO(nullptr, &mfal, nullptr), -1),
        R(_read_KOVA_SRC_INFO(&mfal, nullptr, nullptr), -1),
        R(_write_KOVA_SRC(&mfal, &mfal, nullptr), -1),
        R(_read_KOVA_SRC(nullptr, &mfal) != nullptr, 0),
        R(kova_write_srcset(48000, 2, nullptr, &mfal, &mfal), 0),
        R(kova_open_source(nullptr, f), kBad),
        R(kova_open_source(busy, f), kBad),
        R(kova_get_pcminfo_fromfile(f, &o[0], nullptr, &o[2], &o[3], &o[4], &o[5]), kBad),
        R(kova_get_filters_fromfile(f, nullptr), kBad),
        R(kova_get_tuneset_fromfile(f, nullptr), kBad),
        R(kova_get_rptinfo_fromfile(f, nullptr), kBad),
        R(kova_ringbuffer_read_space(nullptr), 0),
        R(kova_ringbuffer_write_space(nullptr), 0),
        R(kova_ringbuffer_read(nullptr, two, 1), 0),
        R(kova_ringbuffer_write(nullptr, two, 1), 0),
        R(kova_ringbuffer_write(ring, nullptr, 4), 0),
        R(kova_ringbuffer_create(0x80000001u) != nullptr, 0),
        R(kova_write_fasttrack(nullptr, two, 4, 4), 0),
        R(kova_open_fasttrack(48000, 0) != nullptr, 0),
        R(list_getat(nullptr, 0) != nullptr, 0),
        R(list_pushback(nullptr, two) != nullptr, 0),
        R(insert_after(nullptr, list->head, two) != nullptr, 0),
        R(insert_before(list, nullptr, two) != nullptr, 0),
        R(remove_node(nullptr, list->head) != nullptr, 0),
        R(del_node(nullptr, nullptr) != nullptr, 0),
        R(kova_get_volumetablesize(3), 1),
        R(kova_get_volumetablesize(0), 1),
    });
    // Calls without a result: nothing happens, nothing is written.
    kova_eq_init(nullptr, 880, 5000, 48000);
    makefilter(nullptr, 48000, KOVA_FLT_LOWPASS, 1000, 0);
    kova_gen_white_noise_16bit(nullptr, 100);
    kova_gen_white_noise_16bit(two, 1);
    kova_proc_filters(two, 4, nullptr);
    kova_resample_s16_stereo(1, 2, nullptr, &out);
    EXPECT_EQ(out.size, 0);
    kova_resample_s16_stereo(1, 2, &none, &out);
    kova_resample_s16_stereo(1, 2, &in, &none);
    EXPECT_EQ(none.size, 0);
    kova_resample_s16_stereo(1, 2, &in, nullptr);
    kova_ringbuffer_reset(nullptr);
    kova_ringbuffer_free(nullptr);
    kova_close_fasttrack(nullptr, 1);
    kova_start_fasttrack(nullptr);
    kova_stop_fasttrack(nullptr);
    kova_free_sourceobj(nullptr);
    kova_free_sourceset(nullptr);
    list_destory(nullptr, nullptr);
    list_attach(nullptr, list);
    list_attach(list, nullptr);
    kova_get_volumetable(nullptr, row);
    kova_get_volumetable(row, nullptr);
    EXPECT_EQ(row[0], -7);
    EXPECT_EQ(two[0], 1000);
    EXPECT_EQ(two[1], 2000);
    EXPECT_EQ(list->count, 0u);
    EXPECT_EQ(kova_ringbuffer_read_space(ring), 0u);
    EXPECT_EQ(o[0], -7);
    EXPECT_EQ(busy->filters->count, 1u);

    // The wrong-tag objects were refused, so not freed: with their tags back they go normally.
    wrong_flt->tag = KOVA_FLT_TAG;
    wrong_osc->tag = KOVA_OSC_TAG;
    EXPECT_EQ(kova_flt_deinit(wrong_flt), KOVA_OK);
    for (KOVA_OSC* x : {osc, wrong_osc}) EXPECT_EQ(kova_osc_deinit(x), KOVA_OK);
    kova_ringbuffer_free(ring);
    kova_mem_free(mfal.path);  // the caller's even when init refused the path
    list_destory(list, nullptr);
    list_destory(busy->filters, nullptr);
    kova_mem_free(busy);
}

// Every Java method with an id that names no instance (0, negative, past the last slot, a free
// slot), and with an instance that has lost its engine context.
class JavaContract : public jni_test::Loaded {};

TEST_F(JavaContract, MethodsRefuseIdsWithoutInstanceOrContext) {
    using namespace fake_jni;
    ASSERT_EQ(jni_test::init_default(), 1);
    KovaInstance* inst = pKOVAInfo[0].pInstance;
    pthread_mutex_t* lock = gpKovaMutex;
    String s{"/nonexistent"};
    Array<jbyte> out(64, 0x5a);
    kova_test::LogCapture cap;
    g_got = g_released = 0;
    // Checked inside: the rows' calls refer to this call's arguments.
    auto check_id = [&](jlong id, double reg) {
        check({
            R(JAVA(reg_1src_1byfiles, id, jstr(s), jstr(s), jstr(s)), reg),
            R(JAVA(set_1src, id, 1), kBad),
            R(JAVA(get_1src_1num, id), 0),
            R(JAVA(gen_1sounds, id, jbytes(out), 1, 1, 0, 0, 0), 0),
            R(JAVA(gen_1tofasttrack, id, 1, 1, 0, 0, 0), 0),
            R(JAVA(set_1tuneset, id, 1, 1, .3, 1, .5, 0, .2, 0, .4, .6, .9, .6), kBad),
            R(JAVA(set_1thickness, id, 0.5), kBad),
            R(JAVA(set_1volume, id, 0.5), kBad),
        });
    };
    for (jlong id : {0L, -5L, 21L, 2L}) {
        check_id(id, kBad);
        JAVA(start_1fasttrack, id);
        JAVA(stop_1fasttrack, id);
        EXPECT_EQ(jni_test::deinit(id), id == 2 ? 0 : kBad);
    }
    EXPECT_EQ(g_got, 4);  // gen_sounds's array only: no string for these ids
    EXPECT_EQ(g_released, 4);
    // Only deinit speaks, and a refused deinit keeps the registry lock.
    const std::string d = "kova_deinit()";
    EXPECT_EQ(jni_test::jni_lines(cap),
              (jni_test::Lines{d, d, d, d, "instance is NULL. deinit() is failed."}));
    EXPECT_EQ(cap.lines().size(), 5u);
    EXPECT_EQ(gpKovaMutex, lock);
    EXPECT_EQ(inst->pFastTrack->state, 0);  // id 1 untouched

    KOVA_CTX* ctx = inst->pCtx;
    inst->pCtx = nullptr;
    cap.clear();
    check_id(1, 0);
    EXPECT_EQ(g_got, 8);  // three strings and the array, all released
    EXPECT_EQ(g_released, 8);
    EXPECT_EQ(inst->curSrc, 0);
    JAVA(start_1fasttrack, 1);  // the stream is still there
    EXPECT_EQ(inst->pFastTrack->state, 1);
    JAVA(stop_1fasttrack, 1);
    // Its teardown reports the missing context and keeps the slot (without stream and buffer).
    EXPECT_EQ(jni_test::deinit(1), -3);
    EXPECT_EQ(pKOVAInfo[0].pInstance, inst);
    EXPECT_EQ(inst->pFastTrack, nullptr);
    EXPECT_EQ(jni_test::jni_lines(cap),
              (jni_test::Lines{"kova_set_thickness() is failed. (ID is NULL)",
                               "kova_set_volume() is failed. (ID is NULL)", "kova_deinit()",
                               "kova_deinit() is failed. error=-3"}));
    inst->pCtx = ctx;
    EXPECT_EQ(out.items, std::vector<jbyte>(64, 0x5a));

    // The last slot's id names an instance like any other; with every slot taken, init gives 0.
    for (jlong id = 2; id <= KOVA_MAX_INSTANCES; ++id) ASSERT_EQ(jni_test::init_default(), id);
    EXPECT_EQ(JAVA(set_1volume, KOVA_MAX_INSTANCES, 0.5), 0);
    EXPECT_EQ(jni_test::init_default(), 0);
    EXPECT_EQ(jni_test::jni_lines(cap).back(), "KOVA instance MAX");
}

}  // namespace
