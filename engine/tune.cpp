// SPDX-License-Identifier: Apache-2.0
// Tuning controls: a set's tune set, the active set's thickness and the output volume.
#include <cstdint>

#include "engine/context_access.h"
#include "kova/kova_dsp.h"
#include "kova/kova_engine.h"

namespace {

constexpr double kVolumeScale = 0.8;

// Tune values are levels and depths in 0..1; NaN fails both comparisons and is not taken.
bool in_unit_range(double v) {
    return v >= 0.0 && v <= 1.0;
}

void take(double& field, double v) {
    if (in_unit_range(v)) field = v;
}

// An on/off switch with its depth: off is always taken (the depth is kept for later), on only
// together with a usable depth, anything else leaves both as they are.
void take_pair(int32_t& enable, double& depth, int32_t new_enable, double new_depth) {
    if (new_enable == 0) {
        enable = 0;
    } else if (new_enable == 1 && in_unit_range(new_depth)) {
        enable = 1;
        depth = new_depth;
    }
}

// The tune set of a set identifier, or null for an unknown identifier.
KOVA_TUNE_SET* tune_of(const KOVA_CTX* ctx, int32_t index) {
    const KOVA_SRCSET* set = _fetch_srcset(ctx, index);
    return set != nullptr ? set->tune : nullptr;
}

}  // namespace

extern "C" {

KOVA_API KOVA_TUNE_SET* _cfg_tune_default(KOVA_TUNE_SET* tune) {
    if (tune == nullptr) return nullptr;
    tune->gain = 1.0;
    tune->pan = 0.4;
    tune->osc_enable = 0;
    tune->osc_depth = 1.0;
    tune->sharp_enable = 0;
    tune->sharpness = 0.2;
    tune->wn_gain = 0.5;
    tune->file_gain = 0.4;
    tune->start_gain = 0.6;
    tune->loop_gain = 0.9;
    tune->end_gain = 0.6;
    return tune;
}

KOVA_API int32_t kova_get_tuneset(KOVA_CTX* ctx, int32_t index, KOVA_TUNE_SET* out) {
    if (!_ctx_alive(ctx)) return KOVA_OK;
    const KOVA_TUNE_SET* tune = tune_of(ctx, index);
    if (tune == nullptr || out == nullptr) return KOVA_ERR_INVALID_PARAM;
    *out = *tune;
    return KOVA_OK;
}

KOVA_API int32_t kova_set_tuneset(KOVA_CTX* ctx, int32_t index, const KOVA_TUNE_SET* in) {
    if (!_ctx_alive(ctx)) return KOVA_OK;
    KOVA_TUNE_SET* tune = tune_of(ctx, index);
    if (tune == nullptr || in == nullptr) return KOVA_ERR_INVALID_PARAM;
    take(tune->gain, in->gain);
    take(tune->pan, in->pan);
    take_pair(tune->osc_enable, tune->osc_depth, in->osc_enable, in->osc_depth);
    take_pair(tune->sharp_enable, tune->sharpness, in->sharp_enable, in->sharpness);
    take(tune->start_gain, in->start_gain);
    take(tune->loop_gain, in->loop_gain);
    take(tune->end_gain, in->end_gain);
    take(tune->wn_gain, in->wn_gain);
    take(tune->file_gain, in->file_gain);
    return KOVA_OK;
}

KOVA_API int32_t kova_set_thickness(KOVA_CTX* ctx, double thickness) {
    if (!_ctx_alive(ctx) || ctx->eq == nullptr || !in_unit_range(thickness)) {
        return KOVA_ERR_INVALID_PARAM;
    }
    // Without an active set there is nothing to store it in; that is not an error.
    KOVA_SRCSET* set = _fetch_srcset(ctx, ctx->active_src);
    if (set == nullptr) return KOVA_OK;
    set->thickness = thickness;
    kova_eq_set_thickness(ctx->eq, thickness);
    return KOVA_OK;
}

KOVA_API int32_t kova_set_volume(KOVA_CTX* ctx, double volume) {
    if (!_ctx_alive(ctx)) return KOVA_ERR_INVALID_PARAM;
    ctx->volume = volume * kVolumeScale;
    return KOVA_OK;
}

}  // extern "C"
