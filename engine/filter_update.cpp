// SPDX-License-Identifier: Apache-2.0
// Editing a registered set: its filters (replace, attach, read back) and its PCM files, each
// followed by rebuilding every working copy from the unfiltered samples.
#include <cmath>
#include <cstdio>
#include <cstring>
#include <memory>

#include "engine/srcset_build.h"
#include "kova/kova_dsp.h"
#include "kova/kova_engine.h"
#include "kova/kova_source.h"
#include "source/filter_dsc.h"
#include "util/kova_mem.h"

namespace {

struct MemFree {
    void operator()(char* p) const { kova_mem_free(p); }
};

// Slots in the order the working copies are rebuilt after a filter change.
constexpr int kRefilterOrder[KOVA_SLOT_COUNT] = {KOVA_SLOT_LOOP, KOVA_SLOT_START, KOVA_SLOT_END};

// Working copy = unfiltered samples through the set's filters; play position back to the start.
void rebuild_working_copy(KOVA_SRC* src, LIST* filters) {
    if (src->size > 0 && src->pcm != nullptr && src->pcm_proc != nullptr) {
        std::memcpy(src->pcm_proc, src->pcm, static_cast<size_t>(src->size));
        kova_proc_filters(src->pcm_proc, static_cast<uint32_t>(src->size), filters);
    }
    src->pos = 0;
}

// Replaces (`attach` false) or attaches a descriptor, then rebuilds every working copy from the
// unfiltered samples; file sources are read again from disk first. Degenerate descriptors are
// refused like an invalid type, with the context untouched. Attaching and refiltering happen
// under one hold of the mutex, so no other operation sees the new descriptor before the sources
// are rebuilt with it. Every allocation comes first (the path buffer, then an attached
// descriptor's copy), so running out of memory reports -2 and leaves the set as it was.
int32_t edit_filters(KOVA_CTX* ctx, int32_t index, const KOVA_FLT_DSC* dsc, int32_t* err,
                     bool attach) {
    if (err == nullptr) return 0;
    *err = KOVA_ERR_INVALID_PARAM;
    if (!_ctx_alive(ctx) || !_srcset_index_ok(ctx, index) ||
        !kova_source::filter_dsc_ok(dsc, kova_source::FilterUse::kDesign))
        return 0;

    KovaCtxLock lock(ctx);
    KOVA_SRCSET* set = _fetch_srcset(ctx, index);
    if (set == nullptr) return 0;
    const std::unique_ptr<char, MemFree> path_buf(
        static_cast<char*>(kova_mem_malloc(KOVA_PATH_BUF_BYTES)));
    if (path_buf == nullptr) {
        *err = KOVA_ERR_INSUFF_MEM;
        return 0;
    }
    // A type the set already has is replaced rather than attached twice.
    if (attach && set->filters != nullptr && kova_update_filterdsc(set->filters, dsc) < 0 &&
        !_flt_list_push_copy(set->filters, dsc)) {
        *err = KOVA_ERR_INSUFF_MEM;
        return 0;
    }
    if (kova_update_filterdsc(set->filters, dsc) < 0) {
        puts("kova_update_filterdsc() < 0 ");
        return 0;
    }
    for (const int slot : kRefilterOrder) {
        KOVA_SRC* src = set->src[slot];
        if (src == nullptr) continue;
        if (src->origin == KOVA_ORIGIN_FILE && src->path != nullptr) {
            // The path lives in the source being released: keep a copy for the reload.
            std::memset(path_buf.get(), 0, KOVA_PATH_BUF_BYTES);
            std::strncpy(path_buf.get(), src->path, KOVA_PATH_BUF_BYTES - 1);
            kova_free_sourceobj(src);
            // A file that cannot be read again leaves its slot empty; the update still succeeds.
            set->src[slot] = kova_load_sound_source(path_buf.get(), slot, err);
            src = set->src[slot];
            if (src == nullptr) continue;
        }
        rebuild_working_copy(src, set->filters);
    }
    *err = KOVA_OK;
    return index;
}

}  // namespace

bool _flt_list_push_copy(LIST* filters, const KOVA_FLT_DSC* dsc) {
    auto* copy = static_cast<KOVA_FLT_DSC*>(kova_mem_malloc(sizeof(KOVA_FLT_DSC)));
    if (copy == nullptr) return false;
    std::memcpy(copy, dsc, sizeof(KOVA_FLT_DSC));
    if (list_pushback(filters, copy) != nullptr) return true;
    kova_mem_free(copy);
    return false;
}

extern "C" {

KOVA_API int32_t kova_update_filter(KOVA_CTX* ctx, int32_t index, const KOVA_FLT_DSC* dsc,
                                    int32_t* err) {
    return edit_filters(ctx, index, dsc, err, false);
}

KOVA_API int32_t kova_attach_filter(KOVA_CTX* ctx, int32_t index, const KOVA_FLT_DSC* dsc,
                                    int32_t* err) {
    return edit_filters(ctx, index, dsc, err, true);
}

KOVA_API int32_t kova_get_filters(KOVA_CTX* ctx, int32_t index,
                                  KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT]) {
    if (!_ctx_alive(ctx) || !_srcset_index_ok(ctx, index) || flt == nullptr) return 0;
    KovaCtxLock lock(ctx);
    const KOVA_SRCSET* set = _fetch_srcset(ctx, index);
    if (set == nullptr || set->filters == nullptr) return 0;
    for (NODE* n = set->filters->head->next; n != nullptr && n != set->filters->tail; n = n->next) {
        const auto* dsc = static_cast<const KOVA_FLT_DSC*>(n->data);
        // Types read from a file may lie outside the array; they have no element and are skipped.
        if (dsc != nullptr && dsc->type < KOVA_FLT_TYPE_COUNT) flt[dsc->type] = *dsc;
    }
    return 0;
}

KOVA_API int32_t kova_update_src_byfiles(KOVA_CTX* ctx, int32_t index,
                                         const char* const paths[KOVA_SLOT_COUNT], int32_t* err) {
    if (err == nullptr) return 0;
    *err = KOVA_ERR_INVALID_PARAM;
    // A missing path array is refused as an invalid argument rather than read as "keep all".
    if (!_ctx_alive(ctx) || !_srcset_index_ok(ctx, index) || paths == nullptr) return 0;

    KovaCtxLock lock(ctx);
    KOVA_SRCSET* set = _fetch_srcset(ctx, index);
    if (set == nullptr) {
        *err = KOVA_ERR_SOURCE;
        return 0;
    }
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        if (paths[slot] == nullptr) continue;
        kova_free_sourceobj(set->src[slot]);
        set->src[slot] = kova_load_sound_source(paths[slot], slot, err);
    }
    // Kept slots already hold a filtered working copy: rebuilding every slot from its unfiltered
    // samples applies the filters exactly once to old and new sources alike.
    for (KOVA_SRC* src : set->src) {
        if (src != nullptr) rebuild_working_copy(src, set->filters);
    }
    // A set whose loop slot ended up empty stays registered; generation refuses to play it.
    if (set->src[KOVA_SLOT_LOOP] == nullptr) {
        *err = KOVA_ERR_SOURCE;
        return 0;
    }
    if (set->tune != nullptr) {
        set->tune->file_gain = 0.4;
        set->tune->wn_gain = 0.0;
    }
    *err = KOVA_OK;
    return index;
}

}  // extern "C"
