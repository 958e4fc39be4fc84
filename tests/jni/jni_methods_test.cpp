// SPDX-License-Identifier: Apache-2.0
// The control, generation and volume-table methods through a fake JNI environment: results at the
// edges, log lines, the pairing of JNI obtains and releases, the blocks handed to the output
// stream and the table rows copied into Java arrays.
#include "jni/jni_test_support.h"
#include "kova/kova_output.h"

namespace {

using namespace fake_jni;
using jni_test::init_default;
using jni_test::jni_lines;
using jni_test::Lines;
using jni_test::reg;

jint reg(jlong id, String* s, String* l, String* e) {
    auto js = [](String* p) { return p ? jstr(*p) : nullptr; };
    return JAVA(reg_1src_1byfiles, id, js(s), js(l), js(e));
}

class Methods : public jni_test::Loaded {
   protected:
    void SetUp() override {
        Loaded::SetUp();
        ASSERT_EQ(init_default(), 1);
        g_got = g_released = 0;
        cap.clear();
    }

    jni_test::Sounds snd;
    String &start = snd.str[0], &loop = snd.str[1], &end = snd.str[2];
    kova_test::LogCapture cap;
};

TEST_F(Methods, RegistrationAndSelection) {
    EXPECT_EQ(reg(1, &start, nullptr, &end), 0);
    EXPECT_EQ(reg(1, nullptr, &loop, nullptr), 1);
    EXPECT_EQ(reg(1, &start, &loop, &end), 2);
    EXPECT_EQ(g_got, 6);
    EXPECT_EQ(g_released, 6);
    EXPECT_EQ(JAVA(get_1src_1num, 1), 2);

    EXPECT_EQ(JAVA(set_1src, 1, 0), -3);  // equals the initial curSrc: no engine call
    EXPECT_EQ(JAVA(set_1src, 1, 1), 0);
    EXPECT_EQ(pKOVAInfo[0].pInstance->pCtx->active_src, 1);
    EXPECT_EQ(JAVA(set_1src, 1, 1), -3);
    EXPECT_EQ(JAVA(set_1src, 1, 7), -3);  // refused by the engine, yet remembered
    EXPECT_EQ(JAVA(set_1src, 1, 7), -3);
    EXPECT_EQ(jni_lines(cap),
              (Lines{"kova_reg_src () is failed. error=-4", "kova_reg_src (1, idx:1)",
                     "kova_reg_src (1, idx:2)", "kova_set_actiive_src (1, active1)",
                     "kova_set_actiive_src (1, active7)"}));
}

TEST_F(Methods, TuningThicknessAndVolumeReachTheEngine) {
    ASSERT_EQ(reg(1, snd), 1);
    cap.clear();
    KOVA_CTX* ctx = pKOVAInfo[0].pInstance->pCtx;
    auto tune = [](jint index, double gain) {
        return JAVA(set_1tuneset, 1, index, gain, 0.3, 1, 0.5, 0, 0.2, 0.0, 0.4, 0.6, 0.9, 0.6);
    };
    auto thick = [](double v) { return JAVA(set_1thickness, 1, v); };
    auto vol = [](double v) { return JAVA(set_1volume, 1, v); };
    EXPECT_EQ(tune(1, 0.75), 0);
    KOVA_TUNE_SET t{};
    ASSERT_EQ(kova_get_tuneset(ctx, 1, &t), 0);
    EXPECT_EQ(t.gain, 0.75);
    EXPECT_EQ(t.loop_gain, 0.9);
    EXPECT_EQ(tune(3, 0.5), -3);  // no such set: still logged
    EXPECT_EQ(thick(1.0), 0);
    EXPECT_EQ(thick(1.01), -3);
    EXPECT_EQ(vol(0.5), 0);
    EXPECT_DOUBLE_EQ(ctx->volume, 0.4);
    ctx->tag = 0;  // a context the engine refuses
    EXPECT_EQ(vol(0.5), -3);
    ctx->tag = KOVA_CTX_TAG;
    EXPECT_EQ(
        jni_lines(cap),
        (Lines{"kova_set_tuneset(1,0.750000,0.300000,(1,0.500000),(0,0.200000),0.000000,"
               "0.400000,0.600000,0.900000,0.600000)",
               "kova_set_tuneset(1,0.500000,0.300000,(1,0.500000),(0,0.200000),0.000000,"
               "0.400000,0.600000,0.900000,0.600000)",
               "kova_set_thickness(1,1.000000)", "kova_set_thickness(1) is failed. (err : -3)",
               "kova_set_volume(1,0.500000)", "kova_set_volume(1) is failed. (err : -3)"}));
}

// gen_sounds hands the engine the event as given: a reference context fed the same events
// directly produces the same bytes. (That gen_tofasttrack streams the same blocks whole, the Java
// and soak suites check on the device.)
TEST_F(Methods, GeneratedBlocksMatchTheEngine) {
    ASSERT_EQ(reg(1, snd), 1);
    KOVA_FORMAT f{48000, 2, 1, 1080, 2280};
    int32_t err = 0;
    KOVA_CTX* ref = kova_init(&f, &err);
    ASSERT_EQ(kova_reg_src_byfiles(ref, snd.path, &err), 1);
    std::vector<int16_t> ref_buf(480000);
    KOVA_PCMBUF ref_pcm{ref_buf.data(), 960000};
    Array<jbyte> out(960000);
    size_t total = 0;
    jlong t = 1000;
    for (int i = 0; i < 12; ++i) {
        const int action = i == 0 ? 0 : i == 11 ? 2 : 1;
        const float x = 100.0f + 9.0f * i, y = 200.0f + 4.0f * i;
        const KOVA_PARAM p{x, y, t, 0.5f, static_cast<uint32_t>(action)};
        const int32_t want = kova_gen_sounds(ref, &p, &ref_pcm);
        ASSERT_EQ(JAVA(gen_1sounds, 1, jbytes(out), x, y, t, 0.5f, action), want);
        ASSERT_TRUE(std::equal(out.items.begin(), out.items.begin() + want,
                               reinterpret_cast<const jbyte*>(ref_buf.data())));
        total += static_cast<size_t>(want);
        t += 8 + i % 8;
    }
    EXPECT_GT(total, 20000u);
    EXPECT_EQ(g_got, 15);  // the registration's three strings and the twelve arrays
    EXPECT_EQ(g_released, 15);
    kova_deinit(ref);
}

// FNV-1a over the bytes of all seven volume tables: any changed value changes it.
TEST(VolumeTables, ChecksumOfEveryTable) {
    uint64_t h = 0xcbf29ce484222325ull;
    auto fnv1a = [&h](const float* v, size_t n) {
        const auto* b = reinterpret_cast<const unsigned char*>(v);
        for (size_t i = 0; i < n * sizeof(float); ++i) h = (h ^ b[i]) * 0x100000001b3ull;
    };
    for (const float* t :
         {spkVolume, headsetVolume, earpieceVolume, bluetoothVolume, usbVolume, hdmiVolume}) {
        fnv1a(t, KOVA_VOLUME_DEVICE_VALUES);
    }
    fnv1a(situationVolume, KOVA_VOLUME_SITUATION_VALUES);
    EXPECT_EQ(h, 0x622fc9a253244b64ull);
}

// Java arrays of any length get at most row one each, never more than they hold; every array
// obtained is released; a missing array leaves the other alone.
TEST(VolumeTables, JavaArraysGetRowOneWithinTheirLength) {
    Array<jfloat> short_spk(5, -1), long_hs(20, -1), untouched(17, -1);
    g_got = g_released = 0;
    EXPECT_EQ(JAVA(get_1volumeTable, jfloats(short_spk), jfloats(long_hs)), 0);
    EXPECT_TRUE(std::equal(short_spk.items.begin(), short_spk.items.end(), &spkVolume[17]));
    EXPECT_TRUE(std::equal(&headsetVolume[17], &headsetVolume[34], long_hs.items.begin()));
    EXPECT_EQ(long_hs.items[17], -1);
    EXPECT_EQ(g_got, 2);
    EXPECT_EQ(g_released, 2);
    EXPECT_EQ(JAVA(get_1volumeTable, jfloats(untouched), nullptr), 0);
    EXPECT_EQ(untouched.items, std::vector<jfloat>(17, -1));
    EXPECT_EQ(JAVA(get_1volumeTableSize, 2), 17);
}

}  // namespace
