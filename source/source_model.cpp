// SPDX-License-Identifier: Apache-2.0
// Release and descriptor operations on the in-memory source model.
#include <cstring>

#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "source/filter_dsc.h"
#include "util/kova_mem.h"

extern "C" {

KOVA_API void kova_free_sourceobj(KOVA_SRC* src) {
    if (src == nullptr) return;
    kova_mem_free(src->pcm);
    src->pcm = nullptr;
    kova_mem_free(src->pcm_proc);
    src->pcm_proc = nullptr;
    kova_mem_free(src->path);
    kova_mem_free(src);
}

KOVA_API void kova_free_sourceset(void* set_ptr) {
    auto* set = static_cast<KOVA_SRCSET*>(set_ptr);
    if (set == nullptr) return;
    for (KOVA_SRC*& src : set->src) {
        kova_free_sourceobj(src);
        src = nullptr;
    }
    list_destory(set->filters, nullptr);  // descriptors are plain heap records
    kova_mem_free(set->tune);
    kova_mem_free(set);
}

KOVA_API int kova_update_filterdsc(LIST* filters, const KOVA_FLT_DSC* dsc) {
    if (filters == nullptr || dsc == nullptr || filters->count == 0) return -1;
    int index = 0;
    for (NODE* node = filters->head->next; node != filters->tail; node = node->next, ++index) {
        auto* cur = static_cast<KOVA_FLT_DSC*>(node->data);
        if (cur == nullptr || cur->type != dsc->type) continue;
        std::memcpy(cur, dsc, sizeof(KOVA_FLT_DSC));
        return index;
    }
    return -1;
}

KOVA_API int kova_is_valid_filter(const KOVA_FLT_DSC* dsc) {
    // Null has no type, so it is not a valid filter either.
    return kova_source::filter_dsc_ok(dsc, kova_source::FilterUse::kType) ? 1 : -1;
}

}  // extern "C"
