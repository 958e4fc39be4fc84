// SPDX-License-Identifier: Apache-2.0
// Hand-built engine contexts and source sets for the engine tests (header-only).
#ifndef KOVA_TESTS_ENGINE_FIXTURE_H
#define KOVA_TESTS_ENGINE_FIXTURE_H

#include <stdlib.h>

#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "kova/kova_engine.h"
#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "support/temp_dir.h"
#include "util/kova_mem.h"

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

// A source holding `samples` in both pcm and pcm_proc; rpt_end covers the whole source.
inline KOVA_SRC* make_src(int slot, int origin, const std::vector<int16_t>& samples) {
    auto* src = static_cast<KOVA_SRC*>(kova_mem_calloc(1, sizeof(KOVA_SRC)));
    const size_t bytes = samples.size() * sizeof(int16_t);
    src->pcm = static_cast<int16_t*>(kova_mem_malloc(bytes ? bytes : 1));
    src->pcm_proc = static_cast<int16_t*>(kova_mem_malloc(bytes ? bytes : 1));
    if (bytes) {
        std::memcpy(src->pcm, samples.data(), bytes);
        std::memcpy(src->pcm_proc, samples.data(), bytes);
    }
    src->size = static_cast<int32_t>(bytes);
    src->slot = slot;
    src->origin = origin;
    src->rpt_start = 0;
    src->rpt_end = src->size;
    return src;
}

// The tune set a registration from files gives.
inline KOVA_TUNE_SET file_tune() {
    return KOVA_TUNE_SET{1.0, 0.4, 0, 1.0, 0, 0.2, 0.0, 0.4, 0.6, 0.9, 0.6};
}

// A set with the given sources (null for an empty slot), appended to the context's list and
// made active. Returns the set; the context owns it from here on.
inline KOVA_SRCSET* add_set(KOVA_CTX* ctx, KOVA_SRC* start, KOVA_SRC* loop, KOVA_SRC* end,
                            const KOVA_TUNE_SET& tune = file_tune()) {
    auto* set = static_cast<KOVA_SRCSET*>(kova_mem_calloc(1, sizeof(KOVA_SRCSET)));
    set->src[KOVA_SLOT_START] = start;
    set->src[KOVA_SLOT_LOOP] = loop;
    set->src[KOVA_SLOT_END] = end;
    set->filters = list_create();
    set->tune = static_cast<KOVA_TUNE_SET*>(kova_mem_calloc(1, sizeof(KOVA_TUNE_SET)));
    *set->tune = tune;
    set->thickness = 0.6;
    list_pushback(ctx->src_list, set);
    ctx->active_src = static_cast<int32_t>(ctx->src_list->count);
    return set;
}

// The registered set with a 1-based identifier the test knows to exist.
inline KOVA_SRCSET* set_of(KOVA_CTX* ctx, int id) {
    return static_cast<KOVA_SRCSET*>(
        list_getat(ctx->src_list, static_cast<uint32_t>(id - 1))->data);
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
