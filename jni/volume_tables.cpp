// SPDX-License-Identifier: Apache-2.0
/* Per-device output volume tables, exported as writable initialised data. Each device table is 14
 * rows of 17 floats; every row is one of the 21 curves below: 16 step values and a factor, or 8
 * step values, the factor and zero padding. */
#include <string.h>

#include "kova/kova_output.h"

namespace {

using Curve = float[KOVA_VOLUME_ROW];

// clang-format off
constexpr Curve A = {58, 64, 70, 76, 82, 88, 94, 100, 0.5f, 0, 0, 0, 0, 0, 0, 0, 0};
constexpr Curve B = {0, 78, 79, 80, 81, 82, 83, 84, 85, 87, 88, 90, 92, 94, 96, 98, 1};
constexpr Curve C = {0, 71, 73, 75, 77, 79, 81, 83, 85, 87, 89, 91, 93, 95, 97, 100, 1};
constexpr Curve D = {0, 51, 56, 61, 65, 69, 72, 75, 76, 79, 81, 84, 87, 91, 95, 100, 1};
constexpr Curve E = {92, 93, 93, 94, 94, 95, 95, 96, 96, 97, 97, 98, 98, 99, 99, 100, 0.5f};
constexpr Curve F = {0, 72, 74, 76, 78, 80, 82, 84, 86, 88, 90, 92, 94, 96, 98, 100, 1};
constexpr Curve G = {0, 1, 16, 27, 34, 40, 46, 52, 58, 64, 70, 76, 82, 88, 94, 100, 0.5f};
constexpr Curve H = {0, 55, 58, 61, 64, 67, 70, 73, 76, 79, 82, 85, 88, 91, 94, 97, 0.5f};
constexpr Curve I = {36, 42, 48, 54, 60, 66, 72, 78, 0.5f, 0, 0, 0, 0, 0, 0, 0, 0};
constexpr Curve J = {0, 63, 65, 67, 69, 71, 73, 76, 79, 82, 85, 88, 91, 94, 97, 100, 1};
constexpr Curve K = {0, 40, 46, 52, 58, 63, 68, 72, 76, 79, 82, 85, 88, 92, 96, 100, 1};
constexpr Curve L = {0, 62, 64, 66, 68, 70, 72, 74, 76, 78, 80, 82, 84, 86, 88, 91, 1};
constexpr Curve M = {0, 1, 15, 20, 25, 30, 35, 40, 45, 50, 55, 60, 65, 70, 75, 80, 0.5f};
constexpr Curve N = {0, 56, 57, 58, 59, 60, 61, 62, 63, 64, 65, 66, 67, 68, 69, 70, 1};
constexpr Curve O = {0, 58, 61, 64, 67, 70, 73, 76, 79, 82, 85, 88, 91, 94, 97, 100, 1};
constexpr Curve P = {0, 55, 58, 61, 64, 67, 70, 73, 76, 79, 82, 85, 88, 91, 94, 97, 1};
constexpr Curve Q = {0, 1, 11, 22, 29, 35, 41, 47, 53, 59, 65, 71, 77, 83, 89, 95, 0.5f};
constexpr Curve R = {0, 65, 67, 69, 71, 73, 76, 79, 82, 85, 88, 91, 93, 95, 97, 100, 1};
constexpr Curve S = {0, 56, 59, 62, 65, 68, 71, 74, 77, 80, 83, 86, 89, 92, 95, 98, 1};
constexpr Curve T = {0, 81, 82, 83, 84, 85, 86, 87, 88, 89, 90, 92, 94, 96, 98, 100, 1};
constexpr Curve U = {0, 45, 51, 57, 63, 68, 73, 76, 79, 82, 85, 88, 91, 94, 97, 100, 1};
// clang-format on

}  // namespace

/* One curve spelled out as its 17 values, so that the tables stay plain constant-initialised
 * arrays while each curve is written down only once. */
#define KOVA_CURVE(c)                                                                              \
    c[0], c[1], c[2], c[3], c[4], c[5], c[6], c[7], c[8], c[9], c[10], c[11], c[12], c[13], c[14], \
        c[15], c[16]
