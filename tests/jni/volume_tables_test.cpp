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

constexpr Row kSpeakerRow1 = {0, 78, 79, 80, 81, 82, 83, 84, 85, 87, 88, 90, 92, 94, 96, 98, 1};
constexpr Row kHeadsetRow1 = {0, 63, 65, 67, 69, 71, 73, 76, 79, 82, 85, 88, 91, 94, 97, 100, 1};

TEST(VolumeTables, HandsOutRowOneOfSpeakerAndHeadsetOrNothing) {
    Row speaker{}, headset{};
    kova_get_volumetable(speaker.data(), headset.data());
    EXPECT_EQ(speaker, kSpeakerRow1);
    EXPECT_EQ(headset, kHeadsetRow1);

    Row untouched;
    untouched.fill(-7.0f);
    Row other = untouched;
    kova_get_volumetable(nullptr, other.data());
    kova_get_volumetable(other.data(), nullptr);
    EXPECT_EQ(other, untouched);
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
    EXPECT_TRUE(std::equal(short_spk.items.begin(), short_spk.items.end(), kSpeakerRow1.begin()));
    EXPECT_TRUE(std::equal(kHeadsetRow1.begin(), kHeadsetRow1.end(), long_hs.items.begin()));
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

TEST(VolumeTables, DeviceRowsHoldTheirCurves) {
    const Row curveK = {0, 40, 46, 52, 58, 63, 68, 72, 76, 79, 82, 85, 88, 92, 96, 100, 1};
    const Row curveQ = {0, 1, 11, 22, 29, 35, 41, 47, 53, 59, 65, 71, 77, 83, 89, 95, 0.5f};
    const Row curveU = {0, 45, 51, 57, 63, 68, 73, 76, 79, 82, 85, 88, 91, 94, 97, 100, 1};
    const Row curveA = {58, 64, 70, 76, 82, 88, 94, 100, 0.5f, 0, 0, 0, 0, 0, 0, 0, 0};
    EXPECT_EQ(row(headsetVolume, 3), curveK);
    EXPECT_EQ(row(earpieceVolume, 8), curveQ);
    EXPECT_EQ(row(usbVolume, 3), curveU);
    EXPECT_EQ(row(hdmiVolume, 13), curveA);
    EXPECT_EQ(row(headsetVolume, 12), curveA);
    EXPECT_EQ(row(usbVolume, 1), row(hdmiVolume, 1));
    EXPECT_EQ(row(hdmiVolume, 3), row(earpieceVolume, 2));
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
    const std::pair<float, float> expected[17] = {
        {0.02f, 0.03f}, {0.22f, 0.6f}, {0.12f, 0.7f}, {0.75f, 0.1f}, {0.25f, 1.0f}, {0.6f, 0.02f},
        {1.0f, 1.0f},   {0.08f, 0.3f}, {0.8f, 0.1f},  {0.65f, 0.7f}, {1.0f, 1.0f},  {0.3f, 0.05f},
        {0.5f, 1.0f},   {0.5f, 1.0f},  {0.5f, 1.0f},  {0.5f, 1.0f},  {0.7f, 0.05f}};
    for (int r = 0; r < 17; ++r) {
        const Row v = row(situationVolume, r);
        EXPECT_EQ(v[0], expected[r].first) << r;
        EXPECT_EQ(v[1], expected[r].second) << r;
        for (int c = 2; c < KOVA_VOLUME_ROW; ++c) EXPECT_EQ(v[c], 0.0f) << r;
    }
}

}  // namespace
