// SPDX-License-Identifier: Apache-2.0
/* White noise at a tenth of full scale, and noise sound sources for the slots of a source set. */
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "kova/kova_dsp.h"
#include "util/kova_mem.h"
#include "dsp/exact_math.h"

namespace {

/* rand() is deliberately never seeded here: the sequence is process state shared with others. */
int16_t noise_sample() {
    const int r = std::rand();
    double v = r / 2147483647.0 + -0.5;
    v = v + v;
    v = v * 32768.0 * 0.1;
    return static_cast<int16_t>(static_cast<int32_t>(v));
}

constexpr int32_t kSlotBytes[KOVA_SLOT_COUNT] = {KOVA_SLOT_START_MAX_BYTES,
                                                 KOVA_SLOT_LOOP_MAX_BYTES, KOVA_SLOT_END_MAX_BYTES};

/* A noise source for one slot, or null: for an unknown slot (code left as it is) or when memory
 * is short (code set, nothing left allocated). */
KOVA_SRC* new_noise_source(uint32_t slot, int32_t* err) {
    if (slot >= KOVA_SLOT_COUNT) return nullptr;
    const int32_t bytes = kSlotBytes[slot];
    auto* src = static_cast<KOVA_SRC*>(kova_mem_calloc(1, sizeof(KOVA_SRC)));
    if (src != nullptr) {
        src->pcm_proc = static_cast<int16_t*>(kova_mem_malloc(static_cast<size_t>(bytes)));
        if (src->pcm_proc != nullptr) {
            src->pcm = static_cast<int16_t*>(kova_mem_malloc(static_cast<size_t>(bytes)));
        }
    }
    if (src == nullptr || src->pcm == nullptr) {
        if (src != nullptr) kova_mem_free(src->pcm_proc);
        kova_mem_free(src);
        *err = KOVA_ERR_INSUFF_MEM;
        return nullptr;
    }
    src->slot = static_cast<int32_t>(slot);
    src->origin = KOVA_ORIGIN_NOISE;
    src->size = bytes;
    src->pos = 0;
    src->rpt_start = 0;
    src->rpt_end = bytes;
    kova_gen_white_noise_16bit(src->pcm, bytes);
    std::memcpy(src->pcm_proc, src->pcm, static_cast<size_t>(bytes));
    return src;
}

}  // namespace

extern "C" {

void kova_gen_white_noise_16bit(int16_t* buf, int32_t bytes) {
    if (buf == nullptr || bytes < 2) return;
    const int32_t count = bytes / 2;
    for (int32_t i = 0; i < count; ++i) buf[i] = noise_sample();
}

KOVA_SRC* kova_gen_sound_source_wn(const KOVA_FLT_DSC* dsc, uint32_t slot, int32_t* err) {
    /* A null error pointer means the caller does not want the code; the source is still made. */
    int32_t ignored = 0;
    if (err == nullptr) err = &ignored;
    *err = KOVA_ERR_SOURCE;
    /* The descriptor is only required to exist: filtering is the caller's next step. */
    if (dsc == nullptr) return nullptr;

    KOVA_SRC* src = new_noise_source(slot, err);
    if (src == nullptr) {
        fputs("kova_gen_sound_source() fail.", stdout);
        return nullptr;
    }
    *err = KOVA_OK;
    return src;
}

}  // extern "C"