#define KOVA_DEVICE_TABLE(r0, r1, r2, r3, r4, r5, r6, r7, r8, r9, r10, r11, r12, r13)       \
    {                                                                                       \
        KOVA_CURVE(r0), KOVA_CURVE(r1), KOVA_CURVE(r2), KOVA_CURVE(r3), KOVA_CURVE(r4),     \
            KOVA_CURVE(r5), KOVA_CURVE(r6), KOVA_CURVE(r7), KOVA_CURVE(r8), KOVA_CURVE(r9), \
            KOVA_CURVE(r10), KOVA_CURVE(r11), KOVA_CURVE(r12), KOVA_CURVE(r13)              \
    }
/* A situation row: two values, then zeros. */
#define KOVA_SITUATION(a, b) a, b, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0

extern "C" {

// clang-format off
//                                          row: 0  1  2  3  4  5  6  7  8  9 10 11 12 13
KOVA_API float spkVolume[KOVA_VOLUME_DEVICE_VALUES]       = KOVA_DEVICE_TABLE(A, B, C, D, C, C, E, F, G, H, H, G, A, A);
KOVA_API float headsetVolume[KOVA_VOLUME_DEVICE_VALUES]   = KOVA_DEVICE_TABLE(I, J, C, K, C, L, G, F, M, H, H, G, A, A);
KOVA_API float earpieceVolume[KOVA_VOLUME_DEVICE_VALUES]  = KOVA_DEVICE_TABLE(A, N, O, P, O, O, G, O, Q, H, H, G, A, A);
KOVA_API float bluetoothVolume[KOVA_VOLUME_DEVICE_VALUES] = KOVA_DEVICE_TABLE(A, R, O, O, O, S, G, O, G, H, H, G, A, A);
KOVA_API float usbVolume[KOVA_VOLUME_DEVICE_VALUES]       = KOVA_DEVICE_TABLE(A, T, F, U, F, O, E, F, G, H, H, G, A, A);
KOVA_API float hdmiVolume[KOVA_VOLUME_DEVICE_VALUES]      = KOVA_DEVICE_TABLE(A, T, F, O, F, O, E, F, G, H, H, G, A, A);

KOVA_API float situationVolume[KOVA_VOLUME_SITUATION_VALUES] = {
    KOVA_SITUATION(0.02f, 0.03f),  // row 0
    KOVA_SITUATION(0.22f, 0.6f),
    KOVA_SITUATION(0.12f, 0.7f),
    KOVA_SITUATION(0.75f, 0.1f),
    KOVA_SITUATION(0.25f, 1.0f),
    KOVA_SITUATION(0.6f, 0.02f),   // row 5
    KOVA_SITUATION(1.0f, 1.0f),
    KOVA_SITUATION(0.08f, 0.3f),
    KOVA_SITUATION(0.8f, 0.1f),
    KOVA_SITUATION(0.65f, 0.7f),
    KOVA_SITUATION(1.0f, 1.0f),    // row 10
    KOVA_SITUATION(0.3f, 0.05f),
    KOVA_SITUATION(0.5f, 1.0f),
    KOVA_SITUATION(0.5f, 1.0f),
    KOVA_SITUATION(0.5f, 1.0f),
    KOVA_SITUATION(0.5f, 1.0f),    // row 15
    KOVA_SITUATION(0.7f, 0.05f),
};
// clang-format on

/* Only the speaker (1) and headset (2) codes have a table here; any other code answers 1. */
int kova_get_volumetablesize(int device) {
    const unsigned idx = static_cast<unsigned>(device) - 1u;
    return idx <= 1u ? KOVA_VOLUME_ROW : 1;
}

/* Hands out row 1 of the speaker and headset tables, the factor column included. */
void kova_get_volumetable(float* speaker, float* headset) {
    if (!speaker || !headset) return;
    memcpy(speaker, &spkVolume[1 * KOVA_VOLUME_ROW], KOVA_VOLUME_ROW * sizeof(float));
    memcpy(headset, &headsetVolume[1 * KOVA_VOLUME_ROW], KOVA_VOLUME_ROW * sizeof(float));
}

}  // extern "C"

#undef KOVA_CURVE
#undef KOVA_DEVICE_TABLE
#undef KOVA_SITUATION
