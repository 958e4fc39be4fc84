// SPDX-License-Identifier: Apache-2.0
/* Filter bank: enabled filters run in parallel on copies of a buffer, the result is their mean. */
#include <cstdint>
#include <cstring>

#include "kova/kova_dsp.h"
#include "kova/kova_list.h"
#include "util/kova_mem.h"
#include "dsp/exact_math.h"

namespace {

constexpr uint32_t kBranches = 4;

/* Frees the branch buffers whatever way the walk ends. */
struct Branches {
    int16_t* buf[kBranches] = {};
    ~Branches() {
        for (int16_t* b : buf) kova_mem_free(b);
    }
};

void run_filter(const KOVA_FLT_DSC* dsc, int16_t* branch, int32_t bytes) {
    int32_t err = 0;
    KOVA_FLT* flt = kova_flt_init(dsc, &err);
    /* A filter that cannot be created leaves its branch an unfiltered copy. */
    if (flt == nullptr) return;
    kova_flt_process(flt, branch, bytes);
    kova_flt_deinit(flt);
}

}  // namespace

extern "C" {

void kova_proc_filters(int16_t* buf, uint32_t bytes, LIST* filters) {
    if (buf == nullptr || filters == nullptr || bytes == 0 || filters->count == 0) return;
    /* The filter takes a signed length; longer buffers are filtered over their first 2 GiB. */
    const int32_t flt_bytes = bytes > INT32_MAX ? INT32_MAX : static_cast<int32_t>(bytes);

    Branches branches;
    uint32_t made = 0;
    int16_t* current = nullptr;
    uint32_t index = 0;
    for (NODE* node = filters->head ? filters->head->next : nullptr;
         node != nullptr && node != filters->tail && index < filters->count;
         node = node->next, ++index) {
        const auto* dsc = static_cast<const KOVA_FLT_DSC*>(node->data);
        if (dsc == nullptr || dsc->enable != 1) continue;
        if (index < kBranches) {
            /* A branch buffer that cannot be allocated drops just that filter: the others still
             * give a result, and the mean divides only by the branches that exist. */
            auto* branch = static_cast<int16_t*>(kova_mem_malloc(bytes));
            if (branch == nullptr) continue;
            std::memcpy(branch, buf, bytes);
            branches.buf[index] = branch;
            ++made;
            current = branch;
        }
        /* Past the fourth position a filter joins the latest branch in series. */
        if (current == nullptr) continue;
        run_filter(dsc, current, flt_bytes);
    }

    if (made == 0 || bytes < 2) return;
    const uint32_t samples = bytes / 2;
    const double divisor = static_cast<double>(made);
    for (uint32_t s = 0; s < samples; ++s) {
        double sum = 0.0;
        for (int16_t* b : branches.buf) {
            if (b != nullptr) sum = sum + static_cast<double>(b[s]);
        }
        buf[s] = static_cast<int16_t>(static_cast<int32_t>(sum / divisor));
    }
}

}  // extern "C"
