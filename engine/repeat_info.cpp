// SPDX-License-Identifier: Apache-2.0
// Repeat points of a set's sources, converted between bytes and milliseconds.
#include <cstring>

#include "engine/context_access.h"
#include "kova/kova_engine.h"
#include "util/byte_time.h"

extern "C" {

KOVA_API int64_t _cvt_byte_to_ms(int32_t bytes, int32_t sample_rate, int32_t channels) {
    return kova::byte_to_ms(bytes, sample_rate, channels);
}

KOVA_API int32_t _cvt_ms_to_byte(int64_t ms, int32_t sample_rate, int32_t channels) {
    return kova::ms_to_byte(ms, sample_rate, channels);
}

KOVA_API int32_t kova_get_rptinfo(KOVA_CTX* ctx, int32_t index, KOVA_RPT_INFO* info) {
    if (!_ctx_alive(ctx) || !_srcset_index_ok(ctx, index) || info == nullptr) {
        return KOVA_ERR_INVALID_PARAM;
    }
    KovaCtxLock lock(ctx);
    std::memset(info, 0, sizeof(*info));
    const KOVA_SRCSET* set = _fetch_srcset(ctx, index);
    if (set == nullptr) return KOVA_ERR_INVALID_PARAM;

    const auto rate = static_cast<int32_t>(ctx->format->sample_rate);
    const auto channels = static_cast<int32_t>(ctx->format->channels);
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        const KOVA_SRC* src = set->src[slot];
        if (src == nullptr) {
            info->len_ms[slot] = 0;
            info->rpt_start_ms[slot] = -1;
            info->rpt_end_ms[slot] = -1;
            continue;
        }
        info->rpt_start_ms[slot] =
            static_cast<int32_t>(_cvt_byte_to_ms(src->rpt_start, rate, channels));
        info->rpt_end_ms[slot] =
            static_cast<int32_t>(_cvt_byte_to_ms(src->rpt_end, rate, channels));
        info->len_ms[slot] = _cvt_byte_to_ms(src->size, rate, channels);
    }
    return KOVA_OK;
}

// A loop-slot rpt_end below 10 bytes (0 ms included) is stored as given: generation then plays
// the loop over the whole source, so such a value is harmless and refusing it would only make
// "0 stores 0 bytes" untrue for one slot.
KOVA_API int32_t kova_set_rptinfo(KOVA_CTX* ctx, int32_t index, const KOVA_RPT_INFO* info) {
    if (!_ctx_alive(ctx) || !_srcset_index_ok(ctx, index) || info == nullptr) {
        return KOVA_ERR_INVALID_PARAM;
    }
    KovaCtxLock lock(ctx);
    KOVA_SRCSET* set = _fetch_srcset(ctx, index);
    if (set == nullptr) return KOVA_ERR_INVALID_PARAM;

    const auto rate = static_cast<int32_t>(ctx->format->sample_rate);
    const auto channels = static_cast<int32_t>(ctx->format->channels);
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        KOVA_SRC* src = set->src[slot];
        if (src == nullptr) continue;
        const int64_t len_ms = _cvt_byte_to_ms(src->size, rate, channels);
        auto store = [&](int32_t v, int32_t& field) {
            if (v < 0 || v > len_ms) return;
            const int32_t bytes = _cvt_ms_to_byte(v, rate, channels);
            field = bytes > src->size ? src->size : bytes;
        };
        store(info->rpt_start_ms[slot], src->rpt_start);
        store(info->rpt_end_ms[slot], src->rpt_end);
    }
    return KOVA_OK;
}

}  // extern "C"
