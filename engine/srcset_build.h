// SPDX-License-Identifier: Apache-2.0
/* Building and editing source sets: the tune set of a new registration, a new empty set, appending
 * it to a context, the registration frame every way shares, and filter-list helpers. Not
 * exported. */
#ifndef KOVA_ENGINE_SRCSET_BUILD_H
#define KOVA_ENGINE_SRCSET_BUILD_H

#include <stdint.h>

#include "engine/context_access.h"
#include "kova/kova_engine.h"
#include "kova/kova_source.h"

/* The tune set a set gets when it is registered from files or from a filter: the defaults with
 * the way's own noise and file levels. */
inline void _fill_reg_tune(KOVA_TUNE_SET* t, double wn_gain, double file_gain) {
    _cfg_tune_default(t);
    t->wn_gain = wn_gain;
    t->file_gain = file_gain;
}

/* A new, empty set: cleared record, zeroed tune set, empty filter list, thickness 0.6.
 * Null when an allocation failed (nothing is left allocated). */
KOVA_SRCSET* _srcset_new(void);

/* Appends a set to the context's list and makes it active. Returns the new identifier, or 0 when
 * the list node could not be allocated (the list and active_src are then unchanged and the
 * caller still owns the set). */
int32_t _srcset_append(KOVA_CTX* ctx, KOVA_SRCSET* set);

/* What every registration shares, for a context and error cell the caller has checked: a list
 * already holding `limit` sets is refused with -5; otherwise, under the context mutex, a new set
 * is built, `fill(set)` loads it (returning false after storing its own code in *err) and the set
 * is appended as the active one. Returns the new identifier, or 0 with *err set and nothing
 * left allocated. */
template <typename Fill>
int32_t _srcset_register(KOVA_CTX* ctx, int32_t limit, int32_t* err, Fill fill) {
    if (_srcset_count(ctx) >= limit) {
        *err = KOVA_ERR_SRC_FULL;
        return 0;
    }
    KovaCtxLock lock(ctx);
    KOVA_SRCSET* set = _srcset_new();
    if (set == nullptr) {
        *err = KOVA_ERR_INSUFF_MEM;
        return 0;
    }
    if (!fill(set)) {
        kova_free_sourceset(set);
        return 0;
    }
    const int32_t id = _srcset_append(ctx, set);
    if (id == 0) {
        *err = KOVA_ERR_INSUFF_MEM;
        kova_free_sourceset(set);
        return 0;
    }
    *err = KOVA_OK;
    return id;
}

/* Appends a copy of `dsc` to a filter list; false (list unchanged) when memory ran out. */
bool _flt_list_push_copy(LIST* filters, const KOVA_FLT_DSC* dsc);

#endif
