// Registration of a source set whose loop sound is white noise shaped by one filter.
#include <cstring>

#include "engine/engine_internal.h"
#include "kova/kova_dsp.h"
#include "kova/kova_engine.h"
#include "kova/kova_source.h"
#include "util/kova_mem.h"

extern "C" KOVA_API int32_t kova_reg_src_byfilter(KOVA_CTX* ctx, const KOVA_FLT_DSC* dsc,
                                                  int32_t* err) {
    if (err == nullptr) return 0;
    *err = KOVA_ERR_INVALID_PARAM;
    // Degenerate descriptors (no rate, frequencies at or past Nyquist, NaN, ...) would design
    // infinite or unstable coefficients; they are refused here, before anything is built.
    if (!_ctx_alive(ctx) || !_flt_dsc_usable(dsc)) return 0;
    if (_srcset_count(ctx) >= KOVA_MAX_SRCSETS) {
        *err = KOVA_ERR_SRC_FULL;
        return 0;
    }

    KovaCtxLock lock(ctx);
    KOVA_SRCSET* set = _srcset_new();
    if (set == nullptr) {
        *err = KOVA_ERR_INSUFF_MEM;
        return 0;
    }
    _fill_reg_tune(set->tune, 0.5, 0.0);

    KOVA_SRC* loop = kova_gen_sound_source_wn(dsc, KOVA_SLOT_LOOP, err);
    if (loop == nullptr) {
        // The descriptor was checked, so the generator failed for its own reasons: reported as a
        // failed noise generation, whatever code the generator left.
        *err = KOVA_ERR_INVALID_PARAM;
        kova_free_sourceset(set);
        return 0;
    }
    set->src[KOVA_SLOT_LOOP] = loop;

    auto* copy = static_cast<KOVA_FLT_DSC*>(kova_mem_malloc(sizeof(KOVA_FLT_DSC)));
    if (copy == nullptr || list_pushback(set->filters, copy) == nullptr) {
        kova_mem_free(copy);
        *err = KOVA_ERR_INSUFF_MEM;
        kova_free_sourceset(set);
        return 0;
    }
    std::memcpy(copy, dsc, sizeof(KOVA_FLT_DSC));

    kova_proc_filters(loop->pcm_proc, static_cast<uint32_t>(loop->size), set->filters);

    const int32_t id = _srcset_append(ctx, set);
    if (id == 0) {
        *err = KOVA_ERR_INSUFF_MEM;
        kova_free_sourceset(set);
        return 0;
    }
    *err = KOVA_OK;
    return id;
}
