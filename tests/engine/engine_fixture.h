// SPDX-License-Identifier: Apache-2.0
// Engine contexts and source sets registered from files for the engine tests (header-only).
#ifndef KOVA_TESTS_ENGINE_FIXTURE_H
#define KOVA_TESTS_ENGINE_FIXTURE_H

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "kova/kova_engine.h"
#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "support/temp_dir.h"

namespace kova_test {

struct CtxDeleter {
    void operator()(KOVA_CTX* ctx) const { kova_deinit(ctx); }
};
using CtxPtr = std::unique_ptr<KOVA_CTX, CtxDeleter>;

inline CtxPtr make_ctx(uint32_t rate = 48000, uint32_t channels = 2, uint32_t p = 1,
                       uint32_t w = 1080, uint32_t h = 2280) {
    const KOVA_FORMAT f{rate, channels, p, w, h};
    int32_t err = 1;
    return CtxPtr(kova_init(&f, &err));
}

// The tune set a registration from files gives.
inline KOVA_TUNE_SET file_tune() {
    return KOVA_TUNE_SET{1.0, 0.4, 0, 1.0, 0, 0.2, 0.0, 0.4, 0.6, 0.9, 0.6};
}

// The registered set with a 1-based identifier the test knows to exist.
inline KOVA_SRCSET* set_of(KOVA_CTX* ctx, int id) {
    return static_cast<KOVA_SRCSET*>(
        list_getat(ctx->src_list, static_cast<uint32_t>(id - 1))->data);
}

// Registers the start, loop and end sounds given (empty: none in that slot) from files in `dir`,
// as an application does; returns the new set, which is active.
inline KOVA_SRCSET* reg_files(KOVA_CTX* ctx, const TempDir& dir,
                              const std::vector<std::vector<int16_t>>& sounds) {
    std::string paths[KOVA_SLOT_COUNT];
    const char* p[KOVA_SLOT_COUNT] = {};
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        if (sounds[slot].empty()) continue;
        paths[slot] = dir.write("slot" + std::to_string(slot), sounds[slot]);
        p[slot] = paths[slot].c_str();
    }
    int32_t err = 0;
    const int32_t id = kova_reg_src_byfiles(ctx, p, &err);
    EXPECT_GT(id, 0);
    return id > 0 ? set_of(ctx, id) : nullptr;
}

// The eleven tune values in record order, for whole-record comparisons.
inline std::vector<double> tune_values(const KOVA_TUNE_SET& t) {
    return {t.gain,      t.pan,     t.osc_enable * 1.0, t.osc_depth,  t.sharp_enable * 1.0,
            t.sharpness, t.wn_gain, t.file_gain,        t.start_gain, t.loop_gain,
            t.end_gain};
}

// Samples that differ from one to the next, within +-1000.
inline std::vector<int16_t> varied(size_t samples) {
    std::vector<int16_t> s(samples);
    for (size_t k = 0; k < samples; ++k) s[k] = static_cast<int16_t>((k * 37) % 2001) - 1000;
    return s;
}

inline KOVA_PARAM event(float x, float y, int64_t time, uint32_t action) {
    return KOVA_PARAM{x, y, time, 0.0f, action};
}

// Calls kova_gen_sounds on a vector-backed buffer of `bytes` bytes.
inline int32_t gen(KOVA_CTX* ctx, const KOVA_PARAM& p, std::vector<int16_t>& buf) {
    KOVA_PCMBUF out{buf.data(), static_cast<int32_t>(buf.size() * sizeof(int16_t))};
    return kova_gen_sounds(ctx, &p, &out);
}

}  // namespace kova_test

#endif
