// SPDX-License-Identifier: Apache-2.0
/* Helpers shared by the engine's source files. Not exported. Add to this file; do not rename. */
#ifndef KOVA_ENGINE_INTERNAL_H
#define KOVA_ENGINE_INTERNAL_H

#include <pthread.h>
#include <stdint.h>

#include "kova/kova_engine.h"
#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "kova/kova_types.h"

/* Releases everything a context owns, then the context itself; tolerates a partly built one. */
extern "C" void ctx_free(KOVA_CTX* ctx);

/* A context is usable while it is non-null and carries its tag. */
inline bool _ctx_alive(const KOVA_CTX* ctx) {
    return ctx != nullptr && ctx->tag == KOVA_CTX_TAG;
}

/* Number of registered source sets (0 when the list is missing). */
inline int32_t _srcset_count(const KOVA_CTX* ctx) {
    return ctx->src_list != nullptr ? static_cast<int32_t>(ctx->src_list->count) : 0;
}

/* A set identifier is valid when 1 <= index <= number of sets. */
inline bool _srcset_index_ok(const KOVA_CTX* ctx, int32_t index) {
    return index >= 1 && index <= _srcset_count(ctx);
}

/* The set with the 1-based identifier, or null when it is out of range or missing. */
inline KOVA_SRCSET* _fetch_srcset(const KOVA_CTX* ctx, int32_t index) {
    if (!_srcset_index_ok(ctx, index)) return nullptr;
    NODE* node = list_getat(ctx->src_list, static_cast<uint32_t>(index - 1));
    return node != nullptr ? static_cast<KOVA_SRCSET*>(node->data) : nullptr;
}

/* Holds the context mutex for a scope. */
class KovaCtxLock {
   public:
    explicit KovaCtxLock(const KOVA_CTX* ctx) : mutex_(ctx->mutex) {
        if (mutex_ != nullptr) pthread_mutex_lock(mutex_);
    }
    ~KovaCtxLock() {
        if (mutex_ != nullptr) pthread_mutex_unlock(mutex_);
    }
    KovaCtxLock(const KovaCtxLock&) = delete;
    KovaCtxLock& operator=(const KovaCtxLock&) = delete;

   private:
    pthread_mutex_t* mutex_;
};

/* Registration helpers (srcset_build.cpp). */

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

/* Whether a filter descriptor can be designed and run without degenerate coefficients
 * (filter_update.cpp). */
bool _flt_dsc_usable(const KOVA_FLT_DSC* dsc);

/* Appends a copy of `dsc` to a filter list; false (list unchanged) when memory ran out. */
bool _flt_list_push_copy(LIST* filters, const KOVA_FLT_DSC* dsc);

#endif
