// SPDX-License-Identifier: Apache-2.0
/* Access to a live engine context: the liveness check, the registered sets by identifier, the
 * context lock and the release of a context. Not exported. */
#ifndef KOVA_ENGINE_CONTEXT_ACCESS_H
#define KOVA_ENGINE_CONTEXT_ACCESS_H

#include <pthread.h>
#include <stdint.h>

#include "kova/kova_list.h"
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

#endif
