// SPDX-License-Identifier: Apache-2.0
// The volume tables: the rows handed out (directly and through the Java methods), and the shape
// and known curves of every device and situation row.
#include <array>
#include <cmath>

#include "jni/jni_test_support.h"
#include "kova/kova_output.h"

namespace {

using Row = std::array<float, KOVA_VOLUME_ROW>;

Row row(const float* table, int r) {
    Row out;
    std::copy(table + r * KOVA_VOLUME_ROW, table + (r + 1) * KOVA_VOLUME_ROW, out.begin());
    return out;
}

// FNV-1a over the bytes of all seven tables: any changed value changes it. The tables are
// defined curve by curve in the library; this pins the whole of them at once.
uint64_t fnv1a(uint64_t h, const float* v, size_t n) {
    const auto* b = reinterpret_cast<const unsigned char*>(v);
    for (size_t i = 0; i < n * sizeof(float); ++i) h = (h ^ b[i]) * 0x100000001b3ull;
    return h;
}

TEST(VolumeTables, ChecksumOfEveryTable) {
    uint64_t h = 0xcbf29ce484222325ull;
    for (const float* t :
         {spkVolume, headsetVolume, earpieceVolume, bluetoothVolume, usbVolume, hdmiVolume}) {
        h = fnv1a(h, t, KOVA_VOLUME_DEVICE_VALUES);
    }
    h = fnv1a(h, situationVolume, KOVA_VOLUME_SITUATION_VALUES);
    EXPECT_EQ(h, 0x622fc9a253244b64ull);
}

TEST(VolumeTables, HandsOutRowOneOfSpeakerAndHeadset) {
    Row speaker{}, headset{};
    kova_get_volumetable(speaker.data(), headset.data());
    EXPECT_EQ(speaker, row(spkVolume, 1));
    EXPECT_EQ(headset, row(headsetVolume, 1));
}

/* Java arrays of any length get at most one row each, never more than they hold; every array
 * obtained is released. */
TEST(VolumeTables, JavaArraysGetRowOneWithinTheirLength) {
    using fake_jni::counters;
    using Floats = fake_jni::Array<jfloat>;
    Floats short_spk(5, -1), long_hs(20, -1);
    counters().reset();
    EXPECT_EQ(
        Java_com_corvane_audio_Kova_get_1volumeTable(
            fake_jni::env(), nullptr, fake_jni::jfloats(short_spk), fake_jni::jfloats(long_hs)),
        0);
    EXPECT_TRUE(std::equal(short_spk.items.begin(), short_spk.items.end(), &spkVolume[17]));
    EXPECT_TRUE(std::equal(&headsetVolume[17], &headsetVolume[34], long_hs.items.begin()));
    EXPECT_EQ(long_hs.items[17], -1);
    EXPECT_EQ(counters().arrays_got, 2);
    EXPECT_EQ(counters().arrays_released, 2);

    Floats untouched(17, -1);
    EXPECT_EQ(Java_com_corvane_audio_Kova_get_1volumeTable(fake_jni::env(), nullptr,
                                                           fake_jni::jfloats(untouched), nullptr),
              0);
    EXPECT_EQ(untouched.items, std::vector<jfloat>(17, -1));
}

TEST(VolumeTables, SizeIsSeventeenOnlyForSpeakerAndHeadsetCodes) {
    EXPECT_EQ(kova_get_volumetablesize(1), 17);
    EXPECT_EQ(kova_get_volumetablesize(2), 17);
    for (int code : {0, 3, -1, 4, 100, INT32_MIN, INT32_MAX}) {
        EXPECT_EQ(kova_get_volumetablesize(code), 1) << code;
    }
}

// Every device row is 16 non-decreasing whole steps and a factor, or 8 of them, the factor and
// zeros; the factor is 1 or 0.5.
TEST(VolumeTables, EveryDeviceRowHasAValidShape) {
    const float* tables[] = {spkVolume,       headsetVolume, earpieceVolume,
                             bluetoothVolume, usbVolume,     hdmiVolume};
    for (const float* table : tables) {
        for (int r = 0; r < 14; ++r) {
            const Row v = row(table, r);
            const bool short_row = v[8] == 0.5f && v[16] == 0.0f;
            const int steps = short_row ? 8 : 16;
            EXPECT_TRUE(v[steps] == 1.0f || v[steps] == 0.5f) << r;
            for (int c = 0; c < steps; ++c) {
                EXPECT_EQ(v[c], std::floor(v[c])) << r << "," << c;
                EXPECT_GE(v[c], 0.0f);
                EXPECT_LE(v[c], 100.0f);
                if (c > 0) {
                    EXPECT_GE(v[c], v[c - 1]) << r << "," << c;
                }
            }
            for (int c = steps + 1; c < KOVA_VOLUME_ROW; ++c) EXPECT_EQ(v[c], 0.0f) << r;
        }
    }
}

TEST(VolumeTables, SituationRowsHoldTwoValuesThenZeros) {
    for (int r = 0; r < 17; ++r) {
        const Row v = row(situationVolume, r);
        EXPECT_TRUE(v[0] > 0.0f && v[0] <= 1.0f && v[1] > 0.0f && v[1] <= 1.0f) << r;
        for (int c = 2; c < KOVA_VOLUME_ROW; ++c) EXPECT_EQ(v[c], 0.0f) << r;
    }
}

}  // namespace
