// SPDX-License-Identifier: Apache-2.0
// Registration of a source set whose loop sound is white noise shaped by one filter.
#include "engine/srcset_build.h"
#include "kova/kova_dsp.h"
#include "kova/kova_engine.h"
#include "kova/kova_source.h"
#include "source/filter_dsc.h"

extern "C" KOVA_API int32_t kova_reg_src_byfilter(KOVA_CTX* ctx, const KOVA_FLT_DSC* dsc,
                                                  int32_t* err) {
    if (err == nullptr) return 0;
    *err = KOVA_ERR_INVALID_PARAM;
    // Degenerate descriptors (no rate, frequencies at or past Nyquist, NaN, ...) would design
    // infinite or unstable coefficients; they are refused here, before anything is built.
    if (!_ctx_alive(ctx) || !kova_source::filter_dsc_ok(dsc, kova_source::FilterUse::kDesign))
        return 0;

    return _srcset_register(ctx, KOVA_MAX_SRCSETS, err, [&](KOVA_SRCSET* set) {
        _fill_reg_tune(set->tune, 0.5, 0.0);
        KOVA_SRC* loop = kova_gen_sound_source_wn(dsc, KOVA_SLOT_LOOP, err);
        if (loop == nullptr) {
            // The descriptor was checked, so the generator failed for its own reasons: reported
            // as a failed noise generation, whatever code the generator left.
            *err = KOVA_ERR_INVALID_PARAM;
            return false;
        }
        set->src[KOVA_SLOT_LOOP] = loop;
        if (!_flt_list_push_copy(set->filters, dsc)) {
            *err = KOVA_ERR_INSUFF_MEM;
            return false;
        }
        kova_proc_filters(loop->pcm_proc, static_cast<uint32_t>(loop->size), set->filters);
        return true;
    });
}
