// SPDX-License-Identifier: Apache-2.0
// Generation entry points: argument checks, stroke state, start and end sounds.
#include <cmath>
#include <cstdint>

#include "engine/context_access.h"
#include "kova/kova_engine.h"
#include "engine/sample_kernel.h"

int16_t clip_count_hi = 0;
int16_t clip_count_lo = 0;

namespace {

using kova_gen::GenBlock;

// Only x < 0, y < 0 and time < 0 refuse an event. A NaN coordinate compares false, so it is
// accepted (an up event with x = NaN ends the stroke like any other). Non-finite values then
// meet only conversions with a defined result (trunc_sat32): a NaN axis delta counts as 0 px,
// an infinite one as 2^31 - 1 px (full speed); a NaN or infinite pan gain makes the sample
// value NaN (finished as 0) or infinite (finished at the clip limits).
bool event_ok(const KOVA_PARAM* p) {
    return p != nullptr && !(p->x < 0.0f) && !(p->y < 0.0f) && p->time >= 0 &&
           p->action <= KOVA_ACTION_END;
}

// The active set when the context can generate from it, else null. Every action needs the loop
// source (its origin picks the level, an end rewinds it), so a set without one is refused.
KOVA_SRCSET* playable_set(const KOVA_CTX* ctx) {
    if (!_ctx_alive(ctx) || ctx->format == nullptr || ctx->prev_param == nullptr ||
        ctx->osc == nullptr || ctx->eq == nullptr || ctx->work_buf == nullptr) {
        return nullptr;
    }
    KOVA_SRCSET* set = _fetch_srcset(ctx, ctx->active_src);
    if (set == nullptr || set->tune == nullptr || set->src[KOVA_SLOT_LOOP] == nullptr) {
        return nullptr;
    }
    return set;
}

// The set a request plays from: a usable event, an output buffer with room and a context that can
// generate. Null refuses the request. Each entry point checks its request here once.
KOVA_SRCSET* checked_request(const KOVA_CTX* ctx, const KOVA_PARAM* param, const KOVA_PCMBUF* out) {
    if (!event_ok(param) || out == nullptr || out->data == nullptr || out->size < 1) {
        return nullptr;
    }
    return playable_set(ctx);
}

GenBlock setup_block(const KOVA_CTX* ctx, KOVA_SRCSET* set, const KOVA_PARAM* param) {
    GenBlock b{};
    b.set = set;
    b.tune = b.set->tune;
    b.loop = b.set->src[KOVA_SLOT_LOOP];
    const int32_t origin = b.loop->origin;
    b.level = (origin == KOVA_ORIGIN_FILE || origin == KOVA_ORIGIN_SAVEFILE) ? b.tune->file_gain
                                                                             : b.tune->wn_gain;
    // Multiplying by 1.0 changes no value, so "no panning" is simply unit gains.
    b.pan_gain[0] = 1.0;
    b.pan_gain[1] = 1.0;
    if (ctx->format->p == 1) {
        const double q = b.tune->pan * (param->x / static_cast<float>(ctx->format->w));
        b.pan_gain[0] = 1.0 - q;
        b.pan_gain[1] = 1.0 - b.tune->pan + q;
    }
    return b;
}

// Start (action 0) or end (action 2): the slot's whole sound, as far as the buffer holds it.
int32_t gen_once(KOVA_CTX* ctx, bool is_end, KOVA_PCMBUF* out, const GenBlock& b) {
    ctx->fast_count = 0;
    const KOVA_SRC* src = b.set->src[is_end ? KOVA_SLOT_END : KOVA_SLOT_START];
    const int32_t avail = kova_gen::playable_samples(src);
    int32_t n = 0;
    if (avail > 0) {
        n = (avail < out->size / 2) ? avail : out->size / 2;
        const double slot_gain = is_end ? b.tune->end_gain : b.tune->start_gain;
        const double g = b.tune->gain * slot_gain * ctx->volume * b.level;
        kova_gen::render_once(ctx->eq, src->pcm_proc, n, g, b.pan_gain, out->data, ctx->work_buf,
                              KOVA_WORK_BUF_BYTES);
    }
    if (is_end) b.loop->pos = 0;
    return n;
}

// The samples of one checked request's action.
int32_t gen_action(KOVA_CTX* ctx, KOVA_SRCSET* set, const KOVA_PARAM* param, KOVA_PCMBUF* out) {
    const GenBlock b = setup_block(ctx, set, param);
    switch (param->action) {
        case KOVA_ACTION_START:
            return gen_once(ctx, false, out, b);
        case KOVA_ACTION_END:
            return gen_once(ctx, true, out, b);
        default:
            return kova_gen::gen_move(ctx, param, out, b);
    }
}

}  // namespace

extern "C" {

KOVA_API void kova_set_param(KOVA_PARAM* dst, const KOVA_PARAM* src) {
    if (dst == nullptr || src == nullptr) return;
    dst->x = src->x;
    dst->y = src->y;
    dst->time = src->time;
    dst->aux = src->aux;
    dst->action = src->action;
}

// Checks everything itself as well (it is exported): a request that kova_gen_sounds would
// refuse produces nothing here either.
KOVA_API int32_t kova_gen_samples(KOVA_CTX* ctx, const KOVA_PARAM* param, KOVA_PCMBUF* out) {
    KOVA_SRCSET* set = checked_request(ctx, param, out);
    return set != nullptr ? gen_action(ctx, set, param, out) : 0;
}

KOVA_API int32_t kova_gen_sounds(KOVA_CTX* ctx, const KOVA_PARAM* param, KOVA_PCMBUF* out) {
    KOVA_SRCSET* set = checked_request(ctx, param, out);
    if (set == nullptr) return 0;
    int32_t samples = 0;
    switch (param->action) {
        case KOVA_ACTION_START:
            kova_set_param(ctx->prev_param, param);
            ctx->stroke = 1;
            ctx->prev_env = 1.0;
            ctx->slew_odd = 0;
            ctx->slew_even = 0;
            samples = gen_action(ctx, set, param, out);
            break;
        case KOVA_ACTION_MOVE:
            // A move outside a stroke only opens one; its position becomes the reference.
            if (ctx->stroke == 1) samples = gen_action(ctx, set, param, out);
            kova_set_param(ctx->prev_param, param);
            ctx->stroke = 1;
            break;
        default:
            ctx->stroke = 0;
            samples = gen_action(ctx, set, param, out);
            break;
    }
    return samples > 0 ? 2 * samples : 0;
}

}  // extern "C"
