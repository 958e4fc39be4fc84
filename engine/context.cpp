// SPDX-License-Identifier: Apache-2.0
// Engine context: format check, creation and release.
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <pthread.h>

#include "engine/context_access.h"
#include "kova/kova_dsp.h"
#include "kova/kova_engine.h"
#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "util/kova_mem.h"

namespace {

constexpr uint32_t kMinRate = 8000;
constexpr uint32_t kMaxRate = 48000;
constexpr int32_t kEqLowHz = 880;
constexpr int32_t kEqHighHz = 5000;
constexpr double kInitialVolume = 0.8;

// Square of a screen dimension, formed as a float and truncated to 32 bits. Dimensions beyond
// 46340 pixels would overflow the integer; the square saturates instead of being undefined.
int64_t dim_square(uint32_t d) {
    const float f = static_cast<float>(d);
    const float sq = f * f;
    if (sq >= 2147483647.0f) return INT32_MAX;
    return static_cast<int32_t>(sq);
}

// Screen-size normalisation of the move energy: 10000 / sqrt(w*w + h*h). The two squares are
// added in 64 bits so huge screens give a small positive factor rather than a wrapped sum.
// A 0 x 0 screen (allowed without panning) gives +infinity: every move then counts as fast.
double screen_norm(uint32_t w, uint32_t h) {
    const int64_t sum = dim_square(w) + dim_square(h);
    return 10000.0 / std::sqrt(static_cast<double>(sum));
}

template <typename T>
T* alloc_cleared() {
    return static_cast<T*>(kova_mem_calloc(1, sizeof(T)));
}

// Builds every member; false when an allocation failed (members built so far stay in ctx).
bool build_members(KOVA_CTX* ctx, const KOVA_FORMAT* f) {
    ctx->format = alloc_cleared<KOVA_FORMAT>();
    if (ctx->format == nullptr) return false;
    *ctx->format = *f;
    ctx->norm = screen_norm(f->w, f->h);
    if (f->channels == 1) ctx->format->p = 0;  // panning needs two channels

    ctx->prev_param = alloc_cleared<KOVA_PARAM>();
    if (ctx->prev_param == nullptr) return false;

    ctx->osc = kova_osc_init(static_cast<int32_t>(f->sample_rate), f->channels, 0);
    if (ctx->osc == nullptr) return false;

    auto* mutex = static_cast<pthread_mutex_t*>(kova_mem_malloc(sizeof(pthread_mutex_t)));
    if (mutex == nullptr) return false;
    // Stored only once initialised, so the release never destroys an uninitialised mutex.
    if (pthread_mutex_init(mutex, nullptr) != 0) {
        kova_mem_free(mutex);
        return false;
    }
    ctx->mutex = mutex;

    ctx->eq = alloc_cleared<KOVA_EQ>();
    if (ctx->eq == nullptr) return false;
    kova_eq_init(ctx->eq, kEqLowHz, kEqHighHz, static_cast<int32_t>(f->sample_rate));

    ctx->work_buf = static_cast<int16_t*>(kova_mem_malloc(KOVA_WORK_BUF_BYTES));
    if (ctx->work_buf == nullptr) return false;
    ctx->src_list = list_create();
    return ctx->src_list != nullptr;
}

}  // namespace

void ctx_free(KOVA_CTX* ctx) {
    if (ctx == nullptr) return;
    if (ctx->mutex != nullptr) {
        pthread_mutex_destroy(ctx->mutex);
        kova_mem_free(ctx->mutex);
        ctx->mutex = nullptr;
    }
    if (ctx->src_list != nullptr) {
        list_destory(ctx->src_list, kova_free_sourceset);
        ctx->src_list = nullptr;
    }
    if (ctx->osc != nullptr) {
        kova_osc_deinit(ctx->osc);
        ctx->osc = nullptr;
    }
    kova_mem_free(ctx->eq);
    ctx->eq = nullptr;
    kova_mem_free(ctx->prev_param);
    ctx->prev_param = nullptr;
    kova_mem_free(ctx->format);
    ctx->format = nullptr;
    ctx->tag = 0;
    kova_mem_free(ctx->work_buf);
    ctx->work_buf = nullptr;
    kova_mem_free(ctx);
}

extern "C" {

KOVA_API int32_t kova_checkformat(const KOVA_FORMAT* f) {
    if (f == nullptr) return -1;
    if (f->sample_rate < kMinRate || f->sample_rate > kMaxRate) return -1;
    if (f->channels != 1 && f->channels != 2) return -1;
    if (f->p != 1) return 1;
    if (f->channels != 2 || f->h == 0 || f->w == 0) return -1;
    return 1;
}

KOVA_API KOVA_CTX* kova_init(const KOVA_FORMAT* f, int32_t* err) {
    if (f == nullptr || err == nullptr) return nullptr;
    int32_t code = KOVA_ERR_INVALID_FORMAT;
    *err = code;
    if (kova_checkformat(f) >= 1) {
        auto* ctx = alloc_cleared<KOVA_CTX>();
        if (ctx != nullptr && build_members(ctx, f)) {
            // The record starts cleared: no set active, no stroke open, slew memories at rest.
            ctx->volume = kInitialVolume;
            ctx->tag = KOVA_CTX_TAG;
            *err = KOVA_OK;
            return ctx;
        }
        puts("KOVA_CTX malloc fail ");
        ctx_free(ctx);
        code = KOVA_ERR_INSUFF_MEM;
    }
    *err = code;
    printf("kova_init() fail. err code (%d) \n", code);
    return nullptr;
}

KOVA_API int32_t kova_deinit(KOVA_CTX* ctx) {
    if (!_ctx_alive(ctx)) return KOVA_ERR_INVALID_PARAM;
    ctx_free(ctx);
    return KOVA_OK;
}

}  // extern "C"
