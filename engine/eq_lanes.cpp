// SPDX-License-Identifier: Apache-2.0
// The equaliser's two filter sections over a run of inputs known in advance (start and end
// sounds), worked on several lanes at once. Each section is a chain of four dependent operations
// per sample, so a single chain keeps the floating-point units a quarter busy. Lane j takes the
// j-th stretch of the run: it starts kWarmup samples early from a guessed state, and as both
// sections forget their past (each step keeps at most 0.885 of a difference), by the time it
// reaches its stretch its state is normally the true one, bit for bit. That is checked
// afterwards against the state the stretch before ended in, which is the true one; a stretch
// whose lane did not arrive at it is worked again, serially, from the true state. A long
// constant input (digital silence) can hold two states a few units apart for ever, so this does
// happen. The states are therefore always exact; only the speed depends on the signal.
#include <cstdint>
#include <cstring>

#include "engine/sample_kernel.h"

namespace kova_gen {
namespace {

using v2d = double __attribute__((vector_size(16)));

constexpr int64_t kLanes = 8;
// Steps a lane runs before its stretch. On noise, music and speech-like signals both sections of
// a lane have met the true state after about 290 to 360 steps: a state that differs by its own
// size shrinks below one unit in the last place after about 300 steps of the lower section.
constexpr int64_t kWarmup = 416;

// Both sections, low and high, as the two halves of one vector: same operations, same order.
struct Sections {
    v2d coef;
    v2d bias;
    [[gnu::always_inline]] v2d step(v2d s, double x) const {
        const v2d in = {x, x};
        return s + (coef * (in - s) + bias);
    }
};

bool same_bits(v2d a, v2d b) {
    return std::memcmp(&a, &b, sizeof a) == 0;
}

void put(double* st, int64_t i, v2d s) {
    __builtin_memcpy(st + 2 * i, &s, sizeof s);
}

v2d serial(const Sections& sec, v2d s, const double* x, int64_t from, int64_t to, double* st) {
    for (int64_t i = from; i < to; ++i) {
        s = sec.step(s, x[i]);
        put(st, i, s);
    }
    return s;
}

}  // namespace

int64_t eq_lane_min_run() {
    return kLanes * kWarmup;
}

int64_t eq_lane_states(const KOVA_EQ* eq, const double* x, int64_t n, double* st) {
    constexpr double kBias = kova::dsp::kEqStateBias;
    const Sections sec{{eq->low_coef, eq->high_coef}, {kBias, kBias}};
    const v2d start = {eq->low_state, eq->high_state};
    const int64_t len = n / kLanes;  // stretch per lane; the last few samples follow serially
    if (len < kWarmup) {
        serial(sec, start, x, 0, n, st);
        return 0;
    }
    v2d lane[kLanes];
    v2d guessed[kLanes];  // each lane's state on arriving at its stretch
    for (int64_t j = 1; j < kLanes; ++j) {
        const double first = x[j * len - kWarmup];
        lane[j] = v2d{first, first};
    }
    // Unrolled, so that the lanes stay in registers: through memory, every step would add a
    // store and a load to each lane's chain.
    for (int64_t t = 0; t < kWarmup; ++t) {
#pragma GCC unroll 8
        for (int64_t j = 1; j < kLanes; ++j) lane[j] = sec.step(lane[j], x[j * len - kWarmup + t]);
    }
    for (int64_t j = 1; j < kLanes; ++j) guessed[j] = lane[j];
    lane[0] = start;
    for (int64_t t = 0; t < len; ++t) {
#pragma GCC unroll 8
        for (int64_t j = 0; j < kLanes; ++j) {
            const int64_t i = j * len + t;
            lane[j] = sec.step(lane[j], x[i]);
            put(st, i, lane[j]);
        }
    }
    int64_t redone = 0;
    v2d truth = lane[0];
    for (int64_t j = 1; j < kLanes; ++j) {
        if (!same_bits(guessed[j], truth)) {
            lane[j] = serial(sec, truth, x, j * len, (j + 1) * len, st);
            ++redone;
        }
        truth = lane[j];
    }
    serial(sec, truth, x, kLanes * len, n, st);
    return redone;
}

}  // namespace kova_gen
