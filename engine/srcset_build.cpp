// SPDX-License-Identifier: Apache-2.0
// Building a new source set and adding it to a context's list, for every way of registering.
#include "engine/srcset_build.h"
#include "util/kova_mem.h"

namespace {
constexpr double kDefaultThickness = 0.6;
}

KOVA_SRCSET* _srcset_new(void) {
    auto* set = static_cast<KOVA_SRCSET*>(kova_mem_calloc(1, sizeof(KOVA_SRCSET)));
    if (set == nullptr) return nullptr;
    set->tune = static_cast<KOVA_TUNE_SET*>(kova_mem_calloc(1, sizeof(KOVA_TUNE_SET)));
    if (set->tune == nullptr) {
        kova_mem_free(set);
        return nullptr;
    }
    set->filters = list_create();
    if (set->filters == nullptr) {
        kova_mem_free(set->tune);
        kova_mem_free(set);
        return nullptr;
    }
    set->thickness = kDefaultThickness;
    return set;
}

int32_t _srcset_append(KOVA_CTX* ctx, KOVA_SRCSET* set) {
    if (list_pushback(ctx->src_list, set) == nullptr) return 0;
    ctx->active_src = _srcset_count(ctx);
    return ctx->active_src;
}
