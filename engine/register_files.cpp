// SPDX-License-Identifier: Apache-2.0
// Registration of a source set from raw PCM files, selection of the active set, set count.
#include "engine/srcset_build.h"
#include "kova/kova_dsp.h"
#include "kova/kova_engine.h"
#include "kova/kova_source.h"

extern "C" {

KOVA_API int32_t kova_reg_src_byfiles(KOVA_CTX* ctx, const char* const paths[KOVA_SLOT_COUNT],
                                      int32_t* err) {
    if (err == nullptr) return 0;
    *err = KOVA_ERR_INVALID_PARAM;
    // A missing path array is an invalid argument, not a set of empty slots.
    if (!_ctx_alive(ctx) || paths == nullptr) return 0;
    return _srcset_register(ctx, KOVA_MAX_SRCSETS, err, [&](KOVA_SRCSET* set) {
        _fill_reg_tune(set->tune, 0.0, 0.4);
        // Each slot loads on its own; a failure only leaves that slot empty (the loader sets the
        // code).
        for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
            set->src[slot] = kova_load_sound_source(paths[slot], slot, err);
        }
        // Without a loop sound the set cannot play; whatever made the loop load fail, the source
        // is what is missing.
        if (set->src[KOVA_SLOT_LOOP] == nullptr) {
            *err = KOVA_ERR_SOURCE;
            return false;
        }
        return true;
    });
}

KOVA_API int32_t kova_set_active_src(KOVA_CTX* ctx, int32_t index) {
    if (!_ctx_alive(ctx) || !_srcset_index_ok(ctx, index)) return KOVA_ERR_INVALID_PARAM;
    ctx->active_src = index;
    const KOVA_SRCSET* set = _fetch_srcset(ctx, index);
    if (set == nullptr) return KOVA_ERR_INVALID_PARAM;
    if (ctx->eq != nullptr) kova_eq_set_thickness(ctx->eq, set->thickness);
    return KOVA_OK;
}

KOVA_API int32_t kova_get_src_num(KOVA_CTX* ctx) {
    if (!_ctx_alive(ctx)) return 0;
    return _srcset_count(ctx);
}

}  // extern "C"
